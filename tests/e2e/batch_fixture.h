// Many artefacts, their tickets, and a record service that knows them, for the companions that handle many
// artefacts.
//
//   const auto images = writeImages(3);
//   serveRecords();
//   EXPECT_THAT(reportsOf(batch({"staple", "--json", ...})), Each(Reports("worked", 0)));
#pragma once

#include <map>
#include <mutex>
#include <string>
#include <vector>

#include "artefacts.h"
#include "base/bytes.h"
#include "fixture.h"
#include "values/value.h"

namespace pinwell::test {

using values::Value;

/// Matches the line of an artefact by its cause and exit status.
testing::Matcher<const Value&> Reports(const std::string& cause, int exitStatus);

class BatchTest : public EndToEndTest {
  protected:
    Command batchCommand(std::vector<std::string> arguments) const;
    ProcessResult batch(std::vector<std::string> arguments) const;
    /// `batch` of all these images.
    ProcessResult batch(std::vector<std::string> arguments, const std::vector<Artefact>& images) const;
    Command ticketCommand(std::vector<std::string> arguments) const;
    ProcessResult ticketTool(std::vector<std::string> arguments) const;

    /// Unsigned images with different hashes, and a genuine ticket for each in `records`.
    std::vector<Artefact> writeImages(std::size_t count, const std::string& folder = "builds/many");
    /// Paths below "builds", one for each outcome of a staple without a fault of service or volume, with its
    /// cause.
    std::map<std::string, std::string> writeEveryOutcome();
    static std::vector<std::string> pathsOf(const std::vector<Artefact>& artefacts);
    static std::string recordNameOf(const Artefact& artefact) { return "2/" + artefact.prettyHash(); }
    /// A new ticket with a new signature.
    Data ticketOf(const Artefact& artefact) const { return sealed(artefact.payload()); }
    /// The ticket in `records`.
    const Data& issuedFor(const Artefact& artefact) const {
        return records.at(recordNameOf(artefact)).value();
    }

    /// Responds to lookups with the present contents of `records`, in the requested order.
    void serveRecords();
    /// The names in a lookup.
    static std::vector<std::string> namesIn(const RecordedRequest& request);
    /// The body of a response with these records.
    std::string bodyFor(const std::vector<std::string>& names) const;
    /// The number of names in each lookup.
    std::vector<std::size_t> groupSizes();

    /// The lines of a run with --json, except the summary.
    static std::vector<Value> reportsOf(const ProcessResult& result);
    static Value summaryOf(const ProcessResult& result);

    /// Each of these command lines, after the program's name, ends with 64 and a one-line reason.
    void expectWrongUsage(const std::string& program,
                          const std::vector<std::vector<std::string>>& lines) const;

    /// Each line of the output keeps to the schema (expectConforms).
    static void expectValid(const ProcessResult& result, const std::string& schema);

    static bool isStapled(const Artefact& artefact, const Data& ticket);
    std::size_t countStapled(const std::vector<Artefact>& artefacts) const;

    /// By name: a ticket, or `nullopt` if the service has none. The test changes it between runs; the
    /// service's threads read it during them.
    std::map<std::string, std::optional<Data>> records;

    /// Locked while the service uses the test's data.
    mutable std::mutex serving;

  private:
    /// A run orders the test's actions before and after it and the service's actions during it. The language
    /// and ThreadSanitizer do not see other processes, so this lock states the same order.
    void orderWithService() const { const std::lock_guard order(serving); }
};

}  // namespace pinwell::test
