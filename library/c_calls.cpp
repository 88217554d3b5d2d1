#include "c_calls.h"

#include <pthread.h>

#include <atomic>
#include <cstring>
#include <string_view>

#include "base/text.h"
#include "handles.h"
#include "src/messages.h"

namespace pinwell::library {

namespace {

// Silences the tool's message functions, which must not print in another program. Set while the library is
// loaded.
[[maybe_unused]] const bool isSilent = [] {
    verboseLevel = kVerbosityQuiet;
    return true;
}();

/// The part of a text that fits, cut between characters.
std::string_view cut(std::string_view text, std::size_t room) {
    if (text.size() <= room) return text;
    const auto isContinuation = [](char c) { return (static_cast<unsigned char>(c) & 0xC0U) == 0x80U; };
    while (room > 0 && isContinuation(text[room])) --room;
    return text.substr(0, room);
}

void fill(pinwell_error& error, pinwell_status status, int systemError, std::uint64_t offset,
          std::string_view message) noexcept {
    error.status = status;
    error.system_error = systemError;
    error.offset = offset;
    const std::string_view kept = cut(message, sizeof error.message - 1);
    std::memcpy(error.message, kept.data(), kept.size());
    std::memset(error.message + kept.size(), 0, sizeof error.message - kept.size());
}

}  // namespace

std::uintptr_t nextHandleNumber() noexcept {
    // Above the addresses that some languages' runtimes refuse in a pointer.
    static std::atomic<std::uintptr_t> last{0x1'0001};
    while (true) {
        const std::uintptr_t number = last.fetch_add(2);
        if (number >= 0x1'0001) return number;  // else all are used: 2^31 of them with 32 bits
    }
}

Uncancelled::Uncancelled() noexcept {
    pthread_setcancelstate(PTHREAD_CANCEL_DISABLE, &before_);
}

Uncancelled::~Uncancelled() {
    pthread_setcancelstate(before_, nullptr);
}

pinwell_status report(const Failure& failure, pinwell_error* error) noexcept {
    if (error == nullptr) return failure.status;
    try {
        fill(*error, failure.status, failure.systemError, failure.offset,
             base::escapeForTerminal(failure.message));
    } catch (...) {
        fill(*error, failure.status, failure.systemError, failure.offset, pinwell_error_text(failure.status));
    }
    return failure.status;
}

pinwell_status reportOutOfMemory(pinwell_error* error) noexcept {
    if (error != nullptr) fill(*error, PINWELL_ERROR_MEMORY, 0, 0, pinwell_error_text(PINWELL_ERROR_MEMORY));
    return PINWELL_ERROR_MEMORY;
}

pinwell_status reportInternal(const char* what, pinwell_error* error) noexcept {
    if (error != nullptr) fill(*error, PINWELL_ERROR_INTERNAL, 0, 0, what);
    return PINWELL_ERROR_INTERNAL;
}

std::string pathFrom(const char* path, std::size_t length) {
    if (path == nullptr) throw invalid("there is no path");
    const std::string_view text =
        length == PINWELL_NUL_TERMINATED ? std::string_view(path) : std::string_view(path, length);
    if (text.empty()) throw invalid("the path is empty");
    if (text.find('\0') != std::string_view::npos) throw invalid("there is a zero byte in the path");
    return std::string(text);
}

}  // namespace pinwell::library
