// Where the rows of the tables go when somebody wants to see them.
#pragma once

#include <string>

namespace pinwell::test {

/// One row with its result. `wrong` says in one line what is wrong.
struct ResultRow {
    std::string table;
    std::string name;
    std::string wrong;
    std::string expected;
    std::string got;
    bool mustFail = true;  // false for a row that states what is accepted, and why
};

/// Appends the row, tab-separated, to the file that PINWELL_RESULT_TABLE names; nothing without the variable.
/// A line that cannot be written is a std::runtime_error.
void recordResult(const ResultRow& row);

}  // namespace pinwell::test
