#include "syslog/system_log.h"

#include <syslog.h>

#include <mutex>
#include <string>

#include "base/text.h"

namespace pinwell::syslog {
namespace {

constexpr const char* kIdentity = "pinwell";  // syslog(3) keeps the pointer
constexpr std::string_view kCutMark = "...";

// At most the longest entry, never ending inside a UTF-8 sequence.
std::string cut(std::string text) {
    if (text.size() <= kLongestEntry) return text;
    std::size_t end = kLongestEntry - kCutMark.size();
    while (end > 0 && (static_cast<unsigned char>(text[end]) & 0xC0U) == 0x80) --end;
    text.resize(end);
    return text.append(kCutMark);
}

class HostLog final : public SystemLog {
  public:
    HostLog() = default;
    HostLog(const HostLog&) = delete;
    HostLog& operator=(const HostLog&) = delete;
    ~HostLog() override {
        if (opened_) ::closelog();
    }

    void error(std::string_view text) override {
        // Not every caller's text comes from format(); escaping twice changes nothing. The text is cut first,
        // so that no long text is escaped.
        const std::string entry = cut(base::escapeForTerminal(text.substr(0, kLongestEntry + 1)));
        const std::lock_guard lock(mutex_);
        open(0);
        ::syslog(LOG_USER | LOG_ERR, "%s", entry.c_str());
    }

    void connect() override {
        const std::lock_guard lock(mutex_);
        open(LOG_NDELAY);
    }

  private:
    void open(int option) {
        if (!opened_) ::openlog(kIdentity, LOG_PID | option, LOG_USER);
        opened_ = true;
    }

    std::mutex mutex_;
    bool opened_ = false;
};

}  // namespace

std::unique_ptr<SystemLog> makeSystemLog() {
    return std::make_unique<HostLog>();
}

}  // namespace pinwell::syslog
