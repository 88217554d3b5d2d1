// What the targets of deep verification share: the bytes of an artefact are verified in memory, and claims
// hold for whatever comes of it.
#pragma once

#include <functional>

#include "codesign/byte_source.h"
#include "target.h"
#include "verify/check.h"
#include "verify/executable.h"
#include "verify/workers.h"

namespace pinwell::fuzz {

using Verification =
    std::function<verify::VerifiedCode(const codesign::ByteSource&, verify::Workers&, verify::Section&)>;

/// Whether the signature covers all that is not signature, so that every byte counts.
enum class Coverage { whole, partial };

/// Claims of `input`: every check is complete, and a second run says the same. In an artefact that is signed
/// ad hoc, has no fault and is covered whole, no byte may change unnoticed: some bytes, chosen by the input,
/// are tried.
void examineVerified(ByteView input, const Verification& verification, Coverage coverage);

}  // namespace pinwell::fuzz
