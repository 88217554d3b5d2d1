// The texts and codes of failed transfers.
#pragma once

#include <string>

#include "https/session.h"

namespace pinwell::https {

/// An error of kURLErrorDomain. The text becomes one line, safe for a terminal.
Error makeError(URLErrorCode code, const std::string& text);

/// Our code and words for a libcurl result (a CURLcode).
struct TransferFailure {
    int result;
    URLErrorCode code;
    std::string_view reason;  // goes after "HOST port N: "
};

/// For a result outside the table: unknown.
const TransferFailure& failureOf(int result) noexcept;

}  // namespace pinwell::https
