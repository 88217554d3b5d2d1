// Inputs for which a parser, or the library behind it, might work out of proportion to their length.
//
// A row has a builder of such an input, and a builder of its control: a harmless input of the same length for
// the same reader. costly_test compares each row's processor time with its control's, and its memory with its
// length; bench/hostile measures the same rows at 16 MiB, in seconds and mebibytes.
//
// Each library with input has a file of rows here, whose function is one line in costly_inputs.cpp.
#pragma once

#include <cstddef>
#include <functional>
#include <ostream>
#include <string>
#include <string_view>
#include <vector>

#include "base/bytes.h"

namespace pinwell::test {

using base::Data;

struct CostlyInput {
    std::string name;  // as part of a test's name
    std::string cost;  // in one line: the frequent element, or the expensive work

    /// Reads an input as the programs do. Returns true if it is accepted, false if it is refused.
    std::function<bool(const Data&)> read;

    /// Whether a costly input of a quarter of a mebibyte is accepted. The control always is.
    bool isTaken = false;

    /// An input of about `length` bytes, always the same for the same length. The control of a compressed
    /// input may contain the uncompressed bytes, and be longer.
    std::function<Data(std::size_t length)> costly;
    std::function<Data(std::size_t length)> control;

    /// The highest processor time of the costly input, as a multiple of its control's.
    double times = 10;

    friend void PrintTo(const CostlyInput& row, std::ostream* out) { *out << row.cost; }
};

/// Every row, in a fixed order; the names are distinct.
const std::vector<CostlyInput>& costlyInputs();

/// Repeats `text` up to about `length` bytes, at least once.
std::string filled(std::string_view text, std::size_t length);

/// `make(0)`, `make(1)` and so on, up to about `length` bytes.
std::string filled(const std::function<std::string(std::size_t)>& make, std::size_t length);

// The rows, a function for each group.
std::vector<CostlyInput> archiveInputs();
std::vector<CostlyInput> artefactInputs();
std::vector<CostlyInput> certificateInputs();
std::vector<CostlyInput> jsonInputs();
std::vector<CostlyInput> propertyListInputs();

}  // namespace pinwell::test
