#include "xar/archive.h"

#include <fcntl.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <charconv>
#include <utility>

#include "xar/digest.h"
#include "xar/inflater.h"

namespace pinwell::xar {
namespace {

using foundation::Data;

constexpr std::size_t kDigestedAtOnce = std::size_t{64} * 1024;

constexpr std::string_view kOffsetPath = "checksum/offset";
constexpr std::string_view kSizePath = "checksum/size";

template <class Call>
auto uninterrupted(Call call) {
    for (;;) {
        const auto answer = call();
        if (answer != -1 || errno != EINTR) return answer;
    }
}

// The number at the start of a property's text, as in strtoull(3), with any text after it. `nullopt` without
// digits, with a minus sign or with too many digits.
std::optional<std::uint64_t> leadingNumber(const std::optional<std::string>& text) {
    if (!text) return std::nullopt;
    std::string_view rest = *text;
    rest.remove_prefix(std::min(rest.find_first_not_of(" \t\n\v\f\r"), rest.size()));
    if (rest.starts_with('+')) rest.remove_prefix(1);
    std::uint64_t number = 0;
    const auto result = std::from_chars(rest.data(), rest.data() + rest.size(), number);
    return result.ec == std::errc{} ? std::optional(number) : std::nullopt;
}

}  // namespace

std::unique_ptr<Archive> Archive::open(const std::string& path) {
    std::unique_ptr<Archive> archive(new Archive);
    if (!archive->openFile(path)) return nullptr;
    const auto start = archive->read(
        0, static_cast<std::size_t>(std::min<std::uint64_t>(kLongestHeaderRead, archive->fileSize_)));
    const auto header = start ? parseHeader(*start) : std::nullopt;
    if (!header || !archive->readTable(*header) || !archive->isChecksumDescribed(header->algorithm))
        return nullptr;
    if (header->algorithm != DigestAlgorithm::none && !archive->isChecksumStored()) return nullptr;
    return archive;
}

bool Archive::openFile(const std::string& path) {
    auto file = foundation::openRegularFile(path, O_RDONLY);
    if (!file) return false;
    file_ = std::move(file->descriptor);
    fileSize_ = static_cast<std::uint64_t>(file->status.st_size);
    return true;
}

// All of the bytes, or `nullopt`.
std::optional<Data> Archive::read(std::uint64_t offset, std::size_t length) const {
    if (offset > fileSize_ || length > fileSize_ - offset) return std::nullopt;
    Data bytes(length);
    std::size_t had = 0;
    while (had < length) {
        const auto at = static_cast<off_t>(offset + had);
        const ssize_t count =
            uninterrupted([&] { return pread(file_.get(), &bytes[had], length - had, at); });
        if (count <= 0) return std::nullopt;
        had += static_cast<std::size_t>(count);
    }
    return bytes;
}

bool Archive::readTable(const Header& header) {
    if (header.size > fileSize_ || header.compressedLength > fileSize_ - header.size) return false;
    if (header.compressedLength > kMaximumTableOfContents) return false;

    TableOfContentsReader reader;
    Inflater inflater(kMaximumTableOfContents,
                      [&](foundation::ByteView bytes) { return reader.feed(bytes); });
    Digest digest(header.algorithm);
    std::uint64_t at = header.size;
    std::uint64_t rest = header.compressedLength;
    while (rest > 0) {
        const auto piece = read(at, static_cast<std::size_t>(std::min<std::uint64_t>(rest, kDigestedAtOnce)));
        if (!piece || !inflater.feed(*piece)) return false;
        digest.update(*piece);
        at += piece->size();
        rest -= piece->size();
    }
    auto table = inflater.complete() ? reader.finish() : std::nullopt;
    if (!table) return false;
    table_ = *std::move(table);
    checksum_ = digest.finish();
    heapStart_ = at;
    return true;
}

// Whether the table describes the header's checksum, and no other.
bool Archive::isChecksumDescribed(DigestAlgorithm algorithm) const {
    const bool isSigned = !table_.signatures.empty();
    if (algorithm == DigestAlgorithm::none && isSigned) return false;
    const bool hasElement = table_.properties.find("checksum") != table_.properties.end();
    if (!hasElement && algorithm == DigestAlgorithm::none) return true;
    if (!table_.checksumStyle || digestAlgorithmNamed(*table_.checksumStyle) != algorithm) return false;
    // Otherwise a signature would sign bytes without a stated place.
    const bool isPlaced = table_.properties.find(kOffsetPath) != table_.properties.end() &&
                          table_.properties.find(kSizePath) != table_.properties.end();
    return isPlaced || !isSigned;
}

// Without an offset the checksum is at the start of the heap; without a size it has the digest's length.
bool Archive::isChecksumStored() const {
    const auto number = [&](std::string_view path, std::uint64_t otherwise) {
        const auto found = table_.properties.find(path);
        return found == table_.properties.end() ? std::optional(otherwise) : leadingNumber(found->second);
    };
    const auto offset = number(kOffsetPath, 0);
    const auto size = number(kSizePath, checksum_.size());
    if (!offset || *offset > fileSize_ - heapStart_ || size != checksum_.size()) return false;
    return read(heapStart_ + *offset, checksum_.size()) == checksum_;
}

}  // namespace pinwell::xar
