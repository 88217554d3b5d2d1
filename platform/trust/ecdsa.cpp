#include "trust/ecdsa.h"

#include <algorithm>

#include "foundation/byte_reader.h"
#include "trust/der.h"
#include "trust/openssl.h"

namespace pinwell::trust {
namespace {

using DigestContext = Handle<EVP_MD_CTX, EVP_MD_CTX_free>;

constexpr std::uint8_t kSignBit = 0x80;
constexpr std::size_t kLongestInteger = 67;  // the order of P-521 has 66 bytes, a positive integer one more

bool isPositiveInteger(const der::Element& element) {
    if (element.tag != der::kInteger || element.contents.empty() || element.contents.size() > kLongestInteger)
        return false;
    foundation::ByteReader reader(element.contents);
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
    const DigestContext context(EVP_MD_CTX_new());
    return context &&
           EVP_DigestVerifyInit(context.get(), nullptr, EVP_sha256(), nullptr, key.native()) == 1 &&
           EVP_DigestVerify(context.get(), unsignedBytes(signature), signature.size(), unsignedBytes(message),
                            message.size()) == 1;
}

}  // namespace pinwell::trust
