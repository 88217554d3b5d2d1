// The readable fields of a damaged container or payload, and the first rule that it breaks.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "base/bytes.h"
#include "formats/satchel.h"
#include "formats/tm_ticket.h"
#include "support/ticket_builder.h"

namespace pinwell::test {
namespace {

using base::Data;

Data container() {
    return SatchelBuilder::of(TicketChain().issue(), TicketPayloadBuilder().entry(2, hashOf(1)).build())
        .build();
}

TEST(SatchelSurvey, OfAWholeContainerIsWhatDecodingFinds) {
    const Data bytes = container();
    satchel_view view;
    ASSERT_EQ(satchel_decode_header(bytes.data(), bytes.size(), &view), 0);
    const SatchelSurvey survey = surveySatchelContainer(bytes);
    EXPECT_EQ(survey.view, view);
    EXPECT_FALSE(survey.fault);
}

TEST(SatchelSurvey, FindsThePartsInSpiteOfOneWrongLength) {
    const Data bytes = container();
    const satchel_view whole = surveySatchelContainer(bytes).view;
    for (const std::size_t at : {8U, 9U, 10U, 12U, 13U, 14U}) {
        Data damaged = bytes;
        damaged[at] ^= std::byte{0x11};
        const SatchelSurvey survey = surveySatchelContainer(damaged);
        EXPECT_EQ(survey.fault->offset, 8U);
        EXPECT_EQ(survey.view.certificatesLength, whole.certificatesLength) << at;
        EXPECT_EQ(survey.view.payloadLength, whole.payloadLength) << at;
    }
}

TEST(SatchelSurvey, OfAContainerTooShortForItsPartsHasTheHeaderAlone) {
    const Data bytes = container();
    const SatchelSurvey survey = surveySatchelContainer(base::ByteView(bytes).first(87));
    EXPECT_TRUE(survey.header);
    EXPECT_EQ(survey.view, satchel_view{});
    const SatchelSurvey cut = surveySatchelContainer(base::ByteView(bytes).first(15));
    EXPECT_FALSE(cut.header);
    EXPECT_EQ(cut.fault->offset, 15U);
}

TEST(CertificateBlockSurvey, EndsAtTheFirstElementThatBreaksARule) {
    const Data good = derElementOfSize(200);
    const auto surveyOf = [](const Data& block) { return surveySatchelCertificates(block); };
    Data contents = good;
    base::append(contents, derElementOfSize(kSatchelMaximumCertificateSize + 1));
    const Data tooLong = derElement(0x30, contents);
    EXPECT_EQ(surveyOf(tooLong).count, 1U);
    EXPECT_EQ(surveyOf(tooLong).fault->rule, std::string("a certificate is too long"));

    Data four;
    for (int i = 0; i < 4; ++i) base::append(four, good);
    const SatchelCertificateBlock survey = surveyOf(derElement(0x30, four));
    EXPECT_EQ(survey.count, 3U);
    EXPECT_EQ(survey.status, satchel_status::kBadCertificates);
    EXPECT_EQ(survey.fault->offset, 4 + 3 * good.size());
    EXPECT_EQ(surveyOf(derElement(0x30, {})).fault->rule, std::string("there is no certificate"));
}

TEST(TicketSurvey, ReadsTheEntriesInSpiteOfOneWrongField) {
    const auto payload = [] { return TicketPayloadBuilder().entry(2, hashOf(1)).entry(1, hashOf(9)); };
    const auto ofVersion = [&](std::uint8_t number) {
        Data bytes = payload().build();  // the layout stays that of version 2
        bytes[4] = std::byte{number};
        return bytes;
    };
    const Data damaged[] = {
        payload().magic("nope").build(),
        ofVersion(7),
        ofVersion(1),
        payload().hashLength(48).build(),
        payload().count(3).build(),
        payload().count(0xFFFFFFFF).build(),
    };
    for (const Data& bytes : damaged) {
        const TicketSurvey survey = surveyTicketPayload(bytes);
        EXPECT_TRUE(survey.fault);
        ASSERT_EQ(survey.count, 2U);
        tm_cdhash entry;
        ASSERT_EQ(readSurveyedHash(survey, 1, &entry), 0);
        EXPECT_EQ(entry.algorithm, 1U);
        EXPECT_EQ(base::toData(base::ByteView(entry.hash).first(entry.length)), hashOf(9));
        EXPECT_EQ(readSurveyedHash(survey, 2, &entry), -1);
    }
}

TEST(TicketSurvey, OfAWholePayloadHasNoFault) {
    for (const std::uint16_t version : {std::uint16_t{1}, std::uint16_t{2}}) {
        const Data bytes = TicketPayloadBuilder().version(version).entry(2, hashOf(1)).build();
        const TicketSurvey survey = surveyTicketPayload(bytes);
        EXPECT_FALSE(survey.fault);
        EXPECT_EQ(survey.version, version);
        EXPECT_EQ(survey.count, 1U);
    }
    EXPECT_EQ(surveyTicketPayload(Data(23)).fault->rule, std::string("the payload ends inside its header"));
    EXPECT_FALSE(surveyTicketPayload(Data(23)).header);
}

}  // namespace
}  // namespace pinwell::test
