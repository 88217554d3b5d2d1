// The surroundings of a run of the real tool: a signed bundle, genuine tickets for it, a platform
// directory that trusts them, a scripted record service, and an environment without the developer's own
// settings.
//
//   TEST_F(Lookup, SaysWhyThereIsNoTicket) {
//       serve(answer(R"({"records":[{"reason":"Record not found"}]})"));
//       EXPECT_THAT(staple(), Ended(65, ElementsAre(processing(), ...)));
//   }
//
// Everything is below one temporary directory, and every test has its own.
#pragma once

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "base/bytes.h"
#include "base/text.h"
#include "support/certificate_builder.h"
#include "support/code_directory_builder.h"
#include "support/executable_image_builder.h"
#include "support/hostile_server.h"
#include "support/process.h"
#include "support/temporary_directory.h"
#include "support/ticket_builder.h"

namespace pinwell::test {

using base::Data;

/// Shown when an expectation about a run fails.
void PrintTo(const ProcessResult& result, std::ostream* out);

/// A run with this status, these lines on standard output, and an empty standard error.
testing::Matcher<const ProcessResult&> Ended(int status,
                                             const testing::Matcher<std::vector<std::string>>& lines);

/// The last line of a run that ended well.
inline constexpr const char* kWorked = "The staple and validate action worked!";
inline constexpr const char* kValidated = "The validate action worked!";

// Codes of URLErrorDomain.
inline constexpr int kCancelled = 1;
inline constexpr int kUnsupportedURL = 2;
inline constexpr int kCannotConnect = 4;
inline constexpr int kTooManyRedirects = 6;
inline constexpr int kTooLarge = 7;
inline constexpr int kSecureConnectionFailed = 8;
inline constexpr int kBadServerResponse = 9;
inline constexpr int kConnectionLost = 10;
inline constexpr int kProxyFailed = 11;
/// For failures to which versions of the transfer library give different codes.
inline constexpr int kAnyCode = 0;

/// A response of the record service with this body: status 200, request identifier "REQUEST".
Response answer(std::string body);

/// The body of a response whose record contains this ticket.
std::string inlineRecord(const Data& ticket);

/// The body of a response whose record names a ticket's URL; `size` is JSON, or omitted if
/// empty.
std::string assetRecord(const std::string& urlTemplate, const std::string& size);
std::string assetRecord(const std::string& urlTemplate, std::size_t size);

class EndToEndTest : public testing::Test {
  protected:
    EndToEndTest();

    /// Ends the service before the objects it refers to, in the fixtures on this one.
    void TearDown() override { service_.reset(); }

    // Running the tool.

    Command command(std::vector<std::string> arguments) const;
    ProcessResult pinwell(std::vector<std::string> arguments) const;
    ProcessResult staple() const { return pinwell({"staple", bundle}); }
    ProcessResult validate() const { return pinwell({"validate", bundle}); }

    /// A run with a failed download reports it with this line, and then waits for ever.
    void expectParked(const testing::Matcher<std::string>& line) const;

    // The lines of every run.

    std::string processing() const { return "Processing: " + bundle; }
    std::string prettyHash() const { return "2/" + base::toHex(hash); }
    std::string noTicketLine() const {
        return "Could not find base64 encoded ticket in response for " + prettyHash();
    }
    static std::string stapleFailed(int status) {
        return "The staple and validate action failed! Error " + std::to_string(status) + ".";
    }
    static std::string validateFailed(int status) {
        return "The validate action failed! Error " + std::to_string(status) + ".";
    }

    /// The end of a staple whose lookup failed in transit, with that code of URLErrorDomain, after these
    /// lines.
    testing::Matcher<const ProcessResult&> FailedOnTheWay(
        int code, std::vector<testing::Matcher<std::string>> linesBefore = {}) const;

    /// The line of a download that failed.
    testing::Matcher<std::string> DownloadFailed(const std::string& reason = {}) const;

    // The platform directory.

    /// Adds a certificate, by default to the maker's own roots.
    void trust(const IssuedCertificate& certificate, const std::string& store = "roots");
    void writePlatformSettings(std::string_view json);
    /// Sets the record service: HOST or HOST:PORT.
    void contact(const std::string& host);

    // The record service.

    /// Starts it on first use: a well-behaved one under 127.0.0.1, whose root is trusted.
    HostileServer& service();
    /// Starts it under another identity, and names it in platform.json as `host`. Adds no trust.
    HostileServer& startService(const ServerIdentity& identity, const std::string& host = "127.0.0.1",
                                HostileServerOptions options = {});
    /// The response to every request.
    void serve(Response response);
    /// Refuses every request after this call; the server's threads no longer use the earlier handler's
    /// objects.
    void serveNoMore() { serve({.status = 503}); }
    void serveTicket(const Data& ticket) { serve(answer(inlineRecord(ticket))); }
    /// The response to the lookup has this record; later requests get `asset`.
    void serveAsset(const std::string& record, const Response& asset);
    /// A ticket in its own file, as announced, from the record service's own host.
    void serveAsset(const Data& ticket);

    // Tickets.

    /// Lists the bundle's hash.
    TicketPayloadBuilder payload() const;
    Data sealed(const TicketPayloadBuilder& payload) const;
    Data ticket() const { return sealed(payload()); }
    Data revokedTicket() const { return sealed(payload().revoked()); }
    Data ticketForOthers() const { return sealed(TicketPayloadBuilder().entry(2, hashOf(0x77))); }

    // The files on the disk.

    std::string ticketPath() const { return bundle + "/Contents/CodeResources"; }
    void stapleByHand(const Data& ticket) { writeFile(ticketPath(), ticket); }
    /// The bytes of the stapled ticket; `nullopt` if there is no regular file.
    std::optional<Data> stapled() const;
    /// Everything below a directory, by its path from there, sorted.
    static std::vector<std::string> namesBelow(const std::string& path);
    /// The same of the temporary directory that the tool was given.
    std::vector<std::string> temporaryFiles() const { return namesBelow(directory / "tmp"); }
    std::string temporaryPath(const std::string& name) const { return directory / ("tmp/" + name); }

    TemporaryDirectory directory;
    Environment environment;
    IssuedChain ticketChain = TicketChain().issue();
    IssuedChain serverChain = ServerChain("127.0.0.1").issue();
    Data hash;  // of the bundle: 20 bytes, algorithm 2
    std::string bundle;

  private:
    std::unique_ptr<HostileServer> service_;
};

}  // namespace pinwell::test
