// Requirements on an artefact besides being unchanged since signing, and the policy file.
//
// A policy file is in TOML; its keys are the names of the options:
//
//   max-ticket-age = "90d"
//   require-team = "A1B2C3D4E5"                  or a list, one of which must be equal
//   require-identifier = "com.example.*"         or a list, one of which must match
//   require-secure-timestamp = true
//
// An age is a whole number and a unit: s, m, h, d or w.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "base/error.h"
#include "run.h"
#include "verify/code.h"
#include "verify/judged_ticket.h"

namespace pinwell::gate {

/// Longest policy file.
inline constexpr std::size_t kMaximumPolicyFile = std::size_t{1024} * 1024;

/// `nullopt` if the text is not an age, or is beyond ten thousand years.
std::optional<std::int64_t> ageFrom(std::string_view text);

/// Whether a glob of '*', '?' and characters matches a whole text. Time is at most in proportion to the
/// product of their lengths.
bool matchesGlob(std::string_view glob, std::string_view text);

/// Returns an error if the file cannot be read, is not TOML, or has an unknown key or value. Its reason is
/// "FILE:LINE: fault", or "FILE: fault" if no line has it.
base::Result<Policy> readPolicyFile(const std::string& path);

/// Adds a check for each requirement of the policy. `deciding`: the ticket whose age counts; null without a
/// genuine ticket. Every slice of the artefact's own code must satisfy the policy; nested code need not.
/// Returns whether all checks passed.
bool checkAgainst(const Policy& policy, const verify::JudgedTicket* deciding,
                  const verify::VerifiedCode& code, std::int64_t now, verify::Section& section);

}  // namespace pinwell::gate
