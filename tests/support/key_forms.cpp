#include "support/key_forms.h"

#include <stdexcept>

#include "base/byte_io.h"
#include "support/certificate_builder.h"
#include "support/ticket_builder.h"
#include "trust/der.h"

namespace pinwell::test {
namespace {

using base::ByteView;
using base::ByteWriter;
using base::Data;

constexpr std::uint8_t kInfoSequence = 0x30;
constexpr std::uint8_t kInfoBits = 0x03;
constexpr std::uint8_t kInfoNumber = 0x02;

struct KeyInfo {
    Data algorithm;  // an element
    Data bits;       // of the key, without the count of unused ones
};

KeyInfo readInfo(ByteView info) {
    const auto whole = trust::der::readElement(info);
    const auto algorithm = whole ? trust::der::readElement(whole->contents) : std::nullopt;
    const auto bits =
        algorithm ? trust::der::readElement(whole->contents.subspan(algorithm->whole.size())) : std::nullopt;
    if (!bits || bits->contents.empty()) throw std::runtime_error("no public key");
    return {base::toData(algorithm->whole), base::toData(bits->contents.subspan(1))};
}

Data writtenInfo(ByteView algorithm, ByteView bits) {
    const Data key = derElement(kInfoBits, ByteWriter().u8(0).bytes(bits).data());
    return derElement(kInfoSequence, ByteWriter().bytes(algorithm).bytes(key).data());
}

Data withPointForm(ByteView info, std::uint8_t form, bool keepsY) {
    const KeyInfo parts = readInfo(info);
    const ByteView coordinates = ByteView(parts.bits).subspan(1);
    const bool isOdd = (coordinates.back() & std::byte{1}) != std::byte{0};
    return writtenInfo(parts.algorithm, ByteWriter()
                                            .u8(static_cast<std::uint8_t>(form + (isOdd ? 1 : 0)))
                                            .bytes(coordinates.first(coordinates.size() / (keepsY ? 1 : 2)))
                                            .data());
}

constexpr std::string_view kRsaAlgorithm("\x30\x0D\x06\x09\x2A\x86\x48\x86\xF7\x0D\x01\x01\x01\x05\x00", 15);
constexpr std::string_view kPssAlgorithm("\x30\x0B\x06\x09\x2A\x86\x48\x86\xF7\x0D\x01\x01\x0A", 13);

}  // namespace

Data compressedPoint(ByteView info) {
    constexpr std::uint8_t kEvenY = 2;
    return withPointForm(info, kEvenY, false);
}

Data hybridPoint(ByteView info) {
    constexpr std::uint8_t kHybrid = 6;
    return withPointForm(info, kHybrid, true);
}

Data onDescribedCurve(ByteView info) {
    const Data described = SigningKey::cached(KeyKind::p256Described, "description").publicKeyInfo();
    return underAlgorithm(info, readInfo(described).algorithm);
}

Data asPssKey(ByteView info) {
    return underAlgorithm(info, base::asBytes(kPssAlgorithm));
}

Data underAlgorithm(ByteView info, ByteView algorithm) {
    return writtenInfo(algorithm, readInfo(info).bits);
}

Data rsaKey(ByteView modulus, ByteView exponent) {
    return writtenInfo(base::asBytes(kRsaAlgorithm),
                       derElement(kInfoSequence, ByteWriter()
                                                     .bytes(derElement(kInfoNumber, modulus))
                                                     .bytes(derElement(kInfoNumber, exponent))
                                                     .data()));
}

}  // namespace pinwell::test
