// The document inside a package archive: by itself, so that neither compression nor checksum stops the
// fuzzer, and in an archive that is made around it.
#include "xar/table_of_contents.h"

#include <xar/xar.h>

#include <algorithm>
#include <optional>
#include <string>
#include <vector>

#include "scratch_file.h"
#include "signed_data.h"
#include "support/archive_builder.h"
#include "target.h"

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

    const auto builder = test::ArchiveBuilder().toc(base::toString(input));
    const ScratchFile file(builder.build());
    xar_t archive = xar_open(file.path().c_str(), 0);
    if (archive == nullptr) return;
    std::vector<std::optional<std::string>> styles;
    for (auto signature = xar_signature_first(archive); signature != nullptr;
         signature = xar_signature_next(signature)) {
        const char* const style = xar_signature_type(signature);
        styles.push_back(style == nullptr ? std::nullopt : std::optional<std::string>(style));
        require(signedDataOf(signature) == builder.rightChecksum(),
                "what is signed is the checksum of the table");
    }
    require(styles == whole->signatures, "an archive says what its table says");
    xar_close(archive);
}

}  // namespace pinwell::fuzz
