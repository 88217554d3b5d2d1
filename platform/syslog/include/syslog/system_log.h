// The system log.
#pragma once

#include <memory>
#include <string_view>

#include "values/format.h"

namespace pinwell::syslog {

/// Longest entry in bytes; a longer one is cut and ends in "...".
inline constexpr std::size_t kLongestEntry = 2048;

/// Receives error entries. May be used from any thread.
class SystemLog {
  public:
    virtual ~SystemLog() = default;

    /// Logs one entry at error level, word for word: a percent sign has no meaning. Control characters are
    /// escaped.
    virtual void error(std::string_view text) = 0;

    /// Connects now rather than with the first entry: for a process that may not connect later.
    virtual void connect() {}

    template <class... Args>
    void error(values::FormatString<std::type_identity_t<Args>...> format,
               const Args&... args) requires(sizeof...(Args) > 0) {
        error(std::string_view(values::format(format, args...)));
    }
};

/// syslog(3), facility user, identity "pinwell". Connected on first use.
std::unique_ptr<SystemLog> makeSystemLog();

}  // namespace pinwell::syslog
