// The table of contents: an XML document, of which a few things are kept. For this folder only.
//
//   <xar>
//     <toc>
//       <checksum style="sha1"><offset>0</offset><size>20</size></checksum>
//       <signature style="RSA">...</signature>
//       <x-signature style="CMS">...</x-signature>
//       <file id="1">...</file>
//     </toc>
//   </xar>
//
// Elements go by their local names. A child of `toc` is a signature, by either of its names, a file, or a
// property; what is inside the first two is passed over. Of several properties at one path the first one
// counts, but a second checksum, or a second offset or size in it, is refused: readers must not differ in
// what is checked.
//
// Refused besides: what foundation/xml_parser.h refuses, and any document type; a root other than `xar`; no
// `toc`, or two; and what passes a limit below.
#pragma once

#include <cstdint>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "foundation/bytes.h"

namespace pinwell::xar {

/// Length of the table of contents, compressed and uncompressed alike: some hundred thousand files.
inline constexpr std::uint64_t kMaximumTableOfContents = 64ULL * 1024 * 1024;

/// Elements inside one another, the root included.
inline constexpr std::size_t kMaximumDepth = 64;

inline constexpr std::size_t kMaximumElements = 4 * 1024 * 1024;
inline constexpr std::size_t kMaximumSignatures = 64 * 1024;
inline constexpr std::size_t kMaximumProperties = 4096;

/// Length of a property's path, in bytes.
inline constexpr std::size_t kMaximumPath = 1024;

/// What is kept of a table, styles and the text of properties, in bytes.
inline constexpr std::size_t kMaximumKept = 1024 * 1024;

struct TableOfContents {
    /// Each signature's style, in document order; `nullopt` for one that has none.
    std::vector<std::optional<std::string>> signatures;

    /// Text by path ("checksum/size"); `nullopt` for an element without any, or with white space alone.
    std::map<std::string, std::optional<std::string>, std::less<>> properties;

    std::optional<std::string> checksumStyle;
};

/// Reads a table of contents piece by piece.
class TableOfContentsReader {
  public:
    /// Throws std::bad_alloc.
    TableOfContentsReader();
    ~TableOfContentsReader();
    TableOfContentsReader(const TableOfContentsReader&) = delete;
    TableOfContentsReader& operator=(const TableOfContentsReader&) = delete;

    /// Returns false if the document is refused: then no more must be fed. Throws std::bad_alloc.
    bool feed(foundation::ByteView bytes);

    /// Once, and last. Returns `nullopt` if the document is refused. Throws std::bad_alloc.
    std::optional<TableOfContents> finish();

  private:
    class Document;

    std::unique_ptr<Document> document_;
};

}  // namespace pinwell::xar
