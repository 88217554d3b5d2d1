// Shared code of the targets of deep verification: verifies an artefact's bytes in memory, and makes claims
// about the result.
#pragma once

#include <functional>

#include "base/byte_source.h"
#include "target.h"
#include "verify/check.h"
#include "verify/code.h"
#include "verify/workers.h"

namespace pinwell::fuzz {

using Verification =
    std::function<verify::VerifiedCode(const base::ByteSource&, verify::Workers&, verify::Section&)>;

/// Whether the signature covers all bytes outside it, so that every byte counts.
enum class Coverage { whole, partial };

/// Claims about `input`: every check is complete, and a second run has the same result. An artefact with an
/// ad-hoc signature, without a fault and covered whole: no byte may change unnoticed. Some bytes, chosen by
/// the input, are tried.
void examineVerified(ByteView input, const Verification& verification, Coverage coverage);

}  // namespace pinwell::fuzz
