// Writes the rows of the tables to a file on request.
#pragma once

#include <string>

namespace pinwell::test {

/// One row with its result. `wrong` states the fault in one line.
struct ResultRow {
    std::string table;
    std::string name;
    std::string wrong;
    std::string expected;
    std::string got;
    bool mustFail = true;  // false for a row that states an accepted case, and why
};

/// Appends the row, tab-separated, to the file named by PINWELL_RESULT_TABLE; does nothing without the
/// variable. Throws std::runtime_error if it cannot write the line.
void recordResult(const ResultRow& row);

}  // namespace pinwell::test
