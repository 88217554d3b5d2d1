#include "base/error.h"

#include <fmt/format.h>

#include <cstring>

namespace pinwell::base {
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
    return path.empty() ? error : std::move(error).withPath(path);
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

std::string Error::localizedDescription() const {
    return path_.empty() ? text_ : path_ + ": " + text_;
}

Error Error::withPath(std::string_view path) && {
    path_ = path;
    return std::move(*this);
}

Error Error::withURL(std::string_view url) && {
    url_ = url;
    return std::move(*this);
}

Error Error::causedBy(Error underlying) && {
    underlying_ = std::make_shared<const Error>(std::move(underlying));
    return std::move(*this);
}

bool Error::operator==(const Error& other) const {
    const bool isAlike = domain_ == other.domain_ && code_ == other.code_ && text_ == other.text_ &&
                         path_ == other.path_ && url_ == other.url_;
    if (underlying_ == nullptr || other.underlying_ == nullptr)
        return isAlike && underlying_ == other.underlying_;
    return isAlike && *underlying_ == *other.underlying_;
}

}  // namespace pinwell::base
