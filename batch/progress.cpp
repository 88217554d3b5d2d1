#include "batch/progress.h"

#include <sys/ioctl.h>
#include <unistd.h>

#include <algorithm>
#include <string>

#include "foundation/format.h"

namespace pinwell::batch {
namespace {

constexpr std::chrono::milliseconds kInterval{100};
constexpr const char* kEraseLine = "\r\x1b[K";
constexpr std::size_t kUsualColumns = 80;

// The width of the terminal, which may change at any time.
std::size_t columns() {
    winsize size{};
    if (::ioctl(STDERR_FILENO, TIOCGWINSZ, &size) != 0 || size.ws_col == 0) return kUsualColumns;
    return size.ws_col;
}

}  // namespace

void Progress::show(std::uint64_t done, std::uint64_t failed, std::size_t inWork) {
    if (!isShown_) return;
    const auto now = Clock::now();
    if (now - last_ < kInterval) return;
    last_ = now;
    isOnScreen_ = true;
    std::string line =
        foundation::format("%llu done, %llu of them failed, %zu in work", done, failed, inWork);
    line.resize(std::min(line.size(), columns() - 1));  // a second line could not be cleared
    errors_.write(kEraseLine + line);
}

void Progress::clear() {
    if (!isOnScreen_) return;
    isOnScreen_ = false;
    errors_.write(kEraseLine);
}

}  // namespace pinwell::batch
