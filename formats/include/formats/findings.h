// The reports of a parser: results, faults with their offsets, and diagnostic lines.
//
// The parsers in this folder print nothing and open nothing. The caller passes a `Diagnostics` if it wants
// the lines.
#pragma once

#include <cstdint>
#include <functional>
#include <string>
#include <string_view>
#include <type_traits>
#include <utility>

#include "values/format.h"

namespace pinwell {

/// Results of the ticket functions that return a number.
inline constexpr std::int32_t kAccepted = 0;
inline constexpr std::int32_t kRefused = -1;

struct TicketFault {
    /// From the start of the examined bytes.
    std::uint64_t offset = 0;

    /// The broken rule, in one line without a full stop. In static storage, so that a refusal does not
    /// allocate.
    const char* rule = "";

    friend bool operator==(const TicketFault& a, const TicketFault& b) {
        return a.offset == b.offset && std::string_view(a.rule) == b.rule;
    }
};

/// Passes a parser's diagnostic lines to a listener, each without a newline, in the order of the parser's
/// steps. Without a listener no line is formatted.
class Diagnostics {
  public:
    using Listener = std::function<void(std::string line)>;

    Diagnostics() = default;
    explicit Diagnostics(Listener listener) : listener_(std::move(listener)) {}

    template <class... Args>
    void note(values::FormatString<std::type_identity_t<Args>...> format, const Args&... args) const {
        if (listener_) listener_(values::format(format, args...));
    }

  private:
    Listener listener_;
};

}  // namespace pinwell
