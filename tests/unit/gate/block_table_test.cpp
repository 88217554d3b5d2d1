// The second opinion on a disk image's data: its own checksums.
#include "verify/block_table.h"

#include <gmock/gmock.h>

#include "base/byte_source.h"
#include "support/archive_builder.h"
#include "support/tabled_image_builder.h"
#include "verify/check.h"

namespace pinwell::test {
namespace {

using base::MemorySource;
using codesign::DiskImageTrailer;
using testing::AllOf;
using testing::Contains;
using testing::Each;
using testing::HasSubstr;
using testing::SizeIs;
using verify::Check;
using verify::Outcome;
using verify::Section;

std::vector<Check> checksOf(const Data& image) {
    const MemorySource source(image);
    const std::optional<DiskImageTrailer> trailer = DiskImageTrailer::read(source);
    EXPECT_TRUE(trailer.has_value());
    verify::Workers workers(2);
    Section section;
    checkBlockTables(source, *trailer, workers, section);
    return section.checks;
}
std::vector<Check> checksOf(const TabledImageBuilder& image) {
    return checksOf(image.build());
}

auto is(Outcome outcome) {
    return testing::Field(&Check::outcome, outcome);
}
auto failsAt(const std::string& place) {
    return Contains(AllOf(is(Outcome::failed), testing::Field(&Check::place, HasSubstr(place))));
}
auto isSkippedBecause(const std::string& why) {
    return testing::ElementsAre(AllOf(is(Outcome::skipped), testing::Field(&Check::found, HasSubstr(why))));
}

const Data kSome(2048, std::byte{0x5A});
const Data kOther(1024, std::byte{0x17});

TEST(BlockTable, AgreesWithTheDataOfASoundImage) {
    EXPECT_THAT(checksOf(TabledImageBuilder().plain(kSome).zeros(10'000).zlib(kOther).zeros(3)),
                AllOf(SizeIs(3), Each(is(Outcome::passed))));
}

TEST(BlockTable, FindsOtherDataThanItsChecksums) {
    for (const auto make : {+[] { return TabledImageBuilder().plain(kSome); },
                            +[] { return TabledImageBuilder().zlib(kSome); }}) {
        const std::uint32_t wrong = 0x12345678;
        EXPECT_THAT(checksOf(make().tableChecksum(wrong)), failsAt("block table 1 (whole)"));
        EXPECT_THAT(checksOf(make().masterChecksum(wrong)), failsAt("master checksum"));
        EXPECT_THAT(checksOf(make().dataChecksum(wrong)), failsAt("data fork"));
    }
}

TEST(BlockTable, FindsAByteThatDiffers) {
    Data image = TabledImageBuilder().plain(kSome).build();
    image[100] ^= std::byte{1};
    EXPECT_THAT(checksOf(image), AllOf(failsAt("block table 1"), failsAt("data fork")));
}

TEST(BlockTable, FindsBlocksThatCannotBeUnpacked) {
    EXPECT_THAT(checksOf(TabledImageBuilder().block(0x80000005, 4, kSome, kSome)), failsAt("block table 1"));
    EXPECT_THAT(checksOf(TabledImageBuilder().block(0x80000005, 3, deflated(kSome), kSome)),
                failsAt("block table 1"));
    EXPECT_THAT(checksOf(TabledImageBuilder().block(0x80000005, 5, deflated(kSome), kSome)),
                failsAt("block table 1"));
    EXPECT_THAT(checksOf(TabledImageBuilder().block(1, 5, kSome, kSome)), failsAt("block table 1"));
}

TEST(BlockTable, FindsTablesThatContradictThemselves) {
    EXPECT_THAT(checksOf(TabledImageBuilder().plain(kSome).sectorCount(5)), failsAt("block table 1"));
    EXPECT_THAT(checksOf(TabledImageBuilder().plain(kSome).gapBeforeNext().plain(kOther)),
                failsAt("block table 1"));
    EXPECT_THAT(checksOf(TabledImageBuilder().plain(kSome).again(4, kSome.size())), failsAt("block tables"));
    EXPECT_THAT(checksOf(TabledImageBuilder().plain(kSome).again(4, std::uint64_t{1} << 63U)),
                failsAt("block table 1"));
    EXPECT_THAT(checksOf(TabledImageBuilder().block(0, std::uint64_t{1} << 62U, {}, {})),
                failsAt("block table 1"));
}

TEST(BlockTable, ReportsSkippedTables) {
    EXPECT_THAT(
        checksOf(TabledImageBuilder().block(0x80000006, 4, kSome, kSome).dataChecksum(0)),
        Contains(AllOf(is(Outcome::skipped), testing::Field(&Check::found, HasSubstr("packed in a way")))));
    EXPECT_THAT(
        checksOf(TabledImageBuilder().plain(kSome).tableChecksumType(4)),
        Contains(AllOf(is(Outcome::skipped), testing::Field(&Check::found, HasSubstr("known kind")))));
}

TEST(BlockTable, IsSkippedWhereItWouldUnpackToMoreThanTheLimit) {
    TabledImageBuilder image;
    // Blocks that claim more than they have.
    image.block(0x80000005, verify::kMaximumUnpacked / 512 + 1, deflated(kSome), kSome);
    EXPECT_THAT(checksOf(image), isSkippedBecause("more than 256 MiB"));
    TabledImageBuilder many;
    for (std::size_t i = 0; i <= verify::kMaximumBlocks; ++i) many.block(0, 1, {}, {});
    EXPECT_THAT(checksOf(many), isSkippedBecause("more than 256 MiB"));
}

TEST(BlockTable, IsSkippedWhereThereIsNone) {
    Data image = Data(600);
    const Data trailer = base::ByteWriter().text("koly").be32(4).zeros(504).data();
    std::copy(trailer.begin(), trailer.end(), image.end() - 512);
    EXPECT_THAT(checksOf(image), isSkippedBecause("no list of its blocks"));
}

}  // namespace
}  // namespace pinwell::test
