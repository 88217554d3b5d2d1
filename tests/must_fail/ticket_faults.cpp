#include "ticket_faults.h"

#include <algorithm>

#include "base/text.h"

namespace pinwell::test {
namespace {

using S = Subject;
using I = IssuedChain;
using Payload = TicketPayloadBuilder;

constexpr std::uint32_t kMaximum = 0xFFFFFFFF;
constexpr int kRefused = 65;
constexpr int kRevoked = 77;

SatchelBuilder satchel(const S& s, const I& i) {
    return SatchelBuilder::of(i, s.payload().build());
}
Data of(const I& i, const Payload& payload) {
    return SatchelBuilder::of(i, payload.build()).build();
}

Data bytes(std::initializer_list<int> values) {
    Data data;
    for (const int value : values) data.push_back(static_cast<std::byte>(value));
    return data;
}

Data changed(Data data, std::size_t offset, std::byte mask = std::byte{1}) {
    data.at(offset) ^= mask;
    return data;
}
Data inserted(Data data, std::size_t offset) {
    data.insert(data.begin() + static_cast<std::ptrdiff_t>(offset), std::byte{0});
    return data;
}
Data removed(Data data, std::size_t offset) {
    data.erase(data.begin() + static_cast<std::ptrdiff_t>(offset));
    return data;
}
Data joined(Data first, const Data& second) {
    base::append(first, second);
    return first;
}

constexpr std::size_t kSignature = 72;
std::size_t signatureAt(const Data& ticket) {
    return ticket.size() - kSignature;
}
std::size_t payloadAt(const S& s, const Data& ticket) {
    return signatureAt(ticket) - s.payload().build().size();
}

Data hashEnding(const S& s, std::byte mask) {
    Data hash = s.hash;
    hash.back() ^= mask;
    return hash;
}
Data rotated(Data hash) {
    std::rotate(hash.begin(), hash.begin() + 1, hash.end());
    return hash;
}
Data reversed(Data hash) {
    std::reverse(hash.begin(), hash.end());
    return hash;
}
Data longer(Data hash) {
    hash.resize(48);
    return hash;
}

Data signedOver(const S& s, const I& i, const std::function<void(Data&)>& change) {
    const Data ticket = satchel(s, i).build();
    Data message(ticket.begin(), ticket.end() - kSignature);
    change(message);
    return satchel(s, i).signature(i.leaf.key.sign(message)).build();
}

I impostor() {
    TicketChain fields;
    for (CertificateFields* one : {&fields.root, &fields.intermediate, &fields.leaf})
        one->key = SigningKey::cached(KeyKind::p256, "impostor " + one->subject.back().second);
    return fields.issue();
}

/// Signed by a chain in which one thing is wrong, below the genuine root.
Data byChain(const S& s, const std::function<void(ChainFields&)>& change) {
    TicketChain fields;
    change(fields);
    return satchel(s, fields.issue()).build();
}

}  // namespace

Data goodTicket(const S& s, const I& i) {
    return satchel(s, i).build();
}

// clang-format off
const std::vector<TicketFault>& ticketFaults() {
    static const std::vector<TicketFault> faults{
        // Genuine, and of something else.
        {"AnotherArtefact", "lists another artefact's hash", kRefused, [](const S&, const I& i) { return of(i, Payload().entry(2, hashOf(7))); }},
        {"ManyOtherArtefacts", "lists 200 hashes, none of them this one", kRefused, [](const S&, const I& i) { Payload p; for (int n = 0; n < 200; ++n) p.entry(2, hashOf(static_cast<std::uint8_t>(n))); return of(i, p); }},
        {"NoArtefact", "lists no hash at all", kRefused, [](const S&, const I& i) { return of(i, Payload()); }},
        {"LastBitOfTheHash", "the hash differs in its last bit", kRefused, [](const S& s, const I& i) { return of(i, Payload().entry(s.algorithm, hashEnding(s, std::byte{1}))); }},
        {"FirstByteOfTheHash", "the hash differs in its first byte", kRefused, [](const S& s, const I& i) { return of(i, Payload().entry(s.algorithm, changed(s.hash, 0, std::byte{0x80}))); }},
        {"HashRotated", "the hash begins one byte later", kRefused, [](const S& s, const I& i) { return of(i, Payload().entry(s.algorithm, rotated(s.hash))); }},
        {"HashReversed", "the hash stands backwards", kRefused, [](const S& s, const I& i) { return of(i, Payload().entry(s.algorithm, reversed(s.hash))); }},
        {"HashZero", "a hash of zeros", kRefused, [](const S&, const I& i) { return of(i, Payload().entry(2, Data(20))); }},
        {"HashOfAlgorithm4", "the hash as the beginning of 48 bytes of algorithm 4", kRefused, [](const S& s, const I& i) { return of(i, Payload().hashLength(48).entry(4, longer(s.hash))); }},
        {"HashOfAlgorithm4In20Bytes", "algorithm 4 in an entry of 20 bytes", kRefused, [](const S& s, const I& i) { return of(i, Payload().entry(4, s.hash)); }},
        {"HashOfAlgorithm0", "algorithm 0 in a ticket of version 2", kRefused, [](const S& s, const I& i) { return of(i, Payload().entry(0, s.hash)); }},
        {"HashOfAlgorithm5", "an algorithm that nobody knows", kRefused, [](const S& s, const I& i) { return of(i, Payload().entry(5, s.hash)); }},
        {"HashOfAlgorithm255", "the highest algorithm number", kRefused, [](const S& s, const I& i) { return of(i, Payload().entry(255, s.hash)); }},
        {"HashAcrossTwoEntries", "half of the hash in each of two entries", kRefused, [](const S& s, const I& i) { Data one = s.hash; Data two = s.hash; std::rotate(one.begin(), one.begin() + 10, one.end()); std::fill(two.begin() + 10, two.end(), std::byte{0}); std::fill(one.begin(), one.begin() + 10, std::byte{0}); return of(i, Payload().entry(2, one).entry(2, two)); }},
        {"HashBehindTheCount", "the hash behind the entries, where the count ends", kRefused, [](const S& s, const I& i) { return of(i, s.payload().count(0)); }},
        {"HashInTheSignatureTime", "the hash where the time stands, entries empty", kRefused, [](const S& s, const I& i) { return of(i, Payload().trailing(s.hash)); }},
        // Revoked.
        {"Revoked", "the revoked flag", kRevoked, [](const S& s, const I& i) { return of(i, s.payload().revoked()); }},
        {"RevokedAndMore", "the revoked flag among all flags", kRevoked, [](const S& s, const I& i) { return of(i, s.payload().flags(kMaximum)); }},
        {"RevokedAnotherArtefact", "the revoked flag, and another artefact's hash", kRevoked, [](const S&, const I& i) { return of(i, Payload().entry(2, hashOf(7)).revoked()); }},
        {"RevokedNoArtefact", "the revoked flag, and no hash", kRevoked, [](const S&, const I& i) { return of(i, Payload().revoked()); }},
        {"RevokedButNotSigned", "the revoked flag in a ticket that nobody signed", kRefused, [](const S& s, const I& i) { return SatchelBuilder::of(i, s.payload().revoked().build()).signature({}).build(); }},
        {"RevokedFlagCleared", "a revoked ticket whose flag was cleared afterwards", kRefused, [](const S& s, const I& i) { const Data t = of(i, s.payload().revoked()); return changed(t, payloadAt(s, t) + 12); }},
        // Payload fields, signed in this form.
        {"PayloadMagic1", "the payload's first character", kRefused, [](const S& s, const I& i) { return of(i, s.payload().magic("n8tk")); }},
        {"PayloadMagic4", "the payload's fourth character", kRefused, [](const S& s, const I& i) { return of(i, s.payload().magic("m8tl")); }},
        {"PayloadMagicOfTheContainer", "the container's magic in the payload", kRefused, [](const S& s, const I& i) { return of(i, s.payload().magic("s8ch")); }},
        {"PayloadVersion0", "payload version 0", kRefused, [](const S& s, const I& i) { return of(i, s.payload().version(0)); }},
        {"PayloadVersion1WithAlgorithms", "version 1 around entries of version 2", kRefused, [](const S& s, const I& i) { return of(i, Payload().version(1).count(1).trailing(joined(bytes({s.algorithm}), s.hash))); }},
        {"PayloadVersion2WithoutAlgorithms", "version 2 around entries of version 1", kRefused, [](const S& s, const I& i) { return of(i, Payload().count(1).trailing(s.hash)); }},
        {"PayloadVersion3", "payload version 3", kRefused, [](const S& s, const I& i) { return of(i, s.payload().version(3)); }},
        {"PayloadVersion512", "the payload's version in the wrong byte order", kRefused, [](const S& s, const I& i) { return of(i, s.payload().version(0x0200)); }},
        {"HashLength0", "a hash length of 0", kRefused, [](const S& s, const I& i) { return of(i, s.payload().hashLength(0)); }},
        {"HashLength19", "a hash length of 19", kRefused, [](const S& s, const I& i) { return of(i, s.payload().hashLength(19)); }},
        {"HashLength21", "a hash length of 21", kRefused, [](const S& s, const I& i) { return of(i, s.payload().hashLength(21)); }},
        {"HashLength32", "a hash length of 32, all of it there", kRefused, [](const S& s, const I& i) { Data h = s.hash; h.resize(32); return of(i, Payload().hashLength(32).entry(s.algorithm, h)); }},
        {"HashLength48", "a hash length of 48 around a hash of 20", kRefused, [](const S& s, const I& i) { return of(i, s.payload().hashLength(48)); }},
        {"HashLength65535", "the highest hash length", kRefused, [](const S& s, const I& i) { return of(i, s.payload().hashLength(65535)); }},
        {"CountOneTooHigh", "the count is one too high", kRefused, [](const S& s, const I& i) { return of(i, s.payload().count(2)); }},
        {"CountHighest", "the highest count", kRefused, [](const S& s, const I& i) { return of(i, s.payload().count(kMaximum)); }},
        {"CountThatWraps", "a count whose entries come to the right size modulo 2^32", kRefused, [](const S& s, const I& i) { return of(i, s.payload().version(1).count(0x40000001)); }},
        {"PayloadTooLong", "a byte behind the entries", kRefused, [](const S& s, const I& i) { return of(i, s.payload().trailing(bytes({0}))); }},
        {"PayloadTooShort", "the last entry lacks its last byte", kRefused, [](const S& s, const I& i) { Data p = s.payload().build(); p.pop_back(); return SatchelBuilder::of(i, p).build(); }},
        {"PayloadOf23Bytes", "a payload shorter than its header", kRefused, [](const S& s, const I& i) { Data p = s.payload().build(); p.resize(23); return SatchelBuilder::of(i, p).build(); }},
        {"PayloadShifted", "a byte in front of the payload", kRefused, [](const S& s, const I& i) { return SatchelBuilder::of(i, inserted(s.payload().build(), 0)).build(); }},
        {"PayloadTwice", "the payload twice", kRefused, [](const S& s, const I& i) { return SatchelBuilder::of(i, joined(s.payload().build(), s.payload().build())).build(); }},
        // Container fields, signed in this form.
        {"Magic1", "the container's first character", kRefused, [](const S& s, const I& i) { return satchel(s, i).magic("t8ch").build(); }},
        {"Magic2", "the container's second character", kRefused, [](const S& s, const I& i) { return satchel(s, i).magic("s9ch").build(); }},
        {"Magic3", "the container's third character", kRefused, [](const S& s, const I& i) { return satchel(s, i).magic("s8Ch").build(); }},
        {"Magic4", "the container's fourth character", kRefused, [](const S& s, const I& i) { return satchel(s, i).magic("s8cH").build(); }},
        {"MagicReversed", "the container's magic backwards", kRefused, [](const S& s, const I& i) { return satchel(s, i).magic("hc8s").build(); }},
        {"Version0", "container version 0", kRefused, [](const S& s, const I& i) { return satchel(s, i).version(0).build(); }},
        {"Version2", "container version 2", kRefused, [](const S& s, const I& i) { return satchel(s, i).version(2).build(); }},
        {"Version256", "the container's version in the wrong byte order", kRefused, [](const S& s, const I& i) { return satchel(s, i).version(0x0100).build(); }},
        {"CertificatesLength0", "a certificate block of no length", kRefused, [](const S& s, const I& i) { return satchel(s, i).certificateBlockLength(0).build(); }},
        {"CertificatesLengthHighest", "the highest certificate block length", kRefused, [](const S& s, const I& i) { return satchel(s, i).certificateBlockLength(kMaximum).build(); }},
        {"PayloadLength0", "a payload of no length", kRefused, [](const S& s, const I& i) { return satchel(s, i).payloadLength(0).build(); }},
        {"PayloadLengthOneTooHigh", "the payload's length is one too high", kRefused, [](const S& s, const I& i) { return satchel(s, i).payloadLength(static_cast<std::uint32_t>(s.payload().build().size()) + 1).build(); }},
        {"PayloadLengthOneTooLow", "the payload's length is one too low", kRefused, [](const S& s, const I& i) { return satchel(s, i).payloadLength(static_cast<std::uint32_t>(s.payload().build().size()) - 1).build(); }},
        {"PayloadLengthHighest", "the highest payload length", kRefused, [](const S& s, const I& i) { return satchel(s, i).payloadLength(kMaximum).build(); }},
        {"ReservedChanged", "the reserved field was changed after the signing", kRefused, [](const S& s, const I& i) { return changed(satchel(s, i).build(), 6); }},
        // Bytes that belong to no part, and bytes that are missing.
        {"ByteBeforeIt", "a byte in front of the container", kRefused, [](const S& s, const I& i) { return inserted(satchel(s, i).build(), 0); }},
        {"ByteBehindTheHeader", "a byte between header and certificates", kRefused, [](const S& s, const I& i) { return inserted(satchel(s, i).build(), 16); }},
        {"ByteBehindTheCertificates", "a byte between certificates and payload", kRefused, [](const S& s, const I& i) { const Data t = satchel(s, i).build(); return inserted(t, payloadAt(s, t)); }},
        {"ByteBehindThePayload", "a byte between payload and signature", kRefused, [](const S& s, const I& i) { const Data t = satchel(s, i).build(); return inserted(t, signatureAt(t)); }},
        {"ByteBehindIt", "a byte behind the container", kRefused, [](const S& s, const I& i) { return joined(satchel(s, i).build(), bytes({0})); }},
        {"FirstByteMissing", "the container's first byte is missing", kRefused, [](const S& s, const I& i) { return removed(satchel(s, i).build(), 0); }},
        {"LastByteMissing", "the container's last byte is missing", kRefused, [](const S& s, const I& i) { const Data t = satchel(s, i).build(); return removed(t, t.size() - 1); }},
        {"SignatureMissing", "nothing stands behind the payload", kRefused, [](const S& s, const I& i) { Data t = satchel(s, i).build(); t.resize(signatureAt(t)); return t; }},
        {"HeaderAlone", "the header and nothing else", kRefused, [](const S& s, const I& i) { Data t = satchel(s, i).build(); t.resize(16); return t; }},
        {"Empty", "no byte at all", kRefused, [](const S&, const I&) { return Data(); }},
        {"OneByte", "a single byte", kRefused, [](const S&, const I&) { return bytes({0x73}); }},
        {"Zeros", "a thousand zeros", kRefused, [](const S&, const I&) { return Data(1000); }},
        {"PayloadAlone", "the payload without its container", kRefused, [](const S& s, const I&) { return s.payload().build(); }},
        {"InBase64", "the ticket in base64", kRefused, [](const S& s, const I& i) { return base::toData(base::encodeBase64(satchel(s, i).build())); }},
        {"TwoTickets", "two genuine tickets end to end", kRefused, [](const S& s, const I& i) { return joined(satchel(s, i).build(), satchel(s, i).build()); }},
        {"TicketInATicket", "a genuine ticket as the payload of another", kRefused, [](const S& s, const I& i) { return SatchelBuilder::of(i, satchel(s, i).build()).build(); }},
        // The certificate block.
        {"CertificatesAsASet", "a SET of certificates", kRefused, [](const S& s, const I& i) { return satchel(s, i).outerTag(0x31).build(); }},
        {"CertificatesPrimitive", "a SEQUENCE that is not constructed", kRefused, [](const S& s, const I& i) { return satchel(s, i).outerTag(0x10).build(); }},
        {"CertificatesIndefinite", "a SEQUENCE of indefinite length", kRefused, [](const S& s, const I& i) { return satchel(s, i).outerLengthBytes(bytes({0x80})).afterSequence(bytes({0, 0})).build(); }},
        {"CertificatesFollowed", "a byte behind the SEQUENCE", kRefused, [](const S& s, const I& i) { return satchel(s, i).afterSequence(bytes({0})).build(); }},
        {"CertificatesFollowedInside", "a NULL behind the last certificate", kRefused, [](const S& s, const I& i) { return satchel(s, i).certificates({i.leaf.der, i.intermediate.der, bytes({5, 0})}).build(); }},
        {"NoCertificates", "an empty SEQUENCE", kRefused, [](const S& s, const I& i) { return satchel(s, i).certificates({}).build(); }},
        {"FourCertificates", "the root twice, four certificates", kRefused, [](const S& s, const I& i) { return satchel(s, i).certificate(i.root.der).build(); }},
        {"LeafAlone", "the leaf alone", kRefused, [](const S& s, const I& i) { return satchel(s, i).certificates({i.leaf.der}).build(); }},
        {"LeafMissing", "intermediate and root alone", kRefused, [](const S& s, const I& i) { return satchel(s, i).certificates({i.intermediate.der, i.root.der}).build(); }},
        {"LeafSecond", "the intermediate first, the leaf second", kRefused, [](const S& s, const I& i) { return satchel(s, i).certificates({i.intermediate.der, i.leaf.der, i.root.der}).build(); }},
        {"LeafTwice", "the leaf in the place of the intermediate", kRefused, [](const S& s, const I& i) { return satchel(s, i).certificates({i.leaf.der, i.leaf.der, i.root.der}).build(); }},
        {"CertificatesSwappedAfterwards", "the intermediate exchanged for an impostor's after the signing", kRefused, [](const S& s, const I& i) { const Data t = satchel(s, i).build(); return satchel(s, i).certificates({i.leaf.der, impostor().intermediate.der, i.root.der}).signature(Data(t.end() - kSignature, t.end())).build(); }},
        {"ImpostorLeaf", "an impostor's leaf, which signed, before the genuine issuers", kRefused, [](const S& s, const I& i) { const I other = impostor(); return satchel(s, i).certificates({other.leaf.der, i.intermediate.der, i.root.der}).signedBy(other.leaf.key).build(); }},
        {"ImpostorChain", "every name is right, every key another", kRefused, [](const S& s, const I&) { return satchel(s, impostor()).build(); }},
        {"ImpostorBehindTheLeaf", "the genuine certificates, signed by an impostor", kRefused, [](const S& s, const I& i) { return satchel(s, i).signedBy(impostor().leaf.key).build(); }},
        {"ServersChain", "signed by a server's chain below a root of the maker's", kRefused, [](const S& s, const I& i) { ServerChain f; f.root.subject = i.root.subject; f.root.key = i.root.key; return satchel(s, f.issue()).build(); }},
        {"SignerWithoutItsMarker", "the signer lacks its marker", kRefused, [](const S& s, const I&) { return byChain(s, [](ChainFields& f) { f.leaf.markers.clear(); }); }},
        {"SignerWithTheServersMarker", "the signer has the pinned server's marker", kRefused, [](const S& s, const I&) { return byChain(s, [](ChainFields& f) { f.leaf.markers = {kPinnedServerMarker}; }); }},
        {"IntermediateWithoutItsMarker", "the intermediate lacks its marker", kRefused, [](const S& s, const I&) { return byChain(s, [](ChainFields& f) { f.intermediate.markers.clear(); }); }},
        {"SignerWithASmallKey", "the signer's curve has 224 bits", kRefused, [](const S& s, const I&) { return byChain(s, [](ChainFields& f) { f.leaf.key = SigningKey::cached(KeyKind::p224, "small"); }); }},
        {"SignerWithACurveOfItsOwn", "the signer's key describes its curve and names none", kRefused, [](const S& s, const I&) { return byChain(s, [](ChainFields& f) { f.leaf.key = SigningKey::cached(KeyKind::p256Described, "described"); }); }},
        {"SignerOverSha1", "the signer's certificate rests on SHA-1", kRefused, [](const S& s, const I&) { return byChain(s, [](ChainFields& f) { f.leaf.digest = SignatureDigest::sha1; }); }},
        {"SignerCorrupt", "the signature of the signer's certificate is corrupt", kRefused, [](const S& s, const I&) { return byChain(s, [](ChainFields& f) { f.leaf.corruptSignature = true; }); }},
        // The signature.
        {"NoSignature", "zeros in the place of a signature", kRefused, [](const S& s, const I& i) { return satchel(s, i).signature({}).build(); }},
        {"SignatureOfTheIntermediate", "signed by the intermediate", kRefused, [](const S& s, const I& i) { return satchel(s, i).signedBy(i.intermediate.key).build(); }},
        {"SignatureOfTheRoot", "signed by the root", kRefused, [](const S& s, const I& i) { return satchel(s, i).signedBy(i.root.key).build(); }},
        {"SignatureOfAnotherTicket", "the signature of a genuine ticket of something else", kRefused, [](const S& s, const I& i) { const Data other = of(i, Payload().entry(2, hashOf(7))); return satchel(s, i).signature(Data(other.end() - kSignature, other.end())).build(); }},
        {"SignatureOverThePayload", "signed over the payload alone", kRefused, [](const S& s, const I& i) { return signedOver(s, i, [&](Data& m) { m.erase(m.begin(), m.end() - static_cast<std::ptrdiff_t>(s.payload().build().size())); }); }},
        {"SignatureOverNoHeader", "signed over certificates and payload, not the header", kRefused, [](const S& s, const I& i) { return signedOver(s, i, [](Data& m) { m.erase(m.begin(), m.begin() + 16); }); }},
        {"SignatureOverTheField", "signed over the signature field as well", kRefused, [](const S& s, const I& i) { return signedOver(s, i, [](Data& m) { m.resize(m.size() + kSignature); }); }},
        {"SignatureOverNothing", "signed over an empty message", kRefused, [](const S& s, const I& i) { return signedOver(s, i, [](Data& m) { m.clear(); }); }},
        {"SignatureFirstByte", "the signature's first byte is another", kRefused, [](const S& s, const I& i) { const Data t = satchel(s, i).build(); return changed(t, signatureAt(t)); }},
        {"SignatureMiddle", "a bit in the middle of the signature", kRefused, [](const S& s, const I& i) { const Data t = satchel(s, i).build(); return changed(t, signatureAt(t) + 36); }},
        {"SignaturePadding", "the padding behind the signature is not zero", kRefused, [](const S& s, const I& i) { return satchel(s, i).signatureSize(70).lastSignatureByte(1).build(); }},
        // Anchors, with a valid ticket.
        {"NoAnchors", "no anchors at all", kRefused, goodTicket, [](SignerAnchors& a) { a.roots.clear(); }},
        {"CompatibilityAnchorOnly", "the root is in compat-roots/ alone", kRefused, goodTicket, [](SignerAnchors& a) { a.roots.swap(a.compatibility); }},
        {"UsersAnchorOnly", "the user alone trusts the root", kRefused, goodTicket, [](SignerAnchors& a) { a.roots.swap(a.allowed); }},
        {"ImpostorAnchor", "the anchor is an impostor's root", kRefused, goodTicket, [](SignerAnchors& a) { a.roots = {impostor().root.der}; }},
        {"AnchorDenied", "the user distrusts the root", kRefused, goodTicket, [](SignerAnchors& a) { a.denied = a.roots; }},
        {"SignerDeniedUnderAnotherSignature", "the user distrusts the signer, and holds its certificate under another signature", kRefused, goodTicket, [](SignerAnchors& a) { a.denied = {TicketChain().issue().leaf.der}; }},
        {"IntermediateDeniedUnderAnotherSignature", "the user distrusts the intermediate, and holds it under another signature", kRefused, goodTicket, [](SignerAnchors& a) { a.denied = {TicketChain().issue().intermediate.der}; }},
    };
    return faults;
}
// clang-format on

}  // namespace pinwell::test
