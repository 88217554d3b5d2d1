#include "lumora-local/samples.h"

#include <gtest/gtest.h>
#include <sys/stat.h>

#include <filesystem>
#include <map>

#include "base/byte_io.h"
#include "base/bytes.h"
#include "base/text.h"
#include "crypto/crypto.h"
#include "formats/executable_image.h"
#include "lumora-local/failure.h"
#include "support/temporary_directory.h"
#include "values/bundle.h"
#include "values/property_list.h"
#include "values/value.h"

namespace pinwell::lumora {
namespace {

using base::ByteReader;
using base::ByteView;
using base::Data;
using pinwell::test::readFile;
using pinwell::test::TemporaryDirectory;
using pinwell::test::writeFile;

const SealedComponents kComponents{base::toData("the property list"), base::toData("the seal")};

Data reading(ByteReader reader, std::uint64_t length) {
    return base::toData(reader.bytes(length, "bytes"));
}

/// The signature of a thin image, found through its load commands; it must end the image.
Data signatureOf(const Data& image) {
    ByteReader reader(image);
    EXPECT_EQ(reader.le32("magic"), 0xFEEDFACFU);
    reader.skip(12, "processor and kind");
    const std::uint32_t commands = reader.le32("commands");
    const std::uint32_t commandsSize = reader.le32("size of commands");
    reader.skip(8, "flags");
    ByteReader list = reader.sub(reader.position(), commandsSize, "commands");
    Data signature;
    for (std::uint32_t i = 0; i < commands; ++i) {
        const std::uint32_t command = list.le32("command");
        const std::uint32_t size = list.le32("size");
        ByteReader rest = list.sub(list.position(), size - 8U, "command");
        list.skip(size - 8U, "command");
        if (command != 0x1D) continue;
        EXPECT_EQ(size, 16U);
        const std::uint32_t offset = rest.le32("offset");
        const std::uint32_t length = rest.le32("length");
        EXPECT_EQ(std::size_t{offset} + length, image.size());
        signature = reading(reader.sub(offset, length, "signature"), length);
    }
    EXPECT_TRUE(list.atEnd());
    return signature;
}

std::map<std::uint32_t, Data> blobsOf(const Data& signature) {
    ByteReader reader(signature);
    EXPECT_EQ(reader.be32("magic"), 0xFADE0CC0U);
    EXPECT_EQ(reader.be32("length"), signature.size());
    const std::uint32_t count = reader.be32("count");
    std::map<std::uint32_t, Data> blobs;
    for (std::uint32_t i = 0; i < count; ++i) {
        const std::uint32_t slot = reader.be32("slot");
        const std::uint32_t offset = reader.be32("offset");
        ByteReader blob = reader.sub(offset, signature.size() - offset, "blob");
        blob.skip(4, "magic");
        const std::uint32_t length = blob.be32("length");
        blob.seek(0, "blob");
        blobs[slot] = reading(blob, length);
    }
    return blobs;
}

class SignedImage : public testing::TestWithParam<std::uint32_t> {
  protected:
    const Data image_ = makeSignedImage(GetParam(), "an.identifier", kComponents);
    std::map<std::uint32_t, Data> blobs_ = blobsOf(signatureOf(image_));
};

TEST_P(SignedImage, HoldsACodeDirectoryRequirementsAndAnEmptySignature) {
    ASSERT_EQ(blobs_.size(), 3U);
    EXPECT_EQ(base::toHex(blobs_[2]), "fade0c010000000c00000000");
    EXPECT_EQ(base::toHex(blobs_[0x10000]), "fade0b0100000008");
}

TEST_P(SignedImage, MatchesItsCodeDirectory) {
    ByteReader reader(blobs_[0]);
    EXPECT_EQ(reader.be32("magic"), 0xFADE0C02U);
    EXPECT_EQ(reader.be32("length"), blobs_[0].size());
    EXPECT_EQ(reader.be32("version"), 0x20400U);
    EXPECT_EQ(reader.be32("flags"), 2U);
    const std::uint32_t hashes = reader.be32("hash offset");
    const std::uint32_t identifier = reader.be32("identifier offset");
    const std::uint32_t special = reader.be32("special slots");
    const std::uint32_t code = reader.be32("code slots");
    const std::uint32_t limit = reader.be32("limit");
    EXPECT_EQ(reader.u8("digest size"), 32);
    EXPECT_EQ(reader.u8("digest type"), 2);
    EXPECT_EQ(reader.u8("platform"), 0);
    EXPECT_EQ(reader.u8("page size"), 12);
    reader.seek(identifier, "identifier");
    EXPECT_EQ(base::toString(reader.bytes(14, "identifier")), std::string("an.identifier\0", 14));

    // Special slots count down to the code hashes.
    ASSERT_EQ(special, 3U);
    reader.seek(hashes - 3U * 32U, "special slots");
    EXPECT_EQ(reading(reader, 32), crypto::sha256(kComponents.resourceSeal));
    reader.skip(32, "slot 3");
    EXPECT_EQ(reading(reader, 32), crypto::sha256(blobs_[2]));
    reader.skip(32, "slot 2");
    EXPECT_EQ(reading(reader, 32), crypto::sha256(kComponents.informationPropertyList));
    reader.skip(32, "slot 1");

    ASSERT_EQ(std::size_t{limit}, image_.size() - signatureOf(image_).size());
    ASSERT_EQ(code, limit / 4096U);
    for (std::uint32_t page = 0; page < code; ++page) {
        EXPECT_EQ(base::toData(reader.bytes(32, "page")),
                  crypto::sha256(ByteView(image_).subspan(std::size_t{page} * 4096, 4096)));
    }
    EXPECT_TRUE(reader.atEnd());
}

INSTANTIATE_TEST_SUITE_P(Processors, SignedImage, testing::Values(kCpuType64Arm, kCpuType64X86),
                         [](const auto& processor) {
                             return processor.param == kCpuType64Arm ? "Arm64" : "X86_64";
                         });

TEST(UniversalImage, ListsItsSlicesAtAlignedPlaces) {
    const Data first(20'000, std::byte{1});
    const Data second(10, std::byte{2});
    const Data image = makeUniversalImage({{kCpuType64X86, first}, {kCpuType64Arm, second}});
    ByteReader reader(image);
    EXPECT_EQ(reader.be32("magic"), 0xCAFEBABEU);
    EXPECT_EQ(reader.be32("count"), 2U);
    for (const auto& [cpuType, slice] : {std::pair(kCpuType64X86, first), std::pair(kCpuType64Arm, second)}) {
        EXPECT_EQ(reader.be32("processor"), cpuType);
        reader.skip(4, "subtype");
        const std::uint32_t offset = reader.be32("offset");
        const std::uint32_t length = reader.be32("length");
        EXPECT_EQ(reader.be32("alignment"), 14U);
        EXPECT_EQ(offset % 16384U, 0U);
        EXPECT_EQ(reading(reader.sub(offset, length, "slice"), length), slice);
    }
}

TEST(SampleApplication, IsABundleWithAnExecutable) {
    const TemporaryDirectory directory;
    const std::string path = writeSampleApplication(directory.path());
    ASSERT_EQ(path, directory / "Sample.app");
    const auto executable = values::mainExecutableOfBundle(path);
    ASSERT_TRUE(executable);
    struct stat status {};
    ASSERT_EQ(::stat(executable->c_str(), &status), 0);
    EXPECT_NE(status.st_mode & 0111U, 0U);
    EXPECT_TRUE(values::parsePropertyList(base::toData(readFile(path + "/Contents/Info.plist"))));
}

TEST(SampleApplication, IsSignedOverItsOwnPropertyList) {
    const TemporaryDirectory directory;
    const std::string contents = writeSampleApplication(directory.path()) + "/Contents";
    const Data universal = base::toData(readFile(contents + "/Programs/Sample"));
    ByteReader reader(universal);
    reader.seek(8 + 8, "first slice");
    const std::uint32_t offset = reader.be32("offset");
    const std::uint32_t length = reader.be32("length");
    auto blobs = blobsOf(signatureOf(reading(reader.sub(offset, length, "slice"), length)));
    ByteReader codeDirectory(blobs[0]);
    codeDirectory.seek(16, "hash offset");
    const std::uint32_t hashes = codeDirectory.be32("hash offset");
    codeDirectory.seek(hashes - 32U, "slot 1");
    EXPECT_EQ(reading(codeDirectory, 32), crypto::sha256(base::toData(readFile(contents + "/Info.plist"))));
}

TEST(SampleApplication, OverwritesNothing) {
    const TemporaryDirectory directory;
    writeFile(directory / "Sample.app/Contents/mine", "mine");
    EXPECT_THROW(writeSampleApplication(directory.path()), Failure);
    EXPECT_EQ(readFile(directory / "Sample.app/Contents/mine"), "mine");
    EXPECT_FALSE(std::filesystem::exists(directory / "Sample.app/Contents/Info.plist"));
}

TEST(SampleApplication, IsReproducible) {
    EXPECT_EQ(makeSignedImage(kCpuType64Arm, "a", kComponents),
              makeSignedImage(kCpuType64Arm, "a", kComponents));
}

}  // namespace
}  // namespace pinwell::lumora
