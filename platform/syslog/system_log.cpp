#include "syslog/system_log.h"

#include <syslog.h>

#include <algorithm>

namespace pinwell::syslog {
namespace {

// syslogd implementations cut entries at lengths of their own from 1 KiB up; an entry never needs more.
constexpr std::size_t kMaximumEntry = 1000;

class LocalSystemLog final : public SystemLog {
  public:
    void error(std::string_view text) override {
        const int length = static_cast<int>(std::min(text.size(), kMaximumEntry));
        ::openlog("pinwell", LOG_NDELAY, LOG_USER);
        // The text is an argument and never the format: it may hold what a file says.
        ::syslog(LOG_USER | LOG_ERR, "%.*s", length, text.data());
        ::closelog();
    }
};

}  // namespace

std::unique_ptr<SystemLog> makeSystemLog() { return std::make_unique<LocalSystemLog>(); }

}  // namespace pinwell::syslog
