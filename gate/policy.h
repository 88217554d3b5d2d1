// What an artefact must satisfy beside being as it was signed, and the file that says so.
//
// A policy file is in TOML, with keys named as the options:
//
//   max-ticket-age = "90d"
//   require-team = "A1B2C3D4E5"                  or a list, of which one must be it
//   require-identifier = "com.example.*"         or a list, of which one must match
//   require-secure-timestamp = true
//
// An age is a whole number and a unit: s, m, h, d or w.
#pragma once

#include <cstdint>
#include <optional>
#include <stdexcept>
#include <string>
#include <string_view>

#include "gate/options.h"
#include "verify/executable.h"
#include "verify/judged_ticket.h"

namespace pinwell::gate {

/// Longest policy file.
inline constexpr std::size_t kMaximumPolicyFile = std::size_t{1024} * 1024;

/// What is wrong with a policy file: "FILE:LINE: what".
class PolicyError : public std::runtime_error {
  public:
    using std::runtime_error::runtime_error;
};

/// `nullopt` if the text is no age, or one beyond ten thousand years.
std::optional<std::int64_t> ageFrom(std::string_view text);

/// Whether a glob of '*', '?' and characters matches all of a text. Time is in proportion to the product of
/// their lengths at most.
bool matchesGlob(std::string_view glob, std::string_view text);

/// Throws PolicyError if the file cannot be read, is no TOML, or holds a key or value that is none of ours.
Policy readPolicyFile(const std::string& path);

/// Adds a check for each thing that the policy asks. `deciding`: the ticket whose age counts; null without a
/// genuine one. Every slice of the artefact's own code must satisfy it; nested code need not. Returns whether
/// all passed.
bool checkAgainst(const Policy& policy, const verify::JudgedTicket* deciding,
                  const verify::VerifiedCode& code, std::int64_t now, verify::Section& section);

}  // namespace pinwell::gate
