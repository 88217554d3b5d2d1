#include "chain_vocabulary.h"

#include <algorithm>
#include <stdexcept>

#include "support/ticket_builder.h"

namespace pinwell::test::faults {

Data bytes(std::initializer_list<int> values) {
    Data data;
    for (const int value : values) data.push_back(static_cast<std::byte>(value));
    return data;
}

Data joined(const Data& first, const Data& second) {
    Data all = first;
    base::append(all, second);
    return all;
}

Data number(std::size_t size, int last) {
    Data data(size, std::byte{0xFF});
    data.back() = static_cast<std::byte>(last);
    data.insert(data.begin(), std::byte{0});
    return data;
}

Data dates(std::string_view from, std::string_view until) {
    return derElement(0x30,
                      joined(derElement(0x17, base::asBytes(from)), derElement(0x17, base::asBytes(until))));
}

void replace(CertificateFields& c, const char* oid, bool critical, Data value) {
    c.extensions.push_back({oid, critical, std::move(value)});
}

void withoutExtensions(CertificateFields& c) {
    c.basicConstraints.reset();
    c.keyUsage.clear();
    c.extendedKeyUsage.clear();
    c.subjectAlternativeNames.clear();
    c.subjectKeyIdentifier = c.authorityKeyIdentifier = KeyIdentifier::omitted();
    c.markers.clear();
}

void useKey(CertificateFields& c, KeyKind kind) {
    c.key = SigningKey::cached(kind, "faulty");
}

void everyKeyRsa(ChainFields& chain) {
    chain.root.key = SigningKey::cached(KeyKind::rsa2048, "faulty root");
    chain.intermediate.key = SigningKey::cached(KeyKind::rsa2048, "faulty intermediate");
}

void flipBehind(Data& der, const Data& pattern, std::size_t offset, bool last, std::byte mask) {
    const auto found = last ? std::find_end(der.begin(), der.end(), pattern.begin(), pattern.end())
                            : std::search(der.begin(), der.end(), pattern.begin(), pattern.end());
    if (found == der.end()) throw std::runtime_error("the certificate does not hold what shall be changed");
    der.at(static_cast<std::size_t>(found - der.begin()) + pattern.size() + offset) ^= mask;
}

const Data kEcdsaWithSha2 = bytes({0x06, 0x08, 0x2A, 0x86, 0x48, 0xCE, 0x3D, 0x04, 0x03});
const Data kPointBits = bytes({0x03, 0x42, 0x00, 0x04});

void lengthenLength(Data& der) {
    if (der.at(1) != std::byte{0x82})
        throw std::runtime_error("a certificate of 256 to 65535 bytes expected");
    der[1] = std::byte{0x83};
    der.insert(der.begin() + 2, std::byte{0});
}

void makeIndefinite(Data& der) {
    der.erase(der.begin() + 2, der.begin() + 4);
    der[1] = std::byte{0x80};
    der.resize(der.size() + 2);
}

}  // namespace pinwell::test::faults
