// Archives (xar), field by field: header, table of contents, heap. `.build()` without any other call is a
// valid unsigned archive with an SHA-1 checksum; `.signature("CMS")` signs it. Overridden fields are written
// as given; all others follow from the contents.
//
//   header | table of contents, a zlib stream | heap: checksum, signatures, a file's data
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "base/bytes.h"

namespace pinwell::test {

using base::ByteView;
using base::Data;

/// The zlib stream with these contents.
Data deflated(ByteView contents);
Data deflated(std::string_view contents);

class ArchiveBuilder {
  public:
    ArchiveBuilder& magic(std::string value) { return set(magic_, std::move(value)); }
    ArchiveBuilder& version(std::uint16_t value) { return set(version_, value); }
    ArchiveBuilder& headerSize(std::uint16_t value) { return set(headerSize_, value); }
    ArchiveBuilder& compressedLength(std::uint64_t value) { return set(compressedLength_, value); }
    ArchiveBuilder& uncompressedLength(std::uint64_t value) { return set(uncompressedLength_, value); }

    /// The algorithm's number in the header. Without it the digest's own: none 0, sha1 1, md5 2, sha256 3,
    /// sha512 4.
    ArchiveBuilder& algorithm(std::uint32_t value) { return set(algorithm_, value); }

    /// The bytes after byte 28 of the header, unchanged; the header grows by them.
    ArchiveBuilder& headerTail(Data bytes) { return set(headerTail_, std::move(bytes)); }

    /// The checksum's digest: a name that OpenSSL knows, or "none".
    ArchiveBuilder& digest(std::string name) { return set(digest_, std::move(name)); }

    /// The digest, named in a header of 28 bytes and the name, zero-padded to a multiple of 4.
    ArchiveBuilder& namedDigest(const std::string& name);

    /// The whole document.
    ArchiveBuilder& toc(std::string xml) { return set(toc_, std::move(xml)); }

    /// Replaces the stream, and the bytes under its checksum.
    ArchiveBuilder& compressedToc(Data bytes) { return set(compressedToc_, std::move(bytes)); }

    /// Parts of the checksum's element: the text of the attribute and of the elements. An empty text omits
    /// its element or attribute.
    ArchiveBuilder& checksumStyle(std::string value) { return set(checksumStyle_, std::move(value)); }
    ArchiveBuilder& checksumOffset(std::string value) { return set(checksumOffset_, std::move(value)); }
    ArchiveBuilder& checksumSize(std::string value) { return set(checksumSize_, std::move(value)); }

    /// The element itself; an empty text leaves it out.
    ArchiveBuilder& checksumElement(std::string xml) { return set(checksumElement_, std::move(xml)); }

    /// One more child of the table of contents, in the order of the calls.
    ArchiveBuilder& element(std::string_view xml);
    ArchiveBuilder& signature(std::string_view style);

    /// The checksum in the heap; by default the right one.
    ArchiveBuilder& checksum(Data bytes) { return set(checksum_, std::move(bytes)); }

    /// Bytes in the heap before the checksum, and after it.
    ArchiveBuilder& beforeChecksum(Data bytes) { return set(beforeChecksum_, std::move(bytes)); }
    ArchiveBuilder& afterChecksum(Data bytes) { return set(afterChecksum_, std::move(bytes)); }

    /// The right checksum of the table of contents.
    Data rightChecksum() const;

    /// The offset of the heap.
    std::size_t heapStart() const;

    Data build() const;

  private:
    template <class Field, class Value>
    ArchiveBuilder& set(Field& field, Value&& value) {
        field = std::forward<Value>(value);
        return *this;
    }

    std::string document() const;
    std::string checksumDescription() const;
    Data stream() const;
    std::uint32_t digestNumber() const;

    std::string magic_ = "xar!";
    std::uint16_t version_ = 1;
    std::optional<std::uint16_t> headerSize_;
    std::optional<std::uint64_t> compressedLength_;
    std::optional<std::uint64_t> uncompressedLength_;
    std::optional<std::uint32_t> algorithm_;
    Data headerTail_;
    std::string digest_ = "sha1";
    std::optional<std::string> toc_;
    std::optional<Data> compressedToc_;
    std::optional<std::string> checksumStyle_;
    std::optional<std::string> checksumOffset_;
    std::optional<std::string> checksumSize_;
    std::optional<std::string> checksumElement_;
    std::string elements_;
    std::optional<Data> checksum_;
    Data beforeChecksum_;
    Data afterChecksum_ = base::toData("signature value, and the data of a file");
};

}  // namespace pinwell::test
