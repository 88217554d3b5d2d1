#include "journal.h"

#include <fcntl.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <utility>

#include "base/file_io.h"
#include "companion/streams.h"
#include "report.h"
#include "src/DownloadDelegate.h"
#include "values/format.h"

namespace pinwell::batch {
namespace {

using base::Error;
using base::Result;
using retrieval::Cause;

constexpr std::string_view kFirstLine = "pinwell-batch journal 1\n";
constexpr std::string_view kUnknown = "-";
constexpr std::size_t kJournalPieceSize = std::size_t{64} * 1024;
constexpr std::size_t kLongestLine = std::size_t{32} * 1024;
constexpr std::size_t kFields = 6;
constexpr std::string_view kEnded = "ended ";

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

std::string orUnknown(const std::string& text) {
    return text.empty() ? std::string(kUnknown) : text;
}

TextDigest stateAndName(std::string_view state, std::string_view recordName) {
    return digestOf(std::string(state) + " " + std::string(recordName));
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
    auto file = base::openRegularFile(path, O_RDWR | O_APPEND | O_CREAT, companion::kNewFileMode);
    if (!file && file.error().code() == EINVAL)
        return Error(base::kDataErrorDomain, base::kMalformedDocument, path + " is not a regular file.");
    if (!file) return file.error();
    Journal journal(path, std::move(file->descriptor));
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
                return Error(base::kDataErrorDomain, base::kMalformedDocument,
                             path_ + " is not a journal of pinwell-batch.");
            if (!isFirst && !isTooLong) readLine(line);
            isFirst = false;
            isTooLong = false;
            line.clear();
        }
    }
    if (isFirst && !kFirstLine.starts_with(line))
        return Error(base::kDataErrorDomain, base::kMalformedDocument,
                     path_ + " is not a journal of pinwell-batch.");
    if (isFirst) return append(kFirstLine.substr(line.size()));
    // Ends a partial line of a killed run, which is then a malformed line.
    return line.empty() ? Result<void>() : append("\n");
}

void Journal::readLine(std::string_view line) {
    if (line.starts_with(kEnded)) {
        const auto ended = worked_.find(line.substr(kEnded.size()));
        if (ended != worked_.end()) ended->second.clear();
        return;
    }
    const auto fields = fieldsOf(line);
    if (!fields) return;
    const auto& [status, cause, operation, state, recordName, path] = *fields;
    const auto ofOperation = worked_.find(operation);
    if (ofOperation == worked_.end()) return;
    if (status != "0" || cause != nameOf(Cause::worked) || state == kUnknown || recordName == kUnknown)
        ofOperation->second.erase(digestOf(path));
    else
        ofOperation->second.insert_or_assign(digestOf(path), stateAndName(state, recordName));
}

bool Journal::hasDone(const JournalItem& item) const {
    const auto& ofOperation = worked_.find(nameOfOperation(item.operation))->second;
    const auto found = ofOperation.find(digestOf(escaped(item.path)));
    return found != ofOperation.end() && found->second == stateAndName(item.filesState, item.recordName);
}

Result<void> Journal::add(const JournalItem& item, int exitStatus, Cause cause) {
    return append(std::to_string(exitStatus) + " " + std::string(nameOf(cause)) + " " +
                  std::string(nameOfOperation(item.operation)) + " " + orUnknown(item.filesState) + " " +
                  orUnknown(item.recordName) + " " + escaped(item.path) + "\n");
}

Result<void> Journal::end(std::uint8_t operation) {
    return append(std::string(kEnded) + std::string(nameOfOperation(operation)) + "\n");
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
