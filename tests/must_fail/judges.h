// One artefact, judged by each program that states why a ticket is refused: the library, pinwell-inspect and
// pinwell-gate. All of them trust the same directory and read the same clock.
#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <ostream>
#include <string>

#include "base/bytes.h"
#include "subjects.h"
#include "support/test_platform.h"

namespace pinwell::test {

/// The statement of one program.
struct Statement {
    std::string verdict;   // "good", "noTicket", "refused", "revoked", "unreadable"
    std::string sentence;  // the conclusion
    std::string rule;      // the broken rule; empty if there is none, or if the program states none
    std::optional<std::uint64_t> offset;  // of the rule, in the file with the ticket

    bool operator==(const Statement&) const = default;
};
void PrintTo(const Statement& statement, std::ostream* out);

class Judges {
  public:
    explicit Judges(const SignerAnchors& anchors);

    std::string path(const std::string& name) const { return platform_.directory / name; }

    /// pinwell_judge_file() for verdict and sentence. The rule and its offset are the error of
    /// pinwell_find_ticket(), or those of validate() for the found ticket.
    Statement library(const std::string& path) const;
    Statement inspection(const std::string& path);
    /// The rule is the value of the first failed check.
    Statement gate(const std::string& path);

  private:
    Platform services();

    TestPlatform platform_;
    std::unique_ptr<codesign::CodeSigningService> codeSigning_;
    std::unique_ptr<trust::TrustService> trust_;
};

}  // namespace pinwell::test
