// Certificates of a ticket and of a server, each up to 131072 bytes, and the PEM files of distrust.
#include <algorithm>
#include <stdexcept>

#include "costly_input.h"
#include "support/certificate_builder.h"
#include "support/key_forms.h"
#include "support/ticket_builder.h"
#include "trust/anchors.h"
#include "trust/der.h"
#include "trust/trust.h"

namespace pinwell::test {
namespace {

using base::ByteView;
using trust::X509Certificate;

constexpr const char* kServerHost = "api.lumora.example";
constexpr values::Date kJudgedAt{1795204500};  // 2026-11-20 19:55:00 UTC

// The maximum that a server may send.
constexpr std::size_t kListed = 16;

// A certificate may have 131072 bytes. Its other parts, around its large part, take less than the difference.
constexpr std::size_t kLargePart = 125000;

/// Judges the list as a server's, without anchors.
void judge(const std::vector<ByteView>& list) {
    const auto service = trust::makeTrustService(
        config::PlatformDirectory("/nowhere"), [](std::string_view) {}, [] { return kJudgedAt; });
    std::vector<trust::CertificateRef> certificates;
    for (const ByteView der : list) certificates.push_back(service->parseCertificate(der));
    const auto object = service->makeTrust(certificates, trust::pinnedServerPolicy(kServerHost));
    if (!object || !(*object)->evaluate() ||
        !(*object)->setPolicy(trust::compatibilityServerPolicy(kServerHost)) || !(*object)->evaluate())
        throw std::runtime_error("the list could not be judged");
}

/// Certificates end to end: all are read, and the first of them judged.
bool readList(const Data& input) {
    bool isTaken = true;
    std::vector<ByteView> list;
    for (ByteView rest = input; !rest.empty();) {
        const auto element = trust::der::readElement(rest);
        if (!element) return false;
        const bool isCertificate = X509Certificate::parse(element->whole) != nullptr;
        isTaken = isTaken && isCertificate;
        if (isCertificate && list.size() < kListed) list.push_back(element->whole);
        rest = rest.subspan(element->whole.size());
    }
    if (!list.empty()) judge(list);
    return isTaken;
}

/// A file of user-trust/deny.
bool readDenied(const Data& input) {
    trust::DenyList denied;
    trust::readDeniedPem(input, denied, [](const std::string&) {});
    return denied.size() != 0;
}

/// Copies end to end, up to about that length.
Data copies(const std::vector<Data>& certificates, std::size_t length) {
    Data once;
    for (const Data& certificate : certificates) base::append(once, certificate);
    Data all = once;
    while (all.size() + once.size() <= length) base::append(all, once);
    return all;
}

Data ordinaryList(std::size_t length) {
    return copies(ServerChain(kServerHost).issue().list(), length);
}

Data joined(const Data& first, const Data& second) {
    Data all = first;
    base::append(all, second);
    return all;
}

Data manyOf(const Data& part, std::size_t length) {
    Data all;
    while (all.size() + part.size() <= length) base::append(all, part);
    return all;
}

Data textElement(std::uint8_t tag, std::string_view contents) {
    return derElement(tag, base::asBytes(contents));
}

const Data& sequence() {
    static const Data empty = derElement(0x30, Data{});
    return empty;
}

using Fields = std::function<void(CertificateFields&)>;

Data certificateOf(const Fields& change) {
    CertificateFields fields = ServerChain(kServerHost).leaf;
    change(fields);
    return issueCertificate(fields, nullptr).der;
}

/// Copies of one certificate, with changed fields.
CostlyInput certificateRow(std::string name, std::string cost, bool isTaken, Fields change) {
    return {.name = "Certificate" + name,
            .cost = std::move(cost),
            .read = readList,
            .isTaken = isTaken,
            .costly = [change = std::move(change)](
                          std::size_t length) { return copies({certificateOf(change)}, length); },
            .control = ordinaryList};
}

Fields edited(std::function<void(CertificateElements&)> edit) {
    return [edit = std::move(edit)](CertificateFields& fields) { fields.edit = edit; };
}

/// An extension of that value instead of the one from the fields.
Fields extended(const char* oid, const Data& value) {
    return [oid, value](CertificateFields& fields) {
        fields.subjectAlternativeNames.clear();
        fields.extendedKeyUsage.clear();
        fields.extensions.push_back({oid, false, value});
    };
}

/// A public key of those bits under an algorithm with those parameters.
Fields keyed(const Data& algorithm, const Data& bits) {
    return edited([algorithm, bits](CertificateElements& all) {
        all.key = derElement(
            0x30, joined(derElement(0x30, algorithm), derElement(0x03, joined(Data{std::byte{0}}, bits))));
    });
}

/// The contents of a positive INTEGER of that many bytes, odd.
Data oddNumber(std::size_t size) {
    Data data(size, std::byte{0xFF});
    data.insert(data.begin(), std::byte{0});
    return data;
}

/// Certificates of one name on the builder's slowest curve, each issued by the next one.
Data namesakes(std::size_t length) {
    const auto key = [](std::size_t i) {
        return SigningKey::cached(KeyKind::p521, "namesake " + std::to_string(i));
    };
    std::vector<Data> list;
    for (std::size_t i = 0; i < kListed; ++i) {
        CertificateFields fields = ServerChain(kServerHost).leaf;
        fields.subject = commonName("Same");
        fields.key = key(i);
        fields.signer = key((i + 1) % kListed);
        fields.subjectKeyIdentifier = fields.authorityKeyIdentifier = KeyIdentifier::omitted();
        fields.extensions.push_back({"1.2.3.4", false, Data(std::min(length / kListed, kLargePart) - 1024)});
        list.push_back(issueCertificate(fields, nullptr).der);
    }
    return copies(list, length);
}

/// A thousand names below a thousand constraints: the highest permitted number of comparisons.
Data crossedNames(std::size_t length) {
    constexpr std::size_t kNames = 1000;
    const std::string host =
        "a.very.long.name.that.is.equal.to.the.end.of.the.other." + std::string(kServerHost);
    const Data name = textElement(0x82, host);
    ChainFields chain = ServerChain(kServerHost);
    chain.leaf.subjectAlternativeNames.clear();
    chain.leaf.extensions.push_back(
        {"2.5.29.17", false, derElement(0x30, manyOf(name, kNames * name.size()))});
    std::string other = host;
    other.back() = 'f';  // differs only at the end
    const Data subtree = derElement(0x30, textElement(0x82, other));
    chain.root.extensions.push_back(
        {"2.5.29.30", false, derElement(0x30, derElement(0xA1, manyOf(subtree, kNames * subtree.size())))});
    return copies(chain.issue().list(), length);
}

CostlyInput pemRow(std::string name, std::string cost, std::function<std::string(std::size_t)> make) {
    return {.name = "Pem" + name,
            .cost = std::move(cost),
            .read = readDenied,
            .isTaken = false,
            .costly = [make = std::move(make)](std::size_t length) { return base::toData(make(length)); },
            .control =
                [](std::size_t length) {
                    return base::toData(filled(ServerChain(kServerHost).issue().leaf.pem(), length));
                }};
}

std::vector<CostlyInput> crossings() {
    CostlyInput signatures{.name = "CertificateNamesakes",
                           .cost = "pairs of certificates whose signatures have to be checked",
                           .read = readList,
                           .isTaken = true,
                           .costly = namesakes,
                           .control = ordinaryList};
    // The number of checks is bounded, and that of a control's is small.
    signatures.times = 60;
    CostlyInput names{.name = "CertificateCrossedNames",
                      .cost = "pairs of a name and a name constraint",
                      .read = readList,
                      .isTaken = true,
                      .costly = crossedNames,
                      .control = ordinaryList};
    names.times = 60;
    return {std::move(signatures), std::move(names)};
}

}  // namespace

std::vector<CostlyInput> certificateInputs() {
    using Length = std::size_t;
    using Elements = CertificateElements;
    const Data oid = textElement(0x06, "\x2A\x03");
    const Data rsa =
        joined(textElement(0x06, "\x2A\x86\x48\x86\xF7\x0D\x01\x01\x01"), derElement(0x05, Data{}));
    const Data dsa = textElement(0x06, "\x2A\x86\x48\xCE\x38\x04\x01");
    const Data third = derElement(0x02, oddNumber(kLargePart / 3));
    const Data half = derElement(0x02, oddNumber(kLargePart / 2));
    const Data attribute =
        derElement(0x31, derElement(0x30, joined(textElement(0x06, "\x55\x04\x03"), textElement(0x0C, "a"))));

    std::vector<CostlyInput> rows{
        certificateRow("Extensions", "extensions of one certificate", false, edited([](Elements& all) {
                           const Data one = derElement(
                               0x30, joined(textElement(0x06, "\x2A\x03"), derElement(0x04, Data{})));
                           all.extensions = derElement(0xA3, derElement(0x30, manyOf(one, kLargePart)));
                       })),
        certificateRow("Names", "alternative names, of no byte each", true,
                       extended("2.5.29.17", derElement(0x30, manyOf(textElement(0x82, ""), kLargePart)))),
        certificateRow("Purposes", "purposes", true,
                       extended("2.5.29.37", derElement(0x30, manyOf(oid, kLargePart)))),
        certificateRow("Policies", "certificate policies", true,
                       extended("2.5.29.32", derElement(0x30, manyOf(derElement(0x30, oid), kLargePart)))),
        certificateRow(
            "Constraints", "name constraints", true,
            extended("2.5.29.30",
                     derElement(0x30, derElement(0xA0, manyOf(derElement(0x30, textElement(0x82, "a")),
                                                              kLargePart))))),
        certificateRow("Identifier", "bytes of an object identifier", false, edited([](Elements& all) {
                           const Data giant = derElement(0x06, Data(kLargePart, std::byte{0x7F}));
                           all.extensions = derElement(
                               0xA3,
                               derElement(0x30, derElement(0x30, joined(giant, derElement(0x04, Data{})))));
                       })),
        certificateRow("Arc", "digits of one number of an object identifier", false,
                       edited([](Elements& all) {
                           Data arc(kLargePart, std::byte{0xFF});
                           arc.back() = std::byte{0x7F};
                           all.innerAlgorithm = all.outerAlgorithm =
                               derElement(0x30, derElement(0x06, Data(10, std::byte{1})));
                           all.key = derElement(0x30, joined(derElement(0x30, derElement(0x06, arc)),
                                                             derElement(0x03, Data{std::byte{0}})));
                       })),
        certificateRow("SerialNumber", "bytes of a serial number", true, edited([](Elements& all) {
                           all.serialNumber = derElement(0x02, oddNumber(kLargePart));
                       })),
        certificateRow("Subject", "parts of a name", false, edited([attribute](Elements& all) {
                           all.subject = derElement(0x30, manyOf(attribute, kLargePart));
                       })),
        certificateRow("CommonName", "letters of a name", true, edited([](Elements& all) {
                           const Data text = derElement(0x1E, Data(kLargePart, std::byte{0x20}));
                           all.subject = derElement(
                               0x30,
                               derElement(0x31,
                                          derElement(0x30, joined(textElement(0x06, "\x55\x04\x03"), text))));
                       })),
        certificateRow("Nesting", "elements inside elements", false, edited([](Elements& all) {
                           Data nested;
                           for (int i = 0; i < 2000; ++i) nested = derElement(0x30, nested);
                           base::append(nested, manyOf(sequence(), kLargePart));
                           all.extensions = derElement(0xA3, nested);
                       })),
        certificateRow("Elements", "elements of no byte", false, edited([](Elements& all) {
                           all.extensions = derElement(0xA3, manyOf(sequence(), kLargePart));
                       })),
        certificateRow(
            "RsaModulus", "bits of an RSA modulus", true,
            keyed(rsa, derElement(0x30, joined(derElement(0x02, oddNumber(kLargePart)),
                                               textElement(0x02, std::string_view("\1\0\1", 3)))))),
        certificateRow("RsaExponent", "bits of an RSA exponent", true,
                       keyed(rsa, derElement(0x30, joined(half, half)))),
        certificateRow(
            "Dsa", "bits of a DSA key's parameters", true,
            keyed(joined(dsa, derElement(0x30, joined(third, joined(third, textElement(0x02, "\2"))))),
                  third)),
        certificateRow("DescribedCurve", "curves described by their numbers", true,
                       edited([](Elements& all) { all.key = compressedPoint(onDescribedCurve(all.key)); })),
        certificateRow("CompressedPoints", "points whose other half has to be worked out", true,
                       edited([](Elements& all) { all.key = compressedPoint(all.key); })),
        certificateRow("Signature", "bytes of a signature's numbers", true, edited([half](Elements& all) {
                           const Data numbers = derElement(0x30, joined(half, half));
                           all.signature = derElement(0x03, joined(Data{std::byte{0}}, numbers));
                       })),
        pemRow("Beginnings", "blocks without an end",
               [](Length n) { return filled("-----BEGIN CERTIFICATE-----\n", n); }),
        pemRow("Ends", "blocks without a beginning",
               [](Length n) { return filled("-----END CERTIFICATE-----\n", n); }),
        pemRow(
            "Blocks", "blocks of no byte",
            [](Length n) { return filled("-----BEGIN CERTIFICATE-----\n-----END CERTIFICATE-----\n", n); }),
        pemRow("Dashes", "dashes", [](Length n) { return filled("-", n); }),
        pemRow("Labels", "labels without an end", [](Length n) { return filled("-----BEGIN A", n); }),
        pemRow("Body", "white space inside a block",
               [](Length n) {
                   return "-----BEGIN CERTIFICATE-----\n" + filled(" \n", n) + "-----END CERTIFICATE-----\n";
               }),
    };
    for (CostlyInput& crossing : crossings()) rows.push_back(std::move(crossing));
    return rows;
}

}  // namespace pinwell::test
