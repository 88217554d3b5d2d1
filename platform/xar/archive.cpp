// An open archive: its file, its table of contents, and the functions of <xar/xar.h> over them.
#include <xar/xar.h>

#include <fcntl.h>

#include <algorithm>
#include <charconv>
#include <cstdlib>
#include <exception>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "base/byte_source.h"
#include "base/bytes.h"
#include "base/file_io.h"
#include "base/handle.h"
#include "xar/header.h"
#include "xar/inflater.h"
#include "xar/table_of_contents.h"

namespace pinwell::xar {
namespace {

using base::Data;

constexpr std::size_t kDigestedAtOnce = std::size_t{64} * 1024;

constexpr std::string_view kOffsetPath = "checksum/offset";
constexpr std::string_view kSizePath = "checksum/size";
constexpr std::string_view kNoChecksumStyle = "none";

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

// The file of an open archive, and its table of contents.
class Archive {
  public:
    /// Opens the archive at `path`, and compares its table of contents with the checksum in the heap. Returns
    /// null if they differ or one cannot be read. Returns null too for an archive with signatures but without
    /// a checksum algorithm, because its signatures would cover nothing. Throws std::bad_alloc.
    static std::unique_ptr<Archive> open(const std::string& path);

    const TableOfContents& table() const noexcept { return table_; }

    /// The checksum of the table of contents, computed and compared with the heap by open(). Empty for an
    /// archive without an algorithm, which has no signatures.
    const base::Data& checksum() const noexcept { return checksum_; }

  private:
    explicit Archive(base::FileSource file) : file_(std::move(file)) {}

    std::optional<base::Data> read(std::uint64_t offset, std::size_t length) const;
    bool readTable(const Header& header);
    bool isChecksumDescribed(std::optional<Digest> digest) const;
    bool isChecksumStored() const;

    base::FileSource file_;
    std::uint64_t heapStart_ = 0;
    TableOfContents table_;
    base::Data checksum_;
};

std::unique_ptr<Archive> Archive::open(const std::string& path) {
    auto file = base::openRegularFile(path, O_RDONLY);
    if (!file) return nullptr;
    std::unique_ptr<Archive> archive(new Archive(base::FileSource(*std::move(file))));
    const auto start = archive->read(
        0, static_cast<std::size_t>(std::min<std::uint64_t>(kLongestHeaderRead, archive->file_.size())));
    const auto header = start ? parseHeader(*start) : std::nullopt;
    if (!header || !archive->readTable(*header) || !archive->isChecksumDescribed(header->digest))
        return nullptr;
    if (header->digest && !archive->isChecksumStored()) return nullptr;
    return archive;
}

// All of the bytes, or `nullopt`.
std::optional<Data> Archive::read(std::uint64_t offset, std::size_t length) const {
    try {
        return file_.read(offset, length);
    } catch (const base::ReadFailure&) {
        return std::nullopt;
    }
}

bool Archive::readTable(const Header& header) {
    if (header.size > file_.size() || header.compressedLength > file_.size() - header.size) return false;
    if (header.compressedLength > kMaximumTableOfContents) return false;

    TableOfContentsReader reader;
    Inflater inflater(kMaximumTableOfContents, [&](base::ByteView bytes) { return reader.feed(bytes); });
    std::optional<crypto::Hasher> hasher;
    if (header.digest) hasher.emplace(*header.digest);
    std::uint64_t at = header.size;
    std::uint64_t rest = header.compressedLength;
    while (rest > 0) {
        const auto piece = read(at, static_cast<std::size_t>(std::min<std::uint64_t>(rest, kDigestedAtOnce)));
        if (!piece || !inflater.feed(*piece)) return false;
        if (hasher) hasher->update(*piece);
        at += piece->size();
        rest -= piece->size();
    }
    auto table = inflater.complete() ? reader.finish() : std::nullopt;
    if (!table) return false;
    table_ = *std::move(table);
    if (hasher) checksum_ = base::toData(hasher->finish());
    heapStart_ = at;
    return true;
}

// Whether the table describes the header's checksum, and no other.
bool Archive::isChecksumDescribed(std::optional<Digest> digest) const {
    const bool isSigned = !table_.signatures.empty();
    if (!digest && isSigned) return false;
    const bool hasElement = table_.properties.find("checksum") != table_.properties.end();
    if (!hasElement && !digest) return true;
    if (!table_.checksumStyle) return false;
    if (digest ? digestNamed(*table_.checksumStyle) != digest : *table_.checksumStyle != kNoChecksumStyle)
        return false;
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
    if (!offset || *offset > file_.size() - heapStart_ || size != checksum_.size()) return false;
    return read(heapStart_ + *offset, checksum_.size()) == checksum_;
}

}  // namespace pinwell::xar

using pinwell::xar::Archive;

// A signature has its archive and its number, which lead to its style, the checksum and the next signature.
struct xar_archive_signature {
    xar_t archive;
    std::size_t number;
};

struct xar_archive {
    explicit xar_archive(std::unique_ptr<const Archive> opened) : contents(std::move(opened)) {
        for (std::size_t number = 0; number < contents->table().signatures.size(); ++number)
            signatures.push_back({this, number});
    }
    xar_archive(const xar_archive&) = delete;
    xar_archive& operator=(const xar_archive&) = delete;

    xar_signature_t signature(std::size_t number) const {
        return number < signatures.size() ? &signatures[number] : nullptr;
    }

    std::unique_ptr<const Archive> contents;
    std::vector<xar_archive_signature> signatures;
};

namespace {

constexpr int32_t kReading = 0;
constexpr int kFailure = -1;

}  // namespace

xar_t xar_open(const char* file, int32_t flags) {
    if (file == nullptr || flags != kReading) return nullptr;
    try {
        auto archive = Archive::open(file);
        return archive ? new xar_archive(std::move(archive)) : nullptr;
    } catch (const std::exception&) {
        return nullptr;
    }
}

int xar_close(xar_t x) {
    delete x;
    return 0;
}

xar_signature_t xar_signature_first(xar_t x) {
    return x->signature(0);
}

xar_signature_t xar_signature_next(xar_signature_t s) {
    return s->archive->signature(s->number + 1);
}

char* xar_signature_type(xar_signature_t s) {
    const auto& style = s->archive->contents->table().signatures[s->number];
    return style ? const_cast<char*>(style->c_str())
                 : nullptr;  // borrowed, though the prototype does not say so
}

uint8_t xar_signature_copy_signed_data(xar_signature_t sig, uint8_t** data, uint32_t* length,
                                       uint8_t** signed_data, uint32_t* signed_length,
                                       uint32_t* signed_offset) {
    constexpr auto kFailed = static_cast<uint8_t>(kFailure);
    if (data == nullptr || length == nullptr) return kFailed;
    if (signed_data != nullptr || signed_length != nullptr || signed_offset != nullptr) return kFailed;
    const auto& checksum = sig->archive->contents->checksum();
    if (checksum.empty()) return kFailed;
    // The caller frees it, as the prototype says.
    auto* const copy = static_cast<uint8_t*>(std::malloc(checksum.size()));  // NOLINT(*-no-malloc)
    if (copy == nullptr) return kFailed;
    std::transform(checksum.begin(), checksum.end(), copy,
                   [](std::byte byte) { return std::to_integer<uint8_t>(byte); });
    *data = copy;
    *length = static_cast<uint32_t>(checksum.size());
    return 0;
}

int32_t xar_prop_get(xar_file_t f, const char* key, const char** value) {
    if (value == nullptr) return kFailure;
    *value = nullptr;
    if (f == nullptr || key == nullptr) return kFailure;
    const xar_t archive = reinterpret_cast<xar_t>(f);
    const auto& properties = archive->contents->table().properties;
    const auto found = properties.find(std::string_view(key));
    if (found == properties.end()) return kFailure;
    if (found->second) *value = found->second->c_str();
    return 0;
}
