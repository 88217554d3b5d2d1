// An artefact and its ticket, judged without a service: the rules of the tool, and deep verification. For
// this folder only.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "base/bytes.h"
#include "pinwell/ticket.h"
#include "pinwell/ticket_c.h"
#include "verify/check.h"

namespace pinwell::library {

/// How far an assessment goes.
enum class Depth { ticket, everyByte };

struct Settings {
    std::int64_t evaluationTime = 0;  // seconds since 1970-01-01 00:00:00 UTC
    unsigned threads = 0;             // 0: the processors that the process may use
};

/// A check, and the depth of its part in the artefact.
struct PlacedCheck {
    verify::Check check;
    std::uint32_t depth = 0;
};

struct Assessment {
    pinwell_kind kind = PINWELL_KIND_NONE;
    pinwell_verdict verdict = PINWELL_VERDICT_GOOD;
    std::string reason;
    std::string recordName;  // empty without a hash
    std::uint32_t digestType = 0;
    std::optional<base::Data> codeHash;
    std::optional<base::Data> ticket;
    std::vector<PlacedCheck> checks;
};

/// Throws std::bad_alloc.
Assessment assess(const std::string& path, Depth depth, const ticket::TrustedRoots& roots,
                  const Settings& settings);

/// A ticket and its file.
struct LocatedTicket {
    base::Data bytes;
    std::string file;
    std::uint64_t offset = 0;
};

/// Throws Failure if there is no readable ticket.
LocatedTicket findTicket(const std::string& path);

/// Throws Failure if the artefact has no valid signature.
std::string recordNameOfFile(const std::string& path);

}  // namespace pinwell::library
