// The only failure type inside this folder. The service's methods turn it into a status, and let no exception
// out.
#pragma once

#include <stdexcept>
#include <string>

#include "codesign/code_signing.h"

namespace pinwell::codesign {

/// Why code, or its signature, could not be used: a status for the caller and a reason for people.
class CodeError : public std::runtime_error {
  public:
    CodeError(Status status, const std::string& reason) : std::runtime_error(reason), status_(status) {}

    Status status() const noexcept { return status_; }

  private:
    Status status_;
};

/// Refuses a signature that is present and wrong.
[[noreturn]] inline void refuse(const std::string& reason) {
    throw CodeError(kInvalidSignature, reason);
}

}  // namespace pinwell::codesign
