#include "support/tabled_image_builder.h"

#include <zlib.h>

#include "base/text.h"
#include "support/archive_builder.h"

namespace pinwell::test {
namespace {

using base::ByteWriter;

constexpr std::uint64_t kSectorSize = 512;
constexpr std::uint32_t kCrc32 = 2;

void appendChecksum(ByteWriter& writer, std::uint32_t type, std::uint32_t value) {
    writer.be32(type).be32(32).be32(value).zeros(124);
}

}  // namespace

std::uint32_t crcOf(ByteView bytes) {
    return static_cast<std::uint32_t>(crc32_z(0, reinterpret_cast<const Bytef*>(bytes.data()), bytes.size()));
}

Data imageOfTable(ByteView table, ByteView data, const TrailerChecksums& checksums) {
    const Data list = base::toData(
        "<plist version=\"1.0\"><dict><key>resource-fork</key><dict><key>blkx</key><array><dict><key>Name"
        "</key><string>whole</string><key>Data</key><data>" +
        base::encodeBase64(table) + "</data></dict></array></dict></dict></plist>");
    ByteWriter trailer;
    trailer.text("koly").be32(4).zeros(16).be64(0).be64(data.size()).zeros(40);
    appendChecksum(trailer, kCrc32, checksums.data);
    trailer.be64(data.size()).be64(list.size()).zeros(352 - 232);
    appendChecksum(trailer, kCrc32, checksums.master);
    trailer.zeros(512 - trailer.size());
    return ByteWriter().bytes(data).bytes(list).bytes(trailer.data()).data();
}

TabledImageBuilder& TabledImageBuilder::block(std::uint32_t type, std::uint64_t sectors, const Data& packed,
                                              const Data& contents) {
    blocks_.be32(type).be32(0).be64(sectors_ + skew_).be64(sectors);
    blocks_.be64(data_.size()).be64(packed.size());
    data_.bytes(packed);
    contents_.bytes(contents);
    sectors_ += sectors;
    ++count_;
    return *this;
}

TabledImageBuilder& TabledImageBuilder::plain(const Data& contents) {
    return block(1, contents.size() / kSectorSize, contents, contents);
}

TabledImageBuilder& TabledImageBuilder::zlib(const Data& contents) {
    return block(0x80000005, contents.size() / kSectorSize, deflated(contents), contents);
}

TabledImageBuilder& TabledImageBuilder::zeros(std::uint64_t sectors) {
    return block(0, sectors, {}, Data(static_cast<std::size_t>(sectors * kSectorSize)));
}

TabledImageBuilder& TabledImageBuilder::again(std::uint64_t sectors, std::uint64_t length) {
    blocks_.be32(1).be32(0).be64(sectors_).be64(sectors).be64(0).be64(length);
    sectors_ += sectors;
    ++count_;
    return *this;
}

std::uint32_t TabledImageBuilder::ownChecksum() const {
    return tableChecksum_.value_or(crcOf(contents_.data()));
}

Data TabledImageBuilder::table() const {
    ByteWriter table;
    table.text("mish").be32(1).be64(0).be64(sectorCount_.value_or(sectors_)).be64(0).zeros(32);
    appendChecksum(table, tableChecksumType_, ownChecksum());
    return table.be32(count_).bytes(blocks_.data()).data();
}

Data TabledImageBuilder::build() const {
    return imageOfTable(table(), data(),
                        {.data = dataChecksum_.value_or(crcOf(data())),
                         .master = masterChecksum_.value_or(crcOf(ByteWriter().be32(ownChecksum()).data()))});
}

}  // namespace pinwell::test
