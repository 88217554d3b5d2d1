// The failures inside this folder, and the statuses that they mean. The service's methods turn them into a
// status, and let no exception out.
#pragma once

#include <cstdint>
#include <stdexcept>
#include <string>

#include "base/byte_source.h"
#include "base/places.h"
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

/// What `failure` means for code; call it only while `failure` is being handled. A CodeError is returned as
/// it is. A read past the end (base::ReadFailure) and a base::ShortRead mean kInvalidSignature, every other
/// failed read kIOError. All other exceptions are rethrown.
CodeError asCodeError(const std::runtime_error& failure);

/// The service's status for a file that cannot be found or opened, by the errno value.
Status statusOfLookup(std::int64_t reason);

/// The regular file at `path`, kept open. Never follows a link in the last component and never blocks on a
/// pipe or device. Throws CodeError: kStaticCodeNotFound if there is no regular file, kIOError if it cannot
/// be opened.
base::FileSource openCode(const base::Places& places, const std::string& path);

}  // namespace pinwell::codesign
