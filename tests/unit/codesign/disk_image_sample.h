// Disk images as small as they get: some bytes, a signature if there is one, the trailer.
#pragma once

#include "foundation/byte_writer.h"
#include "support/code_directory_builder.h"

namespace pinwell::test {

/// A trailer with these signature fields; the bytes nobody reads are not zero, so that hashing them shows.
inline Data trailerWith(std::uint64_t signatureOffset, std::uint64_t signatureLength) {
    foundation::ByteWriter writer;
    writer.text("koly").be32(4).bytes(Data(288, std::byte{0x5A}));
    writer.be64(signatureOffset).be64(signatureLength).bytes(Data(200, std::byte{0xA5}));
    return std::move(writer).take();
}

/// `content`, then `superblob`, then a trailer that says so.
inline Data diskImage(const Data& content, const Data& superblob) {
    foundation::ByteWriter writer;
    writer.bytes(content).bytes(superblob);
    return writer.bytes(superblob.empty() ? trailerWith(0, 0) : trailerWith(content.size(), superblob.size()))
        .data();
}

}  // namespace pinwell::test
