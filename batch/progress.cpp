#include "batch/progress.h"

#include "foundation/format.h"

namespace pinwell::batch {
namespace {

constexpr std::chrono::milliseconds kInterval{100};
constexpr const char* kEraseLine = "\r\x1b[K";

}  // namespace

void Progress::show(std::uint64_t done, std::uint64_t failed, std::size_t inWork) {
    if (!isShown_) return;
    const auto now = Clock::now();
    if (now - last_ < kInterval) return;
    last_ = now;
    isOnScreen_ = true;
    errors_.write(kEraseLine +
                  foundation::format("%llu done, %llu of them failed, %zu in work", done, failed, inWork));
}

void Progress::clear() {
    if (!isOnScreen_) return;
    isOnScreen_ = false;
    errors_.write(kEraseLine);
}

}  // namespace pinwell::batch
