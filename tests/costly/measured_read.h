// One read of an input, measured in a process of its own.
#pragma once

#include <functional>
#include <string>

#include "foundation/bytes.h"

namespace pinwell::test {

struct MeasuredRead {
    /// Why there is no result: the process was ended, by what; or the reader threw. Empty otherwise.
    std::string failure;

    bool isTaken = false;
    double seconds = 0;    // of processor time, user and system: the least of all runs
    double mebibytes = 0;  // that the process grew by, at most: resident memory
};

/// The input is read `runs` times by a forked child, which may take `limit` seconds of processor time in all.
/// The caller must have one thread.
MeasuredRead measureRead(const std::function<bool(const foundation::Data&)>& read,
                         const foundation::Data& input, int runs, unsigned limit);

/// Whether resident memory says what the code needs: not under a sanitizer, which has memory of its own.
bool memoryIsMeasured();

}  // namespace pinwell::test
