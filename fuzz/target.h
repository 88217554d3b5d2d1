// What every fuzz target is made of: one function that is given the input, and claims about what comes of it.
//
// A target does more than to survive its input. What it claims is checked with require(), which ends the
// process, so that the fuzzer keeps the input as it keeps that of a crash. A target keeps nothing from one
// input to the next that could change what becomes of it.
#pragma once

#include "foundation/bytes.h"

namespace pinwell::fuzz {

using foundation::ByteView;
using foundation::Data;

/// The target: one a program, defined in the file that bears its name.
void examine(ByteView input);

/// Ends the process with a line that states the claim, unless it holds.
void require(bool holds, const char* claim);

/// From now on messages are made up in full, verbose ones included, and go nowhere.
void discardMessages();

}  // namespace pinwell::fuzz
