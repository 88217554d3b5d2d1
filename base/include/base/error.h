// Failures as values: the error object, and a result that is either a value or an error.
#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <variant>

namespace pinwell::base {

/// Error domains: the numbering of an error's code.
inline constexpr std::string_view kPOSIXErrorDomain = "POSIXErrorDomain";        // errno
inline constexpr std::string_view kOSStatusErrorDomain = "OSStatusErrorDomain";  // platform status numbers
inline constexpr std::string_view kURLErrorDomain = "URLErrorDomain";            // https/session.h
inline constexpr std::string_view kDataErrorDomain = "DataErrorDomain";          // malformed documents

/// Codes of kDataErrorDomain.
inline constexpr std::int64_t kMalformedDocument = 1;     // it does not follow its format
inline constexpr std::int64_t kExcessiveDocument = 2;     // it exceeds a limit on length, nesting or values
inline constexpr std::int64_t kUnrepresentableValue = 3;  // the format cannot express it

/// The platform's status for a bad parameter.
inline constexpr std::int32_t kParameterError = -50;

/// Why something failed. A value; an error that may be missing is a `std::optional<Error>`.
class Error {
  public:
    Error(std::string_view domain, std::int64_t code, std::string text);

    /// An errno value, with the path it concerns.
    static Error posix(int number, std::string_view path = {});

    /// A platform status; the text names the common ones.
    static Error osStatus(std::int32_t status);

    const std::string& domain() const noexcept { return domain_; }
    std::int64_t code() const noexcept { return code_; }

    /// The platform status that it holds; `other` for another domain, and for a number that is no failing
    /// status.
    std::int32_t statusOr(std::int32_t other) const noexcept;

    /// One sentence for a person, naming the file where there is one.
    std::string localizedDescription() const;

    /// The bare reason, without the item that it is about.
    const std::string& localizedFailureReason() const noexcept { return text_; }

    /// The file and the web address that it concerns, empty if there is none; and the error behind it, null
    /// if there is none. A description shows them as user information.
    const std::string& path() const noexcept { return path_; }
    const std::string& url() const noexcept { return url_; }
    const Error* underlying() const noexcept { return underlying_.get(); }

    /// The same error with one more of them.
    Error withPath(std::string_view path) &&;
    Error withURL(std::string_view url) &&;
    Error causedBy(Error underlying) &&;

    bool operator==(const Error& other) const;

  private:
    std::string domain_;
    std::int64_t code_;
    std::string text_;
    std::string path_;
    std::string url_;
    std::shared_ptr<const Error> underlying_;
};

/// Either a value or the error that prevented it.
template <class T>
class [[nodiscard]] Result {
  public:
    Result(T value) : content_(std::in_place_index<0>, std::move(value)) {}      // NOLINT: implicit by design
    Result(Error error) : content_(std::in_place_index<1>, std::move(error)) {}  // NOLINT: implicit by design

    bool has_value() const noexcept { return content_.index() == 0; }
    explicit operator bool() const noexcept { return has_value(); }

    /// Undefined unless has_value().
    T& operator*() & { return *std::get_if<0>(&content_); }
    const T& operator*() const& { return *std::get_if<0>(&content_); }
    T&& operator*() && { return std::move(*std::get_if<0>(&content_)); }
    T* operator->() { return std::get_if<0>(&content_); }
    const T* operator->() const { return std::get_if<0>(&content_); }

    /// Undefined if has_value().
    const Error& error() const { return *std::get_if<1>(&content_); }

    std::optional<T> asOptional() && {
        if (has_value()) return std::move(*std::get_if<0>(&content_));
        return std::nullopt;
    }

  private:
    std::variant<T, Error> content_;
};

/// Success, or an error.
template <>
class [[nodiscard]] Result<void> {
  public:
    Result() = default;
    Result(Error error) : error_(std::move(error)) {}  // NOLINT: implicit by design

    bool has_value() const noexcept { return !error_.has_value(); }
    explicit operator bool() const noexcept { return has_value(); }
    const Error& error() const { return *error_; }

  private:
    std::optional<Error> error_;
};

}  // namespace pinwell::base
