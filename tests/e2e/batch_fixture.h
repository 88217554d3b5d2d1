// Many artefacts, their tickets, and a record service that knows them: what the companions that handle many
// are run on.
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
#include "fixture.h"
#include "foundation/bytes.h"
#include "foundation/value.h"

namespace pinwell::test {

using foundation::Value;

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

    /// Unsigned images, each with a hash of its own, and a genuine ticket for each in `records`.
    std::vector<Artefact> writeImages(std::size_t count, const std::string& folder = "builds/many");
    /// Paths below "builds", one for each way in which a staple can end without a fault of service or volume,
    /// with its cause.
    std::map<std::string, std::string> writeEveryOutcome();
    static std::vector<std::string> pathsOf(const std::vector<Artefact>& artefacts);
    static std::string recordNameOf(const Artefact& artefact) { return "2/" + artefact.prettyHash(); }
    /// A new one, whose signature is its own.
    Data ticketOf(const Artefact& artefact) const { return sealed(artefact.payload()); }
    /// The one in `records`.
    const Data& issuedFor(const Artefact& artefact) const {
        return records.at(recordNameOf(artefact)).value();
    }

    /// Answers lookups with what is in `records` then, in the order asked for.
    void serveRecords();
    /// The names that a lookup asks for.
    static std::vector<std::string> namesIn(const RecordedRequest& request);
    /// The body of an answer with these records.
    std::string bodyFor(const std::vector<std::string>& names) const;
    /// How many names each lookup asked for.
    std::vector<std::size_t> groupSizes();

    /// The lines of a run with --json, but for the summary.
    static std::vector<Value> reportsOf(const ProcessResult& result);
    static Value summaryOf(const ProcessResult& result);

    /// Each of these lines, after the program's name, ends with 64 and one line that says why.
    void expectWrongUsage(const std::string& program,
                          const std::vector<std::vector<std::string>>& lines) const;

    /// Each line of the output keeps to the schema, by another program's word.
    void expectValid(const ProcessResult& result, const std::string& schema) const;

    static bool isStapled(const Artefact& artefact, const Data& ticket);
    std::size_t countStapled(const std::vector<Artefact>& artefacts) const;

    /// By name: a ticket, or nothing where the service has none. Changed between runs, read by the service's
    /// threads during them.
    std::map<std::string, std::optional<Data>> records;

    /// Held by what the service does with what the test has.
    mutable std::mutex serving;

  private:
    /// A run orders what the test does before and after it and what the service does meanwhile. Language and
    /// ThreadSanitizer know nothing of other processes: this says the same to them.
    void orderWithService() const { const std::lock_guard order(serving); }
};

}  // namespace pinwell::test
