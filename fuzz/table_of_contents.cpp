// The document inside a package archive: by itself, so that neither compression nor checksum stops the
// fuzzer, and in an archive that is made around it.
#include "xar/table_of_contents.h"

#include <algorithm>

#include "scratch_file.h"
#include "support/archive_builder.h"
#include "target.h"
#include "xar/archive.h"

namespace pinwell::fuzz {
namespace {

std::optional<xar::TableOfContents> readInPieces(ByteView document, std::size_t size) {
    xar::TableOfContentsReader reader;
    while (!document.empty()) {
        const ByteView piece = document.first(std::min(size, document.size()));
        if (!reader.feed(piece)) return std::nullopt;
        document = document.subspan(piece.size());
    }
    return reader.finish();
}

void examineTable(const xar::TableOfContents& table) {
    require(table.signatures.size() <= xar::kMaximumSignatures, "signatures are counted");
    require(table.properties.size() <= xar::kMaximumProperties, "properties are counted");
    for (const auto& [path, text] : table.properties)
        require(!path.empty() && path.size() <= xar::kMaximumPath, "a property's path is bounded");
}

}  // namespace

void examine(ByteView input) {
    constexpr std::size_t kSmallPiece = 7;
    const auto whole = readInPieces(input, std::max<std::size_t>(input.size(), 1));
    const auto pieced = readInPieces(input, kSmallPiece);
    require(whole.has_value() == pieced.has_value(),
            "how a document is cut does not decide whether it is one");
    if (!whole) return;
    examineTable(*whole);
    require(whole->signatures == pieced->signatures && whole->properties == pieced->properties &&
                whole->checksumStyle == pieced->checksumStyle,
            "how a document is cut does not change what it says");

    const auto builder = test::ArchiveBuilder().toc(foundation::toString(input));
    const ScratchFile file(builder.build());
    const auto archive = xar::Archive::open(file.path());
    if (!archive) return;
    require(archive->table().signatures == whole->signatures, "an archive says what its table says");
    require(archive->checksum() == builder.rightChecksum(), "what is signed is the checksum of the table");
}

}  // namespace pinwell::fuzz
