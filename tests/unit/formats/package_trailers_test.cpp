#include "formats/package_trailers.h"

#include <gtest/gtest.h>

#include "foundation/bytes.h"
#include "support/collected_diagnostics.h"
#include "support/package_builder.h"

namespace pinwell {
namespace {

using foundation::Data;
using test::CollectedDiagnostics;
using test::makeTrailer;
using test::TrailerFields;

constexpr std::uint64_t kFourGiB = 1ULL << 32U;

trailer_header recordOf(const TrailerFields& fields) {
    trailer_header record;
    const Data bytes = makeTrailer(fields);
    std::copy(bytes.begin(), bytes.end(), record.bytes.begin());
    return record;
}

bool isTerminator(const TrailerFields& fields, const Diagnostics& diagnostics = {}) {
    const trailer_header record = recordOf(fields);
    return trailer_is_terminator(record.firstWord(), record.length(), diagnostics);
}

TEST(PackageTrailer, AWellFormedRecordIsCopiedOutAndNothingIsSaid) {
    TrailerFields fields;
    fields.type = 2;
    fields.length = 0x01020304;
    CollectedDiagnostics said;
    trailer_header record;
    EXPECT_TRUE(trailer_data_is_valid(makeTrailer(fields), &record, said.diagnostics()));
    EXPECT_EQ(record.bytes, recordOf(fields).bytes);
    EXPECT_EQ(record.magic(), "t8lr");
    EXPECT_EQ(record.version(), 1);
    EXPECT_EQ(record.type(), 2);
    EXPECT_EQ(record.length(), 0x01020304U);
    EXPECT_EQ(said.text(), "");
}

TEST(PackageTrailer, MayBeJudgedWithoutBeingCopiedOut) {
    EXPECT_TRUE(trailer_data_is_valid(makeTrailer({}), nullptr));
}

TEST(PackageTrailer, FifteenAndSeventeenBytesAreNoRecord) {
    Data bytes = makeTrailer({});
    bytes.pop_back();
    CollectedDiagnostics said;
    EXPECT_FALSE(trailer_data_is_valid(bytes, nullptr, said.diagnostics()));
    bytes.resize(17);
    EXPECT_FALSE(trailer_data_is_valid(bytes, nullptr, said.diagnostics()));
    EXPECT_EQ(said.text(),
              "Length 15 does not equal expected size of 16\nLength 17 does not equal expected size of 16\n");
}

TEST(PackageTrailer, OfAnotherVersionIsRefusedAndLeavesTheRecordAlone) {
    TrailerFields fields;
    fields.version = 2;
    trailer_header record = kTerminatorTrailer;
    CollectedDiagnostics said;
    EXPECT_FALSE(trailer_data_is_valid(makeTrailer(fields), &record, said.diagnostics()));
    EXPECT_EQ(said.text(), "We do not know how to deal with trailer version 2. Exepected 1\n");
    EXPECT_EQ(record.bytes, kTerminatorTrailer.bytes);
}

TEST(PackageTrailer, OfAnotherMagicIsRefused) {
    TrailerFields fields;
    fields.magic = "t8lx";
    CollectedDiagnostics said;
    EXPECT_FALSE(trailer_data_is_valid(makeTrailer(fields), nullptr, said.diagnostics()));
    EXPECT_EQ(said.text(), "Expected Magic t8lr for trailer but found t8lx\n");
}

TEST(PackageTrailer, TheVersionIsCheckedBeforeTheMagic) {
    TrailerFields fields;
    fields.magic = "none";
    fields.version = 0xFFFF;
    CollectedDiagnostics said;
    EXPECT_FALSE(trailer_data_is_valid(makeTrailer(fields), nullptr, said.diagnostics()));
    EXPECT_EQ(said.text(), "We do not know how to deal with trailer version 65535. Exepected 1\n");
}

TEST(PackageTrailer, AMagicThatCouldDriveTheTerminalIsPrintedEscaped) {
    TrailerFields fields;
    fields.magic = std::string("\x1b[2\0", 4);
    CollectedDiagnostics said;
    EXPECT_FALSE(trailer_data_is_valid(makeTrailer(fields), nullptr, said.diagnostics()));
    EXPECT_EQ(said.text().find('\x1b'), std::string::npos);
    EXPECT_EQ(said.text().find('\0'), std::string::npos);
    EXPECT_NE(said.text().find("[2"), std::string::npos);
}

TEST(PackageTrailer, TheTerminatorIsVersion1Type1Length0) {
    TrailerFields fields;
    fields.type = 1;
    EXPECT_EQ(kTerminatorTrailer.bytes, recordOf(fields).bytes);
    CollectedDiagnostics said;
    EXPECT_TRUE(isTerminator(fields, said.diagnostics()));
    EXPECT_EQ(said.text(), "");
}

TEST(PackageTrailer, WithDataIsNoTerminatorWhateverItsType) {
    TrailerFields fields;
    fields.type = 2;
    fields.length = 5;
    CollectedDiagnostics said;
    EXPECT_FALSE(isTerminator(fields, said.diagnostics()));
    EXPECT_EQ(said.text(), "Terminator Trailer size must be 0, not 5\n");
}

TEST(PackageTrailer, ALengthOverTwoGiBIsPrintedAsASignedNumber) {
    TrailerFields fields;
    fields.length = 0xFFFFFFFF;
    CollectedDiagnostics said;
    EXPECT_FALSE(isTerminator(fields, said.diagnostics()));
    EXPECT_EQ(said.text(), "Terminator Trailer size must be 0, not -1\n");
}

TEST(PackageTrailer, OfAnotherTypeIsNoTerminator) {
    TrailerFields fields;
    fields.type = 2;
    CollectedDiagnostics said;
    EXPECT_FALSE(isTerminator(fields, said.diagnostics()));
    EXPECT_EQ(said.text(), "Trailer type 2 does not match expected terminator type 1\n");
}

TEST(PackageTrailer, OfType1AndLength4294967296IsTheTerminator) {
    TrailerFields fields;
    fields.type = 1;
    fields.upperLength = 1;
    EXPECT_TRUE(isTerminator(fields));
    EXPECT_TRUE(trailer_is_terminator(kTerminatorTrailer.firstWord(), kFourGiB));
}

TEST(PackageTrailer, TheUpperHalfOfALengthIsIgnored) {
    TrailerFields fields;
    fields.length = 20;
    fields.upperLength = 0xFFFFFFFF;
    EXPECT_EQ(recordOf(fields).length(), 20U);
}

TEST(PackageTrailer, OfATicketHasType2AndTheLengthInItsLowHalf) {
    TrailerFields fields;
    fields.type = 2;
    fields.length = 0xFFFFFFFF;
    EXPECT_EQ(ticketTrailer(0xFFFFFFFF).bytes, recordOf(fields).bytes);
}

TEST(PackageTrailer, ATicketOf4294967295BytesCanBeWrittenAndOneByteMoreCannot) {
    EXPECT_TRUE(isWritableTicketLength(kFourGiB - 1));
    EXPECT_FALSE(isWritableTicketLength(kFourGiB));
    EXPECT_TRUE(isWritableTicketLength(1));
    EXPECT_FALSE(isWritableTicketLength(0));
}

}  // namespace
}  // namespace pinwell
