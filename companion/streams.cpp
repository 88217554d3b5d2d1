#include "companion/streams.h"

#include <fcntl.h>
#include <poll.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdlib>
#include <utility>

namespace pinwell::companion {
namespace {

constexpr std::size_t kListPieceSize = std::size_t{64} * 1024;

bool isSet(const char* value) {
    return value != nullptr && *value != '\0';
}

}  // namespace

base::Result<PathList> PathList::open(std::vector<std::string> paths, const std::optional<std::string>& from,
                                      bool isZeroTerminated) {
    base::FileDescriptor file;
    if (from) {
        // Standard input is duplicated, because this object closes its descriptor.
        // Opening does not wait for a pipe's writer, because no signal would end the wait here.
        const int number = *from == "-" ? ::fcntl(STDIN_FILENO, F_DUPFD_CLOEXEC, 3)
                                        : ::open(from->c_str(), O_RDONLY | O_CLOEXEC | O_NOCTTY | O_NONBLOCK);
        if (number < 0) return base::Error::posix(errno, *from);
        file = base::FileDescriptor(number);
    }
    return PathList(std::move(paths), std::move(file), from.value_or(""), isZeroTerminated ? '\0' : '\n');
}

PathList::PathList(std::vector<std::string> paths, base::FileDescriptor file, std::string name,
                   char separator)
    : paths_(std::move(paths)),
      file_(std::move(file)),
      name_(std::move(name)),
      separator_(separator),
      buffer_(file_ ? kListPieceSize : 0),
      ended_(!file_) {}

PathList::Entry PathList::next() {
    if (nextPath_ < paths_.size()) return {State::path, std::move(paths_[nextPath_++])};
    while (true) {
        if (auto line = takeLine()) {
            if (line->empty()) continue;
            return {State::path, *std::move(line)};
        }
        if (error_) return {State::broken};
        if (ended_) return {State::end};
        if (const State state = fill(); state != State::path) return {state};
    }
}

PathList::Entry PathList::nextOrWait() {
    while (true) {
        Entry entry = next();
        if (entry.state != State::wait) return entry;
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
        error_ = base::Error::posix(errno, name_);
        return State::broken;
    }
    begin_ = 0;
    end_ = static_cast<std::size_t>(count);
    ended_ = count == 0;
    return State::path;
}

ColorWhen colorWhenNamed(std::string_view name) noexcept {
    if (name == "always") return ColorWhen::always;
    if (name == "never") return ColorWhen::never;
    return ColorWhen::automatic;
}

bool wantsColor(ColorWhen when, int descriptor) {
    if (when != ColorWhen::automatic) return when == ColorWhen::always;
    const char* const force = std::getenv("CLICOLOR_FORCE");
    if (isSet(std::getenv("NO_COLOR"))) return false;
    if (isSet(force) && std::string_view(force) != "0") return true;
    const char* const terminal = std::getenv("TERM");
    const bool isDumb = terminal != nullptr && std::string_view(terminal) == "dumb";
    return ::isatty(descriptor) == 1 && !isDumb;
}

void Output::write(std::string_view text) {
    while (!text.empty() && !closed_ && !failed_) {
        const ssize_t written = ::write(descriptor_, text.data(), text.size());
        if (written > 0) {
            text.remove_prefix(static_cast<std::size_t>(written));
            continue;
        }
        if (written < 0 && errno == EINTR) continue;
        if (written < 0 && errno == EAGAIN) {
            pollfd output{descriptor_, POLLOUT, 0};
            static_cast<void>(::poll(&output, 1, -1));
            continue;
        }
        if (written < 0 && errno == EPIPE)
            closed_ = true;
        else
            failed_ = true;
    }
}

base::Result<FileBeside> makeFileBeside(const std::string& path) {
    std::string name = path + ".XXXXXX";
    base::FileDescriptor file(::mkostemp(name.data(), O_CLOEXEC));
    if (!file) return base::Error::posix(errno, path);
    const mode_t mask = ::umask(0);
    ::umask(mask);
    // A file system without modes refuses this.
    static_cast<void>(::fchmod(file.get(), kNewFileMode & ~mask));
    return FileBeside{std::move(name), std::move(file)};
}

}  // namespace pinwell::companion
