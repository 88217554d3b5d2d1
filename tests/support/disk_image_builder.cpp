#include "support/disk_image_builder.h"

#include "base/byte_io.h"

namespace pinwell::test {

using base::ByteWriter;

namespace {

constexpr std::size_t kTrailerSize = 512;
constexpr std::size_t kCodeSignFields = 296;

// Fills up to `end` with a pattern that differs between neighbouring fields.
void fillUpTo(std::size_t end, ByteWriter& writer) {
    while (writer.size() < end) writer.u8(static_cast<std::uint8_t>(writer.size() * 7 + 1));
}

}  // namespace

Data ticketBlob(std::string_view ticket) {
    return makeBlob(0xFADE0B01, base::asBytes(ticket));
}

Data DiskImageBuilder::trailer() const {
    ByteWriter writer;
    writer.text(magic_).be32(version_);
    fillUpTo(kCodeSignFields, writer);
    writer.be64(codeSignOffset_.value_or(superblob_.empty() ? 0 : data_.size()));
    writer.be64(codeSignLength_.value_or(superblob_.size()));
    fillUpTo(kTrailerSize, writer);
    return std::move(writer).take();
}

Data DiskImageBuilder::build() const {
    return ByteWriter().bytes(data_).bytes(superblob_).bytes(trailer()).data();
}

Data DiskImageBuilder::codeDirectory() {
    const Data unsignedTrailer = DiskImageBuilder().trailer();
    return CodeDirectoryBuilder().covers(2, emptyRequirements()).covers(6, unsignedTrailer).build();
}

SuperBlobBuilder DiskImageBuilder::signature() {
    return SuperBlobBuilder::adHoc(codeDirectory());
}

}  // namespace pinwell::test
