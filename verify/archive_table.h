// The table of contents of a package archive, as deep verification reads it: everything that has bytes in the
// heap, with the digest that the table states of them. (xar/table_of_contents.h reads the rest.)
//
//   <xar><toc>
//     <checksum style="sha1"><offset>0</offset><size>20</size></checksum>
//     <signature style="CMS"><offset>20</offset><size>1732</size>...</signature>
//     <file id="1"><name>Payload</name>
//       <data><length>512</length><offset>1752</offset><archived-checksum
//       style="sha1">0a1b...</archived-checksum>... <ea id="0">... the same ...</ea> <file id="2">...</file>
//     </file>
//   </toc></xar>
//
// Offsets count from the start of the heap. `length` is what the heap holds; `size`, in `data`, is what comes
// out of it, and is not looked at. A number is decimal digits alone, between white space.
#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "codesign/executable_image.h"
#include "verify/page_digest.h"

namespace pinwell::verify {

/// Elements with data in the heap, and files around them. A table of 64 MiB has room for some hundred
/// thousand.
inline constexpr std::size_t kMaximumArchivedFiles = std::size_t{1} << 20U;

/// Elements inside one another.
inline constexpr std::size_t kMaximumTableDepth = 64;

/// Most of a name that is kept, in bytes.
inline constexpr std::size_t kMaximumArchivedName = 1024;

/// One range of the heap, and what it must hold.
struct ArchivedData {
    std::size_t file = 0;  // index of the file that it belongs to
    bool isAttribute = false;
    codesign::FileRange range;
    std::optional<Algorithm> algorithm;
    Data checksum;
    std::string problem;  // why it cannot be held against anything; empty when it can
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

    /// Throws codesign::CodeError if it is refused; then no more must be fed.
    void feed(ByteView bytes);

    /// Once, and last. Throws as feed().
    ArchiveTable finish();

  private:
    class Document;

    std::unique_ptr<Document> document_;
};

}  // namespace pinwell::verify
