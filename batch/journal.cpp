#include "batch/journal.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <charconv>
#include <utility>

#include "batch/report.h"
#include "foundation/format.h"
#include "src/DownloadDelegate.h"

namespace pinwell::batch {
namespace {

using foundation::Error;
using foundation::Result;
using retrieval::Cause;

constexpr std::string_view kFirstLine = "pinwell-batch journal 1\n";
constexpr std::string_view kUnknown = "-";
constexpr std::size_t kJournalPieceSize = std::size_t{64} * 1024;
constexpr std::size_t kLongestLine = std::size_t{32} * 1024;
constexpr std::size_t kFields = 7;

std::string escaped(std::string_view path) {
    constexpr std::string_view kDigits = "0123456789ABCDEF";
    std::string text;
    for (const char c : path) {
        const auto byte = static_cast<unsigned char>(c);
        if (byte > 0x20 && byte < 0x7F && c != '%') {
            text += c;
            continue;
        }
        text += '%';
        text += kDigits[byte >> 4U];
        text += kDigits[byte & 0x0FU];
    }
    return text;
}

template <class Number>
std::optional<Number> numberIn(std::string_view text) {
    Number number{};
    const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), number);
    if (error != std::errc{} || end != text.data() + text.size()) return std::nullopt;
    return number;
}

std::optional<FileState> stateIn(std::string_view size, std::string_view time) {
    const std::size_t point = time.find('.');
    if (point == std::string_view::npos) return std::nullopt;
    const auto bytes = numberIn<std::uint64_t>(size);
    const auto seconds = numberIn<std::int64_t>(time.substr(0, point));
    const auto nanoseconds = numberIn<std::int64_t>(time.substr(point + 1));
    if (!bytes || !seconds || !nanoseconds) return std::nullopt;
    return FileState{*bytes, *seconds, *nanoseconds};
}

std::string keyOf(std::string_view operation, std::string_view escapedPath) {
    return std::string(operation) + " " + std::string(escapedPath);
}

std::optional<std::array<std::string_view, kFields>> fieldsOf(std::string_view line) {
    std::array<std::string_view, kFields> fields;
    for (std::size_t i = 0; i < kFields; ++i) {
        const std::size_t end = std::min(line.find(' '), line.size());
        fields.at(i) = line.substr(0, end);
        if (fields.at(i).empty() || (end == line.size()) != (i + 1 == kFields)) return std::nullopt;
        line.remove_prefix(std::min(end + 1, line.size()));
    }
    return fields;
}

}  // namespace

Result<Journal> Journal::open(const std::string& path) {
    constexpr mode_t kMode = 0666;  // less the user's mask
    foundation::FileDescriptor file(
        ::open(path.c_str(), O_RDWR | O_APPEND | O_CREAT | O_CLOEXEC | O_NOCTTY | O_NONBLOCK, kMode));
    if (!file) return Error::posix(errno, path);
    struct stat status {};
    if (::fstat(file.get(), &status) != 0) return Error::posix(errno, path);
    if (!S_ISREG(status.st_mode)) return Error::posix(EINVAL, path);
    Journal journal(path, std::move(file));
    if (const auto done = journal.read(); !done) return done.error();
    return journal;
}

Result<void> Journal::read() {
    std::string line;
    std::string piece(kJournalPieceSize, '\0');
    bool isFirst = true;
    bool isTooLong = false;
    while (true) {
        const ssize_t count = ::read(file_.get(), piece.data(), piece.size());
        if (count < 0 && errno == EINTR) continue;
        if (count < 0) return Error::posix(errno, path_);
        if (count == 0) break;
        for (std::string_view rest(piece.data(), static_cast<std::size_t>(count)); !rest.empty();) {
            const std::size_t end = rest.find('\n');
            if (line.size() < kLongestLine) line += rest.substr(0, end);
            if (line.size() >= kLongestLine) isTooLong = true;
            if (end == std::string_view::npos) break;
            rest.remove_prefix(end + 1);
            if (isFirst && line + "\n" != kFirstLine)
                return Error(foundation::kDataErrorDomain, foundation::kMalformedDocument,
                             path_ + " is not a journal of pinwell-batch.");
            if (!isFirst && !isTooLong) readLine(line);
            isFirst = false;
            isTooLong = false;
            line.clear();
        }
    }
    if (isFirst && !kFirstLine.starts_with(line))
        return Error(foundation::kDataErrorDomain, foundation::kMalformedDocument,
                     path_ + " is not a journal of pinwell-batch.");
    if (isFirst) return append(kFirstLine.substr(line.size()));
    // What a run that was killed has left of a line is a line of its own, and no good one.
    return line.empty() ? Result<void>() : append("\n");
}

void Journal::readLine(std::string_view line) {
    const auto fields = fieldsOf(line);
    if (!fields) return;
    const auto& [status, cause, operation, size, time, recordName, path] = *fields;
    std::string key = keyOf(operation, path);
    const auto state = stateIn(size, time);
    if (status != "0" || cause != nameOf(Cause::worked) || !state || recordName == kUnknown) {
        worked_.erase(key);
        return;
    }
    worked_.insert_or_assign(std::move(key),
                             JournalEntry{.state = state, .recordName = std::string(recordName)});
}

const JournalEntry* Journal::find(const std::string& canonicalPath, std::uint8_t operation) const {
    const auto found = worked_.find(keyOf(nameOfOperation(operation), escaped(canonicalPath)));
    return found == worked_.end() ? nullptr : &found->second;
}

Result<void> Journal::add(const std::string& canonicalPath, const JournalEntry& entry) {
    std::string line = std::to_string(entry.exitStatus) + " " + std::string(nameOf(entry.cause)) + " " +
                       std::string(nameOfOperation(entry.operation)) + " ";
    if (entry.state)
        line += std::to_string(entry.state->size) + " " + std::to_string(entry.state->seconds) + "." +
                std::to_string(entry.state->nanoseconds);
    else
        line += std::string(kUnknown) + " " + std::string(kUnknown);
    line += " " + (entry.recordName.empty() ? std::string(kUnknown) : entry.recordName) + " " +
            escaped(canonicalPath) + "\n";
    return append(line);
}

// In one write, so that the lines of two runs do not mix.
Result<void> Journal::append(std::string_view text) {
    const std::string whole = (endsWithinALine_ ? "\n" : "") + std::string(text);
    ssize_t count = 0;
    do {
        count = ::write(file_.get(), whole.data(), whole.size());
    } while (count < 0 && errno == EINTR);
    if (count == static_cast<ssize_t>(whole.size())) {
        endsWithinALine_ = false;
        return {};
    }
    endsWithinALine_ = endsWithinALine_ || count > 0;
    return Error::posix(count < 0 ? errno : ENOSPC, path_);
}

Result<void> Journal::synchronize() {
    if (::fsync(file_.get()) != 0) return Error::posix(errno, path_);
    return {};
}

}  // namespace pinwell::batch
