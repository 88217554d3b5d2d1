// The parts of every fuzz target: one function for the input, and claims about the result.
//
// A target checks more than survival. require() checks its claims and ends the process if one is false, so
// that the fuzzer keeps the input like that of a crash. A target keeps nothing between inputs that could
// change a result.
#pragma once

#include "base/bytes.h"

namespace pinwell::fuzz {

using base::ByteView;
using base::Data;

/// The target: one for each program, defined in the file of its name.
void examine(ByteView input);

/// If the claim does not hold, ends the process with a line that states it.
void require(bool holds, const char* claim);

/// After this call, all messages are formatted, also the verbose ones, and dropped.
void discardMessages();

}  // namespace pinwell::fuzz
