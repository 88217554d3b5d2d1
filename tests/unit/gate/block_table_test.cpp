// The second opinion on a disk image's data: its own checksums.
#include "verify/block_table.h"

#include <gmock/gmock.h>
#include <zlib.h>

#include "codesign/byte_source.h"
#include "foundation/base64.h"
#include "foundation/byte_writer.h"
#include "support/archive_builder.h"
#include "verify/check_names.h"

namespace pinwell::test {
namespace {

using codesign::DiskImageTrailer;
using codesign::MemorySource;
using foundation::ByteWriter;
using testing::AllOf;
using testing::Contains;
using testing::Each;
using testing::HasSubstr;
using testing::SizeIs;
using verify::Check;
using verify::Outcome;
using verify::Section;

std::uint32_t crcOf(ByteView bytes) {
    return static_cast<std::uint32_t>(crc32_z(0, reinterpret_cast<const Bytef*>(bytes.data()), bytes.size()));
}

void appendChecksum(ByteWriter& writer, std::uint32_t type, std::uint32_t value) {
    writer.be32(type).be32(32).be32(value).zeros(124);
}

/// An image of one table whose blocks are added one by one; valid as it is.
class TabledImage {
  public:
    TabledImage& block(std::uint32_t type, std::uint64_t sectors, const Data& packed, const Data& contents) {
        blocks_.be32(type).be32(0).be64(sectors_ + skew_).be64(sectors);
        blocks_.be64(data_.size()).be64(packed.size());
        data_.bytes(packed);
        contents_.bytes(contents);
        sectors_ += sectors;
        ++count_;
        return *this;
    }
    TabledImage& plain(const Data& contents) { return block(1, contents.size() / 512, contents, contents); }
    TabledImage& zlib(const Data& contents) {
        return block(0x80000005, contents.size() / 512, deflated(contents), contents);
    }
    TabledImage& zeros(std::uint64_t sectors) {
        return block(0, sectors, {}, Data(static_cast<std::size_t>(sectors) * 512));
    }
    /// The last block's data once more, as another block.
    TabledImage& again(std::uint64_t sectors, std::uint64_t length) {
        blocks_.be32(1).be32(0).be64(sectors_).be64(sectors).be64(0).be64(length);
        sectors_ += sectors;
        ++count_;
        return *this;
    }
    TabledImage& gapBeforeNext() { return skew_ = 1, *this; }
    TabledImage& tableChecksum(std::uint32_t value) { return tableChecksum_ = value, *this; }
    TabledImage& tableChecksumType(std::uint32_t value) { return tableChecksumType_ = value, *this; }
    TabledImage& masterChecksum(std::uint32_t value) { return masterChecksum_ = value, *this; }
    TabledImage& dataChecksum(std::uint32_t value) { return dataChecksum_ = value, *this; }
    TabledImage& sectorCount(std::uint64_t value) { return sectorCount_ = value, *this; }

    Data build() const {
        const std::uint32_t own = tableChecksum_.value_or(crcOf(contents_.data()));
        ByteWriter table;
        table.text("mish").be32(1).be64(0).be64(sectorCount_.value_or(sectors_)).be64(0).zeros(32);
        appendChecksum(table, tableChecksumType_, own);
        table.be32(count_).bytes(blocks_.data());
        const Data list = foundation::toData(
            "<plist version=\"1.0\"><dict><key>resource-fork</key><dict><key>blkx</key><array><dict><key>Name"
            "</key><string>whole</string><key>Data</key><data>" +
            foundation::encodeBase64(table.data()) + "</data></dict></array></dict></dict></plist>");
        ByteWriter trailer;
        trailer.text("koly").be32(4).zeros(16).be64(0).be64(data_.size()).zeros(40);
        appendChecksum(trailer, 2, dataChecksum_.value_or(crcOf(data_.data())));
        trailer.be64(data_.size()).be64(list.size()).zeros(352 - 232);
        appendChecksum(trailer, 2, masterChecksum_.value_or(crcOf(ByteWriter().be32(own).data())));
        trailer.zeros(512 - trailer.size());
        return ByteWriter().bytes(data_.data()).bytes(list).bytes(trailer.data()).data();
    }

  private:
    ByteWriter data_;
    ByteWriter contents_;
    ByteWriter blocks_;
    std::uint64_t sectors_ = 0;
    std::uint64_t skew_ = 0;
    std::uint32_t count_ = 0;
    std::uint32_t tableChecksumType_ = 2;
    std::optional<std::uint32_t> tableChecksum_;
    std::optional<std::uint32_t> masterChecksum_;
    std::optional<std::uint32_t> dataChecksum_;
    std::optional<std::uint64_t> sectorCount_;
};

std::vector<Check> checksOf(const Data& image) {
    const MemorySource source(image);
    const std::optional<DiskImageTrailer> trailer = DiskImageTrailer::read(source);
    EXPECT_TRUE(trailer.has_value());
    verify::Workers workers(2);
    Section section;
    checkBlockTables(source, *trailer, workers, section);
    return section.checks;
}
std::vector<Check> checksOf(const TabledImage& image) {
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
    EXPECT_THAT(checksOf(TabledImage().plain(kSome).zeros(10'000).zlib(kOther).zeros(3)),
                AllOf(SizeIs(3), Each(is(Outcome::passed))));
}

TEST(BlockTable, FindsOtherDataThanItsChecksums) {
    for (const auto make :
         {+[] { return TabledImage().plain(kSome); }, +[] { return TabledImage().zlib(kSome); }}) {
        const std::uint32_t wrong = 0x12345678;
        EXPECT_THAT(checksOf(make().tableChecksum(wrong)), failsAt("block table 1 (whole)"));
        EXPECT_THAT(checksOf(make().masterChecksum(wrong)), failsAt("master checksum"));
        EXPECT_THAT(checksOf(make().dataChecksum(wrong)), failsAt("data fork"));
    }
}

TEST(BlockTable, FindsAByteThatDiffers) {
    Data image = TabledImage().plain(kSome).build();
    image[100] ^= std::byte{1};
    EXPECT_THAT(checksOf(image), AllOf(failsAt("block table 1"), failsAt("data fork")));
}

TEST(BlockTable, FindsBlocksThatCannotBeUnpacked) {
    EXPECT_THAT(checksOf(TabledImage().block(0x80000005, 4, kSome, kSome)), failsAt("block table 1"));
    EXPECT_THAT(checksOf(TabledImage().block(0x80000005, 3, deflated(kSome), kSome)),
                failsAt("block table 1"));
    EXPECT_THAT(checksOf(TabledImage().block(0x80000005, 5, deflated(kSome), kSome)),
                failsAt("block table 1"));
    EXPECT_THAT(checksOf(TabledImage().block(1, 5, kSome, kSome)), failsAt("block table 1"));
}

TEST(BlockTable, FindsTablesThatContradictThemselves) {
    EXPECT_THAT(checksOf(TabledImage().plain(kSome).sectorCount(5)), failsAt("block table 1"));
    EXPECT_THAT(checksOf(TabledImage().plain(kSome).gapBeforeNext().plain(kOther)), failsAt("block table 1"));
    EXPECT_THAT(checksOf(TabledImage().plain(kSome).again(4, kSome.size())), failsAt("block tables"));
    EXPECT_THAT(checksOf(TabledImage().plain(kSome).again(4, std::uint64_t{1} << 63U)),
                failsAt("block table 1"));
    EXPECT_THAT(checksOf(TabledImage().block(0, std::uint64_t{1} << 62U, {}, {})), failsAt("block table 1"));
}

TEST(BlockTable, SaysWhatItSkips) {
    EXPECT_THAT(
        checksOf(TabledImage().block(0x80000006, 4, kSome, kSome).dataChecksum(0)),
        Contains(AllOf(is(Outcome::skipped), testing::Field(&Check::found, HasSubstr("packed in a way")))));
    EXPECT_THAT(
        checksOf(TabledImage().plain(kSome).tableChecksumType(4)),
        Contains(AllOf(is(Outcome::skipped), testing::Field(&Check::found, HasSubstr("known kind")))));
}

TEST(BlockTable, IsSkippedWhereItWouldUnpackToMoreThanTheLimit) {
    TabledImage image;
    // Blocks that claim more than they have.
    image.block(0x80000005, verify::kMaximumUnpacked / 512 + 1, deflated(kSome), kSome);
    EXPECT_THAT(checksOf(image), isSkippedBecause("more than 256 MiB"));
    TabledImage many;
    for (std::size_t i = 0; i <= verify::kMaximumBlocks; ++i) many.block(0, 1, {}, {});
    EXPECT_THAT(checksOf(many), isSkippedBecause("more than 256 MiB"));
}

TEST(BlockTable, IsSkippedWhereThereIsNone) {
    Data image = Data(600);
    const Data trailer = ByteWriter().text("koly").be32(4).zeros(504).data();
    std::copy(trailer.begin(), trailer.end(), image.end() - 512);
    EXPECT_THAT(checksOf(image), isSkippedBecause("no list of its blocks"));
}

}  // namespace
}  // namespace pinwell::test
