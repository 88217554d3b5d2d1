#include "archive_table.h"

#include <algorithm>
#include <charconv>
#include <utility>

#include "base/byte_io.h"
#include "codesign/code_error.h"
#include "values/format.h"
#include "values/xml_parser.h"
#include "xar/header.h"
#include "xar/inflater.h"
#include "xar/table_of_contents.h"

namespace pinwell::verify {

using base::ByteSource;
using codesign::FileRange;
using codesign::refuse;
using values::format;

namespace {

/// Longest kept text: digests in hexadecimal have up to 128 characters.
constexpr std::size_t kMaximumText = kMaximumArchivedName;

/// The packed table is read in pieces of this length.
constexpr std::size_t kTablePieceSize = std::size_t{64} * 1024;

std::string_view trimmed(std::string_view text) {
    constexpr std::string_view kBlank = " \t\r\n";
    const std::size_t begin = text.find_first_not_of(kBlank);
    if (begin == std::string_view::npos) return {};
    return text.substr(begin, text.find_last_not_of(kBlank) + 1 - begin);
}

std::optional<std::uint64_t> numberFrom(std::string_view text) {
    text = trimmed(text);
    std::uint64_t number = 0;
    const auto result = std::from_chars(text.data(), text.data() + text.size(), number);
    if (result.ec != std::errc{} || result.ptr != text.data() + text.size()) return std::nullopt;
    return number;
}

std::optional<Data> bytesFrom(std::string_view text) {
    text = trimmed(text);
    if (text.size() % 2 != 0) return std::nullopt;
    Data bytes;
    for (std::size_t at = 0; at < text.size(); at += 2) {
        unsigned value = 0;
        const auto result = std::from_chars(text.data() + at, text.data() + at + 2, value, 16);
        if (result.ec != std::errc{} || result.ptr != text.data() + at + 2) return std::nullopt;
        bytes.push_back(static_cast<std::byte>(value));
    }
    return bytes;
}

/// The fields of an element with a place in the heap. A repeated field makes it ambiguous.
struct Described {
    std::optional<std::uint64_t> offset;
    std::optional<std::uint64_t> length;
    std::optional<Data> checksum;
    std::optional<crypto::Digest> algorithm;
    bool isAmbiguous = false;
    bool saysAnything = false;

    template <class T>
    void set(std::optional<T>& where, std::optional<T> value) {
        saysAnything = true;
        // An unreadable field counts like a repeated one.
        isAmbiguous = isAmbiguous || where || !value;
        where = std::move(value);
    }

    std::optional<FileRange> range() const {
        if (isAmbiguous || !offset || !length) return std::nullopt;
        return FileRange{*offset, *length};
    }
};

/// Checks the fields that the archive reader ignores: no checksum covers the header.
void requireHeaderForm(ByteView start, const xar::Header& header) {
    constexpr std::size_t kVersionOffset = 6;
    constexpr std::uint16_t kVersion = 1;
    base::ByteReader reader(start);
    reader.seek(kVersionOffset, "version");
    if (const std::uint16_t version = reader.be16("version"); version != kVersion)
        refuse(format("the archive's header has the version %u", version));
    if (header.size > xar::kLongestHeaderRead) refuse("the archive's header is too long");
    const ByteView name =
        start.first(std::min<std::size_t>(header.size, start.size())).subspan(xar::kFixedHeaderSize);
    const auto end = std::find(name.begin(), name.end(), std::byte{0});
    if (std::any_of(end, name.end(), [](std::byte byte) { return byte != std::byte{0}; }))
        refuse("the archive's header has bytes after the checksum algorithm's name");
}

}  // namespace

std::string ArchiveTable::pathOf(std::size_t file) const {
    std::string path = files[file].name;
    for (std::optional<std::size_t> parent = files[file].parent; parent; parent = files[*parent].parent)
        path.insert(0, files[*parent].name + "/");
    return path;
}

class ArchiveTableReader::Document final : public values::XMLEvents {
  public:
    void feed(ByteView bytes) {
        try {
            parser_.feed(bytes);
        } catch (const values::MalformedXML& error) {
            refuse(std::string("the table of contents is no XML: ") + error.what());
        }
    }

    ArchiveTable finish() {
        try {
            parser_.finish();
        } catch (const values::MalformedXML& error) {
            refuse(std::string("the table of contents is no XML: ") + error.what());
        }
        if (!hasTable_) refuse("the archive has no table of contents");
        return std::move(table_);
    }

    void begin(std::string_view name, const values::XMLAttributes& attributes) override {
        const Place around = open_.empty() ? Place::outside : open_.back();
        if (open_.size() == kMaximumTableDepth) refuse("the table of contents is too deep");
        open_.push_back(placeOf(withoutPrefix(name), around));
        text_.clear();
        switch (open_.back()) {
            case Place::table:
                if (std::exchange(hasTable_, true)) refuse("two tables of contents");
                break;
            case Place::file:
                beginFile();
                break;
            case Place::checksum:
            case Place::signature:
            case Place::data:
            case Place::attribute:
                described_ = {};
                style_ = attributes["style"].value_or("");
                break;
            case Place::archivedChecksum:
                described_.set(described_.algorithm, xar::digestNamed(attributes["style"].value_or("")));
                break;
            default:
                break;
        }
    }

    void end(std::string_view) override {
        switch (open_.back()) {
            case Place::file:
                around_.pop_back();
                break;
            case Place::name:
                table_.files[around_.back()].name = text_;
                break;
            case Place::offset:
                described_.set(described_.offset, numberFrom(text_));
                break;
            case Place::length:
                described_.set(described_.length, numberFrom(text_));
                break;
            case Place::archivedChecksum:
                described_.set(described_.checksum, bytesFrom(text_));
                break;
            case Place::checksum:
                if (table_.checksum) refuse("the archive has two checksums");
                table_.checksum = described_.range();
                table_.checksumStyle = style_;
                break;
            case Place::signature:
                add(table_.signatures, {style_, described_.range()});
                break;
            case Place::data:
            case Place::attribute:
                endData(open_.back() == Place::attribute);
                break;
            default:
                break;
        }
        open_.pop_back();
        text_.clear();
    }

    void text(std::string_view piece) override {
        const std::size_t room = kMaximumText - std::min(text_.size(), kMaximumText);
        // A longer number or digest is invalid; a longer name is shown cut.
        text_.append(piece.substr(0, room));
    }

  private:
    enum class Place {
        outside,
        root,
        table,
        file,
        name,
        data,
        attribute,
        checksum,
        signature,
        offset,
        length,
        archivedChecksum,
        other,
    };

    static std::string_view withoutPrefix(std::string_view name) {
        const std::size_t colon = name.rfind(':');
        return colon == std::string_view::npos ? name : name.substr(colon + 1);
    }

    static Place placeOf(std::string_view name, Place around) {
        switch (around) {
            case Place::outside:
                if (name != "xar") refuse("the table of contents is none of an archive");
                return Place::root;
            case Place::root:
                return name == "toc" ? Place::table : Place::other;
            case Place::table:
                if (name == "checksum") return Place::checksum;
                if (name == "signature" || name == "x-signature") return Place::signature;
                return name == "file" ? Place::file : Place::other;
            case Place::file:
                if (name == "file") return Place::file;
                if (name == "name") return Place::name;
                if (name == "data") return Place::data;
                return name == "ea" ? Place::attribute : Place::other;
            case Place::checksum:
            case Place::signature:
                if (name == "size") return Place::length;
                return name == "offset" ? Place::offset : Place::other;
            case Place::data:
            case Place::attribute:
                if (name == "length") return Place::length;
                if (name == "archived-checksum") return Place::archivedChecksum;
                return name == "offset" ? Place::offset : Place::other;
            default:
                return Place::other;
        }
    }

    void beginFile() {
        const std::optional<std::size_t> parent =
            around_.empty() ? std::nullopt : std::optional(around_.back());
        around_.push_back(table_.files.size());
        add(table_.files, {std::string(), parent});
    }

    void endData(bool isAttribute) {
        if (!described_.saysAnything) return;
        ArchivedData data{.file = around_.back(),
                          .isAttribute = isAttribute,
                          .range = {},
                          .algorithm = {},
                          .checksum = {},
                          .problem = {}};
        const std::optional<FileRange> range = described_.range();
        if (!range) {
            data.problem = "the table does not say once where it is";
        } else if (!described_.checksum || !described_.algorithm ||
                   described_.checksum->size() != crypto::digestSize(*described_.algorithm)) {
            data.problem = "the table has no checksum of it";
        }
        data.range = range.value_or(FileRange());
        data.algorithm = described_.algorithm;
        data.checksum = described_.checksum.value_or(Data());
        add(table_.data, std::move(data));
    }

    template <class T>
    static void add(std::vector<T>& list, T item) {
        if (list.size() == kMaximumArchivedFiles) refuse("the table of contents has too many entries");
        list.push_back(std::move(item));
    }

    ArchiveTable table_;
    std::vector<Place> open_;
    std::vector<std::size_t> around_;  // the files that are open
    Described described_;
    std::string style_;
    std::string text_;
    bool hasTable_ = false;
    values::XMLParser parser_{*this, values::XMLParser::DocumentType::refused};
};

ArchiveTableReader::ArchiveTableReader() : document_(std::make_unique<Document>()) {}
ArchiveTableReader::~ArchiveTableReader() = default;

void ArchiveTableReader::feed(ByteView bytes) {
    document_->feed(bytes);
}

ArchiveTable ArchiveTableReader::finish() {
    return document_->finish();
}

Archive readArchive(const ByteSource& source, std::uint64_t end) {
    const auto start =
        source.read(0, static_cast<std::size_t>(std::min<std::uint64_t>(xar::kLongestHeaderRead, end)));
    const std::optional<xar::Header> header = xar::parseHeader(start);
    if (!header) refuse("the archive's header is damaged");
    requireHeaderForm(start, *header);
    if (header->size > end || header->compressedLength > end - header->size ||
        header->compressedLength > xar::kMaximumTableOfContents)
        refuse("the table of contents lies outside the archive");

    ArchiveTableReader reader;
    std::uint64_t length = 0;
    xar::Inflater inflater(xar::kMaximumTableOfContents, [&](ByteView bytes) {
        length += bytes.size();
        reader.feed(bytes);
        return true;
    });
    std::optional<crypto::Hasher> hasher;
    if (header->digest) hasher.emplace(*header->digest);
    Archive archive;
    archive.heapStart = header->size + header->compressedLength;
    for (std::uint64_t at = header->size; at < archive.heapStart;) {
        const Data piece = source.read(
            at, static_cast<std::size_t>(std::min<std::uint64_t>(kTablePieceSize, archive.heapStart - at)));
        if (hasher) hasher->update(piece);
        if (!inflater.feed(piece)) refuse("the table of contents cannot be decompressed");
        at += piece.size();
    }
    if (!inflater.complete()) refuse("the table of contents cannot be decompressed");
    base::ByteReader stated(start);
    stated.seek(16, "uncompressed length");
    if (stated.be64("uncompressed length") != length)
        refuse("the header states another length of the table of contents");
    archive.table = reader.finish();
    archive.algorithm = header->digest;
    if (hasher) archive.computed = base::toData(hasher->finish());
    return archive;
}

}  // namespace pinwell::verify
