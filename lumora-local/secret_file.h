// Reading keys and passphrases (foundation/secret_file.h), with Failure instead of error values.
#pragma once

#include <cstddef>
#include <span>
#include <string>

#include "foundation/error.h"
#include "lumora-local/failure.h"

namespace pinwell::lumora {

/// The value, or the Failure (EX_NOINPUT) of a secret that cannot be read.
template <class T>
T secretOf(foundation::Result<T> result) {
    if (!result) throw Failure(EX_NOINPUT, result.error().localizedDescription());
    return *std::move(result);
}

}  // namespace pinwell::lumora
