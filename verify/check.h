// The findings of deep verification: a tree of sections, each with its checks. A plain data model.
//
// Every check has a place (`place`), the value in the signature (`expected`) and the value of the bytes
// (`found`). Texts from a file are unchanged; a rendering escapes them.
#pragma once

#include <cstddef>
#include <string>
#include <string_view>
#include <vector>

namespace pinwell::verify {

/// In the order of gravity: the outcome of several is the highest.
enum class Outcome {
    passed,
    skipped,     // not checked; `found` says why
    noted,       // worth knowing, but not a fault: a matter of policy
    unreadable,  // the bytes cannot be read, so their state is unknown
    failed,      // something has changed since signing
};

/// "passed", "skipped", "noted", "unreadable", "failed".
std::string_view outcomeName(Outcome outcome);

/// One check and its result.
struct Check {
    std::string name;   // from the closed list of check_names.h
    std::string place;  // in the artefact: a path below it, a slice, a page, a range of bytes
    Outcome outcome = Outcome::passed;
    std::string expected;
    std::string found;
};

/// The checks of one part of an artefact, and its subsections. A section of a bundle is a piece of code in
/// it.
struct Section {
    std::string place;  // empty for the artefact itself
    std::vector<Check> checks;
    std::vector<Section> sections;

    void add(Check check) { checks.push_back(std::move(check)); }
    void pass(std::string_view name, std::string place, std::string expected, std::string found = {});
    void fail(std::string_view name, std::string place, std::string expected, std::string found);
    void note(std::string_view name, std::string place, std::string expected, std::string found);
    void skip(std::string_view name, std::string place, std::string why);
    void cannotRead(std::string_view name, std::string place, std::string why);
};

/// The gravest outcome in a section and its subsections; passed if there are no checks.
Outcome worstOutcome(const Section& section);

/// All checks of a section and its subsections, parents first.
std::vector<Check> flattened(const Section& section);

/// Maximum number of failures of one kind that are kept. The rest are counted.
inline constexpr std::size_t kMaximumFailuresKept = 256;

/// Adds failures of one kind to a section, the first kMaximumFailuresKept one by one, the rest as a number.
class FailureList {
  public:
    FailureList(Section& section, std::string_view name) : section_(section), name_(name) {}
    ~FailureList();
    FailureList(const FailureList&) = delete;
    FailureList& operator=(const FailureList&) = delete;

    void add(Outcome outcome, std::string place, std::string expected, std::string found);
    std::size_t count() const noexcept { return count_; }

  private:
    Section& section_;
    std::string name_;
    std::size_t count_ = 0;
    Outcome worst_ = Outcome::passed;  // of the failures that are only counted
};

}  // namespace pinwell::verify
