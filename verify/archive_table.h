// The header and the table of contents of a package archive, for deep verification: everything that has bytes
// in the heap, with the digest that the table states for them. (xar/table_of_contents.h reads the rest.)
//
//   <xar><toc>
//     <checksum style="sha1"><offset>0</offset><size>20</size></checksum>
//     <signature style="CMS"><offset>20</offset><size>1732</size>...</signature>
//     <file id="1"><name>Payload</name>
//       <data><length>512</length><offset>1752</offset>
//         <archived-checksum style="sha1">0a1b...</archived-checksum>...</data>
//       <ea id="0">... the same ...</ea> <file id="2">...</file>
//     </file>
//   </toc></xar>
//
// Offsets count from the start of the heap. `length` is the length in the heap. `size`, in `data`, is the
// unpacked length, and is ignored. A number is only decimal digits, between white space.
#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "base/byte_source.h"
#include "codesign/executable_image.h"
#include "verify/page_digest.h"

namespace pinwell::verify {

/// Elements with data in the heap, and files around them. A table of 64 MiB can hold some hundred
/// thousand.
inline constexpr std::size_t kMaximumArchivedFiles = std::size_t{1} << 20U;

/// Depth of nested elements.
inline constexpr std::size_t kMaximumTableDepth = 64;

/// Longest kept part of a name, in bytes.
inline constexpr std::size_t kMaximumArchivedName = 1024;

/// One range of the heap, and its required digest.
struct ArchivedData {
    std::size_t file = 0;  // index of its file
    bool isAttribute = false;
    codesign::FileRange range;
    std::optional<crypto::Digest> algorithm;
    Data checksum;
    std::string problem;  // why it cannot be checked; empty if it can
};

struct ArchiveSignature {
    std::string style;
    std::optional<codesign::FileRange> range;
};

struct ArchiveTable {
    struct File {
        std::string name;
        std::optional<std::size_t> parent;
    };

    std::vector<File> files;
    std::vector<ArchivedData> data;
    std::vector<ArchiveSignature> signatures;
    std::optional<codesign::FileRange> checksum;
    std::string checksumStyle;

    /// "Scripts/preinstall".
    std::string pathOf(std::size_t file) const;
};

/// Reads a table piece by piece.
class ArchiveTableReader {
  public:
    ArchiveTableReader();
    ~ArchiveTableReader();
    ArchiveTableReader(const ArchiveTableReader&) = delete;
    ArchiveTableReader& operator=(const ArchiveTableReader&) = delete;

    /// Throws codesign::CodeError if the table is refused; then feed no more.
    void feed(ByteView bytes);

    /// Call it once, and last. Throws like feed().
    ArchiveTable finish();

  private:
    class Document;

    std::unique_ptr<Document> document_;
};

/// An archive's header and table of contents.
struct Archive {
    std::uint64_t heapStart = 0;
    ArchiveTable table;
    std::optional<crypto::Digest> algorithm;
    Data computed;  // checksum of the table
};

/// Reads the archive at the start of `source`, which ends at `end`. Throws codesign::CodeError if header or
/// table is refused.
Archive readArchive(const base::ByteSource& source, std::uint64_t end);

}  // namespace pinwell::verify
