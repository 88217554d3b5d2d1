#include <gtest/gtest.h>

#include <algorithm>

#include "allocation_count.h"
#include "formats/package_trailers.h"
#include "src/PWHashedFile/PWHashedDiskImage.h"
#include "src/PWHashedFile/PWHashedFlatPackage.h"
#include "support/disk_image_builder.h"
#include "support/package_builder.h"
#include "support/test_platform.h"

namespace pinwell::test {
namespace {

TEST(BoundedWork, ManyTrailersAreReadInAFewPieces) {
    constexpr std::size_t kTrailers = 10'000;
    PackageBuilder builder;
    builder.terminator();
    for (std::size_t i = 0; i < kTrailers; ++i) builder.unknown("");
    TestPlatform platform;
    writeFile(platform.directory / "Sample.pkg", builder.build());

    PWHashedFlatPackage package(platform.directory.url("Sample.pkg"), platform.services());
    EXPECT_EQ(package._ticketData(), std::nullopt);
    ASSERT_TRUE(package.dataToAppend());
    EXPECT_EQ(package.dataToAppend()->size(), kTrailers * kTrailerSize);
    EXPECT_LE(platform.files.count("handle.read"), 16U);
}

TEST(BoundedWork, TrailersThatClaimMoreThanTheFileAreNotRead) {
    for (const std::uint16_t type : {kTicketTrailerType, kUnknownTrailerType}) {
        TestPlatform platform;
        writeFile(platform.directory / "Sample.pkg",
                  PackageBuilder().terminator().trailer({.type = type, .length = ~0U}).build());
        PWHashedFlatPackage package(platform.directory.url("Sample.pkg"), platform.services());
        const AllocationCount count;
        EXPECT_EQ(package._ticketData(), std::nullopt);
        EXPECT_LE(platform.files.count("handle.read"), 1U);
        EXPECT_LE(count.largest(), 64U * 1024);
    }
}

TEST(BoundedWork, DiskImageIsReadOnceForItsTrailerAndOnceForItsSignature) {
    TestPlatform platform;
    writeFile(platform.directory / "Sample.dmg",
              DiskImageBuilder().superblob(DiskImageBuilder::signature()).build());
    const PWHashedDiskImage image(platform.directory.url("Sample.dmg"), platform.services());
    EXPECT_EQ(image.appropriateExitCode(), kExitOK);
    EXPECT_EQ(platform.files.count("handle.read"), 2U);
}

TEST(BoundedWork, DiskImageWhoseSignatureClaimsMoreThanTheFileIsNotReadForIt) {
    for (const std::uint64_t length : {~0ULL, 1ULL << 40U}) {
        TestPlatform platform;
        writeFile(platform.directory / "Sample.dmg",
                  DiskImageBuilder().superblob(DiskImageBuilder::signature()).codeSignLength(length).build());
        const AllocationCount count;
        const PWHashedDiskImage image(platform.directory.url("Sample.dmg"), platform.services());
        EXPECT_EQ(image.appropriateExitCode(), kExitNoInput);
        EXPECT_EQ(platform.files.count("handle.read"), 1U);
        EXPECT_LE(count.largest(), 64U * 1024);
    }
}

}  // namespace
}  // namespace pinwell::test
