// Statuses of the platform as results, and back.
#pragma once

#include <cstdint>

#include "base/error.h"

namespace pinwell::test {

/// The status of a result: 0 for a value, 1 for an error that is no status.
template <class T>
std::int32_t statusOf(const base::Result<T>& result) {
    return result ? 0 : result.error().statusOr(1);
}

/// A result with this status: `value` for 0.
template <class T>
base::Result<T> withStatus(std::int32_t status, T value) {
    if (status != 0) return base::Error::osStatus(status);
    return value;
}
inline base::Result<void> withStatus(std::int32_t status) {
    if (status != 0) return base::Error::osStatus(status);
    return {};
}

}  // namespace pinwell::test
