// The progress line of a batch on a terminal.
#pragma once

#include <chrono>
#include <cstdint>

#include "companion/output.h"

namespace pinwell::batch {

/// Rewrites one line of standard error, ten times a second at most.
class Progress {
  public:
    /// Shows nothing unless `isShown`.
    explicit Progress(bool isShown) : isShown_(isShown) {}
    ~Progress() { clear(); }
    Progress(const Progress&) = delete;
    Progress& operator=(const Progress&) = delete;

    void show(std::uint64_t done, std::uint64_t failed, std::size_t inWork);

    /// Removes the line, so that another line can be printed.
    void clear();

  private:
    using Clock = std::chrono::steady_clock;

    const bool isShown_;
    companion::Output errors_{2};
    bool isOnScreen_ = false;
    Clock::time_point last_;
};

}  // namespace pinwell::batch
