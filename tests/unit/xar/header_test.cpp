// The fixed part of an archive.
#include "fixture.h"

namespace pinwell::test {
namespace {

using ArchiveHeader = ArchiveTest;

TEST_F(ArchiveHeader, AsItShouldBeOpens) {
    EXPECT_TRUE(opens(ArchiveBuilder()));
}

TEST_F(ArchiveHeader, OfAnotherMagicIsRefused) {
    EXPECT_FALSE(opens(ArchiveBuilder().magic("xar?")));
}

TEST_F(ArchiveHeader, OfFewerThan28BytesIsRefused) {
    EXPECT_FALSE(opens(ArchiveBuilder().headerSize(27)));
    EXPECT_FALSE(opens(ArchiveBuilder().headerSize(0)));
}

TEST_F(ArchiveHeader, AdditionalBytesOfALongerOneAreSkipped) {
    const ArchiveBuilder longer = ArchiveBuilder().headerTail(Data(5, std::byte{0xEE})).signature("CMS");
    const auto archive = open(longer);
    ASSERT_NE(archive, nullptr);
    EXPECT_EQ(signedData(archive), longer.rightChecksum());
}

TEST_F(ArchiveHeader, ThatEndsAfterTheFileIsRefused) {
    EXPECT_FALSE(opens(ArchiveBuilder().headerSize(0xFFFF)));
}

TEST_F(ArchiveHeader, OfAnyVersionOpens) {
    EXPECT_TRUE(opens(ArchiveBuilder().version(0)));
    EXPECT_TRUE(opens(ArchiveBuilder().version(0xFFFF)));
}

TEST_F(ArchiveHeader, TheUncompressedLengthIsNotLookedAt) {
    EXPECT_TRUE(opens(ArchiveBuilder().uncompressedLength(0)));
    EXPECT_TRUE(opens(ArchiveBuilder().uncompressedLength(~0ULL)));
}

TEST_F(ArchiveHeader, ACompressedLengthAfterTheEndOfTheFileIsRefused) {
    const std::size_t rest = ArchiveBuilder().build().size() - 28;
    EXPECT_FALSE(opens(ArchiveBuilder().compressedLength(rest + 1)));
    EXPECT_FALSE(opens(ArchiveBuilder().compressedLength(~0ULL)));
    EXPECT_FALSE(opens(ArchiveBuilder().compressedLength(~0ULL - 27)));
}

TEST_F(ArchiveHeader, EachNumberedAlgorithmIsKnown) {
    EXPECT_TRUE(opens(ArchiveBuilder().digest("none")));
    EXPECT_TRUE(opens(ArchiveBuilder().digest("sha1").algorithm(1)));
    EXPECT_TRUE(opens(ArchiveBuilder().digest("md5").algorithm(2)));
}

TEST_F(ArchiveHeader, In28BytesAlgorithms3And4AreSHA256AndSHA512) {
    EXPECT_TRUE(opens(ArchiveBuilder().digest("sha256").algorithm(3)));
    EXPECT_TRUE(opens(ArchiveBuilder().digest("sha512").algorithm(4)));
    EXPECT_FALSE(opens(ArchiveBuilder().digest("sha512").algorithm(3)));
    EXPECT_FALSE(opens(ArchiveBuilder().digest("sha512").algorithm(4).headerTail(Data(4))));
}

TEST_F(ArchiveHeader, AlgorithmNumbersWithoutAMeaningAreRefused) {
    EXPECT_FALSE(opens(ArchiveBuilder().algorithm(5)));
    EXPECT_FALSE(opens(ArchiveBuilder().algorithm(0xFFFFFFFF)));
}

TEST_F(ArchiveHeader, Algorithm3IsNamedAfterByte28) {
    for (const char* name : {"sha1", "md5", "sha224", "sha256", "sha384", "sha512"})
        EXPECT_TRUE(opens(ArchiveBuilder().namedDigest(name))) << name;
}

TEST_F(ArchiveHeader, ANameThatIsNoDigestIsRefused) {
    for (const char* name : {"none", "None", "sha3", "sha256x", "sha25", "SHA256", "Sha256"})
        EXPECT_FALSE(opens(ArchiveBuilder().namedDigest("sha256").headerTail([&] {
            Data tail = base::toData(name);
            tail.resize(12);
            return tail;
        }())))
            << name;
    EXPECT_FALSE(opens(ArchiveBuilder().namedDigest("sha256").headerTail(Data(8)))) << "empty";
}

TEST_F(ArchiveHeader, ANameWithoutAnEndIsRefused) {
    EXPECT_FALSE(opens(ArchiveBuilder().namedDigest("sha1").headerTail(base::toData("sha1"))));
}

TEST_F(ArchiveHeader, WithANameIsAtLeast32BytesAndAMultipleOf4) {
    const auto withTail = [](std::size_t length) {
        Data tail = base::toData("md5");
        tail.resize(length);
        return ArchiveBuilder().namedDigest("md5").headerTail(tail);
    };
    EXPECT_FALSE(opens(withTail(3)));
    EXPECT_TRUE(opens(withTail(4)));
    EXPECT_FALSE(opens(withTail(5)));
    EXPECT_FALSE(opens(withTail(6)));
    EXPECT_TRUE(opens(withTail(8)));
    EXPECT_TRUE(opens(withTail(1000)));
}

}  // namespace
}  // namespace pinwell::test
