#include "trust/public_key.h"

#include <openssl/core_names.h>
#include <openssl/param_build.h>
#include <openssl/rsa.h>

#include <algorithm>

#include "base/byte_io.h"
#include "crypto/openssl.h"
#include "trust/der.h"

namespace pinwell::trust {

namespace {

using crypto::DigestContextHandle;
using crypto::ErrorQueueGuard;
using crypto::NumberHandle;
using crypto::ParameterBuilderHandle;
using crypto::unsignedBytes;

constexpr std::uint8_t kSignBit = 0x80;
constexpr std::size_t kLongestInteger = 67;  // the order of P-521 has 66 bytes, a positive integer one more

bool isPositiveInteger(const der::Element& element) {
    if (element.tag != der::kInteger || element.contents.empty() || element.contents.size() > kLongestInteger)
        return false;
    base::ByteReader reader(element.contents);
    const std::uint8_t first = reader.u8("integer");
    if (first != 0) return (first & kSignBit) == 0;
    return !reader.atEnd() && (reader.u8("integer") & kSignBit) != 0;  // or zero, or not the shortest form
}

/// The DER element at the start of the field; empty if the field is malformed.
ByteView signatureElement(ByteView field) {
    const std::optional<der::Element> sequence = der::readElement(field);
    if (!sequence || sequence->tag != der::kConstructedSequence) return {};
    const ByteView padding = field.subspan(sequence->whole.size());
    if (std::any_of(padding.begin(), padding.end(), [](std::byte byte) { return byte != std::byte{0}; }))
        return {};

    const std::optional<der::Element> r = der::readElement(sequence->contents);
    if (!r || !isPositiveInteger(*r)) return {};
    const ByteView rest = sequence->contents.subspan(r->whole.size());
    const std::optional<der::Element> s = der::readElement(rest);
    if (!s || !isPositiveInteger(*s) || s->whole.size() != rest.size()) return {};
    return sequence->whole;
}

}  // namespace

bool isStrictEcdsaSignature(ByteView signature) {
    return !signature.empty() && signatureElement(signature).size() == signature.size();
}

bool verifyEcdsa(const X509PublicKey& key, ByteView message, ByteView field) {
    if (key.type() != kKeyTypeEllipticCurve) return false;
    const ByteView signature = signatureElement(field);
    if (signature.empty()) return false;
    const ErrorQueueGuard guard;
    const DigestContextHandle context(EVP_MD_CTX_new());
    return context &&
           EVP_DigestVerifyInit(context.get(), nullptr, EVP_sha256(), nullptr, key.native()) == 1 &&
           EVP_DigestVerify(context.get(), unsignedBytes(signature), signature.size(), unsignedBytes(message),
                            message.size()) == 1;
}

namespace {

using Kind = SubjectKey::Kind;
using Scheme = SignatureAlgorithm::Scheme;
using SharedKey = std::shared_ptr<EVP_PKEY>;

constexpr std::size_t kEd25519Signature = 64;
constexpr std::size_t kEd448Signature = 114;

SharedKey own(EVP_PKEY* key) {
    return key == nullptr ? nullptr : SharedKey(key, EVP_PKEY_free);
}

NumberHandle number(ByteView bytes) {
    return NumberHandle(BN_bin2bn(unsignedBytes(bytes), static_cast<int>(bytes.size()), nullptr));
}

SharedKey fromParameters(const char* type, OSSL_PARAM_BLD* builder) {
    const crypto::ParametersHandle parameters(OSSL_PARAM_BLD_to_param(builder));
    const crypto::KeyContextHandle context(EVP_PKEY_CTX_new_from_name(nullptr, type, nullptr));
    EVP_PKEY* key = nullptr;
    if (!parameters || !context || EVP_PKEY_fromdata_init(context.get()) != 1 ||
        EVP_PKEY_fromdata(context.get(), &key, EVP_PKEY_PUBLIC_KEY, parameters.get()) != 1) {
        return nullptr;
    }
    return own(key);
}

SharedKey makeRsa(const SubjectKey& key) {
    const NumberHandle modulus = number(key.modulus);
    const NumberHandle exponent = number(key.exponent);
    const ParameterBuilderHandle builder(OSSL_PARAM_BLD_new());
    if (!modulus || !exponent || !builder ||
        OSSL_PARAM_BLD_push_BN(builder.get(), OSSL_PKEY_PARAM_RSA_N, modulus.get()) != 1 ||
        OSSL_PARAM_BLD_push_BN(builder.get(), OSSL_PKEY_PARAM_RSA_E, exponent.get()) != 1) {
        return nullptr;
    }
    return fromParameters("RSA", builder.get());
}

/// OpenSSL refuses a point that is not on the curve, also a compressed one without a valid y.
SharedKey makeEllipticCurve(const SubjectKey& key) {
    const ParameterBuilderHandle builder(OSSL_PARAM_BLD_new());
    const std::string curve(key.curve);
    if (!builder ||
        OSSL_PARAM_BLD_push_utf8_string(builder.get(), OSSL_PKEY_PARAM_GROUP_NAME, curve.c_str(), 0) != 1 ||
        OSSL_PARAM_BLD_push_octet_string(builder.get(), OSSL_PKEY_PARAM_PUB_KEY, key.point.data(),
                                         key.point.size()) != 1) {
        return nullptr;
    }
    return fromParameters("EC", builder.get());
}

SharedKey makeEdwards(const SubjectKey& key) {
    const char* const type = key.kind == Kind::ed25519 ? "ED25519" : "ED448";
    return own(
        EVP_PKEY_new_raw_public_key_ex(nullptr, type, nullptr, unsignedBytes(key.point), key.point.size()));
}

SharedKey makeNative(const SubjectKey& key) {
    switch (key.kind) {
        case Kind::rsa:
            return makeRsa(key);
        case Kind::ellipticCurve:
            return makeEllipticCurve(key);
        case Kind::ed25519:
        case Kind::ed448:
            return makeEdwards(key);
        case Kind::unusable:
            break;
    }
    return nullptr;
}

bool choosePssPadding(EVP_PKEY_CTX* context, const PssParameters& pss) {
    const std::string mask(pss.maskDigest.name);
    return EVP_PKEY_CTX_set_rsa_padding(context, RSA_PKCS1_PSS_PADDING) == 1 &&
           EVP_PKEY_CTX_set_rsa_mgf1_md_name(context, mask.c_str(), nullptr) == 1 &&
           EVP_PKEY_CTX_set_rsa_pss_saltlen(context, static_cast<int>(pss.saltLength)) == 1;
}

/// A key with parameters only verifies signatures with the same ones, and with a salt that is not shorter
/// (RFC 4055, 3.3).
bool permits(const PssParameters& key, const PssParameters& signature) {
    return key.digest == signature.digest && key.maskDigest == signature.maskDigest &&
           key.saltLength <= signature.saltLength;
}

}  // namespace

std::shared_ptr<const X509PublicKey> X509PublicKey::make(const SubjectKey& key) {
    const ErrorQueueGuard guard;
    SharedKey native = makeNative(key);
    if (native == nullptr) return nullptr;
    return std::shared_ptr<const X509PublicKey>(new X509PublicKey(key, std::move(native)));
}

std::shared_ptr<const X509PublicKey> X509PublicKey::fromSubjectPublicKeyInfo(ByteView der) {
    try {
        der::Cursor outer(der);
        const ByteView contents = outer.take(der::kConstructedSequence).contents;
        outer.expectEnd();
        return make(readSubjectKey(contents));
    } catch (const der::Malformed&) {
        return nullptr;
    }
}

std::string_view X509PublicKey::type() const noexcept {
    switch (description_.kind) {
        case Kind::rsa:
            return kKeyTypeRSA;
        case Kind::ellipticCurve:
            return kKeyTypeEllipticCurve;
        default:
            return {};
    }
}

bool X509PublicKey::isFor(const SignatureAlgorithm& algorithm) const {
    switch (algorithm.scheme) {
        case Scheme::ecdsa:
            return description_.kind == Kind::ellipticCurve;
        case Scheme::rsaPkcs1:
            return description_.kind == Kind::rsa && !description_.isPss;
        case Scheme::rsaPss:
            return description_.kind == Kind::rsa && algorithm.pss &&
                   (!description_.pssOnly || permits(*description_.pssOnly, *algorithm.pss));
        case Scheme::ed25519:
            return description_.kind == Kind::ed25519;
        case Scheme::ed448:
            return description_.kind == Kind::ed448;
        case Scheme::unknown:
            break;
    }
    return false;
}

bool X509PublicKey::hasProperLength(const SignatureAlgorithm& algorithm, ByteView signature) const {
    switch (algorithm.scheme) {
        case Scheme::ecdsa:
            return isStrictEcdsaSignature(signature);
        case Scheme::ed25519:
            return signature.size() == kEd25519Signature;
        case Scheme::ed448:
            return signature.size() == kEd448Signature;
        default:
            return signature.size() == description_.modulus.size();  // RFC 8017, 8.1.2 and 8.2.2
    }
}

bool X509PublicKey::verifies(const SignatureAlgorithm& algorithm, ByteView message,
                             ByteView signature) const {
    if (!isFor(algorithm) || !hasProperLength(algorithm, signature)) return false;
    const ErrorQueueGuard guard;
    const DigestContextHandle context(EVP_MD_CTX_new());
    const std::string digest(algorithm.digest.name);
    EVP_PKEY_CTX* choices = nullptr;  // belongs to the context
    if (!context ||
        EVP_DigestVerifyInit_ex(context.get(), &choices, digest.empty() ? nullptr : digest.c_str(), nullptr,
                                nullptr, native(), nullptr) != 1) {
        return false;
    }
    if (algorithm.pss && !choosePssPadding(choices, *algorithm.pss)) return false;
    return EVP_DigestVerify(context.get(), unsignedBytes(signature), signature.size(), unsignedBytes(message),
                            message.size()) == 1;
}

}  // namespace pinwell::trust
