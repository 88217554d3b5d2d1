// Artefacts of the three kinds with the hash that a ticket must list for them, and the tool run over them in
// the test's own process: real files, real code signing, real trust over anchors of the test's choice, the
// test in the place of the network.
#pragma once

#include <functional>
#include <memory>
#include <optional>
#include <ostream>
#include <string>
#include <vector>

#include "foundation/bytes.h"
#include "support/test_platform.h"
#include "support/ticket_builder.h"
#include "trust/trust_service.h"

namespace pinwell::test {

using foundation::Data;

/// One artefact that could be had, ticket and all.
struct Subject {
    std::string name;      // of the kind, as a part of a test's name
    std::string fileName;  // with the kind's extension
    std::uint8_t algorithm = 0;
    Data hash;
    std::function<void(const std::string& path, const std::optional<Data>& ticket)> write;

    /// A payload that lists the hash.
    TicketPayloadBuilder payload() const { return TicketPayloadBuilder().entry(algorithm, hash); }

    friend void PrintTo(const Subject& subject, std::ostream* out) { *out << subject.name; }
};

/// A bundle, a signed and an unsigned disk image, a flat package.
const std::vector<Subject>& subjects();
const Subject& subjectNamed(const std::string& name);

/// Everything a run may find on disk, as one text: a file's bytes, of a bundle those of its ticket.
std::string contentsOf(const std::string& path);

struct SignerAnchors {
    std::vector<Data> roots;
    std::vector<Data> compatibility;
    std::vector<Data> allowed;
    std::vector<Data> denied;
};

/// Ends as the tool ends. Of use for any number of runs.
class ToolRun {
  public:
    explicit ToolRun(const SignerAnchors& anchors);

    /// Where artefacts may be put.
    std::string path(const std::string& name) const { return platform_.directory / name; }

    int validate(const std::string& path, const std::string& answer);
    /// `meanwhile` happens while the service is asked.
    int staple(const std::string& path, const std::string& answer,
               const std::function<void()>& meanwhile = {});

    /// Whether the ticket on it passes the check that is made before the network is asked.
    bool passesOffline(const std::string& path);

  private:
    int run(const std::string& path, const std::string& answer, std::uint8_t operation,
            const std::function<void()>& meanwhile = {});

    TestPlatform platform_;
    std::unique_ptr<codesign::CodeSigningService> codeSigning_;
    std::unique_ptr<trust::TrustService> trust_;
    Platform services_;
};

}  // namespace pinwell::test
