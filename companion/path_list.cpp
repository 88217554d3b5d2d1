#include "companion/path_list.h"

#include <fcntl.h>
#include <poll.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <utility>

namespace pinwell::companion {
namespace {

constexpr std::size_t kListPieceSize = std::size_t{64} * 1024;

}  // namespace

foundation::Result<PathList> PathList::open(std::vector<std::string> paths,
                                            const std::optional<std::string>& from, bool isZeroTerminated) {
    foundation::FileDescriptor file;
    if (from) {
        // Standard input is duplicated, because this object closes its descriptor.
        // Opening does not wait for a pipe's writer, because no signal would end the wait here.
        const int number = *from == "-" ? ::fcntl(STDIN_FILENO, F_DUPFD_CLOEXEC, 3)
                                        : ::open(from->c_str(), O_RDONLY | O_CLOEXEC | O_NOCTTY | O_NONBLOCK);
        if (number < 0) return foundation::Error::posix(errno, *from);
        file = foundation::FileDescriptor(number);
    }
    return PathList(std::move(paths), std::move(file), from.value_or(""), isZeroTerminated ? '\0' : '\n');
}

PathList::PathList(std::vector<std::string> paths, foundation::FileDescriptor file, std::string name,
                   char separator)
    : paths_(std::move(paths)),
      file_(std::move(file)),
      name_(std::move(name)),
      separator_(separator),
      buffer_(file_ ? kListPieceSize : 0),
      ended_(!file_) {}

PathList::State PathList::next(std::string& path) {
    if (nextPath_ < paths_.size()) {
        path = std::move(paths_[nextPath_++]);
        return State::path;
    }
    while (true) {
        if (auto line = takeLine()) {
            if (line->empty()) continue;
            path = *std::move(line);
            return State::path;
        }
        if (error_) return State::broken;
        if (ended_) return State::end;
        if (const State state = fill(); state != State::path) return state;
    }
}

PathList::State PathList::nextOrWait(std::string& path) {
    while (true) {
        const State state = next(path);
        if (state != State::wait) return state;
        pollfd input{file_.get(), POLLIN, 0};
        static_cast<void>(::poll(&input, 1, -1));
    }
}

// A whole line of the buffer, or the last line, which needs no end.
std::optional<std::string> PathList::takeLine() {
    while (begin_ < end_) {
        const auto from = buffer_.begin() + static_cast<std::ptrdiff_t>(begin_);
        const auto to = buffer_.begin() + static_cast<std::ptrdiff_t>(end_);
        const auto end = std::find(from, to, separator_);
        const auto room = kLongestPath - std::min(line_.size(), kLongestPath);
        line_.append(from, from + std::min(end - from, static_cast<std::ptrdiff_t>(room)));
        begin_ = static_cast<std::size_t>(end - buffer_.begin());
        if (end == to) break;
        ++begin_;
        return std::exchange(line_, {});
    }
    if (ended_ && !line_.empty()) return std::exchange(line_, {});
    return std::nullopt;
}

// Returns `path` if something was read or the end was reached.
PathList::State PathList::fill() {
    pollfd input{file_.get(), POLLIN, 0};
    if (::poll(&input, 1, 0) == 0) return State::wait;
    const ssize_t count = ::read(file_.get(), buffer_.data(), buffer_.size());
    if (count < 0 && (errno == EINTR || errno == EAGAIN)) return State::wait;
    if (count < 0) {
        error_ = foundation::Error::posix(errno, name_);
        return State::broken;
    }
    begin_ = 0;
    end_ = static_cast<std::size_t>(count);
    ended_ = count == 0;
    return State::path;
}

}  // namespace pinwell::companion
