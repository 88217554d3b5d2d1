// The boundary of the C interface: its failures are exceptions inside and statuses outside. Every argument is
// checked here. For this folder only.
#pragma once

#include <cstddef>
#include <cstdint>
#include <exception>
#include <new>
#include <string>
#include <utility>

#include "base/error.h"
#include "pinwell/ticket.h"
#include "pinwell/ticket_c.h"

namespace pinwell::library {

/// A failed call. Thrown inside, and caught by guarded().
struct Failure {
    pinwell_status status = PINWELL_ERROR_INTERNAL;
    std::string message;
    int systemError = 0;
    std::uint64_t offset = 0;
};

inline Failure invalid(std::string message) {
    return {PINWELL_ERROR_ARGUMENT, std::move(message)};
}

/// Converts an error of the C++ interface about a file.
inline Failure failureOf(const ticket::Error& error) {
    const bool isMalformed = error.code == ticket::ErrorCode::malformed;
    return {isMalformed ? PINWELL_ERROR_MALFORMED : PINWELL_ERROR_UNREADABLE, error.message,
            error.systemError, error.offset};
}

/// Converts an error of the services about a file.
inline Failure failureOf(const base::Error& error) {
    const std::string& reason = error.localizedFailureReason();
    return {PINWELL_ERROR_UNREADABLE, reason.empty() ? error.localizedDescription() : reason,
            error.domain() == base::kPOSIXErrorDomain ? static_cast<int>(error.code()) : 0};
}

/// While it lives, the calling thread cannot be cancelled: cancellation would unwind through a C function.
class Uncancelled {
  public:
    Uncancelled() noexcept;
    ~Uncancelled();
    Uncancelled(const Uncancelled&) = delete;
    Uncancelled& operator=(const Uncancelled&) = delete;

  private:
    int before_ = 0;
};

/// Fills in `error`, unless it is null, and returns the failure's status.
pinwell_status report(const Failure& failure, pinwell_error* error) noexcept;
pinwell_status reportOutOfMemory(pinwell_error* error) noexcept;
pinwell_status reportInternal(const char* what, pinwell_error* error) noexcept;

/// Whether a structure of the caller is long enough: at least as long as in the first version.
template <class Structure>
bool hasKnownSize(const Structure* structure) noexcept {
    return structure == nullptr || structure->struct_size >= sizeof(Structure);
}

/// Calls `work`, and turns its exceptions into a status.
template <class Work>
pinwell_status guarded(pinwell_error* error, Work work) noexcept {
    const Uncancelled uncancelled;
    if (!hasKnownSize(error)) return PINWELL_ERROR_ARGUMENT;
    try {
        work();
        return PINWELL_OK;
    } catch (const Failure& failure) {
        return report(failure, error);
    } catch (const std::bad_alloc&) {
        return reportOutOfMemory(error);
    } catch (const std::exception& failure) {
        return reportInternal(failure.what(), error);
    } catch (...) {
        return reportInternal("unknown exception", error);
    }
}

/// The caller's path as text. Throws Failure if it is null or contains a zero byte.
std::string pathFrom(const char* path, std::size_t length);

/// Sets the caller's handle to null, so that it is null after a failure.
template <class Handle>
void empty(Handle** place) noexcept {
    if (place != nullptr) *place = nullptr;
}

/// Throws Failure if a required pointer is null.
inline void require(const void* pointer, const char* problem) {
    if (pointer == nullptr) throw invalid(problem);
}

/// Hands out a text or a buffer with its length. `length` may be null.
template <class Range>
auto handOut(const Range& range, std::size_t* length) noexcept {
    if (length != nullptr) *length = range.size();
    return range.data();
}

/// The result for an invalid handle: null, with length 0.
template <class Type = char>
const Type* nothing(std::size_t* length) noexcept {
    if (length != nullptr) *length = 0;
    return nullptr;
}

}  // namespace pinwell::library
