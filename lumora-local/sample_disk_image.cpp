#include "lumora-local/sample_disk_image.h"

#include <algorithm>
#include <cstdint>
#include <utility>

#include "foundation/byte_writer.h"
#include "lumora-local/ad_hoc_signature.h"
#include "lumora-local/deflate.h"
#include "lumora-local/file_writing.h"
#include "lumora-local/sample_volume.h"

namespace pinwell::lumora {
namespace {

using foundation::Array;
using foundation::ByteView;
using foundation::ByteWriter;
using foundation::Data;
using foundation::Dictionary;

constexpr std::string_view kImageIdentifier = "example.lumora.sample.image";
constexpr std::string_view kText = "A sample disk image, to try a record service with.\r\n";
constexpr std::string_view kPartition = "Sample (DOS_FAT_12 : 0)";

constexpr std::uint32_t kDeflated = 0x80000005;
constexpr std::uint32_t kNothing = 2;
constexpr std::uint32_t kEnd = 0xFFFFFFFF;
constexpr std::size_t kChunkSectors = 64;
constexpr std::size_t kTrailerSize = 512;
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
        trailer.text("koly").be32(4).be32(kTrailerSize).be32(1);
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
    writeNewFile(path, makeDiskImage(signature), 0644);
    return path;
}

}  // namespace pinwell::lumora
