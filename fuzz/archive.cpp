// A package archive: header, compressed table of contents, signatures and checksum.
#include <xar/xar.h>

#include <algorithm>
#include <cstring>

#include "base/byte_io.h"
#include "scratch_file.h"
#include "signed_data.h"
#include "target.h"
#include "xar/header.h"

namespace pinwell::fuzz {
namespace {

/// The checksum of the table of contents of an opened archive.
Data computedChecksum(ByteView archive) {
    const auto header = xar::parseHeader(archive.first(std::min(archive.size(), xar::kLongestHeaderRead)));
    require(header.has_value(), "an archive has a header");
    if (!header->digest) return {};
    base::ByteReader reader(archive);
    reader.skip(header->size, "header");
    return crypto::digestOf(*header->digest, reader.bytes(header->compressedLength, "table of contents"));
}

void examineSignature(xar_signature_t signature, const Data& checksum) {
    if (const char* type = xar_signature_type(signature)) static_cast<void>(std::strlen(type));
    require(signedDataOf(signature) == checksum && !checksum.empty(),
            "what is signed is the checksum of the table");
}

}  // namespace

void examine(ByteView input) {
    const ScratchFile file(input);
    xar_t archive = xar_open(file.path().c_str(), 0);
    if (archive == nullptr) return;
    const Data checksum = computedChecksum(input);
    std::size_t count = 0;
    for (auto signature = xar_signature_first(archive); signature != nullptr;
         signature = xar_signature_next(signature)) {
        examineSignature(signature, checksum);
        ++count;
    }
    require(count <= std::size_t{1} << 16U, "signatures are counted");
    for (const char* key : {"checksum", "checksum/size", "creation-time", ""}) {
        const char* value = nullptr;
        if (xar_prop_get(reinterpret_cast<xar_file_t>(archive), key, &value) == 0 && value != nullptr)
            static_cast<void>(std::strlen(value));
    }
    require(xar_close(archive) == 0, "an archive can be closed");
}

}  // namespace pinwell::fuzz
