// Usable keys, the identity of a key in every form, and the signatures that a key verifies.
#include "trust/public_key.h"

#include <gtest/gtest.h>

#include "elements.h"
#include "support/certificate_builder.h"
#include "support/key_forms.h"
#include "trust/certificate.h"
#include "trust/der.h"

namespace pinwell::trust {
namespace {

using base::Data;
using test::CertificateElements;
using test::CertificateFields;
using test::KeyKind;
using test::SignatureDigest;
using test::SigningKey;

Data keyInfo(KeyKind kind, const char* name = "key") {
    return SigningKey::cached(kind, name).publicKeyInfo();
}

std::shared_ptr<const X509PublicKey> read(const Data& info) {
    return X509PublicKey::fromSubjectPublicKeyInfo(info);
}

SubjectKey describe(const Data& info) {
    return readSubjectKey(der::readElement(info)->contents);
}

Data identity(const Data& info) {
    return describe(info).identity;
}

struct Usable {
    const char* name;
    KeyKind kind;
    std::string_view type;
    std::size_t bits;
    std::string_view curve;
};

class UsableKey : public testing::TestWithParam<Usable> {};

TEST_P(UsableKey, IsRead) {
    const auto key = read(keyInfo(GetParam().kind));
    ASSERT_NE(key, nullptr);
    EXPECT_EQ(key->type(), GetParam().type);
    EXPECT_EQ(key->bits(), GetParam().bits);
    EXPECT_EQ(key->curve(), GetParam().curve);
}

INSTANTIATE_TEST_SUITE_P(Of, UsableKey,
                         testing::Values(Usable{"P224", KeyKind::p224, "EC", 224, "secp224r1"},
                                         Usable{"P256", KeyKind::p256, "EC", 256, "prime256v1"},
                                         Usable{"P384", KeyKind::p384, "EC", 384, "secp384r1"},
                                         Usable{"P521", KeyKind::p521, "EC", 521, "secp521r1"},
                                         Usable{"Rsa1024", KeyKind::rsa1024, "RSA", 1024, ""},
                                         Usable{"Rsa2048", KeyKind::rsa2048, "RSA", 2048, ""},
                                         Usable{"Ed25519", KeyKind::ed25519, "", 253, ""}),
                         [](const auto& tested) { return tested.param.name; });

/// The known curves beside those of KeyKind: each has its base point as a key.
TEST(UsableKey, MayBeOnAnyCurveOfTheTable) {
    for (const char* name : {"secp256k1", "brainpoolP224r1", "brainpoolP256r1", "brainpoolP320r1",
                             "brainpoolP384r1", "brainpoolP512r1"}) {
        const SigningKey key = SigningKey::onCurve(name);
        const auto verifier = read(key.publicKeyInfo());
        ASSERT_NE(verifier, nullptr) << name;
        EXPECT_EQ(verifier->curve(), name);
        const Data message = base::toData("message");
        EXPECT_TRUE(verifier->verifies({"", SignatureAlgorithm::Scheme::ecdsa, {"SHA256", true}, {}}, message,
                                       key.sign(message)))
            << name;
    }
}

TEST(CompressedPoint, IsTheSameKey) {
    for (const char* name : {"a", "b", "c", "d", "e", "f"}) {  // both parities of y, all but certainly
        const SigningKey key = SigningKey::cached(KeyKind::p256, name);
        const auto compressed = read(test::compressedPoint(key.publicKeyInfo()));
        ASSERT_NE(compressed, nullptr);
        const Data message = base::toData("message");
        EXPECT_TRUE(compressed->verifies({"", SignatureAlgorithm::Scheme::ecdsa, {"SHA256", true}, {}},
                                         message, key.sign(message)));
    }
}

struct Unusable {
    const char* name;
    std::function<Data()> info;
};

class UnusableKey : public testing::TestWithParam<Unusable> {};

TEST_P(UnusableKey, IsNone) {
    EXPECT_EQ(read(GetParam().info()), nullptr);
}

/// The key of P-256 with other bytes for its point.
Data withPoint(const Data& point) {
    Data bits = bytes({0});
    base::append(bits, point);
    Data contents = base::toData(der::readElement(der::readElement(keyInfo(KeyKind::p256))->contents)->whole);
    base::append(contents, derElement(3, bits));
    return derElement(0x30, contents);
}

Data point(unsigned form, std::size_t size, unsigned fill) {
    Data data(size, static_cast<std::byte>(fill));
    data.insert(data.begin(), static_cast<std::byte>(form));
    return data;
}

Data modulus(std::size_t bits, unsigned last = 0xFF) {
    Data number(bits / 8, std::byte{0xFF});
    number.back() = static_cast<std::byte>(last);
    number.insert(number.begin(), std::byte{0});
    return number;
}

const Data kUsual = bytes({1, 0, 1});

Data changedBit(Data info) {
    info.back() ^= std::byte{1};
    return info;
}

Data algorithm(const Data& contents) {
    return derElement(0x30, contents);
}
const Data kEcOid = bytes({6, 7, 0x2A, 0x86, 0x48, 0xCE, 0x3D, 2, 1});
const Data kRsaOid = bytes({6, 9, 0x2A, 0x86, 0x48, 0x86, 0xF7, 0x0D, 1, 1, 1});

INSTANTIATE_TEST_SUITE_P(
    Of, UnusableKey,
    testing::Values(
        Unusable{"AHybridPoint", [] { return test::hybridPoint(keyInfo(KeyKind::p256)); }},
        Unusable{"ACurveByItsNumbers", [] { return test::onDescribedCurve(keyInfo(KeyKind::p256)); }},
        Unusable{"APointOffTheCurve", [] { return changedBit(keyInfo(KeyKind::p256)); }},
        Unusable{"APointBeyondTheField", [] { return withPoint(point(4, 64, 0xFF)); }},
        Unusable{"ACompressedPointOffTheCurve", [] { return withPoint(point(2, 32, 0xFF)); }},
        Unusable{"ThePointAtInfinity", [] { return withPoint(bytes({0})); }},
        Unusable{"NoPoint", [] { return withPoint({}); }},
        Unusable{"APointOfAnotherSize", [] { return withPoint(point(4, 96, 1)); }},
        Unusable{"HalfAPoint", [] { return withPoint(point(4, 32, 1)); }},
        Unusable{"APointOfAnotherForm", [] { return withPoint(point(5, 64, 1)); }},
        Unusable{"ACurveOfNoName",
                 [] { return test::underAlgorithm(keyInfo(KeyKind::p256), algorithm(kEcOid)); }},
        Unusable{"ACurveOfNull",
                 [] {
                     return test::underAlgorithm(keyInfo(KeyKind::p256),
                                                 algorithm(joined({kEcOid, bytes({5, 0})})));
                 }},
        Unusable{"AnUnknownCurve",
                 [] {
                     return test::underAlgorithm(keyInfo(KeyKind::p256),
                                                 algorithm(joined({kEcOid, bytes({6, 2, 0x2A, 3})})));
                 }},
        Unusable{"ABinaryCurve", [] { return SigningKey::onCurve("sect283k1").publicKeyInfo(); }},
        Unusable{"AnotherAlgorithmForTheCurve",
                 [] {
                     const Data ecdh = bytes({6, 5, 0x2B, 0x81, 4, 1, 0x0C});
                     const Data curve = bytes({6, 8, 0x2A, 0x86, 0x48, 0xCE, 0x3D, 3, 1, 7});
                     return test::underAlgorithm(keyInfo(KeyKind::p256), algorithm(joined({ecdh, curve})));
                 }},
        Unusable{"RsaOfTooManyBits", [] { return test::rsaKey(modulus(kMaximumRsaBits + 8), kUsual); }},
        Unusable{"RsaOfAMegabit", [] { return test::rsaKey(modulus(1000000), kUsual); }},
        Unusable{"RsaOfAnEvenModulus", [] { return test::rsaKey(modulus(2048, 0xFE), kUsual); }},
        Unusable{"RsaOfAnEvenExponent",
                 [] {
                     return test::rsaKey(modulus(2048), bytes({1, 0, 0}));
                 }},
        Unusable{"RsaOfTheExponentOne", [] { return test::rsaKey(modulus(2048), bytes({1})); }},
        Unusable{"RsaOfTheExponentZero", [] { return test::rsaKey(modulus(2048), bytes({0})); }},
        Unusable{"RsaOfANegativeExponent", [] { return test::rsaKey(modulus(2048), bytes({0xFF})); }},
        Unusable{"RsaOfALargeExponent", [] { return test::rsaKey(modulus(2048), modulus(72)); }},
        Unusable{"RsaOfAnExponentAsLargeAsItsModulus", [] { return test::rsaKey(modulus(64), modulus(64)); }},
        Unusable{"RsaOfANegativeModulus",
                 [] {
                     Data number = modulus(2048);
                     number.erase(number.begin());
                     number.front() = std::byte{0x9F};
                     return test::rsaKey(number, kUsual);
                 }},
        Unusable{"RsaOfANumberNotInTheFewestBytes",
                 [] {
                     Data number = modulus(2048);
                     number.insert(number.begin(), std::byte{0});
                     return test::rsaKey(number, kUsual);
                 }},
        Unusable{"RsaWithParameters",
                 [] {
                     return test::underAlgorithm(keyInfo(KeyKind::rsa2048),
                                                 algorithm(joined({kRsaOid, bytes({4, 1, 0})})));
                 }},
        Unusable{"RsaWithANullOfOneByte",
                 [] {
                     return test::underAlgorithm(keyInfo(KeyKind::rsa2048),
                                                 algorithm(joined({kRsaOid, bytes({5, 1, 0})})));
                 }},
        Unusable{
            "PssOfAnUnknownDigest",
            [] {
                const Data pss = bytes({6, 9, 0x2A, 0x86, 0x48, 0x86, 0xF7, 0x0D, 1, 1, 0x0A});
                const Data parameters = bytes({0x30, 8, 0xA0, 6, 0x30, 4, 6, 2, 0x2A, 3});
                return test::underAlgorithm(keyInfo(KeyKind::rsa2048), algorithm(joined({pss, parameters})));
            }},
        Unusable{"Ed25519WithParameters",
                 [] {
                     return test::underAlgorithm(keyInfo(KeyKind::ed25519),
                                                 algorithm(bytes({6, 3, 0x2B, 0x65, 0x70, 5, 0})));
                 }},
        Unusable{"Ed25519Of31Bytes",
                 [] {
                     Data bits(32);
                     Data contents = algorithm(bytes({6, 3, 0x2B, 0x65, 0x70}));
                     base::append(contents, derElement(3, bits));
                     return derElement(0x30, contents);
                 }},
        Unusable{"Dsa",
                 [] {
                     return test::underAlgorithm(
                         keyInfo(KeyKind::rsa2048),
                         algorithm(bytes({6, 7, 0x2A, 0x86, 0x48, 0xCE, 0x38, 4, 1})));
                 }}),
    [](const auto& tested) { return tested.param.name; });

TEST(RsaKey, MayHaveAsManyBitsAsItsLimits) {
    EXPECT_NE(read(test::rsaKey(modulus(kMaximumRsaBits), kUsual)), nullptr);
    EXPECT_NE(read(test::rsaKey(modulus(2048), modulus(kMaximumRsaExponentBits))), nullptr);
}

TEST(KeyIdentity, IsThatOfThePointInEveryForm) {
    for (const char* name : {"a", "b", "c", "d"}) {
        const Data whole = keyInfo(KeyKind::p256, name);
        EXPECT_EQ(identity(test::compressedPoint(whole)), identity(whole));
        EXPECT_EQ(identity(test::hybridPoint(whole)), identity(whole));
        EXPECT_EQ(identity(test::onDescribedCurve(whole)), identity(whole));
        EXPECT_EQ(identity(test::compressedPoint(test::onDescribedCurve(whole))), identity(whole));
    }
    EXPECT_NE(identity(keyInfo(KeyKind::p256, "a")), identity(keyInfo(KeyKind::p256, "b")));
}

TEST(KeyIdentity, DiffersForThePointOnTheOtherSide) {
    Data mirrored = test::compressedPoint(keyInfo(KeyKind::p256));
    const std::size_t form = mirrored.size() - 33;
    mirrored.at(form) ^= std::byte{1};
    EXPECT_NE(identity(mirrored), identity(keyInfo(KeyKind::p256)));
}

TEST(KeyIdentity, IsThatOfModulusAndExponentUnderEveryAlgorithm) {
    const Data whole = keyInfo(KeyKind::rsa2048);
    EXPECT_EQ(identity(test::asPssKey(whole)), identity(whole));
    EXPECT_EQ(identity(test::underAlgorithm(whole, algorithm(bytes({6, 2, 0x2A, 3})))), identity(whole));
    EXPECT_EQ(identity(test::underAlgorithm(whole, algorithm(kRsaOid))), identity(whole));
    EXPECT_EQ(identity(test::rsaKey(modulus(2048), kUsual)),
              identity(test::rsaKey(joined({bytes({0, 0}), modulus(2048)}), joined({bytes({0}), kUsual}))));
    EXPECT_NE(identity(test::rsaKey(modulus(2048), kUsual)),
              identity(test::rsaKey(modulus(2048), bytes({3}))));
    EXPECT_NE(identity(test::rsaKey(modulus(2048), kUsual)), identity(test::rsaKey(modulus(2056), kUsual)));
}

TEST(KeyIdentity, IsFoundWhereNothingElseCanBeRead) {
    const Data whole = keyInfo(KeyKind::p256);
    EXPECT_EQ(readKeyIdentity(der::readElement(whole)->contents), identity(whole));
    EXPECT_EQ(readKeyIdentity({}), std::nullopt);
    EXPECT_EQ(readKeyIdentity(bytes({0x30, 0})), std::nullopt);
    EXPECT_EQ(readKeyIdentity(bytes({0x30, 0, 4, 1, 0})), std::nullopt);
}

// Signatures of certificates.

const SigningKey kRsa = SigningKey::cached(KeyKind::rsa2048, "signer");
const SigningKey kEc = SigningKey::cached(KeyKind::p256, "signer");

X509CertificateRef selfSigned(const SigningKey& key,
                              const std::function<void(CertificateFields&)>& change = {}) {
    CertificateFields fields;
    fields.key = key;
    if (change) change(fields);
    return X509Certificate::parse(issueCertificate(fields, nullptr).der);
}

bool verifiesItself(const X509CertificateRef& certificate) {
    return certificate->verifiesSignatureOf(*certificate);
}

TEST(CertificateSignature, VerifiesUnderEveryScheme) {
    EXPECT_TRUE(verifiesItself(selfSigned(kEc)));
    EXPECT_TRUE(verifiesItself(selfSigned(kRsa)));
    EXPECT_TRUE(verifiesItself(selfSigned(SigningKey::cached(KeyKind::ed25519, "signer"))));
    for (const SignatureDigest digest :
         {SignatureDigest::sha1, SignatureDigest::sha256, SignatureDigest::sha384})
        EXPECT_TRUE(verifiesItself(selfSigned(kRsa, [&](CertificateFields& f) {
            f.pss = {digest, digest};
        })));
    EXPECT_TRUE(verifiesItself(selfSigned(kRsa, [](CertificateFields& f) {
        f.pss = {SignatureDigest::sha256, SignatureDigest::sha384};
    })));
}

TEST(CertificateSignature, IsWeakUnderSha1AndMd5) {
    const auto isWeak = [](const SigningKey& key, const std::function<void(CertificateFields&)>& change) {
        return selfSigned(key, change)->hasWeakSignatureDigest();
    };
    EXPECT_FALSE(isWeak(kEc, {}));
    EXPECT_FALSE(isWeak(SigningKey::cached(KeyKind::ed25519, "signer"), {}));
    EXPECT_TRUE(isWeak(kEc, [](CertificateFields& f) { f.digest = SignatureDigest::sha1; }));
    EXPECT_TRUE(isWeak(kRsa, [](CertificateFields& f) { f.digest = SignatureDigest::md5; }));
    EXPECT_FALSE(isWeak(kRsa, [](CertificateFields& f) { f.pss.emplace(); }));
    EXPECT_TRUE(isWeak(kRsa, [](CertificateFields& f) {
        f.pss = {SignatureDigest::sha1, SignatureDigest::sha1};
    }));
    EXPECT_TRUE(isWeak(kRsa, [](CertificateFields& f) {
        f.pss = {SignatureDigest::sha256, SignatureDigest::sha1};
    }));
}

TEST(CertificateSignature, OfAPssKeyIsPss) {
    const auto asPss = [](CertificateFields& f) {
        f.edit = [](CertificateElements& all) { all.key = test::asPssKey(all.key); };
    };
    EXPECT_FALSE(verifiesItself(selfSigned(kRsa, asPss)));
    EXPECT_TRUE(verifiesItself(selfSigned(kRsa, [&](CertificateFields& f) {
        asPss(f);
        f.pss.emplace();
    })));
}

/// A PSS key that restricts every signature to SHA-256, MGF1 with SHA-256 and a salt of at least `salt`
/// bytes.
Data limitedPssKey(const Data& key, unsigned salt) {
    const Data pss = bytes({6, 9, 0x2A, 0x86, 0x48, 0x86, 0xF7, 0x0D, 1, 1, 0x0A});
    const Data sha256 = derElement(0x30, bytes({6, 9, 0x60, 0x86, 0x48, 1, 0x65, 3, 4, 2, 1}));
    const Data mgf1 =
        derElement(0x30, joined({bytes({6, 9, 0x2A, 0x86, 0x48, 0x86, 0xF7, 0x0D, 1, 1, 8}), sha256}));
    const Data parameters = derElement(
        0x30, joined({derElement(0xA0, sha256), derElement(0xA1, mgf1), bytes({0xA2, 3, 2, 1, salt})}));
    return test::underAlgorithm(key, algorithm(joined({pss, parameters})));
}

TEST(CertificateSignature, KeepsToTheParametersOfAPssKey) {
    const auto verifies = [](unsigned salt, SignatureDigest digest) {
        return verifiesItself(selfSigned(kRsa, [&](CertificateFields& f) {
            f.pss = {digest, digest};
            f.edit = [salt](CertificateElements& all) { all.key = limitedPssKey(all.key, salt); };
        }));
    };
    EXPECT_TRUE(verifies(32, SignatureDigest::sha256));
    EXPECT_TRUE(verifies(20, SignatureDigest::sha256));
    EXPECT_FALSE(verifies(33, SignatureDigest::sha256));
    EXPECT_FALSE(verifies(32, SignatureDigest::sha384));
}

struct BadSignature {
    const char* name;
    const SigningKey& key;
    std::function<void(CertificateElements&)> edit;
};

class BadCertificateSignature : public testing::TestWithParam<BadSignature> {};

TEST_P(BadCertificateSignature, DoesNotVerify) {
    const auto certificate =
        selfSigned(GetParam().key, [](CertificateFields& fields) { fields.edit = GetParam().edit; });
    ASSERT_NE(certificate, nullptr);
    EXPECT_FALSE(verifiesItself(certificate));
}

/// A BIT STRING around a signature.
Data bitString(const Data& signature) {
    return derElement(3, joined({bytes({0}), signature}));
}

Data ecdsaWithSha256(const Data& parameters) {
    return algorithm(joined({bytes({6, 8, 0x2A, 0x86, 0x48, 0xCE, 0x3D, 4, 3, 2}), parameters}));
}
Data rsaWith(unsigned last, const Data& parameters) {
    return algorithm(joined({bytes({6, 9, 0x2A, 0x86, 0x48, 0x86, 0xF7, 0x0D, 1, 1, last}), parameters}));
}
void useAlgorithm(CertificateElements& all, const Data& used) {
    all.innerAlgorithm = all.outerAlgorithm = used;
}

INSTANTIATE_TEST_SUITE_P(
    Of, BadCertificateSignature,
    testing::Values(
        BadSignature{"NoByte", kEc, [](CertificateElements& e) { e.signature = bitString({}); }},
        BadSignature{"ZeroAndZero", kEc,
                     [](CertificateElements& e) {
                         e.signature = bitString(bytes({0x30, 6, 2, 1, 0, 2, 1, 0}));
                     }},
        BadSignature{"GiantNumbers", kEc,
                     [](CertificateElements& e) {
                         const Data number = derElement(2, Data(50000, std::byte{0x11}));
                         e.signature = bitString(derElement(0x30, joined({number, number})));
                     }},
        BadSignature{"RsaOfNoByte", kRsa, [](CertificateElements& e) { e.signature = bitString({}); }},
        BadSignature{"RsaOfZeros", kRsa, [](CertificateElements& e) { e.signature = bitString(Data(256)); }},
        BadSignature{"RsaOfAHundredThousandBytes", kRsa,
                     [](CertificateElements& e) { e.signature = bitString(Data(100000, std::byte{1})); }},
        BadSignature{"AlgorithmsThatDiffer", kEc,
                     [](CertificateElements& e) {
                         e.innerAlgorithm = ecdsaWithSha256(bytes({5, 0}));
                     }},
        BadSignature{"EcdsaWithParameters", kEc,
                     [](CertificateElements& e) {
                         useAlgorithm(e, ecdsaWithSha256(bytes({5, 0})));
                     }},
        BadSignature{"RsaWithParameters", kRsa,
                     [](CertificateElements& e) {
                         useAlgorithm(e, rsaWith(11, bytes({4, 0})));
                     }},
        BadSignature{"RsaUnderAnotherDigest", kRsa,
                     [](CertificateElements& e) {
                         useAlgorithm(e, rsaWith(12, bytes({5, 0})));
                     }},
        BadSignature{"RsaUnderItsKeysIdentifier", kRsa,
                     [](CertificateElements& e) {
                         useAlgorithm(e, rsaWith(1, bytes({5, 0})));
                     }},
        BadSignature{"RsaOverMd2", kRsa,
                     [](CertificateElements& e) {
                         useAlgorithm(e, rsaWith(2, bytes({5, 0})));
                     }},
        BadSignature{"PssWithoutParameters", kRsa,
                     [](CertificateElements& e) { useAlgorithm(e, rsaWith(10, {})); }},
        BadSignature{"PssOfAnotherTrailer", kRsa,
                     [](CertificateElements& e) {
                         useAlgorithm(e, rsaWith(10, bytes({0x30, 5, 0xA3, 3, 2, 1, 2})));
                     }},
        BadSignature{"PssOfAGiantSalt", kRsa,
                     [](CertificateElements& e) {
                         useAlgorithm(e, rsaWith(10, bytes({0x30, 7, 0xA2, 5, 2, 3, 1, 0, 0})));
                     }},
        BadSignature{"EcdsaByAnRsaKey", kRsa,
                     [](CertificateElements& e) { useAlgorithm(e, ecdsaWithSha256({})); }},
        BadSignature{"RsaByAnEllipticCurveKey", kEc,
                     [](CertificateElements& e) {
                         useAlgorithm(e, rsaWith(11, bytes({5, 0})));
                     }}),
    [](const auto& tested) { return tested.param.name; });

TEST(CertificateSignature, IsRefusedWithAByteAfterIt) {
    for (const SigningKey* key : {&kEc, &kRsa}) {
        const auto unchanged = selfSigned(*key);
        Data longer = base::toData(unchanged->parts().signature);
        longer.push_back(std::byte{0});
        const auto changed = selfSigned(*key, [&](CertificateFields& fields) {
            fields.edit = [&](CertificateElements& all) { all.signature = bitString(longer); };
        });
        EXPECT_FALSE(verifiesItself(changed));
    }
}

TEST(RsaSignature, MayHaveNoParametersInTheStead) {
    EXPECT_TRUE(verifiesItself(selfSigned(kRsa, [](CertificateFields& fields) {
        fields.edit = [](CertificateElements& all) { useAlgorithm(all, rsaWith(11, {})); };
    })));
}

}  // namespace
}  // namespace pinwell::trust
