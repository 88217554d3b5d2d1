// The table of contents: an XML document, of which a few values are kept.
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
// Elements are recognised by their local names. A child of `toc` is a signature, by either of its names, a
// file, or a property; the contents of the first two are skipped. If several properties have one path, the
// first one counts. But a second checksum, or a second offset or size in it, is refused, because all readers
// must check the same bytes.
//
// Also refused: every document that values/xml_parser.h refuses, and any document type; a root other than
// `xar`; no `toc`, or two; and tables that exceed a limit below.
#pragma once

#include <cstdint>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "base/bytes.h"

namespace pinwell::xar {

/// Length of the table of contents, compressed and uncompressed alike: some hundred thousand files.
inline constexpr std::uint64_t kMaximumTableOfContents = 64ULL * 1024 * 1024;

/// Depth of nested elements, with the root.
inline constexpr std::size_t kMaximumDepth = 64;

inline constexpr std::size_t kMaximumElements = 4 * 1024 * 1024;
inline constexpr std::size_t kMaximumSignatures = 64 * 1024;
inline constexpr std::size_t kMaximumProperties = 4096;

/// Length of a property's path, in bytes.
inline constexpr std::size_t kMaximumPath = 1024;

/// Kept styles and property texts of a table, in bytes.
inline constexpr std::size_t kMaximumKept = 1024 * 1024;

struct TableOfContents {
    /// Each signature's style, in document order; `nullopt` for a signature without a style.
    std::vector<std::optional<std::string>> signatures;

    /// Text by path ("checksum/size"); `nullopt` for an element without text, or with only white space.
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

    /// Returns false if the document is refused; then feed no more. Throws std::bad_alloc.
    bool feed(base::ByteView bytes);

    /// Call it once, and last. Returns `nullopt` if the document is refused. Throws std::bad_alloc.
    std::optional<TableOfContents> finish();

  private:
    class Document;

    std::unique_ptr<Document> document_;
};

}  // namespace pinwell::xar
