// The superblob of an embedded signature, by the rules of the code-signing service. formats/superblob.h has
// its layout.
//
// The index may name the blobs in any order, and there may be gaps between them. The rest of the reserved
// area after the superblob's own length is padding and is never read.
//
// Refused: a wrong magic, a length or count that does not fit, two entries for a slot of the signature, and
// blobs that overlap each other or the index. Other slots, such as the ticket's, may have any number of
// entries. There is no limit on the length or on the number of blobs: a record here takes 40 bytes; the
// smallest blob takes 16 in the file.
#pragma once

#include <cstdint>
#include <optional>
#include <utility>
#include <vector>

#include "base/byte_source.h"
#include "codesign/code_signing.h"
#include "formats/superblob.h"

namespace pinwell::codesign {

using base::ByteSource;
using base::ByteView;
using base::Data;
using base::SharedBytes;

/// Whether the signature is read from this slot: code directories, the components that they cover, and the
/// signer's message.
bool isSlotOfSignature(std::uint32_t slot);

/// One blob of a superblob.
struct Blob {
    std::uint32_t slot;
    std::uint32_t magic;
    ByteView bytes;  // with its header
};

/// The blobs, in index order, as views of `superblob`, which may have padding after it. Throws CodeError or
/// base::ShortRead.
std::vector<Blob> parseSuperBlob(ByteView superblob);

/// The superblob in `source` at `offset`, in an area of `areaLength` bytes, without its padding. Only the
/// superblob itself is read. Throws CodeError or base::ReadFailure.
SharedBytes readSuperBlob(const ByteSource& source, std::uint64_t offset, std::uint64_t areaLength);

/// The superblob of these blobs (slot, bytes with header), back to back in this order.
Data buildSuperBlob(const std::vector<std::pair<std::uint32_t, Data>>& blobs);

}  // namespace pinwell::codesign
