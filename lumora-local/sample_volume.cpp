#include "lumora-local/sample_volume.h"

#include <algorithm>
#include <cstdint>
#include <utility>

#include "foundation/byte_writer.h"

namespace pinwell::lumora {
namespace {

using foundation::ByteWriter;
using foundation::Data;

constexpr std::uint8_t kFixedDisk = 0xF8;  // media descriptor
constexpr std::uint32_t kSerialNumber = 0x4C554D4F;
constexpr std::string_view kLabel = "SAMPLE     ";     // 11 characters
constexpr std::string_view kFileName = "README  TXT";  // 8 and 3
constexpr std::uint8_t kVolumeLabel = 0x08;
constexpr std::uint8_t kArchive = 0x20;
constexpr std::uint16_t kFirstCluster = 2;
constexpr std::uint16_t kTime = 19 << 11 | 55 << 5;                // 19:55:00
constexpr std::uint16_t kDay = (2026 - 1980) << 9 | 11 << 5 | 20;  // 2026-11-20

void fillSector(ByteWriter& volume) {
    volume.zeros((kSectorSize - volume.size() % kSectorSize) % kSectorSize);
}

void appendBootSector(ByteWriter& volume) {
    volume.u8(0xEB).u8(0x3C).u8(0x90);  // a jump over the parameters, to an endless loop
    volume.text("LUMORA  ")
        .le16(kSectorSize)
        .u8(1)     // sectors per cluster
        .le16(1)   // reserved sectors: this one
        .u8(1)     // copies of the file allocation table
        .le16(16)  // entries in the root directory: one sector
        .le16(kVolumeSectors)
        .u8(kFixedDisk)
        .le16(1)   // sectors per file allocation table
        .le16(32)  // sectors per track
        .le16(2)   // heads
        .le32(0)   // hidden sectors
        .le32(0)   // sectors, when they do not fit above
        .u8(0x80)  // drive
        .u8(0)
        .u8(0x29)  // the three fields that follow are there
        .le32(kSerialNumber)
        .text(kLabel)
        .text("FAT12   ")
        .u8(0xEB)  // the endless loop
        .u8(0xFE);
    volume.zeros(kSectorSize - 2 - volume.size()).u8(0x55).u8(0xAA);
}

void appendEntry(ByteWriter& volume, std::string_view name, std::uint8_t attributes, std::uint16_t cluster,
                 std::size_t size) {
    volume.text(name)
        .u8(attributes)
        .zeros(2)
        .le16(kTime)
        .le16(kDay)
        .le16(kDay)
        .le16(0)
        .le16(kTime)
        .le16(kDay)
        .le16(cluster)
        .le32(static_cast<std::uint32_t>(size));
}

}  // namespace

Data makeSampleVolume(std::string_view text) {
    const std::string_view contents = text.substr(0, kSectorSize);
    ByteWriter volume;
    appendBootSector(volume);
    // Entries of 12 bits: the media descriptor, the end mark, and one cluster that ends its chain.
    volume.u8(kFixedDisk).u8(0xFF).u8(0xFF).u8(0xFF).u8(0x0F);
    fillSector(volume);
    appendEntry(volume, kLabel, kVolumeLabel, 0, 0);
    appendEntry(volume, kFileName, kArchive, kFirstCluster, contents.size());
    fillSector(volume);
    volume.text(contents);
    volume.zeros(kVolumeSectors * kSectorSize - volume.size());
    return std::move(volume).take();
}

}  // namespace pinwell::lumora
