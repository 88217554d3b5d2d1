#include "src/PWHashedFile/trailer_window.h"

#include <algorithm>

namespace pinwell {

using foundation::ByteView;

bool TrailerWindow::has(std::uint64_t offset, std::uint64_t length) const {
    return offset >= start_ && offset - start_ <= bytes_.size() &&
           length <= bytes_.size() - (offset - start_);
}

ByteView TrailerWindow::readAt(std::uint64_t offset, std::uint64_t length) {
    if (!has(offset, length)) {
        const std::uint64_t end = offset + length;
        bytes_.clear();  // a failed read leaves no window
        start_ = end - std::min(end, std::max(length, next_));
        next_ = std::min(next_ * 2, kSize);
        file_.seek(start_);
        bytes_ = file_.read(end - start_);
    }
    const ByteView window = bytes_;
    const auto from = static_cast<std::size_t>(std::min<std::uint64_t>(offset - start_, window.size()));
    return window.subspan(from).first(std::min<std::size_t>(length, window.size() - from));
}

}  // namespace pinwell
