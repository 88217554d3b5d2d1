#include "foundation/error.h"

#include <fmt/format.h>

#include <cstring>

#include "foundation/value.h"

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

Error::Error(std::string_view domain, std::int64_t code, std::string text)
    : domain_(domain), code_(code), text_(std::move(text)) {}

Error Error::posix(int number, std::string_view path) {
    // Unlike strerror, this one is not translated and not shared between threads.
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

std::int32_t Error::statusOr(std::int32_t other) const noexcept {
    // A number that does not fit could be truncated to success.
    const bool isStatus = domain_ == kOSStatusErrorDomain && code_ != 0 && std::in_range<std::int32_t>(code_);
    return isStatus ? static_cast<std::int32_t>(code_) : other;
}

const Dictionary& Error::userInfo() const noexcept {
    static const Dictionary none;
    return userInfo_ == nullptr ? none : *userInfo_;
}

std::string Error::localizedDescription() const {
    const auto path = userInfo().find(kFilePathKey);
    if (path == userInfo().end() || path->second.string() == nullptr) return text_;
    return *path->second.string() + ": " + text_;
}

Error Error::with(std::string_view key, const Value& value) && {
    Dictionary more = userInfo();
    more.insert_or_assign(std::string(key), value);
    userInfo_ = std::make_shared<const Dictionary>(std::move(more));
    return std::move(*this);
}

bool Error::operator==(const Error& other) const {
    return domain_ == other.domain_ && code_ == other.code_ && text_ == other.text_ &&
           userInfo() == other.userInfo();
}

}  // namespace pinwell::foundation
