// Disk images and packages: the index of a superblob, and the chain of trailers.
#include <memory>

#include "base/byte_io.h"
#include "codesign/code_signing.h"
#include "costly_input.h"
#include "src/PWHashedFile/PWHashedDiskImage.h"
#include "src/PWHashedFile/PWHashedFlatPackage.h"
#include "support/code_directory_builder.h"
#include "support/disk_image_builder.h"
#include "support/package_builder.h"
#include "support/test_platform.h"

namespace pinwell::test {
namespace {

using base::ByteWriter;
using base::toData;

/// Whether it is a disk image; reads its ticket and its hash.
bool readImage(const Data& image) {
    TestPlatform platform;
    writeFile(platform.directory / "Sample.dmg", base::ByteView(image));
    const auto codeSigning = codesign::makeCodeSigningService();
    const Platform services = platform.servicesWith(*codeSigning);
    PWHashedDiskImage file(platform.directory.url("Sample.dmg"), services);
    static_cast<void>(file.ticketData());
    static_cast<void>(file.cdHash());
    return file.appropriateExitCode() == 0;
}

/// Whether the package has a ticket.
bool readPackage(const Data& package) {
    TestPlatform platform;
    writeFile(platform.directory / "Sample.pkg", base::ByteView(package));
    PWHashedFlatPackage file(platform.directory.url("Sample.pkg"), platform.services());
    return file.ticketData().has_value();
}

/// An image with this superblob: entries of slot and offset, then the bytes after them.
Data imageWith(const std::vector<std::pair<std::uint32_t, std::uint32_t>>& index, const Data& behind) {
    ByteWriter superblob;
    superblob.be32(0xFADE0CC0)
        .be32(static_cast<std::uint32_t>(12 + 8 * index.size() + behind.size()))
        .be32(static_cast<std::uint32_t>(index.size()));
    for (const auto& [slot, offset] : index) superblob.be32(slot).be32(offset);
    superblob.bytes(behind);
    return DiskImageBuilder().superblob(superblob.data()).build();
}

/// Blobs of `size` bytes with their header, back to back; slots from 0x20000 on.
Data imageOfBlobs(std::size_t length, std::uint32_t size, bool isReversed = false, bool isOneSlot = false) {
    const auto count = static_cast<std::uint32_t>(length / (size + 8) + 1);
    std::vector<std::pair<std::uint32_t, std::uint32_t>> index;
    ByteWriter blobs;
    for (std::uint32_t i = 0; i < count; ++i) {
        const std::uint32_t place = isReversed ? count - 1 - i : i;
        index.emplace_back(isOneSlot ? 0x20000U : 0x20000 + i, 12 + 8 * count + size * place);
        blobs.be32(0xFADE7171).be32(size).zeros(size - 8);
    }
    return imageWith(index, blobs.data());
}

Data ordinaryImage(std::size_t length) {
    return imageOfBlobs(length, 56);
}

CostlyInput image(std::string name, std::string cost, bool isTaken, std::function<Data(std::size_t)> costly) {
    return {.name = "Image" + std::move(name),
            .cost = std::move(cost),
            .read = readImage,
            .isTaken = isTaken,
            .costly = std::move(costly),
            .control = ordinaryImage};
}

/// A package that ends in a ticket and in unknown trailers with `size` bytes of data each.
Data packageOfTrailers(std::size_t length, std::size_t size) {
    const std::string one = PackageBuilder().archive({}).unknown(std::string(size, 'x')).build();
    return toData(PackageBuilder().terminator().ticket("TICKET").build() + filled(one, length));
}

Data ordinaryPackage(std::size_t length) {
    return packageOfTrailers(length, 48);
}

CostlyInput package(std::string name, std::string cost, std::function<Data(std::size_t)> costly) {
    return {.name = "Package" + std::move(name),
            .cost = std::move(cost),
            .read = readPackage,
            .isTaken = true,
            .costly = std::move(costly),
            .control = ordinaryPackage};
}

}  // namespace

std::vector<CostlyInput> artefactInputs() {
    return {
        image("OfTheSmallestBlobs", "as many blobs as there is room for", true,
              [](std::size_t length) { return imageOfBlobs(length, 8); }),
        image("OfBlobsInOneSlot", "the smallest blobs, all in one slot", true,
              [](std::size_t length) { return imageOfBlobs(length, 8, false, true); }),
        image("OfBlobsInReverse", "an index against the order of the file", false,
              [](std::size_t length) { return imageOfBlobs(length, 8, true); }),
        image("OfTickets", "the smallest blobs, every one a ticket", true,
              [](std::size_t length) {
                  const auto count = static_cast<std::uint32_t>(length / 16 + 1);
                  std::vector<std::pair<std::uint32_t, std::uint32_t>> index;
                  ByteWriter blobs;
                  for (std::uint32_t i = 0; i < count; ++i) {
                      index.emplace_back(0x10002, 12 + 8 * count + 8 * i);
                      blobs.be32(0xFADE0B01).be32(8);
                  }
                  return imageWith(index, blobs.data());
              }),
        image(
            "OfEqualEntries", "an index whose entries are all equal", false,
            [](std::size_t length) {
                const auto count = static_cast<std::uint32_t>(length / 16 + 1);
                const std::vector<std::pair<std::uint32_t, std::uint32_t>> index(count, {2, 12 + 8 * count});
                return imageWith(index, Data(8 * std::size_t{count}));
            }),
        image("OfEntriesOnOneBlob", "an index whose entries lead to one long blob", false,
              [](std::size_t length) {
                  const auto count = static_cast<std::uint32_t>(length / 16 + 1);
                  std::vector<std::pair<std::uint32_t, std::uint32_t>> index;
                  for (std::uint32_t i = 0; i < count; ++i) index.emplace_back(i, 12 + 8 * count);
                  return imageWith(
                      index, ByteWriter().be32(2).be32(8 * count).zeros(8 * std::size_t{count} - 8).data());
              }),
        image("OfALongCodeDirectory", "a scatter vector that fills a code directory", true,
              [](std::size_t length) {
                  Data records((length / 24 + 1) * 24, std::byte{1});
                  records.resize(records.size() + 24);
                  return DiskImageBuilder()
                      .superblob(SuperBlobBuilder().blob(0, CodeDirectoryBuilder().scatter(records).build()))
                      .build();
              }),
        package("OfEmptyTrailers", "trailers that are records alone",
                [](std::size_t length) { return packageOfTrailers(length, 0); }),
        package("OfTrailersOfOneByte", "trailers that are hardly more than records",
                [](std::size_t length) { return packageOfTrailers(length, 1); }),
        package("OfTrailersLongerThanTheWindow", "trailers that a window is read for in vain",
                [](std::size_t length) { return packageOfTrailers(length, 65'536); }),
        package("OfTrailersHalfAsLongAsTheWindow", "trailers of which the window has every other one",
                [](std::size_t length) { return packageOfTrailers(length, 32'769); }),
    };
}

}  // namespace pinwell::test
