#include "formats/package_trailers.h"

#include <gtest/gtest.h>

#include <vector>

#include "base/bytes.h"
#include "formats/explain_ticket.h"
#include "support/collected_diagnostics.h"
#include "support/memory_reader.h"
#include "support/package_builder.h"

namespace pinwell {
namespace {

using base::Data;
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

using test::PackageBuilder;

struct Surveyed {
    PackageTrailerSurvey survey;
    std::vector<SurveyedTrailer> trailers;
};

Surveyed surveyOf(const std::string& package) {
    test::MemoryReader file(base::toData(base::asBytes(package)));
    Surveyed found;
    found.survey = surveyPackageTrailers(
        file, [&](const SurveyedTrailer& trailer) { found.trailers.push_back(trailer); });
    return found;
}

PackageTrailers walkOf(const std::string& package) {
    test::MemoryReader file(base::toData(base::asBytes(package)));
    return walkPackageTrailers(file, "Sample.pkg");
}

TrailerFields ticketOfVersion2() {
    TrailerFields fields;
    fields.type = 2;
    fields.version = 2;
    return fields;
}

TEST(PackageTrailerSurvey, PassesTheTicketUpToTheTerminator) {
    const PackageBuilder package =
        PackageBuilder().terminator().unknown("abc").ticket("the ticket").unknown("de");
    const auto [survey, trailers] = surveyOf(package.build());
    ASSERT_EQ(trailers.size(), 4U);
    EXPECT_TRUE(survey.hasTerminator);
    EXPECT_EQ(survey.fault, std::nullopt);
    EXPECT_EQ(survey.ticketStart, package.archiveSize() + 16 + 3 + 16);
    EXPECT_EQ(survey.ticketLength, 10U);
    EXPECT_EQ(trailers[1].dataOffset, survey.ticketStart);
    EXPECT_EQ(trailers[1].recordOffset, *survey.ticketStart + 10);
    EXPECT_TRUE(trailers[3].isTerminator);
    EXPECT_EQ(trailers[3].recordOffset, package.archiveSize());
}

TEST(PackageTrailerSurvey, OfAnArchiveAloneFindsNothing) {
    const auto [survey, trailers] = surveyOf(PackageBuilder().build());
    EXPECT_TRUE(trailers.empty());
    EXPECT_FALSE(survey.hasTerminator);
    EXPECT_EQ(survey.ticketStart, std::nullopt);
    EXPECT_EQ(surveyOf("short").trailers.size(), 0U);
}

TEST(PackageTrailerSurvey, OfTwoTicketsCountsTheLastInTheFile) {
    const auto [survey, trailers] =
        surveyOf(PackageBuilder().terminator().ticket("earlier").ticket("later").build());
    EXPECT_EQ(trailers.size(), 3U);
    EXPECT_EQ(survey.ticketLength, 5U);
}

TEST(PackageTrailerSurvey, PassesADamagedRecordAndStatesTheFaultOfTheWalk) {
    const PackageBuilder package = PackageBuilder().terminator().ticket("good").trailer(ticketOfVersion2());
    const auto [survey, trailers] = surveyOf(package.build());
    ASSERT_EQ(trailers.size(), 3U);
    ASSERT_TRUE(survey.fault.has_value());
    EXPECT_STREQ(survey.fault->rule, "a trailer's version is not 1");
    EXPECT_EQ(survey.fault, walkOf(package.build()).fault);
    EXPECT_EQ(trailers[0].fault, survey.fault);
}

TEST(PackageTrailerSurvey, IgnoresAFaultBeforeTheTicketLikeTheWalk) {
    const std::string package =
        PackageBuilder().terminator().trailer(ticketOfVersion2()).ticket("good").build();
    const auto [survey, trailers] = surveyOf(package);
    EXPECT_EQ(survey.fault, std::nullopt);
    EXPECT_EQ(walkOf(package).fault, std::nullopt);
    EXPECT_NE(trailers.at(1).fault, std::nullopt);
}

TEST(PackageTrailerSurvey, EndsAtARecordWhoseDataWouldBeginBeforeTheFile) {
    TrailerFields fields;
    fields.length = 0xFFFFFFFF;
    const std::string package = PackageBuilder().terminator().trailer(fields).build();
    const auto [survey, trailers] = surveyOf(package);
    ASSERT_EQ(trailers.size(), 1U);
    EXPECT_EQ(trailers[0].dataOffset, std::nullopt);
    EXPECT_STREQ(survey.fault.value_or(TicketFault()).rule, "a trailer's data would begin before the file");
    EXPECT_EQ(survey.fault, walkOf(package).fault);
}

TEST(PackageTrailerSurvey, ThrowsIfARecordCannotBeRead) {
    const std::string package = PackageBuilder().terminator().ticket("ticket").build();
    test::MemoryReader file(base::toData(base::asBytes(package)), package.size() - 1);
    EXPECT_THROW(surveyPackageTrailers(file, [](const SurveyedTrailer&) {}), base::ReadFailure);
}

TEST(PackageTrailerWalk, TurnsAReadErrorIntoAFaultAndADiagnosticLine) {
    const std::string package = PackageBuilder().terminator().ticket("ticket").build();
    test::MemoryReader file(base::toData(base::asBytes(package)), package.size() - 1);
    CollectedDiagnostics said;
    const PackageTrailers walked = walkPackageTrailers(file, "Sample.pkg", {}, said.diagnostics());
    EXPECT_EQ(walked.ticket, std::nullopt);
    EXPECT_EQ(walked.fault, (TicketFault{package.size(), "the trailers cannot be read"}));
    EXPECT_EQ(said.text(), "Couldn't read existing package trailers of Sample.pkg. a broken sector.\n");
}

TEST(PackageTrailerWalk, StatesEachStepInOrder) {
    test::MemoryReader file(
        base::toData(base::asBytes(PackageBuilder().terminator().ticket("ticket").build())));
    CollectedDiagnostics said;
    const PackageTrailers walked = walkPackageTrailers(file, "Sample.pkg", {}, said.diagnostics());
    EXPECT_EQ(said.lines(),
              (std::vector<std::string>{
                  "Terminator Trailer size must be 0, not 6", "{magic: t8lr, version: 1, type: 2, length: 6}",
                  values::format("Found expected ticket at %llu with length of 6", walked.ticketStart)}));
}

TEST(TicketPlace, OfAPackageIsAtFaultIfTheWalkEndedWithAFault) {
    EXPECT_EQ(explainTicketPlace(walkOf(PackageBuilder().terminator().ticket("ticket").build())),
              std::nullopt);
    const std::string damaged = PackageBuilder().trailer(ticketOfVersion2()).build();
    EXPECT_EQ(explainTicketPlace(walkOf(damaged)),
              (TicketPlaceFault{"a trailer's version is not 1", damaged.size() - 16}));
}

}  // namespace
}  // namespace pinwell
