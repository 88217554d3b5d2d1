// Deep verification of a disk image: trailer, signature, pages, and the block table as a second opinion.
//
// The first byte of the input gives the kind of the rest:
//
//   0  a whole image
//   1  a block table, after its length in two bytes, and its data: the fuzzer would not find the fields of a
//      table in Base64 in a property list
#include <algorithm>

#include "base/byte_io.h"
#include "support/tabled_image_builder.h"
#include "verified_bytes.h"
#include "verify/code.h"

namespace pinwell::fuzz {
namespace {

Data imageAround(ByteView input) {
    base::ByteReader reader(input);
    if (reader.remaining() < 2) return {};
    const std::size_t length = std::min<std::size_t>(reader.be16("length"), reader.remaining());
    const ByteView table = reader.bytes(length, "table");
    const ByteView data = reader.bytes(reader.remaining(), "data");
    return test::imageOfTable(table, data, {.data = test::crcOf(data)});
}

/// A stapled ticket has its own signature, which is not checked here.
bool mayHoldTicket(ByteView image) {
    const Data slot = base::ByteWriter().be32(0x10002).data();
    return std::search(image.begin(), image.end(), slot.begin(), slot.end()) != image.end();
}

}  // namespace

void examine(ByteView input) {
    if (input.empty()) return;
    const bool isTable = input.front() == std::byte{1};
    const ByteView rest = input.subspan(1);
    const Data image = isTable ? imageAround(rest) : base::toData(rest);
    examineVerified(image, verify::verifyDiskImage,
                    mayHoldTicket(image) ? Coverage::partial : Coverage::whole);
}

}  // namespace pinwell::fuzz
