#include "lumora-local/samples.h"

#include <gmock/gmock.h>

#include <filesystem>

#include "base/byte_io.h"
#include "crypto/crypto.h"
#include "fixed_now.h"
#include "lumora-local/failure.h"
#include "support/temporary_directory.h"

namespace pinwell::lumora {
namespace {

using base::ByteReader;
using base::Data;
using pinwell::test::readFile;
using pinwell::test::TemporaryDirectory;
using pinwell::test::writeFile;
using testing::ElementsAre;

TEST(Samples, AreOneOfEveryKindInADirectoryThatIsMade) {
    const TemporaryDirectory directory;
    const std::string in = directory / "new/samples/";
    EXPECT_THAT(writeSamples(directory / "new/samples", kNow),
                ElementsAre(in + "Sample.app", in + "Sample.dmg", in + "Unsigned.dmg", in + "Sample.pkg"));
    EXPECT_EQ(base::toData(readFile(in + "Sample.dmg")), makeDiskImage(ImageSignature::adHoc));
    EXPECT_EQ(base::toData(readFile(in + "Unsigned.dmg")), makeDiskImage(ImageSignature::none));
}

TEST(Samples, AreNotWrittenWhenAnyOfThemExists) {
    for (const char* const name : {"Sample.app", "Sample.dmg", "Unsigned.dmg", "Sample.pkg"}) {
        const TemporaryDirectory directory;
        writeFile(directory / name, "mine");
        EXPECT_THROW(writeSamples(directory.path(), kNow), Failure);
        EXPECT_EQ(readFile(directory / name), "mine");
        EXPECT_EQ(std::distance(std::filesystem::directory_iterator(directory.path()), {}), 1) << name;
    }
}

TEST(Samples, NameADirectoryThatCannotBeMade) {
    const TemporaryDirectory directory;
    writeFile(directory / "file", "mine");
    try {
        writeSamples(directory / "file/samples", kNow);
        FAIL() << "a directory below a file";
    } catch (const Failure& failure) {
        EXPECT_EQ(failure.exitStatus(), EX_CANTCREAT);
        EXPECT_EQ(failure.what(), "cannot create " + (directory / "file/samples") + ": Not a directory");
    }
}

TEST(Samples, AreNotWrittenOverADanglingLink) {
    const TemporaryDirectory directory;
    std::filesystem::create_symlink(directory / "elsewhere", directory / "Sample.dmg");
    EXPECT_THROW(writeSamples(directory.path(), kNow), Failure);
    EXPECT_FALSE(std::filesystem::exists(directory / "elsewhere"));
}

TEST(SampleVolume, HasTheSizeInItsBootSector) {
    const Data volume = makeSampleVolume("text");
    EXPECT_EQ(volume.size(), kVolumeSectors * kSectorSize);
    ByteReader reader(volume);
    reader.seek(19, "sectors");
    EXPECT_EQ(reader.le16("sectors"), kVolumeSectors);
    reader.seek(510, "mark");
    EXPECT_EQ(reader.be16("mark"), 0x55AA);
}

TEST(SampleVolume, CutsTextAfterItsOneCluster) {
    EXPECT_EQ(makeSampleVolume(std::string(600, 'x')), makeSampleVolume(std::string(512, 'x')));
}

TEST(SampleDiskImage, DiffersFromTheUnsignedOneInSuperblobAndTwoFieldsOfTheTrailerAlone) {
    const Data plain = makeDiskImage(ImageSignature::none);
    const Data withSignature = makeDiskImage(ImageSignature::adHoc);
    const std::size_t end = plain.size() - 512;
    const auto at = [](std::size_t offset) { return static_cast<std::ptrdiff_t>(offset); };
    EXPECT_TRUE(std::equal(plain.begin(), plain.begin() + at(end), withSignature.begin()));
    Data trailer(withSignature.end() - 512, withSignature.end());
    ByteReader reader(trailer);
    reader.seek(296, "code signature");
    EXPECT_EQ(reader.be64("offset"), end);
    EXPECT_EQ(reader.be64("length"), withSignature.size() - plain.size());
    std::fill_n(trailer.begin() + 296, 16, std::byte{0});
    EXPECT_TRUE(std::equal(trailer.begin(), trailer.end(), plain.end() - 512));
}

TEST(SampleDiskImage, IsSignedOverItsTrailerAndEveryPageOfItsData) {
    const Data plain = makeDiskImage(ImageSignature::none);
    const Data image = makeDiskImage(ImageSignature::adHoc);
    const std::size_t end = plain.size() - 512;
    ASSERT_LT(end, 4096U);  // one page
    ByteReader reader(image);
    reader.seek(end + 12 + 3 * 8, "code directory");
    const std::size_t start = reader.position();
    EXPECT_EQ(reader.be32("magic"), 0xFADE0C02U);
    reader.skip(12, "length, version, flags");
    const std::uint32_t hashes = reader.be32("hash offset");
    reader.skip(4, "identifier");
    EXPECT_EQ(reader.be32("special slots"), 6U);
    EXPECT_EQ(reader.be32("code slots"), 1U);
    EXPECT_EQ(reader.be32("limit"), end);
    const auto digestAt = [&](std::size_t offset) {
        reader.seek(start + offset, "digest");
        return base::toData(reader.bytes(32, "digest"));
    };
    EXPECT_EQ(digestAt(hashes), crypto::sha256(base::ByteView(plain).first(end)));
    EXPECT_EQ(digestAt(hashes - 6U * 32U), crypto::sha256(base::ByteView(plain).subspan(end)));
}

TEST(SamplePackage, BeginsWithAnArchivesHeader) {
    const Data package = makePackage(kNow);
    ByteReader reader(package);
    EXPECT_EQ(base::toString(base::toData(reader.bytes(4, "magic"))), "xar!");
    EXPECT_EQ(reader.be16("size"), 28U);
    EXPECT_EQ(reader.be16("version"), 1U);
    EXPECT_LT(reader.be64("compressed length"), package.size());
}

TEST(SamplePackage, IsSignedByAFreshKey) {
    EXPECT_NE(makePackage(kNow), makePackage(kNow));
}

}  // namespace
}  // namespace pinwell::lumora
