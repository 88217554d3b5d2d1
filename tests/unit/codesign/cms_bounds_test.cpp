// The rules for a signer's message: each rule that bounds the work of verifying it, and each rule about its
// parts. The signatures are real: the same message without the fault verifies.
#include <gtest/gtest.h>

#include <algorithm>

#include "cms_fixture.h"
#include "codesign/cms_message.h"
#include "codesign/cms_signature.h"
#include "codesign/code_error.h"

namespace pinwell::test {
namespace {

using codesign::kMaximumCertificates;
using codesign::kMaximumDigestAlgorithms;
using codesign::kMaximumRsaBits;

constexpr std::string_view kContentType = "\x2A\x86\x48\x86\xF7\x0D\x01\x09\x03";
constexpr std::string_view kMessageDigest = "\x2A\x86\x48\x86\xF7\x0D\x01\x09\x04";
constexpr std::string_view kPlainData = "\x2A\x86\x48\x86\xF7\x0D\x01\x07\x01";

/// Why the message is refused; empty if it is not.
std::string refusalOf(ByteView message, ByteView content = kContent) {
    try {
        codesign::requireDetachedCms(message, content);
        return "";
    } catch (const codesign::CodeError& error) {
        EXPECT_EQ(error.status(), codesign::kInvalidSignature);
        return error.what();
    }
}
std::string refusalOf(const CmsParts& parts) {
    return refusalOf(parts.build());
}

CmsParts with(const std::function<void(CmsParts&)>& change) {
    CmsParts parts = goodParts();
    change(parts);
    return parts;
}

TEST(CmsMessage, VerifiesAsItWasTakenApart) {
    const Data message = CmsBuilder(kContent).build();
    EXPECT_EQ(CmsParts::of(message).build(), message);
    EXPECT_EQ(refusalOf(message), "");
}

TEST(CmsMessage, MayHaveEightDigestAlgorithmsAndNoMore) {
    const auto filled = [](std::size_t count) {
        return with([&](CmsParts& parts) {
            while (parts.digestAlgorithms.size() < count)
                parts.digestAlgorithms.push_back(algorithmIdentifier("\x2B\x0E\x03\x02\x1A"));
        });
    };
    EXPECT_EQ(refusalOf(filled(kMaximumDigestAlgorithms)), "");
    EXPECT_EQ(refusalOf(filled(kMaximumDigestAlgorithms + 1)),
              "the signer's message has too many digest algorithms");
    EXPECT_EQ(refusalOf(filled(80'000)), "the signer's message has too many digest algorithms");
}

TEST(CmsMessage, CountsTheSameDigestAlgorithmEachTime) {
    CmsParts parts = goodParts();
    parts.digestAlgorithms.resize(kMaximumDigestAlgorithms + 1, parts.digestAlgorithms.front());
    EXPECT_EQ(refusalOf(parts), "the signer's message has too many digest algorithms");
}

TEST(CmsMessage, MustListTheDigestAlgorithmOfItsSigner) {
    EXPECT_EQ(refusalOf(with([](CmsParts& parts) { parts.digestAlgorithms.clear(); })),
              "the message does not list the signer's digest algorithm");
    EXPECT_EQ(refusalOf(with([](CmsParts& parts) {
                  parts.digestAlgorithms = {algorithmIdentifier("\x2B\x0E\x03\x02\x1A")};
              })),
              "the message does not list the signer's digest algorithm");
}

TEST(CmsMessage, HasExactlyOneSigner) {
    EXPECT_EQ(refusalOf(with([](CmsParts& parts) { parts.signers.clear(); })),
              "the signer's message has no signer");
    EXPECT_EQ(refusalOf(with([](CmsParts& parts) { parts.signers.push_back(parts.signers.front()); })),
              "the signer's message has more than one signer");
    EXPECT_EQ(refusalOf(with([](CmsParts& parts) { parts.signers.resize(1000, parts.signers.front()); })),
              "the signer's message has more than one signer");
}

TEST(CmsMessage, MayHave64CertificatesAndNoMore) {
    const auto filled = [](std::size_t count, const Data& certificate) {
        return with([&](CmsParts& parts) { parts.certificates->resize(count, certificate); });
    };
    const Data certificate = certificateAround(rsaKeyOfExponentOne(1024));
    const Data ofAnotherForm = derElement(0xA2, {});
    for (const Data& one : {certificate, ofAnotherForm}) {
        EXPECT_EQ(refusalOf(filled(kMaximumCertificates, one)), "");
        EXPECT_EQ(refusalOf(filled(kMaximumCertificates + 1, one)),
                  "the signer's message has too many certificates");
    }
}

TEST(CmsMessage, FindsItsSignersCertificateInAnyPlace) {
    CmsParts parts = goodParts();
    parts.certificates->insert(parts.certificates->begin(), certificateAround(rsaKeyOfExponentOne(1024)));
    EXPECT_EQ(refusalOf(parts), "");
    parts.certificates->erase(parts.certificates->begin() + 1);
    EXPECT_EQ(refusalOf(parts), "the signer's certificate is not in the message");
}

TEST(CmsMessage, RefusesACertificateThatIsNone) {
    for (const Data& none : {derElement(0x30, {}), derElement(0x04, {}), derElement(0xA4, {}),
                             derElement(0x30, joined({derElement(0x30, {}), derElement(0x30, {}),
                                                      derElement(0x03, Data(1))}))}) {
        EXPECT_EQ(refusalOf(with([&](CmsParts& parts) { parts.certificates->push_back(none); })),
                  "a certificate in the message is malformed");
    }
}

TEST(CmsMessage, IsNotTakenInByItsRevocationLists) {
    EXPECT_EQ(refusalOf(with([](CmsParts& parts) {
                  parts.revocationLists = std::vector<Data>(1000, derElement(0x30, Data(100)));
              })),
              "");
}

TEST(CmsMessage, IsOfAKnownVersion) {
    for (const int version : {1, 3, 4, 5})
        EXPECT_EQ(refusalOf(with([&](CmsParts& parts) { parts.version = number(version); })), "");
    for (const int version : {0, 2, 6, 255})
        EXPECT_EQ(refusalOf(with([&](CmsParts& parts) { parts.version = number(version); })),
                  "the signer's message has an unknown version");
    for (const int version : {0, 2, 4})
        EXPECT_EQ(refusalOf(with([&](CmsParts& parts) { signerOf(parts).version = number(version); })),
                  "the signer in the message has an unknown version");
}

TEST(CmsMessage, IsNoOtherSortOfMessage) {
    EXPECT_EQ(refusalOf(with([](CmsParts& parts) { parts.type = "\x2A\x86\x48\x86\xF7\x0D\x01\x07\x03"; })),
              "the signer's message is no SignedData");
}

TEST(CmsMessage, IsDetachedEvenFromEmptyContent) {
    CmsParts parts = goodParts();
    parts.content =
        derElement(0x30, joined({identifier(kPlainData), derElement(0xA0, derElement(0x04, {}))}));
    EXPECT_EQ(refusalOf(parts), "the signer's message is not detached");
}

TEST(CmsMessage, HasNothingAfterItsParts) {
    const Data more = derElement(0x05, {});
    const std::string trailing = " has something after it";
    Data message = goodParts().build();
    base::append(message, more);
    EXPECT_EQ(refusalOf(message), "the signer's message" + trailing);

    const std::vector<Data> info = derElements(derContents(goodParts().build()));
    EXPECT_EQ(refusalOf(derElement(0x30, joined({info[0], info[1], more}))),
              "the signer's message" + trailing);
    const Data fields = base::toData(derContents(derContents(info[1])));
    EXPECT_EQ(refusalOf(derElement(
                  0x30, joined({info[0], derElement(0xA0, derElement(0x30, joined({fields, more})))}))),
              "the signer's message" + trailing);
    EXPECT_EQ(refusalOf(derElement(
                  0x30, joined({info[0], derElement(0xA0, joined({derElement(0x30, fields), more}))}))),
              "the signer's message" + trailing);
    EXPECT_EQ(refusalOf(with([&](CmsParts& parts) {
                  signerOf(parts).unsignedAttributes.emplace();
                  base::append(signerOf(parts).signature, derElement(0xA1, {}));
              })),
              "the signer in the message" + trailing);
}

TEST(CmsSignedAttributes, HoldTheDigestOfTheContentOnce) {
    const auto withoutDigest = [](CmsParts& parts) {
        std::erase_if(*signerOf(parts).signedAttributes, [](const Data& attribute) {
            return derElements(derContents(attribute)).front() == identifier(kMessageDigest);
        });
    };
    const std::string refusal = "the signed attributes have not the content's digest";
    EXPECT_EQ(refusalOf(with(withoutDigest)), refusal);
    EXPECT_EQ(refusalOf(with([&](CmsParts& parts) {
                  withoutDigest(parts);
                  signerOf(parts).signedAttributes->push_back(
                      attributeOf(kMessageDigest, {derElement(0x04, Data(32))}));
              })),
              refusal);
    EXPECT_EQ(refusalOf(with([&](CmsParts& parts) {
                  const std::vector<Data> again = *signerOf(parts).signedAttributes;
                  for (const Data& attribute : again) signerOf(parts).signedAttributes->push_back(attribute);
              })),
              "the signed attributes have not the content's type");
}

TEST(CmsSignedAttributes, HoldTheTypeOfTheContentOnce) {
    const auto typed = [](const std::vector<Data>& types) {
        return with([&](CmsParts& parts) {
            std::erase_if(*signerOf(parts).signedAttributes, [](const Data& attribute) {
                return derElements(derContents(attribute)).front() == identifier(kContentType);
            });
            for (const Data& type : types) signerOf(parts).signedAttributes->push_back(type);
        });
    };
    const std::string refusal = "the signed attributes have not the content's type";
    const Data right = attributeOf(kContentType, {identifier(kPlainData)});
    EXPECT_EQ(refusalOf(typed({})), refusal);
    EXPECT_EQ(refusalOf(typed({attributeOf(kContentType, {identifier(kTimeStampContent)})})), refusal);
    EXPECT_EQ(refusalOf(typed({right, right})), refusal);
    EXPECT_EQ(refusalOf(typed({attributeOf(kContentType, {})})), refusal);
    EXPECT_EQ(refusalOf(typed({attributeOf(kContentType, {identifier(kPlainData), identifier(kPlainData)})})),
              refusal);
}

TEST(CmsSignedAttributes, AreSignedInTheirOrderAndToTheLastByte) {
    EXPECT_EQ(refusalOf(with([](CmsParts& parts) {
                  std::vector<Data>& attributes = *signerOf(parts).signedAttributes;
                  std::swap(attributes.front(), attributes.back());
              })),
              "the signer's signature does not verify");
    EXPECT_EQ(refusalOf(with([](CmsParts& parts) {
                  signerOf(parts).signedAttributes->push_back(attributeOf("\x2A\x03", {number(1)}));
              })),
              "the signer's signature does not verify");
}

TEST(CmsSignedAttributes, AreSignedInDerHoweverTheyAreWritten) {
    for (const int levels : {1, 2, 9}) {
        EXPECT_EQ(refusalOf(with([&](CmsParts& parts) {
                      for (Data& attribute : *signerOf(parts).signedAttributes)
                          attribute = withIndefiniteLengths(attribute, levels);
                  })),
                  "");
    }
}

TEST(CmsSignedAttributes, MayBeMissingForPlainDataOnly) {
    CmsParts parts = CmsParts::of(CmsBuilder(kContent).withoutSignedAttributes().build());
    EXPECT_EQ(refusalOf(parts), "");
    parts.content = derElement(0x30, identifier(kTimeStampContent));
    EXPECT_EQ(refusalOf(parts), "the message has no signed attributes");
}

TEST(CmsSigner, MayBeNamedByItsKeyIdentifier) {
    EXPECT_EQ(refusalOf(CmsBuilder(kContent).byKeyIdentifier().build()), "");
    CmsParts parts = CmsParts::of(CmsBuilder(kContent).byKeyIdentifier().build());
    signerOf(parts).identifier = derElement(0x80, Data(20));
    EXPECT_EQ(refusalOf(parts), "the signer's certificate is not in the message");
    signerOf(parts).identifier = derElement(0x81, Data(20));
    EXPECT_EQ(refusalOf(parts), "the signer in the message is malformed");
}

TEST(CmsSigner, NamedByAKeyIdentifierNeedsACertificateThatHasIt) {
    CmsParts parts = signedByExponentOne(2048, kContent);
    signerOf(parts).identifier = derElement(0x80, base::asBytes("key"));
    EXPECT_EQ(refusalOf(parts), "the signer's certificate is not in the message");
    parts.certificates = {certificateAround(rsaKeyOfExponentOne(2048), "kez"),
                          certificateAround(rsaKeyOfExponentOne(2048), "key")};
    EXPECT_EQ(refusalOf(parts), "");
}

TEST(CmsSigner, IsFoundWhenItsNameIsWrittenWithAnotherStringType) {
    CmsParts parts = signedByExponentOne(2048, kContent);
    Data& name = signerOf(parts).identifier;
    const auto utf8 = std::ranges::find(name, std::byte{0x0C});
    ASSERT_NE(utf8, name.end());
    *utf8 = std::byte{0x13};  // PrintableString
    EXPECT_EQ(refusalOf(parts), "");
    name.at(name.size() - 4) = std::byte{'s'};  // of "Signer"
    EXPECT_EQ(refusalOf(parts), "the signer's certificate is not in the message");
}

TEST(CmsSigner, IsFoundByTheValueOfItsSerialNumber) {
    CmsParts parts = signedByExponentOne(2048, kContent);
    std::vector<Data> fields = derElements(derContents(signerOf(parts).identifier));
    fields[1] = derElement(0x02, Data{std::byte{0}, std::byte{1}});
    signerOf(parts).identifier = derElement(0x30, joined(fields));
    EXPECT_EQ(refusalOf(parts), "");
    fields[1] = number(2);
    signerOf(parts).identifier = derElement(0x30, joined(fields));
    EXPECT_EQ(refusalOf(parts), "the signer's certificate is not in the message");
}

TEST(CmsSigner, MayHaveAnRsaKeyOf8192BitsAndNoLonger) {
    EXPECT_EQ(refusalOf(signedByExponentOne(kMaximumRsaBits, kContent)), "");
    for (const std::size_t bits : {kMaximumRsaBits + 1, kMaximumRsaBits + 8, std::size_t{12'000}})
        EXPECT_EQ(refusalOf(signedByExponentOne(bits, kContent)), "the signer's RSA key is too long") << bits;
    EXPECT_EQ(refusalOf(signedByExponentOne(1'000'000, kContent)), "the signer's key is too long");
}

TEST(CmsSigner, HasAnRsaOrEllipticCurveKey) {
    // DSA, X9.42 Diffie-Hellman, Ed25519.
    for (const std::string_view algorithm :
         {"\x2A\x86\x48\xCE\x38\x04\x01", "\x2A\x86\x48\xCE\x3E\x02\x01", "\x2B\x65\x70"}) {
        CmsParts parts = signedByExponentOne(2048, kContent);
        const Data key =
            derElement(0x30, joined({algorithmIdentifier(algorithm), derElement(0x03, Data(33))}));
        parts.certificates = {certificateAround(key)};
        EXPECT_EQ(refusalOf(parts), "the signer's key is neither RSA nor EC");
    }
}

TEST(CmsSigner, OfAnotherCertificateMayHaveAnyKey) {
    const Data key = derElement(
        0x30, joined({algorithmIdentifier("\x2A\x86\x48\xCE\x38\x04\x01"), derElement(0x03, Data(100'000))}));
    EXPECT_EQ(refusalOf(with([&](CmsParts& parts) {
                  parts.certificates->push_back(certificateAround(key));
                  parts.certificates->push_back(certificateAround(rsaKeyOfExponentOne(100'000)));
              })),
              "");
}

TEST(CmsSigner, HasASignatureAlgorithmOfItsKey) {
    EXPECT_EQ(refusalOf(with([](CmsParts& parts) {
                  signerOf(parts).signatureAlgorithm = algorithmIdentifier(kRsaIdentifier);
              })),
              "the signature's algorithm is not one of the signer's key");
    CmsParts rsa = signedByExponentOne(2048, kContent);
    signerOf(rsa).signatureAlgorithm = algorithmIdentifier("\x2A\x86\x48\xCE\x3D\x04\x03\x02");
    EXPECT_EQ(refusalOf(rsa), "the signature's algorithm is not one of the signer's key");
    signerOf(rsa).signatureAlgorithm = algorithmIdentifier("\x2A\x86\x48\x86\xF7\x0D\x01\x01\x0B");
    EXPECT_EQ(refusalOf(rsa), "") << "named with its digest";
}

TEST(CmsSigner, HasAKnownDigestAlgorithm) {
    CmsParts parts = signedByExponentOne(2048, kContent);
    signerOf(parts).digestAlgorithm = algorithmIdentifier("\x2A\x03\x04");
    parts.digestAlgorithms = {signerOf(parts).digestAlgorithm};
    EXPECT_EQ(refusalOf(parts), "the signer's digest algorithm is unknown");
}

TEST(CmsSigner, MayHaveItsSignatureInPieces) {
    CmsParts parts = signedByExponentOne(2048, kContent);
    const ByteView value = derContents(signerOf(parts).signature);
    const Data pieces = joined({derElement(0x04, value.first(100)), derElement(0x04, value.subspan(100))});
    signerOf(parts).signature = derElement(0x24, pieces);
    EXPECT_EQ(refusalOf(parts), "");
}

TEST(CmsSigner, RefusesASignatureOfAnyOtherLength) {
    CmsParts parts = signedByExponentOne(2048, kContent);
    const Data value = base::toData(derContents(signerOf(parts).signature));
    for (const std::size_t length :
         {std::size_t{0}, value.size() - 1, value.size() + 1, std::size_t{1'000'000}}) {
        Data other = value;
        other.resize(length);
        signerOf(parts).signature = derElement(0x04, other);
        EXPECT_EQ(refusalOf(parts), "the signer's signature does not verify") << length;
    }
}

class PssSignature : public testing::Test {
  protected:
    static CmsParts withParameters(const std::vector<Data>& parameters) {
        CmsParts parts = CmsParts::of(CmsBuilder(kContent).key(TestKey::rsa2048).pss().build());
        const Data algorithm = identifier("\x2A\x86\x48\x86\xF7\x0D\x01\x01\x0A");
        signerOf(parts).signatureAlgorithm =
            derElement(0x30, joined({algorithm, derElement(0x30, joined(parameters))}));
        return parts;
    }
    static Data digest(std::string_view name = kSha256Identifier) {
        return derElement(0xA0, algorithmIdentifier(name));
    }
    static Data mask(std::string_view function = "\x2A\x86\x48\x86\xF7\x0D\x01\x01\x08") {
        return derElement(
            0xA1, derElement(0x30, joined({identifier(function), algorithmIdentifier(kSha256Identifier)})));
    }
    static Data salt(const Data& length) { return derElement(0xA2, derElement(0x02, length)); }
    static Data salt(std::uint8_t length) { return salt(Data{static_cast<std::byte>(length)}); }
};

TEST_F(PssSignature, Verifies) {
    const CmsParts made = CmsParts::of(CmsBuilder(kContent).key(TestKey::rsa2048).pss().build());
    EXPECT_EQ(refusalOf(made), "");
    EXPECT_EQ(refusalOf(withParameters({digest(), mask(), salt(Data{std::byte{0}, std::byte{222}})})), "");
    EXPECT_NE(refusalOf(withParameters({digest(), mask(), salt(32)})), "") << "a salt of another length";
}

TEST_F(PssSignature, NamesTheSignersDigest) {
    EXPECT_NE(refusalOf(withParameters({digest("\x2B\x0E\x03\x02\x1A"), mask(), salt(222)})), "");
    EXPECT_NE(refusalOf(withParameters({})), "") << "SHA-1, where none is named";
}

TEST_F(PssSignature, HasASaltOfPossibleLength) {
    const std::string refusal = "the signature's algorithm has a number that is out of range";
    EXPECT_EQ(refusalOf(withParameters({digest(), mask(), salt(Data(4, std::byte{0x7F}))})), refusal);
    EXPECT_EQ(refusalOf(withParameters({digest(), mask(), salt(Data(100'000, std::byte{0x7F}))})), refusal);
    EXPECT_EQ(refusalOf(withParameters({digest(), mask(), salt(Data{std::byte{0xFF}})})), refusal);
    EXPECT_EQ(refusalOf(withParameters({digest(), mask(), salt(Data())})), refusal);
    EXPECT_EQ(refusalOf(withParameters({digest(), mask(), salt(Data{std::byte{0x7F}, std::byte{0xFF}})})),
              "the signer's signature does not verify");
}

TEST_F(PssSignature, HasTheKnownMaskFunctionAndTrailer) {
    EXPECT_EQ(refusalOf(withParameters({digest(), mask("\x2A\x03"), salt(222)})),
              "the signature's mask function is unknown");
    const Data trailer = derElement(0xA3, number(2));
    EXPECT_EQ(refusalOf(withParameters({digest(), mask(), trailer})), "the signature's trailer is unknown");
}

}  // namespace
}  // namespace pinwell::test
