#include "foundation/error.h"

#include <fmt/format.h>

#include <system_error>

namespace pinwell::foundation {
namespace {

std::string_view statusText(std::int32_t status) {
    switch (status) {
        case kParameterError: return "A parameter was not valid.";
        default: return {};
    }
}

}  // namespace

Error::Error(std::string_view domain, std::int64_t code, std::string text, Dictionary userInfo)
    : domain_(domain), code_(code), text_(std::move(text)), userInfo_(std::move(userInfo)) {}

Error Error::posix(int number, std::string_view path) {
    // Not strerror: its buffer is shared between threads.
    Error error(kPOSIXErrorDomain, number, std::generic_category().message(number));
    return path.empty() ? error : std::move(error).with(kFilePathKey, path);
}

Error Error::osStatus(std::int32_t status) {
    const std::string_view text = statusText(status);
    return {kOSStatusErrorDomain, status, text.empty() ? fmt::format("Status {}.", status) : std::string(text)};
}

std::string Error::localizedDescription() const {
    const auto path = userInfo_.find(kFilePathKey);
    if (path == userInfo_.end() || path->second.string() == nullptr) return text_;
    return *path->second.string() + ": " + text_;
}

Error Error::with(std::string_view key, Value value) && {
    userInfo_.insert_or_assign(std::string(key), std::move(value));
    return std::move(*this);
}

}  // namespace pinwell::foundation
