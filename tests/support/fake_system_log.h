// A system log that keeps its entries for the test to read.
#pragma once

#include <mutex>
#include <string>
#include <vector>

#include "syslog/system_log.h"

namespace pinwell::test {

/// May be used from any thread.
class FakeSystemLog final : public syslog::SystemLog {
  public:
    using SystemLog::error;

    void error(std::string_view text) override {
        const std::lock_guard lock(mutex_);
        entries_.emplace_back(text);
    }

    std::vector<std::string> entries() const {
        const std::lock_guard lock(mutex_);
        return entries_;
    }

  private:
    mutable std::mutex mutex_;
    std::vector<std::string> entries_;
};

}  // namespace pinwell::test
