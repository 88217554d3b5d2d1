// Deep verification of a flat package: table of contents, signatures, the whole heap, and the bytes after it.
//
// The first byte of the input gives the kind of the rest:
//
//   0  a whole package
//   1  a document and, after its last "</xar>", the heap after the checksum: under compression and a checksum
//      the fuzzer would not get past its first change
#include "support/archive_builder.h"
#include "verified_bytes.h"
#include "verify/archive_table.h"
#include "verify/code.h"

#include <algorithm>

#include "codesign/code_error.h"

namespace pinwell::fuzz {
namespace {

std::optional<verify::ArchiveTable> readInPieces(ByteView document, std::size_t size) {
    verify::ArchiveTableReader reader;
    try {
        while (!document.empty()) {
            const ByteView piece = document.first(std::min(size, document.size()));
            reader.feed(piece);
            document = document.subspan(piece.size());
        }
        return reader.finish();
    } catch (const codesign::CodeError&) {
        return std::nullopt;
    }
}

void examineTable(ByteView document) {
    constexpr std::size_t kSmallPiece = 7;
    const auto whole = readInPieces(document, std::max<std::size_t>(document.size(), 1));
    const auto pieced = readInPieces(document, kSmallPiece);
    require(whole.has_value() == pieced.has_value(),
            "how a document is cut does not decide whether it is one");
    if (!whole) return;
    require(whole->files.size() == pieced->files.size() && whole->data.size() == pieced->data.size() &&
                whole->signatures.size() == pieced->signatures.size() &&
                whole->checksum == pieced->checksum && whole->checksumStyle == pieced->checksumStyle,
            "how a document is cut does not change what it says");
    require(whole->files.size() <= verify::kMaximumArchivedFiles &&
                whole->data.size() <= verify::kMaximumArchivedFiles,
            "files are counted");
    for (std::size_t i = 0; i < whole->files.size(); ++i) {
        const verify::ArchiveTable::File& file = whole->files[i];
        require(file.name == pieced->files[i].name && file.parent == pieced->files[i].parent,
                "how a document is cut does not change what a file is called");
        require(file.name.size() <= verify::kMaximumArchivedName, "a name is bounded");
        require(!file.parent || *file.parent < i, "a file comes after the one that it is in");
        require(whole->pathOf(i).size() >= file.name.size(), "a path ends in a name");
    }
    for (const verify::ArchivedData& data : whole->data)
        require(data.file < whole->files.size() && (data.algorithm || !data.problem.empty()),
                "data belong to a file, and have a digest or a fault");
}

}  // namespace

void examine(ByteView input) {
    if (input.empty()) return;
    const ByteView rest = input.subspan(1);
    if (input.front() != std::byte{1}) return examineVerified(rest, verify::verifyPackage, Coverage::partial);
    const ByteView mark = base::asBytes("</xar>");
    const auto found = std::find_end(rest.begin(), rest.end(), mark.begin(), mark.end());
    const std::size_t length =
        found == rest.end() ? rest.size() : static_cast<std::size_t>(found - rest.begin()) + mark.size();
    examineTable(rest.first(length));
    examineVerified(test::ArchiveBuilder()
                        .toc(base::toString(rest.first(length)))
                        .afterChecksum(base::toData(rest.subspan(length)))
                        .build(),
                    verify::verifyPackage, Coverage::partial);
}

}  // namespace pinwell::fuzz
