// One read of an input, measured in a separate process.
#pragma once

#include <functional>
#include <string>

#include "base/bytes.h"

namespace pinwell::test {

struct MeasuredRead {
    /// Why there is no result: the end of the process, or the reader's exception. Empty otherwise.
    std::string failure;

    bool isTaken = false;
    double seconds = 0;    // of processor time, user and system: the least of all runs
    double mebibytes = 0;  // that the process grew by, at most: resident memory
};

/// A forked child reads the input `runs` times, within `limit` seconds of processor time in all. The caller
/// must have one thread.
MeasuredRead measureRead(const std::function<bool(const base::Data&)>& read, const base::Data& input,
                         int runs, unsigned limit);

/// Whether resident memory measures the code's needs: not under a sanitizer, which needs memory itself.
bool memoryIsMeasured();

}  // namespace pinwell::test
