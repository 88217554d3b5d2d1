// Verification step by step, over a trust service with fixed results: the status of each refusal, the calls
// to the service, and the calls that never happen.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <new>

#include "base/bytes.h"
#include "formats/satchel.h"
#include "formats/tm_ticket.h"
#include "support/fake_trust_service.h"
#include "support/ticket_builder.h"

namespace pinwell {
namespace {

namespace status = satchel_status;

using base::ByteView;
using base::Data;
using base::Error;
using base::toData;
using test::derElement;
using test::derElementOfSize;
using test::FakeTrustService;
using test::SatchelBuilder;
using testing::ElementsAre;
using testing::IsEmpty;
using testing::SizeIs;
using trust::Verdict;

constexpr trust::Status kForeignStatus = -12345;
constexpr std::uint8_t kOctetString = 0x04;

Data bytes(std::initializer_list<int> values) {
    Data data;
    for (const int value : values) data.push_back(static_cast<std::byte>(value));
    return data;
}

// To the fake, any element is a certificate.
const Data kLeaf = derElement(0x30, toData("leaf"));
const Data kIntermediate = derElement(0x30, toData("intermediate"));
const Data kRoot = derElement(0x30, toData("root"));

SatchelBuilder satchel() {
    return SatchelBuilder().certificates({kLeaf, kIntermediate, kRoot}).payload(toData("payload"));
}

class SatchelVerification : public testing::Test {
  protected:
    // The internal status, and the public result held against it.
    trust::Status verify(const Data& container) {
        satchel_view view;
        EXPECT_EQ(satchel_decode_header(container.data(), container.size(), &view), 0);
        FakeTrustService untouched = service;
        const trust::Status result = verifySatchel(&view, service);
        EXPECT_EQ(satchel_verify_signature(&view, untouched), result == status::kSuccess ? 0 : -1);
        return result;
    }
    trust::Status verify(const SatchelBuilder& builder) { return verify(builder.build()); }

    FakeTrustService service;
};

TEST_F(SatchelVerification, AcceptsWhatTheTrustServiceAccepts) {
    EXPECT_EQ(verify(satchel()), status::kSuccess);
}

TEST_F(SatchelVerification, HandsTheCertificatesOnInOrder) {
    EXPECT_EQ(verify(satchel()), status::kSuccess);
    EXPECT_THAT(service.certificateLists, ElementsAre(ElementsAre(kLeaf, kIntermediate, kRoot)));
}

TEST_F(SatchelVerification, HandsOnEverythingBeforeTheSignatureAndThe72BytesOfTheField) {
    const Data container = satchel().signature(toData("signature")).build();
    EXPECT_EQ(verify(container), status::kSuccess);
    ASSERT_THAT(service.signatureChecks, SizeIs(1));
    const auto field = container.end() - 72;
    EXPECT_EQ(service.signatureChecks[0].message, Data(container.begin(), field));
    EXPECT_EQ(service.signatureChecks[0].signature, Data(field, container.end()));
}

// The view.

TEST_F(SatchelVerification, RefusesAMissingView) {
    EXPECT_EQ(satchel_verify_signature(nullptr, service), -1);
}

TEST_F(SatchelVerification, RefusesAContainerWithoutACertificateBlock) {
    EXPECT_EQ(verify(satchel().certificateBlock({})), status::kNotAvailable);
}

TEST_F(SatchelVerification, RefusesAViewWithAPartMissingWithoutACall) {
    const Data container = satchel().build();
    satchel_view whole;
    ASSERT_EQ(satchel_decode_header(container.data(), container.size(), &whole), 0);
    std::vector<satchel_view> views(6, whole);
    views[0].signedData = nullptr;
    views[1].signedDataLength = 0;
    views[2].signature = nullptr;
    views[3].signatureLength = 0;
    views[4].certificates = nullptr;
    views[5].certificatesLength = 0;
    for (const satchel_view& view : views) {
        EXPECT_EQ(verifySatchel(&view, service), status::kNotAvailable);
        EXPECT_EQ(satchel_verify_signature(&view, service), -1);
    }
    const satchel_view empty;
    EXPECT_EQ(verifySatchel(&empty, service), status::kNotAvailable);
    EXPECT_THAT(service.parsedCertificates, IsEmpty());
}

// The outer element.

TEST_F(SatchelVerification, RefusesAnOuterTagThatIsNoConstructedSequence) {
    constexpr std::uint8_t kSet = 0x31, kPrimitive = 0x10, kContextSpecific = 0xB0, kApplication = 0x70;
    for (const std::uint8_t tag : {kSet, kPrimitive, kContextSpecific, kApplication, kOctetString}) {
        EXPECT_EQ(verify(satchel().outerTag(tag)), status::kBadParameter) << int{tag};
    }
}

TEST_F(SatchelVerification, RefusesASequenceThatEndsOneByteBeforeItsBlock) {
    const std::size_t contents = kLeaf.size() + kIntermediate.size() + kRoot.size();
    EXPECT_EQ(verify(satchel().outerLength(contents - 1)), status::kBadParameter);
    EXPECT_EQ(verify(satchel().afterSequence(bytes({0x00}))), status::kBadParameter);
}

TEST_F(SatchelVerification, RefusesASequenceThatEndsAfterItsBlock) {
    const std::size_t contents = kLeaf.size() + kIntermediate.size() + kRoot.size();
    EXPECT_EQ(verify(satchel().outerLength(contents + 1)), status::kNotAvailable);
    EXPECT_EQ(verify(satchel().outerLength(0xFFFFFFFF)), status::kNotAvailable);
    EXPECT_EQ(verify(satchel().outerLength(0xFFFFFFFFFFFFFFFF)), status::kNotAvailable);
}

TEST_F(SatchelVerification, RefusesAnOuterLengthThatIsNotDER) {
    EXPECT_EQ(verify(satchel().outerLengthBytes(bytes({0x80})).afterSequence(bytes({0, 0}))),
              status::kNotAvailable);                                                     // indefinite
    EXPECT_EQ(verify(satchel().outerLengthBytes(bytes({0xFF}))), status::kNotAvailable);  // reserved
    const int contents = static_cast<int>(kLeaf.size() + kIntermediate.size() + kRoot.size());
    EXPECT_EQ(verify(satchel().outerLengthBytes(bytes({0x82, 0x00, contents}))), status::kNotAvailable);
}

TEST_F(SatchelVerification, RefusesABlockThatIsCutShortAnywhere) {
    const Data block = derElement(0x30, kLeaf);
    for (std::size_t size = 1; size < block.size(); ++size) {
        EXPECT_EQ(verify(satchel().certificateBlock(ByteView(block).first(size))), status::kNotAvailable)
            << size;
    }
    EXPECT_EQ(verify(satchel().certificateBlock(block)), status::kSuccess);
}

// The certificates.

TEST_F(SatchelVerification, AcceptsOneToThreeCertificates) {
    EXPECT_EQ(verify(satchel().certificates({kLeaf})), status::kSuccess);
    EXPECT_EQ(verify(satchel().certificates({kLeaf, kRoot})), status::kSuccess);
    EXPECT_EQ(verify(satchel().certificates({kLeaf, kIntermediate, kRoot})), status::kSuccess);
}

TEST_F(SatchelVerification, RefusesAnEmptySequence) {
    EXPECT_EQ(verify(satchel().certificates({})), status::kBadCertificates);
}

TEST_F(SatchelVerification, RefusesFourCertificatesAndDoesNotLookAtTheFourth) {
    EXPECT_EQ(verify(satchel().certificate(kRoot)), status::kBadCertificates);
    EXPECT_THAT(service.parsedCertificates, ElementsAre(kLeaf, kIntermediate, kRoot));
}

TEST_F(SatchelVerification, RefusesABytePastTheThirdCertificate) {
    EXPECT_EQ(verify(satchel().certificate(bytes({0x00}))), status::kBadCertificates);
}

TEST_F(SatchelVerification, RefusesABytePastTheSecondCertificateSinceItIsNoElement) {
    EXPECT_EQ(verify(satchel().certificates({kLeaf, kRoot, bytes({0x00})})), status::kNotAvailable);
}

TEST_F(SatchelVerification, RefusesAnInnerElementThatReachesPastTheSequence) {
    EXPECT_EQ(verify(satchel().certificates({kLeaf, bytes({0x30, 0x03, 0x00, 0x00})})),
              status::kNotAvailable);
}

TEST_F(SatchelVerification, RefusesAnInnerElementOfIndefiniteLength) {
    EXPECT_EQ(verify(satchel().certificates({bytes({0x30, 0x80, 0x00, 0x00})})), status::kNotAvailable);
}

TEST_F(SatchelVerification, DoesNotCheckTheTagOfAnInnerElement) {
    EXPECT_EQ(verify(satchel().certificates({derElement(kOctetString, toData("leaf"))})), status::kSuccess);
}

TEST_F(SatchelVerification, AcceptsAnInnerElementOf131072Bytes) {
    EXPECT_EQ(verify(satchel().certificates({kLeaf, derElementOfSize(131072)})), status::kSuccess);
}

TEST_F(SatchelVerification, RefusesAnInnerElementOf131073BytesAndDoesNotParseIt) {
    EXPECT_EQ(verify(satchel().certificates({kLeaf, derElementOfSize(131073)})), status::kBadCertificates);
    EXPECT_THAT(service.parsedCertificates, ElementsAre(kLeaf));
}

TEST_F(SatchelVerification, RefusesAnInnerElementThatIsNoCertificate) {
    service.parsesCertificate = [](ByteView der) { return toData(der) != kIntermediate; };
    EXPECT_EQ(verify(satchel()), status::kBadCertificates);
    EXPECT_THAT(service.certificateLists, IsEmpty());
}

TEST_F(SatchelVerification, LooksForNoPolicyBeforeTheCertificatesAreRead) {
    EXPECT_EQ(verify(satchel().certificates({})), status::kBadCertificates);
    EXPECT_THAT(service.namedPolicyRequests, IsEmpty());
}

// The policy (satchel_policy_test.cpp has its contents).

TEST_F(SatchelVerification, EvaluatesUnderTheNamedPolicy) {
    service.libraryPolicy = std::make_shared<trust::Policy>();
    EXPECT_EQ(verify(satchel()), status::kSuccess);
    EXPECT_THAT(service.policies, ElementsAre(*service.libraryPolicy));
}

TEST_F(SatchelVerification, RefusesWhenTheNamedConstructorReturnsNothing) {
    service.libraryPolicy = trust::PolicyRef();
    EXPECT_EQ(verify(satchel()), status::kNoPolicy);
    EXPECT_THAT(service.policies, IsEmpty());
}

// The trust object and its verdict.

TEST_F(SatchelVerification, PassesOnAStatusOfTrustCreation) {
    service.makeTrustStatus = kForeignStatus;
    EXPECT_EQ(verify(satchel()), kForeignStatus);
}

TEST_F(SatchelVerification, RefusesTrustCreationThatSucceedsWithoutAnObject) {
    service.makesTrustObject = false;
    EXPECT_EQ(verify(satchel()), status::kNotAvailable);
}

TEST_F(SatchelVerification, PassesOnAStatusOfTheEvaluationWhateverItsVerdict) {
    service.evaluations = {{.status = kForeignStatus, .verdict = Verdict::unspecified}};
    EXPECT_EQ(verify(satchel()), kForeignStatus);
}

TEST_F(SatchelVerification, RefusesAChainTrustedOnlyByTheUser) {
    service.evaluations = {{.verdict = Verdict::proceed}};
    EXPECT_EQ(verify(satchel()), status::kNotTrusted);
}

TEST_F(SatchelVerification, RefusesEveryVerdictButUnspecifiedAndLeavesTheSignatureAlone) {
    for (std::uint32_t verdict = 0; verdict < 9; ++verdict) {
        service.evaluations = {{.verdict = Verdict{verdict}}};
        service.signatureChecks.clear();
        const bool accepted = verdict == 4;
        EXPECT_EQ(verify(satchel()), accepted ? status::kSuccess : status::kNotTrusted) << verdict;
        EXPECT_EQ(service.signatureChecks.empty(), !accepted) << verdict;
    }
}

TEST_F(SatchelVerification, RefusesATrustObjectWithoutAPublicKey) {
    service.publicKey = nullptr;
    EXPECT_EQ(verify(satchel()), status::kNotAvailable);
}

// The signature.

TEST_F(SatchelVerification, PassesOnTheSignatureErrorsCodeWhenItIsAStatus) {
    service.signatureError = Error(base::kOSStatusErrorDomain, kForeignStatus, "no");
    EXPECT_EQ(verify(satchel()), kForeignStatus);
}

TEST_F(SatchelVerification, GivesAStatusOfItsOwnToASignatureErrorOfCode0) {
    service.signatureError = Error(base::kOSStatusErrorDomain, 0, "no");
    EXPECT_EQ(verify(satchel()), status::kBadSignature);
}

TEST_F(SatchelVerification, GivesAStatusOfItsOwnToASignatureErrorOfAnotherDomain) {
    service.signatureError = Error(base::kPOSIXErrorDomain, 5, "no");
    EXPECT_EQ(verify(satchel()), status::kBadSignature);
}

TEST_F(SatchelVerification, DoesNotMakeSuccessOfACodeThatIsTooLargeForAStatus) {
    for (const std::int64_t code :
         {std::int64_t{1} << 32U, -(std::int64_t{1} << 32U), std::int64_t{1} << 40U}) {
        service.signatureError = Error(base::kOSStatusErrorDomain, code, "no");
        EXPECT_EQ(verify(satchel()), status::kBadSignature) << code;
    }
}

// Places for results, and memory.

TEST_F(SatchelVerification, NeedsAPlaceForEveryResult) {
    EXPECT_EQ(readSatchelCertificates(derElement(0x30, kLeaf), nullptr, service), status::kBadParameter);
    EXPECT_EQ(_satchel_create_trust({}, nullptr, nullptr, service), status::kBadParameter);
    EXPECT_EQ(_satchel_create_cert_policy(nullptr, service), status::kBadParameter);
}

TEST_F(SatchelVerification, HandsOutNothingThatItRefuses) {
    service.evaluations = {{.verdict = Verdict::proceed}};
    std::shared_ptr<trust::Trust> evaluated = service.trustOfChallenge();
    EXPECT_EQ(_satchel_create_trust({}, nullptr, &evaluated, service), status::kNotTrusted);
    EXPECT_EQ(evaluated, nullptr);

    std::vector<trust::CertificateRef> certificates(1);
    const Data twoAndAHalf = derElement(0x30, bytes({0x30, 0x00, 0x30, 0x00, 0x30}));
    EXPECT_EQ(readSatchelCertificates(twoAndAHalf, &certificates, service), status::kNotAvailable);
    EXPECT_THAT(certificates, IsEmpty());
}

class ExhaustedTrustService : public FakeTrustService {
  public:
    trust::CertificateRef parseCertificate(ByteView) const override { throw std::bad_alloc(); }
};

TEST_F(SatchelVerification, RefusesWhenMemoryRunsOut) {
    ExhaustedTrustService exhausted;
    const Data container = satchel().build();
    satchel_view view;
    ASSERT_EQ(satchel_decode_header(container.data(), container.size(), &view), 0);
    EXPECT_EQ(verifySatchel(&view, exhausted), status::kNotAvailable);
    EXPECT_EQ(satchel_verify_signature(&view, exhausted), -1);
}

// The payload.

class ValidatedPayload : public testing::Test {
  protected:
    std::int32_t get(const Data& container) {
        payload = container.data();
        length = 99;
        return satchel_get_validated_payload(container.data(), container.size(), &payload, &length, service);
    }

    FakeTrustService service;
    const std::byte* payload = nullptr;
    std::uint64_t length = 0;
};

TEST_F(ValidatedPayload, PointsIntoTheContainer) {
    const Data container = satchel().build();
    ASSERT_EQ(get(container), 0);
    EXPECT_EQ(payload, container.data() + container.size() - 72 - 7);
    EXPECT_EQ(length, 7U);
    EXPECT_EQ(toData(ByteView(payload, length)), toData("payload"));
}

TEST_F(ValidatedPayload, IsNothingWhenTheFramingIsRefused) {
    EXPECT_EQ(get(satchel().version(2).build()), -1);
    EXPECT_EQ(payload, nullptr);
    EXPECT_EQ(length, 0U);
    EXPECT_THAT(service.parsedCertificates, IsEmpty());
}

TEST_F(ValidatedPayload, IsNothingWhenTheVerificationFails) {
    service.evaluations = {{.verdict = Verdict::deny}};
    EXPECT_EQ(get(satchel().build()), -1);
    EXPECT_EQ(payload, nullptr);
    EXPECT_EQ(length, 0U);
}

TEST_F(ValidatedPayload, NeedsBothPlaces) {
    const Data container = satchel().build();
    EXPECT_EQ(satchel_get_validated_payload(container.data(), container.size(), nullptr, &length, service),
              -1);
    EXPECT_EQ(satchel_get_validated_payload(container.data(), container.size(), &payload, nullptr, service),
              -1);
    EXPECT_THAT(service.parsedCertificates, IsEmpty());
}

// The ticket.

class ValidatedTicket : public testing::Test {
  protected:
    std::int32_t get(const Data& container) {
        tm_ticket* decoded = nullptr;
        const std::int32_t result =
            satchel_get_validated_tm_ticket(container.data(), container.size(), &decoded, service);
        ticket.reset(decoded);
        return result;
    }

    FakeTrustService service;
    TicketPointer ticket;
};

TEST_F(ValidatedTicket, IsDecodedFromTheValidatedPayload) {
    const Data payload = test::TicketPayloadBuilder().entry(2, test::hashOf(1)).build();
    ASSERT_EQ(get(satchel().payload(payload).build()), 0);
    ASSERT_NE(ticket, nullptr);
    EXPECT_EQ(tm_ticket_get_cdhash_count(ticket.get()), 1U);
}

TEST_F(ValidatedTicket, IsRefusedWithItsContainer) {
    service.signatureError = Error::osStatus(kForeignStatus);
    const Data payload = test::TicketPayloadBuilder().build();
    EXPECT_EQ(get(satchel().payload(payload).build()), -1);
    EXPECT_EQ(ticket, nullptr);
}

TEST_F(ValidatedTicket, IsRefusedWhenThePayloadIsNone) {
    EXPECT_EQ(get(satchel().payload(toData("no ticket, but signed")).build()), -1);
    EXPECT_EQ(get(satchel().payload(test::TicketPayloadBuilder().hashLength(32).build()).build()), -1);
    EXPECT_EQ(ticket, nullptr);
}

TEST_F(ValidatedTicket, NeedsAPlace) {
    const Data container = satchel().payload(test::TicketPayloadBuilder().build()).build();
    EXPECT_EQ(satchel_get_validated_tm_ticket(container.data(), container.size(), nullptr, service), -1);
}

}  // namespace
}  // namespace pinwell
