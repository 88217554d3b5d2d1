#include "trust/signature_algorithm.h"

#include <algorithm>
#include <array>

#include "trust/der.h"

namespace pinwell::trust {
namespace {

using base::ByteView;
using der::Cursor;
using der::Element;
using der::Malformed;
using Scheme = SignatureAlgorithm::Scheme;

constexpr Digest kMd5{"MD5", false};
constexpr Digest kSha1{"SHA1", false};
constexpr Digest kSha224{"SHA224", true};
constexpr Digest kSha256{"SHA256", true};
constexpr Digest kSha384{"SHA384", true};
constexpr Digest kSha512{"SHA512", true};
constexpr Digest kSha512To224{"SHA512-224", true};
constexpr Digest kSha512To256{"SHA512-256", true};
constexpr Digest kSha3To224{"SHA3-224", true};
constexpr Digest kSha3To256{"SHA3-256", true};
constexpr Digest kSha3To384{"SHA3-384", true};
constexpr Digest kSha3To512{"SHA3-512", true};

struct DigestName {
    std::string_view oid;
    Digest digest;
};
// RFC 4055, 2.1, and the register of NIST's algorithms.
constexpr std::array kDigests{
    DigestName{"1.3.14.3.2.26", kSha1},
    DigestName{"2.16.840.1.101.3.4.2.4", kSha224},
    DigestName{"2.16.840.1.101.3.4.2.1", kSha256},
    DigestName{"2.16.840.1.101.3.4.2.2", kSha384},
    DigestName{"2.16.840.1.101.3.4.2.3", kSha512},
    DigestName{"2.16.840.1.101.3.4.2.5", kSha512To224},
    DigestName{"2.16.840.1.101.3.4.2.6", kSha512To256},
    DigestName{"2.16.840.1.101.3.4.2.7", kSha3To224},
    DigestName{"2.16.840.1.101.3.4.2.8", kSha3To256},
    DigestName{"2.16.840.1.101.3.4.2.9", kSha3To384},
    DigestName{"2.16.840.1.101.3.4.2.10", kSha3To512},
};

struct AlgorithmName {
    std::string_view oid;
    Scheme scheme;
    Digest digest;
};
constexpr std::string_view kMgf1Oid = "1.2.840.113549.1.1.8";
constexpr std::array kAlgorithms{
    AlgorithmName{"1.2.840.10045.4.1", Scheme::ecdsa, kSha1},
    AlgorithmName{"1.2.840.10045.4.3.1", Scheme::ecdsa, kSha224},
    AlgorithmName{"1.2.840.10045.4.3.2", Scheme::ecdsa, kSha256},
    AlgorithmName{"1.2.840.10045.4.3.3", Scheme::ecdsa, kSha384},
    AlgorithmName{"1.2.840.10045.4.3.4", Scheme::ecdsa, kSha512},
    AlgorithmName{"2.16.840.1.101.3.4.3.9", Scheme::ecdsa, kSha3To224},
    AlgorithmName{"2.16.840.1.101.3.4.3.10", Scheme::ecdsa, kSha3To256},
    AlgorithmName{"2.16.840.1.101.3.4.3.11", Scheme::ecdsa, kSha3To384},
    AlgorithmName{"2.16.840.1.101.3.4.3.12", Scheme::ecdsa, kSha3To512},
    AlgorithmName{"1.2.840.113549.1.1.4", Scheme::rsaPkcs1, kMd5},
    AlgorithmName{"1.2.840.113549.1.1.5", Scheme::rsaPkcs1, kSha1},
    AlgorithmName{"1.2.840.113549.1.1.14", Scheme::rsaPkcs1, kSha224},
    AlgorithmName{"1.2.840.113549.1.1.11", Scheme::rsaPkcs1, kSha256},
    AlgorithmName{"1.2.840.113549.1.1.12", Scheme::rsaPkcs1, kSha384},
    AlgorithmName{"1.2.840.113549.1.1.13", Scheme::rsaPkcs1, kSha512},
    AlgorithmName{"1.2.840.113549.1.1.15", Scheme::rsaPkcs1, kSha512To224},
    AlgorithmName{"1.2.840.113549.1.1.16", Scheme::rsaPkcs1, kSha512To256},
    AlgorithmName{"2.16.840.1.101.3.4.3.13", Scheme::rsaPkcs1, kSha3To224},
    AlgorithmName{"2.16.840.1.101.3.4.3.14", Scheme::rsaPkcs1, kSha3To256},
    AlgorithmName{"2.16.840.1.101.3.4.3.15", Scheme::rsaPkcs1, kSha3To384},
    AlgorithmName{"2.16.840.1.101.3.4.3.16", Scheme::rsaPkcs1, kSha3To512},
    AlgorithmName{kPssOid, Scheme::rsaPss, {}},
    AlgorithmName{"1.3.101.112", Scheme::ed25519, {}},
    AlgorithmName{"1.3.101.113", Scheme::ed448, {}},
};

/// Throws Malformed unless the parameters are a NULL, or absent.
void expectNullAtMost(Cursor& parameters) {
    const std::optional<Element> null = parameters.takeIf(der::kNull);
    if (null && !null->contents.empty()) throw Malformed("a NULL has contents");
    parameters.expectEnd();
}

Digest readDigest(Cursor identifier) {
    const std::string oid = identifier.oid();
    expectNullAtMost(identifier);
    const auto* const found =
        std::find_if(kDigests.begin(), kDigests.end(), [&](const DigestName& one) { return one.oid == oid; });
    if (found == kDigests.end()) throw Malformed("a digest is not known");
    return found->digest;
}

Digest readMaskDigest(Cursor identifier) {
    if (identifier.oid() != kMgf1Oid) throw Malformed("a mask generation function is not known");
    const Digest digest = readDigest(identifier.enter(der::kConstructedSequence));
    identifier.expectEnd();
    return digest;
}

std::size_t readSmallNumber(Cursor field, std::size_t largest) {
    const ByteView bytes = field.naturalNumber();
    field.expectEnd();
    std::size_t value = 0;
    for (const std::byte byte : bytes) {
        value = (value << 8U) | std::to_integer<std::size_t>(byte);
        if (value > largest) throw Malformed("a number is too large");
    }
    return value;
}

void readParameters(Cursor& parameters, SignatureAlgorithm& into) {
    switch (into.scheme) {
        case Scheme::rsaPkcs1:
            return expectNullAtMost(parameters);
        case Scheme::rsaPss:
            into.pss = readPssParameters(parameters.take(der::kConstructedSequence).contents);
            into.digest = into.pss->digest;
            return parameters.expectEnd();
        default:
            return parameters.expectEnd();
    }
}

}  // namespace

bool SignatureAlgorithm::isWeak() const {
    switch (scheme) {
        case Scheme::ed25519:
        case Scheme::ed448:
            return false;  // the digest is part of the scheme
        case Scheme::rsaPss:
            return !pss || !pss->digest.isSound || !pss->maskDigest.isSound;
        default:
            return !digest.isSound;
    }
}

PssParameters readPssParameters(ByteView contents) {
    constexpr std::size_t kDefaultSalt = 20;
    PssParameters result{kSha1, kSha1, kDefaultSalt};
    Cursor fields(contents);
    const auto enter = [&](std::uint32_t number) -> std::optional<Cursor> {
        const std::optional<Element> field = fields.takeIf(der::contextTag(number, true));
        return field ? std::optional(Cursor(field->contents)) : std::nullopt;
    };
    if (auto field = enter(0)) {
        result.digest = readDigest(field->enter(der::kConstructedSequence));
        field->expectEnd();
    }
    if (auto field = enter(1)) {
        result.maskDigest = readMaskDigest(field->enter(der::kConstructedSequence));
        field->expectEnd();
    }
    if (const auto field = enter(2)) result.saltLength = readSmallNumber(*field, kMaximumPssSalt);
    if (const auto field = enter(3)) {
        if (readSmallNumber(*field, 1) != 1) throw Malformed("a trailer is not known");
    }
    fields.expectEnd();
    return result;
}

SignatureAlgorithm readSignatureAlgorithm(ByteView contents) {
    SignatureAlgorithm result;
    Cursor identifier(contents);
    result.oid = identifier.oid();
    const auto* const known = std::find_if(kAlgorithms.begin(), kAlgorithms.end(),
                                           [&](const AlgorithmName& one) { return one.oid == result.oid; });
    Cursor parameters = identifier;
    if (!identifier.atEnd()) identifier.any();
    identifier.expectEnd();
    if (known == kAlgorithms.end()) return result;
    result.scheme = known->scheme;
    result.digest = known->digest;
    try {
        readParameters(parameters, result);
    } catch (const Malformed&) {
        result.scheme = Scheme::unknown;
        result.pss.reset();
    }
    return result;
}

}  // namespace pinwell::trust
