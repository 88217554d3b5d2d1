#include "artefacts.h"

#include <utility>

#include "base/byte_io.h"
#include "base/text.h"
#include "support/archive_builder.h"
#include "support/code_directory_builder.h"
#include "support/disk_image_builder.h"
#include "support/executable_image_builder.h"
#include "support/file_properties.h"
#include "support/package_builder.h"
#include "support/temporary_directory.h"

namespace pinwell::test {
namespace {

using base::ByteWriter;

constexpr std::uint8_t kSHA1 = 1;
constexpr std::uint8_t kSHA256 = 2;

/// The synthetic code directory of an unsigned image: SHA-256 of its data, its trailer and the empty
/// requirements.
Data madeUpCodeDirectory(const Data& data, const Data& trailer) {
    return ByteWriter()
        .be32(0xFADE0C02)
        .be32(48 + 6 + 7 * 32)  // length
        .be32(0x20100)
        .be32(2)                // flags: ad hoc
        .be32(48 + 6 + 6 * 32)  // hash offset
        .be32(48)               // identifier offset
        .be32(6)                // special slots
        .be32(1)                // code slots
        .be32(static_cast<std::uint32_t>(data.size()))
        .be32(0x20020000)  // digest size, digest type, platform, page size
        .be64(0)           // spare, scatter offset
        .text("ADHOC")
        .u8(0)
        .bytes(codeDigest(kSHA256, trailer))  // slot 6
        .zeros(3 * 32)
        .bytes(codeDigest(kSHA256, emptyRequirements()))  // slot 2
        .zeros(32)
        .bytes(codeDigest(kSHA256, data))
        .data();
}

std::string imageWith(const Data& data, SuperBlobBuilder superblob, const Data& ticket) {
    superblob.blob(kSampleTicketSlot, ticketBlob(base::toString(ticket)));
    return base::toString(DiskImageBuilder().data(data).superblob(superblob).build());
}

}  // namespace

std::string Artefact::prettyHash() const {
    return std::to_string(algorithm) + "/" + base::toHex(hash);
}

TicketPayloadBuilder Artefact::payload() const {
    return TicketPayloadBuilder().entry(algorithm, hash);
}

std::string Artefact::kind() const {
    std::string kind = name.substr(0, name.find('.'));
    if (isBundle()) return kind + "Bundle";
    return kind + (name.ends_with(".dmg") ? "Image" : "Package");
}

Data irregularData(std::size_t count) {
    return base::toData(irregularBytes(count));
}

Artefact signedImage(const Data& data) {
    const SuperBlobBuilder signature = DiskImageBuilder::signature();
    return {.name = "Signed.dmg",
            .contents = base::toString(DiskImageBuilder().data(data).superblob(signature).build()),
            .algorithm = kSHA256,
            .hash = codeHashOf(kSHA256, DiskImageBuilder::codeDirectory()),
            .stapledWith = [=](const Data& ticket) { return imageWith(data, signature, ticket); }};
}

Artefact unsignedImage(const Data& data) {
    const DiskImageBuilder image = DiskImageBuilder().data(data);
    return {.name = "Unsigned.dmg",
            .contents = base::toString(image.build()),
            .algorithm = kSHA256,
            .hash = codeHashOf(kSHA256, madeUpCodeDirectory(data, image.trailer())),
            .stapledWith = [=](const Data& ticket) { return imageWith(data, SuperBlobBuilder(), ticket); }};
}

Artefact signedPackage(const Data& data) {
    const ArchiveBuilder archive = ArchiveBuilder().signature("CMS").afterChecksum(data);
    const PackageBuilder package = PackageBuilder().archive(archive.build());
    return {.name = "Signed.pkg",
            .contents = package.build(),
            .algorithm = kSHA1,
            .hash = archive.rightChecksum(),
            .stapledWith = [=](const Data& ticket) {
                return PackageBuilder(package).terminator().ticket(base::toString(ticket)).build();
            }};
}

Artefact signedBundle(const Data& data) {
    const Data codeDirectory = CodeDirectoryBuilder().covers(2, emptyRequirements()).build();
    const SuperBlobBuilder signature = SuperBlobBuilder::adHoc(codeDirectory);
    return {.name = "Signed.app",
            .contents = base::toString(data),
            .algorithm = kSHA256,
            .hash = codeHashOf(kSHA256, codeDirectory),
            .stapledWith = [](const Data& ticket) { return base::toString(ticket); },
            .executable = ExecutableImageBuilder().signature(signature.build()).build()};
}

Artefact writeArtefact(Artefact artefact, const std::string& path) {
    artefact.path = path;
    if (artefact.isBundle()) BundleBuilder().executable(artefact.executable).write(path);
    writeFile(artefact.file(), artefact.contents);
    return artefact;
}

}  // namespace pinwell::test
