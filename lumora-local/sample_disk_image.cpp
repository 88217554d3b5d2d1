// Disk images to try the service with, which other readers of the format accept too.
//
// | Part           | Holds                                                                            |
// |----------------|----------------------------------------------------------------------------------|
// | data fork      | the chunks of a small volume (below), deflated                                   |
// | property list  | "resource-fork" with one "blkx" block table, which says what each chunk holds    |
// | code signature | superblob (ad_hoc_signature.h) that covers all before it; absent when unsigned   |
// | trailer        | 512 bytes: where the other parts are, and their CRC-32 (ISO 3309)                |
//
// Block table. All integers here and in the trailer are big-endian.
//
// | Offset | Size | Field                                                                            |
// |--------|------|----------------------------------------------------------------------------------|
// | 0      | 4    | "mish"                                                                           |
// | 4      | 4    | version, 1                                                                       |
// | 8      | 16   | first sector and number of sectors of the volume                                 |
// | 24     | 8    | added to the chunks' offsets: 0                                                  |
// | 32     | 4    | sectors to set aside for decompressing one chunk                                 |
// | 36     | 4    | number of the table                                                              |
// | 40     | 24   | reserved                                                                         |
// | 64     | 136  | checksum of the volume: type 2 (CRC-32), 32 bits, 128 bytes of room              |
// | 200    | 4    | number of chunks                                                                 |
// | 204    | 40 n | chunks: type and comment (4 each); first sector, sectors, offset and length in   |
// |        |      | the data fork (8 each). Types: 80000005 deflated, 2 nothing, FFFFFFFF the end    |
//
// The volume is a small FAT12 file system (ECMA-107) with one text file.
//
// | Sector  | Holds                                                     |
// |---------|-----------------------------------------------------------|
// | 0       | boot sector: the parameters below, no code                |
// | 1       | the file allocation table, one copy                       |
// | 2       | the root directory: volume label, README.TXT              |
// | from 3  | clusters of one sector each, numbered from 2              |
#include <algorithm>
#include <cstdint>
#include <utility>

#include "ad_hoc_signature.h"
#include "base/byte_io.h"
#include "file_writing.h"
#include "formats/disk_image.h"
#include "samples.h"

namespace pinwell::lumora {
namespace {

using base::ByteView;
using base::ByteWriter;
using base::Data;
using values::Array;
using values::Dictionary;

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

namespace {

constexpr std::string_view kImageIdentifier = "example.lumora.sample.image";
constexpr std::string_view kText = "A sample disk image, to try a record service with.\r\n";
constexpr std::string_view kPartition = "Sample (DOS_FAT_12 : 0)";

constexpr std::uint32_t kDeflated = 0x80000005;
constexpr std::uint32_t kNothing = 2;
constexpr std::uint32_t kEnd = 0xFFFFFFFF;
constexpr std::size_t kChunkSectors = 64;
constexpr std::uint32_t kTrailerSlot = 6;  // the special slot that covers the trailer

void appendChecksum(ByteWriter& writer, std::uint32_t crc) {
    constexpr std::uint32_t kCrc32 = 2;
    constexpr std::size_t kRoom = 128;
    writer.be32(kCrc32).be32(32).be32(crc).zeros(kRoom - 4);
}

struct DataFork {
    ByteWriter bytes;
    ByteWriter chunks;
    std::uint32_t chunkCount = 0;

    void chunk(std::uint32_t type, std::size_t firstSector, std::size_t sectors, ByteView contents) {
        chunks.be32(type).be32(0).be64(firstSector).be64(sectors);
        chunks.be64(bytes.size()).be64(contents.size());
        bytes.bytes(contents);
        ++chunkCount;
    }
};

DataFork pack(ByteView volume) {
    DataFork fork;
    const std::size_t sectors = volume.size() / kSectorSize;
    for (std::size_t first = 0; first < sectors; first += kChunkSectors) {
        const std::size_t count = std::min(kChunkSectors, sectors - first);
        const ByteView part = volume.subspan(first * kSectorSize, count * kSectorSize);
        const bool isEmpty =
            std::all_of(part.begin(), part.end(), [](std::byte byte) { return byte == std::byte{0}; });
        if (isEmpty) {
            fork.chunk(kNothing, first, count, {});
        } else {
            fork.chunk(kDeflated, first, count, deflated(part));
        }
    }
    fork.chunk(kEnd, sectors, 0, {});
    return fork;
}

Data blockTable(const DataFork& fork, ByteView volume) {
    ByteWriter table;
    table.text("mish")
        .be32(1)
        .be64(0)
        .be64(volume.size() / kSectorSize)
        .be64(0)
        .be32(kChunkSectors + 8)
        .be32(0)
        .zeros(24);
    appendChecksum(table, crc32(volume));
    table.be32(fork.chunkCount).bytes(fork.chunks.data());
    return std::move(table).take();
}

Data propertyList(const Data& table) {
    const std::string name(kPartition);
    return propertyListDocument({{"resource-fork", Dictionary{{"blkx", Array{Dictionary{
                                                                           {"Attributes", "0x0050"},
                                                                           {"CFName", name},
                                                                           {"Data", table},
                                                                           {"ID", "0"},
                                                                           {"Name", name},
                                                                       }}}}}});
}

struct Trailer {
    std::size_t dataLength = 0;
    std::size_t propertyListLength = 0;
    std::uint32_t dataChecksum = 0;
    std::uint32_t masterChecksum = 0;

    /// The two code-signature fields are empty unless a signature of that length is before it.
    Data bytes(std::size_t signatureLength) const {
        const std::size_t end = dataLength + propertyListLength;
        ByteWriter trailer;
        trailer.be32(kUDIFMagic).be32(kUDIFVersion).be32(kUDIFHeaderSize).be32(1);
        trailer.be64(0);                   // running data fork offset
        trailer.be64(0).be64(dataLength);  // data fork
        trailer.be64(0).be64(0);           // resource fork
        trailer.be32(1).be32(1);           // segment number and count
        trailer.text("LUMORA--SAMPLE--");  // segment identifier
        appendChecksum(trailer, dataChecksum);
        trailer.be64(dataLength).be64(propertyListLength).zeros(64);
        trailer.be64(signatureLength == 0 ? 0 : end).be64(signatureLength).zeros(40);
        appendChecksum(trailer, masterChecksum);
        trailer.be32(1).be64(kVolumeSectors).zeros(12);
        return std::move(trailer).take();
    }
};

}  // namespace

Data makeDiskImage(ImageSignature signature) {
    const Data volume = makeSampleVolume(kText);
    const DataFork fork = pack(volume);
    const Data list = propertyList(blockTable(fork, volume));
    // The master checksum is that of the tables' checksums, one after the other.
    const Trailer trailer{.dataLength = fork.bytes.size(),
                          .propertyListLength = list.size(),
                          .dataChecksum = crc32(fork.bytes.data()),
                          .masterChecksum = crc32(ByteWriter().be32(crc32(volume)).data())};

    ByteWriter image;
    image.bytes(fork.bytes.data()).bytes(list);
    Data superblob;
    if (signature == ImageSignature::adHoc) {
        superblob = AdHocSignature{.identifier = std::string(kImageIdentifier),
                                   .code = image.data(),
                                   .components = {{kTrailerSlot, trailer.bytes(0)}}}
                        .superblob();
    }
    image.bytes(superblob).bytes(trailer.bytes(superblob.size()));
    return std::move(image).take();
}

std::string writeSampleDiskImage(const std::string& directory, const std::string& name,
                                 ImageSignature signature) {
    std::string path = directory + "/" + name;
    writeNewFile(path, makeDiskImage(signature), kPublicFileMode);
    return path;
}

}  // namespace pinwell::lumora
