#include "trust/subject_key.h"

#include <algorithm>
#include <array>
#include <bit>

#include "base/byte_io.h"
#include "trust/der.h"

namespace pinwell::trust {
namespace {

using base::ByteReader;
using base::ByteView;
using base::ByteWriter;
using base::Data;
using der::Cursor;
using der::Element;
using der::Malformed;

constexpr std::string_view kRsaOid = "1.2.840.113549.1.1.1";
constexpr std::string_view kEllipticCurveOid = "1.2.840.10045.2.1";
constexpr std::string_view kEd25519Oid = "1.3.101.112";
constexpr std::string_view kEd448Oid = "1.3.101.113";

// First bytes of a point (SEC 1, 2.3.3).
enum PointForm : std::uint8_t { kEvenY = 2, kOddY = 3, kUncompressed = 4, kHybridEven = 6, kHybridOdd = 7 };

struct Curve {
    std::string_view oid;
    std::string_view name;  // OpenSSL's
    std::size_t bits;
};
// Curves over prime fields whose order is a prime: SEC 2 and RFC 5639.
constexpr std::array kCurves{
    Curve{"1.3.132.0.33", "secp224r1", 224},
    Curve{"1.2.840.10045.3.1.7", "prime256v1", 256},
    Curve{"1.3.132.0.34", "secp384r1", 384},
    Curve{"1.3.132.0.35", "secp521r1", 521},
    Curve{"1.3.132.0.10", "secp256k1", 256},
    Curve{"1.3.36.3.3.2.8.1.1.5", "brainpoolP224r1", 224},
    Curve{"1.3.36.3.3.2.8.1.1.7", "brainpoolP256r1", 256},
    Curve{"1.3.36.3.3.2.8.1.1.9", "brainpoolP320r1", 320},
    Curve{"1.3.36.3.3.2.8.1.1.11", "brainpoolP384r1", 384},
    Curve{"1.3.36.3.3.2.8.1.1.13", "brainpoolP512r1", 512},
};

ByteView withoutLeadingZeros(ByteView number) {
    const auto first =
        std::find_if(number.begin(), number.end(), [](std::byte byte) { return byte != std::byte{0}; });
    return number.subspan(static_cast<std::size_t>(first - number.begin()));
}

std::size_t bitLength(ByteView number) {
    if (number.empty()) return 0;
    return (number.size() - 1) * 8 +
           static_cast<std::size_t>(std::bit_width(std::to_integer<unsigned>(number.front())));
}

bool isOdd(ByteView number) {
    return !number.empty() && (number.back() & std::byte{1}) != std::byte{0};
}

Data identityOf(char kind, ByteView first, ByteView second = {}) {
    return std::move(ByteWriter()
                         .u8(static_cast<std::uint8_t>(kind))
                         .be32(static_cast<std::uint32_t>(first.size()))
                         .bytes(first)
                         .bytes(second))
        .take();
}

/// The identity of modulus and exponent, in any encoding of the integers.
std::optional<Data> rsaIdentity(ByteView key) {
    const std::optional<Element> sequence = der::readElement(key);
    if (!sequence || sequence->tag != der::kConstructedSequence || sequence->whole.size() != key.size())
        return std::nullopt;
    const std::optional<Element> modulus = der::readElement(sequence->contents);
    if (!modulus || modulus->tag != der::kInteger) return std::nullopt;
    const ByteView rest = sequence->contents.subspan(modulus->whole.size());
    const std::optional<Element> exponent = der::readElement(rest);
    if (!exponent || exponent->tag != der::kInteger) return std::nullopt;
    return identityOf('R', withoutLeadingZeros(modulus->contents), withoutLeadingZeros(exponent->contents));
}

/// The identity of x and the lowest bit of y, which every form of a point has.
std::optional<Data> pointIdentity(ByteView key) {
    if (key.size() < 2) return std::nullopt;
    ByteReader reader(key);
    const std::uint8_t form = reader.u8("form of the point");
    const ByteView coordinates = key.subspan(1);
    switch (form) {
        case kEvenY:
        case kOddY: {
            const std::array parity{std::byte{form == kOddY ? std::uint8_t{1} : std::uint8_t{0}}};
            return identityOf('E', withoutLeadingZeros(coordinates), parity);
        }
        case kUncompressed:
        case kHybridEven:
        case kHybridOdd: {
            if (coordinates.size() % 2 != 0) return std::nullopt;
            const std::array parity{coordinates.back() & std::byte{1}};
            return identityOf('E', withoutLeadingZeros(coordinates.first(coordinates.size() / 2)), parity);
        }
        default:
            return std::nullopt;
    }
}

Data identityOf(ByteView key) {
    if (auto identity = rsaIdentity(key)) return *std::move(identity);
    if (auto identity = pointIdentity(key)) return *std::move(identity);
    return identityOf('K', key);
}

bool isNullOrAbsent(ByteView parameters) {
    Cursor cursor(parameters);
    const std::optional<Element> null = cursor.takeIf(der::kNull);
    return cursor.atEnd() && (!null || null->contents.empty());
}

void readRsa(ByteView bytes, SubjectKey& key) {
    Cursor outer(bytes);
    Cursor numbers = outer.enter(der::kConstructedSequence);
    outer.expectEnd();
    const ByteView modulus = numbers.naturalNumber();
    const ByteView exponent = numbers.naturalNumber();
    numbers.expectEnd();
    if (bitLength(modulus) > kMaximumRsaBits || bitLength(exponent) > kMaximumRsaExponentBits) return;
    // An even modulus is not a product of odd primes, and an even exponent has no inverse. With exponent 1
    // anything would verify.
    if (!isOdd(modulus) || !isOdd(exponent) || bitLength(exponent) < 2) return;
    if (bitLength(modulus) <= bitLength(exponent)) return;
    key.kind = SubjectKey::Kind::rsa;
    key.bits = bitLength(modulus);
    key.modulus = base::toData(modulus);
    key.exponent = base::toData(exponent);
}

void readEllipticCurve(ByteView parameters, ByteView point, SubjectKey& key) {
    Cursor cursor(parameters);
    const std::string oid = cursor.oid();
    cursor.expectEnd();
    const auto* const curve =
        std::find_if(kCurves.begin(), kCurves.end(), [&](const Curve& one) { return one.oid == oid; });
    if (curve == kCurves.end() || point.empty()) return;
    const std::size_t field = (curve->bits + 7) / 8;
    const auto form = std::to_integer<std::uint8_t>(point.front());
    const bool isWhole = form == kUncompressed && point.size() == 1 + 2 * field;
    const bool isCompressed = (form == kEvenY || form == kOddY) && point.size() == 1 + field;
    if (!isWhole && !isCompressed) return;
    key.kind = SubjectKey::Kind::ellipticCurve;
    key.bits = curve->bits;
    key.curve = curve->name;
    key.point = base::toData(point);
}

void readEdwards(ByteView parameters, ByteView point, SubjectKey::Kind kind, SubjectKey& key) {
    const std::size_t size = kind == SubjectKey::Kind::ed25519 ? 32 : 57;
    if (!parameters.empty() || point.size() != size) return;
    key.kind = kind;
    key.bits = kind == SubjectKey::Kind::ed25519 ? 253 : 456;
    key.point = base::toData(point);
}

void readKnown(ByteView parameters, ByteView bits, SubjectKey& key) {
    if (key.algorithm == kRsaOid) {
        if (isNullOrAbsent(parameters)) readRsa(bits, key);
    } else if (key.algorithm == kPssOid) {
        Cursor cursor(parameters);
        if (!cursor.atEnd()) key.pssOnly = readPssParameters(cursor.take(der::kConstructedSequence).contents);
        cursor.expectEnd();
        key.isPss = true;
        readRsa(bits, key);
    } else if (key.algorithm == kEllipticCurveOid) {
        readEllipticCurve(parameters, bits, key);
    } else if (key.algorithm == kEd25519Oid) {
        readEdwards(parameters, bits, SubjectKey::Kind::ed25519, key);
    } else if (key.algorithm == kEd448Oid) {
        readEdwards(parameters, bits, SubjectKey::Kind::ed448, key);
    }
}

}  // namespace

SubjectKey readSubjectKey(ByteView contents) {
    Cursor cursor(contents);
    Cursor algorithm = cursor.enter(der::kConstructedSequence);
    const ByteView bits = der::wholeBytes(cursor.take(der::kBitString).contents);
    cursor.expectEnd();

    SubjectKey key;
    key.algorithm = algorithm.oid();
    const ByteView parameters = algorithm.rest();
    if (!algorithm.atEnd()) algorithm.any();
    algorithm.expectEnd();
    key.identity = identityOf(bits);
    try {
        readKnown(parameters, bits, key);
    } catch (const Malformed&) {
        key.kind = SubjectKey::Kind::unusable;
    }
    return key;
}

std::optional<Data> readKeyIdentity(ByteView contents) {
    const std::optional<Element> algorithm = der::readElement(contents);
    if (!algorithm) return std::nullopt;
    const std::optional<Element> bits = der::readElement(contents.subspan(algorithm->whole.size()));
    if (!bits || bits->tag != der::kBitString || bits->contents.empty()) return std::nullopt;
    return identityOf(bits->contents.subspan(1));
}

}  // namespace pinwell::trust
