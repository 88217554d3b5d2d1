#include "verify/check.h"

#include <algorithm>
#include <utility>

#include "codesign/code_error.h"
#include "values/format.h"

namespace pinwell::verify {

std::string_view outcomeName(Outcome outcome) {
    switch (outcome) {
        case Outcome::passed:
            return "passed";
        case Outcome::skipped:
            return "skipped";
        case Outcome::noted:
            return "noted";
        case Outcome::unreadable:
            return "unreadable";
        case Outcome::failed:
            break;
    }
    return "failed";
}

void Section::pass(std::string_view name, std::string at, std::string expected, std::string found) {
    if (found.empty()) found = expected;
    add({std::string(name), std::move(at), Outcome::passed, std::move(expected), std::move(found)});
}

void Section::fail(std::string_view name, std::string at, std::string expected, std::string found) {
    add({std::string(name), std::move(at), Outcome::failed, std::move(expected), std::move(found)});
}

void Section::note(std::string_view name, std::string at, std::string expected, std::string found) {
    add({std::string(name), std::move(at), Outcome::noted, std::move(expected), std::move(found)});
}

void Section::skip(std::string_view name, std::string at, std::string why) {
    add({std::string(name), std::move(at), Outcome::skipped, {}, std::move(why)});
}

void Section::cannotRead(std::string_view name, std::string at, std::string why) {
    add({std::string(name), std::move(at), Outcome::unreadable, "bytes that can be read", std::move(why)});
}

void Section::failWith(const std::runtime_error& failure, std::string_view name, std::string at,
                       std::string expected) {
    const codesign::CodeError error = codesign::asCodeError(failure);
    if (error.status() == codesign::kIOError) {
        cannotRead(name, std::move(at), error.what());
    } else {
        fail(name, std::move(at), std::move(expected), error.what());
    }
}

Outcome worstOutcome(const Section& section) {
    Outcome worst = Outcome::passed;
    for (const Check& check : section.checks) worst = std::max(worst, check.outcome);
    for (const Section& part : section.sections) worst = std::max(worst, worstOutcome(part));
    return worst;
}

namespace {

void flattenInto(const Section& section, std::vector<Check>& all) {
    all.insert(all.end(), section.checks.begin(), section.checks.end());
    for (const Section& part : section.sections) flattenInto(part, all);
}

}  // namespace

std::vector<Check> flattened(const Section& section) {
    std::vector<Check> all;
    flattenInto(section, all);
    return all;
}

FailureList::~FailureList() {
    if (count_ <= kMaximumFailuresKept) return;
    section_.add({name_,
                  section_.place,
                  worst_,
                  {},
                  values::format("%zu more of the same kind", count_ - kMaximumFailuresKept)});
}

void FailureList::add(Outcome outcome, std::string place, std::string expected, std::string found) {
    if (++count_ <= kMaximumFailuresKept) {
        section_.add({name_, std::move(place), outcome, std::move(expected), std::move(found)});
    } else {
        worst_ = std::max(worst_, outcome);
    }
}

}  // namespace pinwell::verify
