#include "trust/certificate.h"

#include <gtest/gtest.h>

#include "base/byte_io.h"
#include "elements.h"
#include "support/certificate_builder.h"

namespace pinwell::trust {
namespace {

using test::CertificateFields;
using test::issueCertificate;

X509CertificateRef made(const CertificateFields& fields) {
    return X509Certificate::parse(issueCertificate(fields, nullptr).der);
}

TEST(Certificate, KeepsItsBytes) {
    const Data der = issueCertificate({}, nullptr).der;
    EXPECT_EQ(X509Certificate::parse(der)->der(), der);
}

TEST(Certificate, IsRefusedWhenCutShortOrFollowedByMore) {
    Data der = issueCertificate({}, nullptr).der;
    for (std::size_t length = 0; length < der.size(); ++length) {
        EXPECT_EQ(X509Certificate::parse(ByteView(der).first(length)), nullptr);
    }
    der.push_back(std::byte{0});
    EXPECT_EQ(X509Certificate::parse(der), nullptr);
}

TEST(Certificate, IsRefusedWithAnIndefiniteLength) {
    Data der = issueCertificate({}, nullptr).der;
    Data indefinite{std::byte{0x30}, std::byte{0x80}};
    base::append(indefinite, ByteView(der).subspan(4));
    indefinite.resize(indefinite.size() + 2);
    EXPECT_EQ(X509Certificate::parse(indefinite), nullptr);
}

TEST(Certificate, HasExtensionsInItsThirdVersionOnly) {
    CertificateFields fields;
    EXPECT_NE(made(fields), nullptr);
    for (const int version : {1, 2, 4}) {
        fields.version = version;
        EXPECT_EQ(made(fields), nullptr) << version;
    }
}

TEST(Certificate, MayBeOfAnEarlierVersionWithoutExtensions) {
    CertificateFields fields;
    fields.basicConstraints.reset();
    fields.subjectKeyIdentifier = fields.authorityKeyIdentifier = test::KeyIdentifier::omitted();
    for (const int version : {1, 2}) {
        fields.version = version;
        EXPECT_NE(made(fields), nullptr) << version;
    }
}

TEST(Certificate, HasALimitOnItsSize) {
    const auto sized = [](std::size_t payload) {
        CertificateFields fields;
        fields.extensions = {{"1.2.3.4", false, Data(payload)}};
        return issueCertificate(fields, nullptr).der;
    };
    const std::size_t around = sized(100000).size() - 100000;
    std::size_t payload = kMaximumCertificateSize - around - 2;  // ECDSA signatures differ by a byte or two
    while (sized(payload).size() > kMaximumCertificateSize) --payload;
    const Data fits = sized(payload - 4);
    ASSERT_LE(fits.size(), kMaximumCertificateSize);
    EXPECT_NE(X509Certificate::parse(fits), nullptr);
    EXPECT_EQ(X509Certificate::parse(sized(kMaximumCertificateSize)), nullptr);
}

TEST(CertificateSummary, IsTheCommonName) {
    CertificateFields fields;
    fields.subject = {{"O", "Ostrel"}, {"CN", "Signer"}, {"OU", "Tickets"}};
    EXPECT_EQ(made(fields)->subjectSummary(), "Signer");
}

TEST(CertificateSummary, IsElseTheLastNamedPart) {
    CertificateFields fields;
    fields.subject = {{"O", "Ostrel"}, {"OU", "Tickets"}};
    EXPECT_EQ(made(fields)->subjectSummary(), "Tickets");
}

TEST(CertificateSummary, IsElseTheKeyIdentifier) {
    CertificateFields fields;
    fields.subject.clear();
    fields.subjectKeyIdentifier = test::KeyIdentifier::given("\x01\xAB");
    EXPECT_EQ(made(fields)->subjectSummary(), "01ab");
    fields.subjectKeyIdentifier = test::KeyIdentifier::omitted();
    EXPECT_EQ(made(fields)->subjectSummary().size(), 40U);
}

TEST(CertificateSummary, HoldsNoControlCharacters) {
    CertificateFields fields;
    fields.subject = {{"CN", "a\n\x1b[31m"}};
    EXPECT_EQ(made(fields)->subjectSummary().find_first_of("\n\x1b"), std::string::npos);
}

TEST(Certificate, KnowsTheSizeOfItsKey) {
    CertificateFields fields;
    fields.key = test::SigningKey::cached(test::KeyKind::p384, "key");
    EXPECT_EQ(made(fields)->publicKey()->type(), kKeyTypeEllipticCurve);
    EXPECT_EQ(made(fields)->publicKey()->bits(), 384);
    fields.key = test::SigningKey::cached(test::KeyKind::rsa2048, "key");
    EXPECT_EQ(made(fields)->publicKey()->type(), kKeyTypeRSA);
    EXPECT_EQ(made(fields)->publicKey()->bits(), 2048);
}

TEST(Certificate, HasNoKeyThatBringsItsOwnCurve) {
    CertificateFields fields;
    fields.key = test::SigningKey::cached(test::KeyKind::p256Described, "key");
    ASSERT_NE(made(fields), nullptr);
    EXPECT_EQ(made(fields)->publicKey(), nullptr);
    EXPECT_FALSE(made(fields)->verifiesSignatureOf(*made(fields)));
}

TEST(Certificate, KeepsDatesBeyondTheTwoDigitYears) {
    CertificateFields fields;
    fields.notAfter = {4102444800};  // 2100-01-01
    EXPECT_EQ(made(fields)->notAfter().seconds, 4102444800);
    EXPECT_EQ(made(fields)->notBefore().seconds, 1577836800);
}

// The grammar of a certificate's bytes. Each row is a certificate with one change under a valid signature;
// every rule here is our own, not a library's.

using base::asBytes;
using base::ByteWriter;
using test::CertificateElements;

/// The contents of one element.
Data inside(const Data& element) {
    return base::toData(der::readElement(element)->contents);
}

/// The same element around other contents.
Data around(const Data& element, const Data& contents) {
    return derElement(std::to_integer<std::uint8_t>(element.front()), contents);
}

void withoutExtensions(CertificateElements& all) {
    all.version.clear();
    all.extensions.clear();
}

Data time(std::uint8_t tag, std::string_view text) {
    return derElement(tag, asBytes(text));
}
Data validity(const Data& from, const Data& until) {
    return derElement(0x30, joined({from, until}));
}
const Data kFrom = time(0x17, "200101000000Z");
const Data kUntil = time(0x17, "491231235959Z");

/// One extension, 1.2.3, with these bytes after its identifier.
Data extensionsOf(const Data& behind) {
    return derElement(0xA3, derElement(0x30, derElement(0x30, joined({bytes({6, 2, 0x2A, 3}), behind}))));
}
const Data kNullValue = bytes({4, 2, 5, 0});

/// A subject of one attribute: a common name of that type.
Data nameOf(std::uint8_t type, std::string_view text) {
    return derElement(0x30, derElement(0x31, derElement(0x30, joined({bytes({6, 3, 0x55, 4, 3}),
                                                                      derElement(type, asBytes(text))}))));
}

/// An unknown AlgorithmIdentifier with those parameters.
Data unknownAlgorithm(const Data& parameters) {
    return derElement(0x30, joined({bytes({6, 2, 0x2A, 3}), parameters}));
}

struct GrammarRow {
    const char* name;
    bool isTaken;
    std::function<void(CertificateElements&)> edit;

    friend void PrintTo(const GrammarRow& row, std::ostream* out) { *out << row.name; }
};

class Grammar : public testing::TestWithParam<GrammarRow> {};

TEST_P(Grammar, IsKept) {
    CertificateFields fields;
    fields.edit = GetParam().edit;
    const test::IssuedCertificate issued = issueCertificate(fields, nullptr);
    EXPECT_EQ(X509Certificate::parse(issued.der) != nullptr, GetParam().isTaken);
}

using Elements = CertificateElements;

// clang-format off
INSTANTIATE_TEST_SUITE_P(OfTheWhole, Grammar, testing::Values(
    GrammarRow{"Unchanged", true, [](Elements&) {}},
    GrammarRow{"ASignatureOfNoByte", true, [](Elements& e) { e.signature = bytes({3, 1, 0}); }},
    GrammarRow{"ASignatureWithoutItsCountOfUnusedBits", false, [](Elements& e) { e.signature = bytes({3, 0}); }},
    GrammarRow{"ASignatureWithUnusedBits", false, [](Elements& e) { e.signature = bytes({3, 2, 4, 0xF0}); }},
    GrammarRow{"ASignatureAsAnOctetString", false, [](Elements& e) { e.signature = bytes({4, 1, 0}); }},
    GrammarRow{"AConstructedSignature", false, [](Elements& e) { e.signature = bytes({0x23, 3, 3, 1, 0}); }},
    GrammarRow{"NoSignature", false, [](Elements& e) { e.signature.emplace(); }},
    GrammarRow{"TwoSignatures", false, [](Elements& e) { e.signature = bytes({3, 1, 0, 3, 1, 0}); }},
    GrammarRow{"NoOuterAlgorithm", false, [](Elements& e) { e.outerAlgorithm.clear(); }},
    GrammarRow{"AnOuterAlgorithmOfNothing", false, [](Elements& e) { e.outerAlgorithm = bytes({0x30, 0}); }},
    GrammarRow{"AnOuterAlgorithmWithTwoParameters", false, [](Elements& e) { e.outerAlgorithm = unknownAlgorithm(bytes({5, 0, 5, 0})); }},
    GrammarRow{"AnUnknownAlgorithm", true, [](Elements& e) { e.outerAlgorithm = e.innerAlgorithm = unknownAlgorithm(bytes({5, 0})); }},
    GrammarRow{"AlgorithmsThatDiffer", true, [](Elements& e) { e.outerAlgorithm = unknownAlgorithm({}); }},
    GrammarRow{"AnInnerAlgorithmOfNothing", false, [](Elements& e) { e.innerAlgorithm = bytes({0x30, 0}); }},
    GrammarRow{"AnInnerAlgorithmAsASet", false, [](Elements& e) { e.innerAlgorithm.front() = std::byte{0x31}; }},
    GrammarRow{"AnElementBehindTheLast", false, [](Elements& e) { e.extensions = joined({e.extensions, bytes({5, 0})}); }},
    GrammarRow{"NoIssuer", false, [](Elements& e) { e.issuer.clear(); }},
    GrammarRow{"NoKey", false, [](Elements& e) { e.key.clear(); }}),
    [](const auto& row) { return std::string(row.param.name); });

INSTANTIATE_TEST_SUITE_P(OfTheVersion, Grammar, testing::Values(
    GrammarRow{"One", true, [](Elements& e) { withoutExtensions(e); }},
    GrammarRow{"Two", true, [](Elements& e) { withoutExtensions(e); e.version = bytes({0xA0, 3, 2, 1, 1}); }},
    GrammarRow{"ThreeWithoutExtensions", true, [](Elements& e) { e.extensions.clear(); }},
    GrammarRow{"OneWithExtensions", false, [](Elements& e) { e.version.clear(); }},
    GrammarRow{"TwoWithExtensions", false, [](Elements& e) { e.version = bytes({0xA0, 3, 2, 1, 1}); }},
    GrammarRow{"OneWithAnEmptyListOfExtensions", false, [](Elements& e) { e.version.clear(); e.extensions = bytes({0xA3, 2, 0x30, 0}); }},
    GrammarRow{"OneWrittenOut", false, [](Elements& e) { withoutExtensions(e); e.version = bytes({0xA0, 3, 2, 1, 0}); }},
    GrammarRow{"Four", false, [](Elements& e) { e.version = bytes({0xA0, 3, 2, 1, 3}); }},
    GrammarRow{"FourWithoutExtensions", false, [](Elements& e) { withoutExtensions(e); e.version = bytes({0xA0, 3, 2, 1, 3}); }},
    GrammarRow{"MinusOne", false, [](Elements& e) { e.version = bytes({0xA0, 3, 2, 1, 0xFF}); }},
    GrammarRow{"OfTwoBytes", false, [](Elements& e) { e.version = bytes({0xA0, 4, 2, 2, 0, 2}); }},
    GrammarRow{"Of257", false, [](Elements& e) { e.version = bytes({0xA0, 4, 2, 2, 1, 2}); }},
    GrammarRow{"OfNoByte", false, [](Elements& e) { e.version = bytes({0xA0, 2, 2, 0}); }},
    GrammarRow{"Twice", false, [](Elements& e) { e.version = bytes({0xA0, 6, 2, 1, 2, 2, 1, 2}); }},
    GrammarRow{"WithoutItsTag", false, [](Elements& e) { e.version = bytes({2, 1, 2}); }},
    GrammarRow{"AsAnEnumeration", false, [](Elements& e) { e.version = bytes({0xA0, 3, 0x0A, 1, 2}); }},
    GrammarRow{"OneWithAUniqueIdentifier", false, [](Elements& e) { withoutExtensions(e); e.issuerUniqueIdentifier = bytes({0x81, 2, 0, 7}); }},
    GrammarRow{"TwoWithUniqueIdentifiers", true, [](Elements& e) { withoutExtensions(e); e.version = bytes({0xA0, 3, 2, 1, 1}); e.issuerUniqueIdentifier = bytes({0x81, 2, 0, 7}); e.subjectUniqueIdentifier = bytes({0x82, 2, 0, 7}); }},
    GrammarRow{"UniqueIdentifiersInTheWrongOrder", false, [](Elements& e) { e.issuerUniqueIdentifier = bytes({0x82, 2, 0, 7}); e.subjectUniqueIdentifier = bytes({0x81, 2, 0, 7}); }},
    GrammarRow{"AUniqueIdentifierWithUnusedBitsSet", false, [](Elements& e) { e.issuerUniqueIdentifier = bytes({0x81, 2, 4, 7}); }}),
    [](const auto& row) { return std::string(row.param.name); });

INSTANTIATE_TEST_SUITE_P(OfTheSerialNumber, Grammar, testing::Values(
    GrammarRow{"Zero", true, [](Elements& e) { e.serialNumber = bytes({2, 1, 0}); }},
    GrammarRow{"Negative", true, [](Elements& e) { e.serialNumber = bytes({2, 1, 0x80}); }},
    GrammarRow{"Of21Bytes", true, [](Elements& e) { e.serialNumber = derElement(2, Data(21, std::byte{0x11})); }},
    GrammarRow{"OfFourThousandBytes", true, [](Elements& e) { e.serialNumber = derElement(2, Data(4000, std::byte{0x11})); }},
    GrammarRow{"OfNoByte", false, [](Elements& e) { e.serialNumber = bytes({2, 0}); }},
    GrammarRow{"WithAZeroInFront", false, [](Elements& e) { e.serialNumber = bytes({2, 2, 0, 1}); }},
    GrammarRow{"WithOnesInFront", false, [](Elements& e) { e.serialNumber = bytes({2, 2, 0xFF, 0x80}); }},
    GrammarRow{"AsText", false, [](Elements& e) { e.serialNumber = bytes({0x0C, 1, '1'}); }},
    GrammarRow{"Missing", false, [](Elements& e) { e.serialNumber.clear(); }}),
    [](const auto& row) { return std::string(row.param.name); });

INSTANTIATE_TEST_SUITE_P(OfTheDates, Grammar, testing::Values(
    GrammarRow{"BothForms", true, [](Elements& e) { e.validity = validity(kFrom, time(0x18, "20491231235959Z")); }},
    GrammarRow{"WithoutSeconds", false, [](Elements& e) { e.validity = validity(time(0x17, "2001010000Z"), kUntil); }},
    GrammarRow{"WithAnOffset", false, [](Elements& e) { e.validity = validity(time(0x17, "200101000000+0000"), kUntil); }},
    GrammarRow{"WithoutAZone", false, [](Elements& e) { e.validity = validity(kFrom, time(0x17, "491231235959")); }},
    GrammarRow{"WithAFraction", false, [](Elements& e) { e.validity = validity(kFrom, time(0x18, "20491231235959.0Z")); }},
    GrammarRow{"OnThe30thOfFebruary", false, [](Elements& e) { e.validity = validity(kFrom, time(0x17, "490230000000Z")); }},
    GrammarRow{"AtTheHour24", false, [](Elements& e) { e.validity = validity(kFrom, time(0x17, "491231240000Z")); }},
    GrammarRow{"InALeapSecond", false, [](Elements& e) { e.validity = validity(kFrom, time(0x17, "491231235960Z")); }},
    GrammarRow{"OfAnotherType", false, [](Elements& e) { e.validity = validity(kFrom, time(0x0C, "491231235959Z")); }},
    GrammarRow{"OneOnly", false, [](Elements& e) { e.validity = derElement(0x30, kFrom); }},
    GrammarRow{"Three", false, [](Elements& e) { e.validity = derElement(0x30, joined({kFrom, kUntil, kUntil})); }},
    GrammarRow{"AsASet", false, [](Elements& e) { e.validity.front() = std::byte{0x31}; }}),
    [](const auto& row) { return std::string(row.param.name); });

INSTANTIATE_TEST_SUITE_P(OfNames, Grammar, testing::Values(
    GrammarRow{"Empty", true, [](Elements& e) { e.subject = bytes({0x30, 0}); }},
    GrammarRow{"Utf8", true, [](Elements& e) { e.subject = nameOf(12, "Caf\xC3\xA9"); }},
    GrammarRow{"Utf8ThatIsNone", false, [](Elements& e) { e.subject = nameOf(12, "Caf\xE9"); }},
    GrammarRow{"Utf8OverlongNul", false, [](Elements& e) { e.subject = nameOf(12, "a\xC0\x80"); }},
    GrammarRow{"Utf8Surrogate", false, [](Elements& e) { e.issuer = nameOf(12, "\xED\xA0\x80"); }},
    GrammarRow{"PrintableOf8Bits", false, [](Elements& e) { e.subject = nameOf(19, "Caf\xE9"); }},
    GrammarRow{"Ia5Of8Bits", false, [](Elements& e) { e.subject = nameOf(22, "Caf\xE9"); }},
    GrammarRow{"T61Of8Bits", true, [](Elements& e) { e.subject = nameOf(20, "Caf\xE9"); }},
    GrammarRow{"Bmp", true, [](Elements& e) { e.subject = nameOf(30, std::string_view("\0C\0a", 4)); }},
    GrammarRow{"BmpOfThreeBytes", false, [](Elements& e) { e.subject = nameOf(30, std::string_view("\0C\0", 3)); }},
    GrammarRow{"BmpSurrogate", false, [](Elements& e) { e.subject = nameOf(30, std::string_view("\xD8\0", 2)); }},
    GrammarRow{"Universal", true, [](Elements& e) { e.subject = nameOf(28, std::string_view("\0\1\xF6\0", 4)); }},
    GrammarRow{"UniversalBeyondUnicode", false, [](Elements& e) { e.subject = nameOf(28, std::string_view("\0\x11\0\0", 4)); }},
    GrammarRow{"UniversalOfFiveBytes", false, [](Elements& e) { e.subject = nameOf(28, std::string_view("\0\0\0C\0", 5)); }},
    GrammarRow{"AValueThatIsNoText", true, [](Elements& e) { e.subject = nameOf(4, "any\xFFthing"); }},
    GrammarRow{"AnEmptySet", false, [](Elements& e) { e.subject = bytes({0x30, 2, 0x31, 0}); }},
    GrammarRow{"ASequenceForASet", false, [](Elements& e) { e.subject[2] = std::byte{0x30}; }},
    GrammarRow{"AnAttributeWithoutAValue", false, [](Elements& e) { e.subject = derElement(0x30, derElement(0x31, derElement(0x30, bytes({6, 3, 0x55, 4, 3})))); }},
    GrammarRow{"AnAttributeOfTwoValues", false, [](Elements& e) { e.subject = derElement(0x30, derElement(0x31, derElement(0x30, bytes({6, 3, 0x55, 4, 3, 5, 0, 5, 0})))); }},
    GrammarRow{"AnAttributeOfNoType", false, [](Elements& e) { e.subject = derElement(0x30, derElement(0x31, derElement(0x30, bytes({6, 0, 5, 0})))); }},
    GrammarRow{"OfTheMostAttributes", true, [](Elements& e) { Data all; for (std::size_t i = 0; i < kMaximumNameAttributes; ++i) base::append(all, inside(nameOf(12, "x"))); e.subject = derElement(0x30, all); }},
    GrammarRow{"OfTooManyAttributes", false, [](Elements& e) { Data all; for (std::size_t i = 0; i <= kMaximumNameAttributes; ++i) base::append(all, inside(nameOf(12, "x"))); e.subject = derElement(0x30, all); }},
    GrammarRow{"OfTooManyAttributesInOneSet", false, [](Elements& e) { Data all; for (std::size_t i = 0; i <= kMaximumNameAttributes; ++i) base::append(all, inside(inside(nameOf(12, "x")))); e.issuer = derElement(0x30, derElement(0x31, all)); }}),
    [](const auto& row) { return std::string(row.param.name); });

INSTANTIATE_TEST_SUITE_P(OfTheKey, Grammar, testing::Values(
    GrammarRow{"OfAnUnknownAlgorithm", true, [](Elements& e) { e.key = derElement(0x30, joined({unknownAlgorithm({}), bytes({3, 2, 0, 7})})); }},
    GrammarRow{"WithUnusedBits", false, [](Elements& e) { e.key = derElement(0x30, joined({unknownAlgorithm({}), bytes({3, 2, 4, 0x70})})); }},
    GrammarRow{"OfNoBit", true, [](Elements& e) { e.key = derElement(0x30, joined({unknownAlgorithm({}), bytes({3, 1, 0})})); }},
    GrammarRow{"WithoutItsCountOfUnusedBits", false, [](Elements& e) { e.key = derElement(0x30, joined({unknownAlgorithm({}), bytes({3, 0})})); }},
    GrammarRow{"AsAnOctetString", false, [](Elements& e) { e.key = derElement(0x30, joined({unknownAlgorithm({}), bytes({4, 2, 0, 7})})); }},
    GrammarRow{"WithAnElementBehindIt", false, [](Elements& e) { e.key = around(e.key, joined({inside(e.key), bytes({5, 0})})); }},
    GrammarRow{"WithTwoParameters", false, [](Elements& e) { e.key = derElement(0x30, joined({unknownAlgorithm(bytes({5, 0, 5, 0})), bytes({3, 2, 0, 7})})); }},
    GrammarRow{"OfNoAlgorithm", false, [](Elements& e) { e.key = derElement(0x30, bytes({0x30, 0, 3, 2, 0, 7})); }}),
    [](const auto& row) { return std::string(row.param.name); });

INSTANTIATE_TEST_SUITE_P(OfExtensions, Grammar, testing::Values(
    GrammarRow{"Critical", true, [](Elements& e) { e.extensions = extensionsOf(joined({bytes({1, 1, 0xFF}), kNullValue})); }},
    GrammarRow{"NotCriticalWrittenOut", true, [](Elements& e) { e.extensions = extensionsOf(joined({bytes({1, 1, 0}), kNullValue})); }},
    GrammarRow{"CriticalAsAOne", false, [](Elements& e) { e.extensions = extensionsOf(joined({bytes({1, 1, 1}), kNullValue})); }},
    GrammarRow{"CriticalOfTwoBytes", false, [](Elements& e) { e.extensions = extensionsOf(joined({bytes({1, 2, 0xFF, 0xFF}), kNullValue})); }},
    GrammarRow{"CriticalTwice", false, [](Elements& e) { e.extensions = extensionsOf(joined({bytes({1, 1, 0xFF, 1, 1, 0xFF}), kNullValue})); }},
    GrammarRow{"CriticalBehindTheValue", false, [](Elements& e) { e.extensions = extensionsOf(joined({kNullValue, bytes({1, 1, 0xFF})})); }},
    GrammarRow{"OfNoValue", false, [](Elements& e) { e.extensions = extensionsOf({}); }},
    GrammarRow{"OfTwoValues", false, [](Elements& e) { e.extensions = extensionsOf(joined({kNullValue, kNullValue})); }},
    GrammarRow{"AValueInPieces", false, [](Elements& e) { e.extensions = extensionsOf(bytes({0x24, 4, 4, 2, 5, 0})); }},
    GrammarRow{"AnEmptyList", false, [](Elements& e) { e.extensions = bytes({0xA3, 2, 0x30, 0}); }},
    GrammarRow{"NoList", false, [](Elements& e) { e.extensions = bytes({0xA3, 0}); }},
    GrammarRow{"TwoLists", false, [](Elements& e) { e.extensions = around(e.extensions, joined({inside(e.extensions), inside(e.extensions)})); }},
    GrammarRow{"Twice", false, [](Elements& e) { e.extensions = joined({e.extensions, e.extensions}); }},
    GrammarRow{"AnIdentifierOfOneHundredAndTwentyEightBytes", true, [](Elements& e) { e.extensions = derElement(0xA3, derElement(0x30, derElement(0x30, joined({derElement(6, Data(128, std::byte{1})), kNullValue})))); }},
    GrammarRow{"AGiantIdentifier", false, [](Elements& e) { e.extensions = derElement(0xA3, derElement(0x30, derElement(0x30, joined({derElement(6, Data(100000, std::byte{1})), kNullValue})))); }},
    GrammarRow{"AsManyAsThereMayBe", true, [](Elements& e) { Data all; for (std::size_t i = 0; i < kMaximumExtensions; ++i) base::append(all, inside(inside(extensionsOf(kNullValue)))); e.extensions = derElement(0xA3, derElement(0x30, all)); }},
    GrammarRow{"TooMany", false, [](Elements& e) { Data all; for (std::size_t i = 0; i <= kMaximumExtensions; ++i) base::append(all, inside(inside(extensionsOf(kNullValue)))); e.extensions = derElement(0xA3, derElement(0x30, all)); }}),
    [](const auto& row) { return std::string(row.param.name); });
// clang-format on

}  // namespace
}  // namespace pinwell::trust
