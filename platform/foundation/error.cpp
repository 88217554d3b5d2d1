#include "foundation/error.h"

#include <fmt/format.h>

#include <cstring>

namespace pinwell::foundation {
namespace {

std::string_view statusText(std::int32_t status) {
    switch (status) {
        case kParameterError:
            return "A parameter was not valid.";
        default:
            return {};
    }
}

}  // namespace

Error::Error(std::string_view domain, std::int64_t code, std::string text, Dictionary userInfo)
    : domain_(domain), code_(code), text_(std::move(text)), userInfo_(std::move(userInfo)) {}

Error Error::posix(int number, std::string_view path) {
    // Not strerror: this one is neither translated nor shared between threads.
    const char* text = strerrordesc_np(number);
    Error error(kPOSIXErrorDomain, number,
                text == nullptr ? fmt::format("Error {}.", number) : std::string(text));
    return path.empty() ? error : std::move(error).with(kFilePathKey, path);
}

Error Error::osStatus(std::int32_t status) {
    const std::string_view text = statusText(status);
    return {kOSStatusErrorDomain, status,
            text.empty() ? fmt::format("Status {}.", status) : std::string(text)};
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
