// Inputs that would make a parser, or the library behind it, work out of proportion to their length.
//
// A row is a builder of such an input and a builder of an innocent one of the same length, its control, which
// the same reader takes. costly_test holds each row's processor time against its control's, and its memory
// against its length; bench/hostile measures the same rows at 16 MiB, in seconds and mebibytes.
//
// A library that is handed input has a file of rows here, whose function is one line in costly_inputs.cpp.
#pragma once

#include <cstddef>
#include <functional>
#include <ostream>
#include <string>
#include <string_view>
#include <vector>

#include "foundation/bytes.h"

namespace pinwell::test {

using foundation::Data;

struct CostlyInput {
    std::string name;  // as part of a test's name
    std::string cost;  // in one line: what there is a lot of, or what it could set to work

    /// Reads an input as the programs do. Returns whether it was taken, false if it was refused.
    std::function<bool(const Data&)> read;

    /// What becomes of the costly input at a quarter of a mebibyte. The control is always taken.
    bool isTaken = false;

    /// An input of about `length` bytes, and not much longer. The same for the same
    /// length. The control of a compressed input may hold what that comes to, and be longer.
    std::function<Data(std::size_t length)> costly;
    std::function<Data(std::size_t length)> control;

    /// The most processor time that the costly input may take, as a multiple of its control's.
    double times = 10;

    friend void PrintTo(const CostlyInput& row, std::ostream* out) { *out << row.cost; }
};

/// Every row, in a fixed order; the names are distinct.
const std::vector<CostlyInput>& costlyInputs();

/// `text` as often as it takes to come to about `length` bytes, at least once.
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
