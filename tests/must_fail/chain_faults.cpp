#include "chain_faults.h"

#include <algorithm>
#include <array>
#include <optional>
#include <stdexcept>
#include <string_view>

#include "support/ticket_builder.h"

namespace pinwell::test {
namespace {

using foundation::Data;
using trust::kDay;
using trust::kHost;
using trust::kNow;
using trust::Scene;

enum Position : std::size_t { kLeaf, kIntermediate, kRoot };
constexpr std::array kPositions{"leaf", "intermediate", "root"};
constexpr std::array kPolicies{"ticket", "pinned", "compatibility"};

constexpr const char* kBasicConstraints = "2.5.29.19";
constexpr const char* kKeyUsage = "2.5.29.15";
constexpr const char* kAlternativeNames = "2.5.29.17";
constexpr const char* kPurposes = "2.5.29.37";
constexpr const char* kSubjectKeyIdentifier = "2.5.29.14";
constexpr const char* kAuthorityKeyIdentifier = "2.5.29.35";
constexpr const char* kUnknown = "1.2.3.4.5";

struct CertificateFault {
    const char* name;
    const char* wrong;
    const char* verdicts;
    std::function<void(CertificateFields&, ChainFields&)> fields;
    std::function<void(Data&)> der = nullptr;  // what becomes of the certificate in the list
};

struct ChainFault {
    const char* name;
    const char* wrong;
    const char* verdicts;
    std::function<void(ChainFields&)> fields;
    std::function<void(Scene&, const ChainFields&)> arrangement = nullptr;
    std::string host = kHost;
};

using C = CertificateFields;
using Chain = ChainFields;

Data bytes(std::initializer_list<int> values) {
    Data data;
    for (const int value : values) data.push_back(static_cast<std::byte>(value));
    return data;
}

void replace(CertificateFields& c, const char* oid, bool critical, Data value = bytes({5, 0})) {
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

/// The same chain in every word, of other keys.
IssuedChain impostorOf(ChainFields fields) {
    fields.root.key = SigningKey::cached(KeyKind::p256, "impostor root");
    fields.intermediate.key = SigningKey::cached(KeyKind::p256, "impostor intermediate");
    fields.leaf.key = SigningKey::cached(KeyKind::p256, "impostor leaf");
    return fields.issue();
}

/// Changes the byte behind the n-th place at which `pattern` stands; an error when there is none.
void flipBehind(Data& der, const Data& pattern, std::size_t offset, bool last, std::byte mask) {
    const auto found = last ? std::find_end(der.begin(), der.end(), pattern.begin(), pattern.end())
                            : std::search(der.begin(), der.end(), pattern.begin(), pattern.end());
    if (found == der.end()) throw std::runtime_error("the certificate does not hold what shall be changed");
    der.at(static_cast<std::size_t>(found - der.begin()) + pattern.size() + offset) ^= mask;
}

const Data kEcdsaWithSha2 = bytes({0x06, 0x08, 0x2A, 0x86, 0x48, 0xCE, 0x3D, 0x04, 0x03});
const Data kPointBits = bytes({0x03, 0x42, 0x00, 0x04});

/// Its length in the form of one byte more than needed.
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

void makeLonger(ChainFields& chain, std::optional<int> pathLength) {
    chain.intermediate.basicConstraints = BasicConstraints{true, pathLength};
}

/// Leaf, lower intermediate, upper intermediate, root: the lower one under the chain's own.
void insertIntermediate(Scene& scene, const ChainFields& fields) {
    CertificateFields lower = fields.intermediate;
    lower.subject = commonName("Lower Intermediate");
    lower.key = SigningKey::cached(KeyKind::p256, "lower intermediate");
    lower.basicConstraints = BasicConstraints{true};
    const IssuedCertificate issued = issueCertificate(lower, &scene.chain.intermediate);
    scene.list = {issueCertificate(fields.leaf, &issued).der, issued.der, scene.chain.intermediate.der,
                  scene.chain.root.der};
}

void insertMany(Scene& scene, const ChainFields& fields, int count) {
    IssuedCertificate above = scene.chain.intermediate;
    std::vector<Data> list{scene.chain.intermediate.der, scene.chain.root.der};
    for (int i = 0; i < count; ++i) {
        CertificateFields lower = fields.intermediate;
        lower.subject = commonName("Intermediate " + std::to_string(i));
        above = issueCertificate(lower, &above);
        list.push_back(above.der);
    }
    list.insert(list.begin(), issueCertificate(fields.leaf, &above).der);
    scene.list = std::move(list);
}

/// Two intermediates, each issued by the other.
void issueInACircle(Scene& scene, const ChainFields& fields) {
    CertificateFields one = fields.intermediate;
    CertificateFields two = fields.intermediate;
    one.subject = commonName("One");
    two.subject = commonName("Two");
    one.key = SigningKey::cached(KeyKind::p256, "one");
    two.key = SigningKey::cached(KeyKind::p256, "two");
    const IssuedCertificate first = issueCertificate(one, nullptr);
    const IssuedCertificate second = issueCertificate(two, &first);
    scene.list = {issueCertificate(fields.leaf, &second).der, second.der, issueCertificate(one, &second).der};
}

const IssuedCertificate& at(const IssuedChain& chain, Position position) {
    const std::array all{&chain.leaf, &chain.intermediate, &chain.root};
    return *all.at(position);
}

/// Of the chain's certificate: the same under the other signature that verifies.
Data twin(const Scene& scene, Position position) {
    const Position issuer = position == kLeaf ? kIntermediate : kRoot;
    return underOtherSignature(at(scene.chain, position).der, at(scene.chain, issuer).key);
}

/// The chain's certificate as its issuer would renew it: another serial number, other dates, the same key.
Data renewed(const Scene& scene, const ChainFields& fields, Position position) {
    CertificateFields later = position == kLeaf           ? fields.leaf
                              : position == kIntermediate ? fields.intermediate
                                                          : fields.root;
    later.serial += 100;
    later.notBefore.seconds += kDay;
    if (position == kRoot) return issueCertificate(later, nullptr).der;
    return issueCertificate(later, &at(scene.chain, position == kLeaf ? kIntermediate : kRoot)).der;
}

void names(ChainFields& chain, const char* words) {
    chain.leaf.subjectAlternativeNames = words;
}

/// One general name, byte for byte.
void rawName(ChainFields& chain, std::uint8_t tag, std::string_view text) {
    chain.leaf.subjectAlternativeNames.clear();
    replace(chain.leaf, kAlternativeNames, false,
            derElement(0x30, derElement(tag, foundation::asBytes(text))));
}
constexpr std::uint8_t kDnsName = 0x82;
constexpr std::uint8_t kAddress = 0x87;

// clang-format off
const std::vector<CertificateFault>& certificateFaults() {
    static const std::vector<CertificateFault> faults{
        // Validity.
        {"Expired", "expired a second ago; the ticket policy has no option on dates", "444 555 555", [](C& c, Chain&) { c.notAfter = {kNow.seconds - 1}; }},
        {"ExpiredLongAgo", "expired in 1999; the ticket policy has no option on dates", "444 555 555", [](C& c, Chain&) { c.notBefore = {800000000}; c.notAfter = {946684799}; }},
        {"NotValidYet", "valid from the next second; the ticket policy has no option on dates", "444 555 555", [](C& c, Chain&) { c.notBefore = {kNow.seconds + 1}; }},
        {"ValidityInverted", "ends before it begins; the ticket policy has no option on dates", "444 555 555", [](C& c, Chain&) { c.notBefore = {kNow.seconds + kDay}; c.notAfter = {kNow.seconds - kDay}; }},
        // Signatures. A root is an anchor byte for byte: nothing is asked of its own signature.
        {"SignatureCorrupt", "the last bit of the signature is flipped; a root's own is not looked at", "664 664 664", [](C& c, Chain&) { c.corruptSignature = true; }},
        {"SignedByAnotherKey", "signed by a key that is not the issuer's; a root's own signature is not looked at", "664 664 664", [](C& c, Chain&) { c.signer = SigningKey::cached(KeyKind::p256, "another"); }},
        {"SignedByItself", "signed by its own key, under its issuer's name; a root is", "664 664 664", [](C& c, Chain&) { c.signer = c.key; }},
        {"SignedByTheLeaf", "signed by the leaf's key; a root's own signature is not looked at", "664 664 664", [](C& c, Chain& chain) { c.signer = chain.leaf.key; }},
        {"SignedOverSha1", "the signature rests on SHA-1; the root's own is aside", "554 554 554", [](C& c, Chain&) { c.digest = SignatureDigest::sha1; }},
        {"SignedOverMd5", "the signature rests on MD5; the root's own is aside", "554 554 554", [](C& c, Chain& chain) { everyKeyRsa(chain); c.digest = SignatureDigest::md5; }},
        {"SignedWithRsaOverSha1", "an RSA signature rests on SHA-1; the root's own is aside", "554 554 554", [](C& c, Chain& chain) { everyKeyRsa(chain); c.digest = SignatureDigest::sha1; }},
        {"OuterAlgorithmDiffers", "the algorithm outside is not the signed one; the anchor stands in for such a root", "664 664 664", nullptr, [](Data& der) { flipBehind(der, kEcdsaWithSha2, 0, true, std::byte{1}); }},
        {"InnerAlgorithmDiffers", "the signed algorithm is not the one outside; the anchor stands in for such a root", "664 664 664", nullptr, [](Data& der) { flipBehind(der, kEcdsaWithSha2, 0, false, std::byte{1}); }},
        {"PublicKeyChanged", "a bit of the public key is flipped; the anchor stands in for such a root", "664 664 664", nullptr, [](Data& der) { flipBehind(der, kPointBits, 9, false, std::byte{1}); }},
        // Names.
        {"IssuerNameDiffers", "names an issuer that is not there; a root that is an anchor needs none", "554 554 554", [](C& c, Chain&) { c.issuer = commonName("Somebody Else"); }},
        {"IssuerNameInAnotherOrder", "the issuer's name parts are in another order; a root that is an anchor needs none", "554 554 554", [](C& c, Chain& chain) { c.issuer = &c == &chain.leaf ? chain.intermediate.subject : chain.root.subject; std::reverse(c.issuer->begin(), c.issuer->end()); }},
        {"IssuerNameEmpty", "the issuer's name is empty; a root that is an anchor needs none", "554 554 554", [](C& c, Chain&) { c.issuer.emplace(); }},
        {"SubjectEmpty", "the subject is empty; server policies have no option on it", "555 444 444", [](C& c, Chain&) { c.subject.clear(); }},
        {"AuthorityKeyIdentifierDiffers", "names another key of its issuer; server policies have no option on linkage, a root has no issuer", "554 444 444", [](C& c, Chain&) { c.authorityKeyIdentifier = KeyIdentifier::given("another"); }},
        {"AuthorityKeyIdentifierEmpty", "names an empty key identifier; server policies have no option on linkage, a root has no issuer", "554 444 444", [](C& c, Chain&) { c.authorityKeyIdentifier = KeyIdentifier::given(""); }},
        // Keys.
        {"KeyP224", "a curve of 224 bits", "555 555 555", [](C& c, Chain&) { useKey(c, KeyKind::p224); }},
        {"KeyRsa1024", "an RSA key of 1024 bits", "555 555 555", [](C& c, Chain&) { useKey(c, KeyKind::rsa1024); }},
        {"KeyEd25519", "a kind of key that the policy does not admit", "555 555 555", [](C& c, Chain&) { useKey(c, KeyKind::ed25519); }},
        {"KeyWithACurveOfItsOwn", "the key describes its curve and names none, so it cannot be read", "566 566 566", [](C& c, Chain&) { useKey(c, KeyKind::p256Described); }},
        // Basic constraints and key usage: a matter of the issuers.
        {"NoBasicConstraints", "has no basic constraints; a leaf needs none", "455 455 455", [](C& c, Chain&) { c.basicConstraints.reset(); }},
        {"NotAnAuthority", "its basic constraints say CA:FALSE", "-55 -55 -55", [](C& c, Chain&) { c.basicConstraints = BasicConstraints{false}; }},
        {"ALeafThatIsAnAuthority", "a leaf that says CA:TRUE; basic constraints are a matter of the issuers", "4-- 4-- 4--", [](C& c, Chain&) { c.basicConstraints = BasicConstraints{true}; }},
        {"PathLengthZero", "the path length of 0 leaves no room for the intermediate below", "--5 --5 --5", [](C& c, Chain&) { c.basicConstraints = BasicConstraints{true, 0}; }},
        {"PathLengthZeroNotCritical", "a path length of 0 counts in an extension that is not critical", "--5 --5 --5", [](C& c, Chain&) { c.basicConstraints = BasicConstraints{true, 0, false}; }},
        {"PathLengthNegative", "a path length of -1", "666 666 666", [](C& c, Chain&) { c.basicConstraints.reset(); replace(c, kBasicConstraints, true, bytes({0x30, 6, 1, 1, 0xFF, 2, 1, 0xFF})); }},
        {"PathLengthOf9Bytes", "a path length of 2^64", "666 666 666", [](C& c, Chain&) { c.basicConstraints.reset(); replace(c, kBasicConstraints, true, bytes({0x30, 14, 1, 1, 0xFF, 2, 9, 1, 0, 0, 0, 0, 0, 0, 0, 0})); }},
        {"NoKeyCertSign", "the key usage lacks keyCertSign; a leaf signs no certificates", "455 455 455", [](C& c, Chain&) { c.keyUsage = "critical,digitalSignature,cRLSign"; }},
        {"NoKeyCertSignNotCritical", "the key usage counts in an extension that is not critical; a leaf signs no certificates", "455 455 455", [](C& c, Chain&) { c.keyUsage = "digitalSignature"; }},
        {"KeyUsageEmpty", "a key usage of no bit at all; a leaf signs no certificates", "455 455 455", [](C& c, Chain&) { c.keyUsage.clear(); replace(c, kKeyUsage, true, bytes({3, 1, 0})); }},
        // Extensions.
        {"UnknownCritical", "a critical extension that nobody knows", "666 666 666", [](C& c, Chain&) { replace(c, kUnknown, true); }},
        {"NameConstraintsCritical", "critical name constraints, which are not understood here", "666 666 666", [](C& c, Chain&) { replace(c, "2.5.29.30", true); }},
        {"PolicyConstraintsCritical", "critical policy constraints, which are not understood here", "666 666 666", [](C& c, Chain&) { replace(c, "2.5.29.36", true); }},
        {"PoliciesCritical", "critical certificate policies, which are not understood here", "666 666 666", [](C& c, Chain&) { replace(c, "2.5.29.32", true); }},
        {"UnknownTwice", "one extension twice", "666 666 666", [](C& c, Chain&) { replace(c, kUnknown, false); replace(c, kUnknown, false); }},
        {"BasicConstraintsTwice", "two basic constraints, the second says CA:FALSE", "666 666 666", [](C& c, Chain&) { replace(c, kBasicConstraints, true, bytes({0x30, 0})); }},
        {"BasicConstraintsMalformed", "a NULL in the place of basic constraints", "666 666 666", [](C& c, Chain&) { c.basicConstraints.reset(); replace(c, kBasicConstraints, true); }},
        {"BasicConstraintsMalformedNotCritical", "a NULL in the place of basic constraints that are not critical", "666 666 666", [](C& c, Chain&) { c.basicConstraints.reset(); replace(c, kBasicConstraints, false); }},
        {"KeyUsageMalformed", "a NULL in the place of the key usage", "666 666 666", [](C& c, Chain&) { c.keyUsage.clear(); replace(c, kKeyUsage, true); }},
        {"PurposesMalformed", "a NULL in the place of the purposes", "666 666 666", [](C& c, Chain&) { c.extendedKeyUsage.clear(); replace(c, kPurposes, false); }},
        {"AlternativeNamesMalformed", "a NULL in the place of the names", "666 666 666", [](C& c, Chain&) { c.subjectAlternativeNames.clear(); replace(c, kAlternativeNames, false); }},
        {"SubjectKeyIdentifierMalformed", "a NULL in the place of the key identifier", "666 666 666", [](C& c, Chain&) { c.subjectKeyIdentifier = KeyIdentifier::omitted(); replace(c, kSubjectKeyIdentifier, false); }},
        {"AuthorityKeyIdentifierMalformed", "a NULL in the place of the issuer's key identifier", "666 666 666", [](C& c, Chain&) { c.authorityKeyIdentifier = KeyIdentifier::omitted(); replace(c, kAuthorityKeyIdentifier, false); }},
        {"BytesBehindAnExtensionsValue", "a byte behind the value inside an extension", "666 666 666", [](C& c, Chain&) { c.keyUsage.clear(); replace(c, kKeyUsage, true, bytes({3, 2, 2, 4, 0})); }},
        // Markers.
        {"MarkersMissing", "carries no marker; only the ticket's leaf and intermediate and the pinned leaf need one", "554 544 444", [](C& c, Chain&) { c.markers.clear(); }},
        {"MarkerOneDigitOff", "the last number of the marker is one more; the compatibility policy asks for none", "55- 5-- 4--", [](C& c, Chain&) { c.markers.at(0).back() = static_cast<char>(c.markers.at(0).back() + 1); }},
        {"MarkerOfTheOtherKind", "carries the marker of the other sort of leaf; the compatibility policy asks for none", "5-- 5-- 4--", [](C& c, Chain&) { c.markers = {c.markers.at(0) == kTicketLeafMarker ? kPinnedServerMarker : kTicketLeafMarker}; }},
        {"LeafMarkerHereInstead", "the leaf's marker stands here instead of in the leaf; the compatibility policy asks for none", "-55 -55 -44", [](C& c, Chain& chain) { const auto moved = chain.leaf.markers; chain.leaf.markers.clear(); c.markers.push_back(moved.at(0)); }},
        {"IntermediateMarkerHereInstead", "the intermediate's marker stands here instead of in the intermediate", "5-5 --- ---", [](C& c, Chain& chain) { const auto moved = chain.intermediate.markers; chain.intermediate.markers.clear(); c.markers.push_back(moved.at(0)); }},
        {"MarkerAsPurpose", "the marker is listed among the purposes and is no extension; the compatibility policy asks for none", "55- 5-- 4--", [](C& c, Chain&) { c.extendedKeyUsage += (c.extendedKeyUsage.empty() ? "" : ",") + c.markers.at(0); c.markers.clear(); }},
        {"ForeignMarkerCritical", "the pinned marker is critical; only the pinned policy knows it", "6-- 4-- 6--", [](C& c, Chain&) { c.markers.erase(std::remove(c.markers.begin(), c.markers.end(), kPinnedServerMarker), c.markers.end()); replace(c, kPinnedServerMarker, true); }},
        // Purposes: of the leaf, and no option of the ticket policy.
        {"PurposeOfAClient", "for clients alone; purposes are the leaf's, and no option of the ticket policy", "444 544 544", [](C& c, Chain&) { c.extendedKeyUsage = "critical,clientAuth"; }},
        {"PurposeOfMail", "for mail alone; purposes are the leaf's, and no option of the ticket policy", "444 544 544", [](C& c, Chain&) { c.extendedKeyUsage = "emailProtection"; }},
        {"AnyPurpose", "for any purpose, which names none; purposes are the leaf's, and no option of the ticket policy", "444 544 544", [](C& c, Chain&) { c.extendedKeyUsage = "anyExtendedKeyUsage"; }},
        {"NoPurpose", "names no purpose; purposes are the leaf's, and no option of the ticket policy", "444 544 544", [](C& c, Chain&) { c.extendedKeyUsage.clear(); }},
        {"PurposesEmpty", "an empty list of purposes; purposes are the leaf's, and no option of the ticket policy", "444 544 544", [](C& c, Chain&) { c.extendedKeyUsage.clear(); replace(c, kPurposes, false, bytes({0x30, 0})); }},
        // Versions and serial numbers.
        {"Version1", "of version 1, so without extensions", "555 555 555", [](C& c, Chain&) { c.version = 1; withoutExtensions(c); }},
        {"Version1WithExtensions", "of version 1, and yet with extensions", "xxx xxx xxx", [](C& c, Chain&) { c.version = 1; }},
        {"Version2WithExtensions", "of version 2, and yet with extensions", "xxx xxx xxx", [](C& c, Chain&) { c.version = 2; }},
        {"Version4", "of a version that there is not", "xxx xxx xxx", [](C& c, Chain&) { c.version = 4; }},
        {"SerialNegative", "a serial number of -1; no option asks for it", "444 444 444", [](C& c, Chain&) { c.serial = -1; }},
        {"SerialZero", "a serial number of 0; no option asks for it", "444 444 444", [](C& c, Chain&) { c.serial = 0; }},
        // Encodings of the certificate in the list.
        {"BytesBehindIt", "a byte behind the certificate", "xxx xxx xxx", nullptr, [](Data& der) { der.push_back(std::byte{0}); }},
        {"CutShort", "its last byte is missing", "xxx xxx xxx", nullptr, [](Data& der) { der.pop_back(); }},
        {"Empty", "no byte of it is there", "xxx xxx xxx", nullptr, [](Data& der) { der.clear(); }},
        {"ASetInsteadOfASequence", "its outer tag is that of a SET", "xxx xxx xxx", nullptr, [](Data& der) { der[0] = std::byte{0x31}; }},
        {"LengthNotMinimal", "its length is written with a zero in front", "xxx xxx xxx", nullptr, lengthenLength},
        {"LengthIndefinite", "its length is indefinite", "xxx xxx xxx", nullptr, makeIndefinite},
        {"Longer", "longer than 131072 bytes", "xxx xxx xxx", [](C& c, Chain&) { replace(c, kUnknown, false, derElementOfSize(131072)); }},
        // At the margin, and good.
        {"KeyRsa2048", "nothing: 2048 bits are enough", "444 444 444", [](C& c, Chain&) { useKey(c, KeyKind::rsa2048); }},
        {"KeyP384", "nothing: a longer curve", "444 444 444", [](C& c, Chain&) { useKey(c, KeyKind::p384); }},
        {"SubjectKeyIdentifierMissing", "nothing: linkage is compared where both sides carry one", "444 444 444", [](C& c, Chain&) { c.subjectKeyIdentifier = KeyIdentifier::omitted(); }},
        {"UnknownNotCritical", "nothing: an unknown extension that is not critical", "444 444 444", [](C& c, Chain&) { replace(c, kUnknown, false); }},
        {"KeyUsageMissing", "nothing: a key usage that is not stated forbids nothing", "444 444 444", [](C& c, Chain&) { c.keyUsage.clear(); }},
    };
    return faults;
}

const std::vector<ChainFault>& chainFaults() {
    static const std::vector<ChainFault> faults{
        // Anchors.
        {"NoAnchors", "roots/ is empty", "5 5 5", nullptr, [](Scene& s, const Chain&) { s.roots.clear(); }},
        {"CompatibilityRootOnly", "the root is in compat-roots/ alone, which serves the compatibility policy", "5 5 4", nullptr, [](Scene& s, const Chain&) { s.roots.swap(s.compatibility); }},
        {"AnchorOfAnotherSerial", "the anchor has another serial number, and is not in the list", "5 5 5", nullptr, [](Scene& s, const Chain& f) { Chain other = f; other.root.serial = 99; other.root.key = SigningKey::cached(KeyKind::p256, "of another serial"); s.roots = {other.issue().root.der}; }},
        {"ImpostorChain", "every name is right, every key another", "5 5 5", nullptr, [](Scene& s, const Chain& f) { s.list = impostorOf(f).list(); }},
        {"ImpostorChainWithoutItsRoot", "every name is right, every key another, and the root is left out", "5 5 5", nullptr, [](Scene& s, const Chain& f) { s.list = impostorOf(f).list(false); }},
        {"ImpostorChainUnderTheGenuineRoot", "the genuine root stands behind an impostor's intermediate", "5 5 5", nullptr, [](Scene& s, const Chain& f) { s.list = impostorOf(f).list(false); s.list.push_back(s.chain.root.der); }},
        {"ImpostorLeaf", "an impostor's leaf before the genuine issuers", "5 5 5", nullptr, [](Scene& s, const Chain& f) { s.list[0] = impostorOf(f).leaf.der; }},
        {"ImpostorIntermediate", "an impostor's intermediate in the place of the genuine one", "5 5 5", nullptr, [](Scene& s, const Chain& f) { s.list[1] = impostorOf(f).intermediate.der; }},
        {"ImpostorRoot", "an impostor's root in the list; the genuine one is an anchor", "4 4 4", nullptr, [](Scene& s, const Chain& f) { s.list[2] = impostorOf(f).root.der; }},
        {"ImpostorWithoutKeyIdentifiers", "no key identifiers, and the issuers' names with other keys", "6 6 6", [](Chain& c) { for (C* one : {&c.root, &c.intermediate, &c.leaf}) one->subjectKeyIdentifier = one->authorityKeyIdentifier = KeyIdentifier::omitted(); }, [](Scene& s, const Chain& f) { s.list[0] = impostorOf(f).leaf.der; }},
        // What the list holds.
        {"SelfSignedLeaf", "the leaf has signed itself", "5 5 5", nullptr, [](Scene& s, const Chain& f) { s.list = {issueCertificate(f.leaf, nullptr).der}; }},
        {"SelfSignedLeafBeforeTheIssuers", "the leaf has signed itself, genuine issuers stand behind it", "5 5 5", nullptr, [](Scene& s, const Chain& f) { s.list[0] = issueCertificate(f.leaf, nullptr).der; }},
        {"IntermediateMissing", "the intermediate is left out", "5 5 5", nullptr, [](Scene& s, const Chain&) { s.list.erase(s.list.begin() + 1); }},
        {"LeafMissing", "the intermediate stands first", "5 5 5", nullptr, [](Scene& s, const Chain&) { s.list.erase(s.list.begin()); }},
        {"RootAlone", "the root stands alone", "5 5 5", nullptr, [](Scene& s, const Chain&) { s.list = {s.chain.root.der}; }},
        {"ReversedOrder", "root first, leaf last", "5 5 5", nullptr, [](Scene& s, const Chain&) { std::reverse(s.list.begin(), s.list.end()); }},
        {"IntermediateFirst", "intermediate, leaf, root", "5 5 5", nullptr, [](Scene& s, const Chain&) { std::swap(s.list[0], s.list[1]); }},
        {"LeafTwice", "the leaf twice, and no intermediate", "5 5 5", nullptr, [](Scene& s, const Chain&) { s.list[1] = s.list[0]; }},
        {"NoCertificate", "an empty list", "p p p", nullptr, [](Scene& s, const Chain&) { s.list.clear(); }},
        {"TooManyCertificates", "65 certificates", "p p p", nullptr, [](Scene& s, const Chain&) { s.list.resize(65, s.chain.root.der); }},
        {"LeafOfTheOtherKind", "a genuine chain of the other sort", "5 5 5", [](Chain& c) { const bool ticket = c.leaf.markers.at(0) == kTicketLeafMarker; c = ticket ? Chain(ServerChain(kHost)) : Chain(TicketChain()); }},
        // Lengths.
        {"LeafUnderTheRoot", "the root itself issued the leaf; server policies ask for no length", "5 4 4", nullptr, [](Scene& s, const Chain& f) { s.list = {issueCertificate(f.leaf, &s.chain.root).der, s.chain.root.der}; }},
        {"IntermediateAsAnchor", "the intermediate is the anchor; server policies ask for no length", "5 4 4", nullptr, [](Scene& s, const Chain&) { s.roots = {s.chain.intermediate.der}; s.list.pop_back(); }},
        {"LeafAsAnchor", "the leaf itself is the anchor; server policies ask for no length", "5 4 4", nullptr, [](Scene& s, const Chain&) { s.roots = {s.chain.leaf.der}; s.list.resize(1); }},
        {"FourCertificates", "a second intermediate where the path length is 0", "5 5 5", nullptr, insertIntermediate},
        {"FourCertificatesWithRoom", "a second intermediate where the path length is 1; server policies ask for no length", "5 4 4", [](Chain& c) { makeLonger(c, 1); }, insertIntermediate},
        {"MoreThan16Certificates", "a chain of 19", "5 5 5", [](Chain& c) { makeLonger(c, std::nullopt); }, [](Scene& s, const Chain& f) { insertMany(s, f, 16); }},
        {"Circle", "two intermediates that issue one another", "5 5 5", nullptr, issueInACircle},
        {"IssuedByALeaf", "a leaf issued the leaf", "5 5 5", nullptr, [](Scene& s, const Chain& f) { C below = f.leaf; below.subject = commonName("Below"); below.key = SigningKey::cached(KeyKind::p256, "below"); s.list = {issueCertificate(below, &s.chain.leaf).der, s.chain.leaf.der, s.chain.intermediate.der, s.chain.root.der}; }},
        {"LeafIsItsIssuer", "the leaf has its issuer's name and key", "5 5 5", [](Chain& c) { c.leaf.subject = c.intermediate.subject; c.leaf.key = c.intermediate.key; }},
        // User trust. Verdict 1 is enough for a server, never for a ticket.
        {"RootAllowed", "the user alone trusts the root: verdict 1, enough for servers only", "1 1 1", nullptr, [](Scene& s, const Chain&) { s.roots.swap(s.allowed); }},
        {"LeafAllowed", "the user alone trusts the leaf: verdict 1, enough for servers only", "1 1 1", nullptr, [](Scene& s, const Chain&) { s.roots.clear(); s.allowed = {s.chain.leaf.der}; }},
        {"IntermediateAllowed", "the user alone trusts the intermediate: verdict 1, enough for servers only", "1 1 1", nullptr, [](Scene& s, const Chain&) { s.roots.clear(); s.allowed = {s.chain.intermediate.der}; }},
        {"ImpostorRootAllowed", "the user trusts an impostor's root, and the chain is the impostor's: verdict 1, enough for servers only", "1 1 1", nullptr, [](Scene& s, const Chain& f) { const IssuedChain other = impostorOf(f); s.list = other.list(); s.allowed = {other.root.der}; }},
        {"AllowedButCorrupt", "the user trusts the root, the leaf's signature is corrupt", "6 6 6", [](Chain& c) { c.leaf.corruptSignature = true; }, [](Scene& s, const Chain&) { s.roots.swap(s.allowed); }},
        {"AllowedButWithoutMarkers", "the user trusts the root, no certificate has a marker; the compatibility policy asks for none", "5 5 1", [](Chain& c) { c.leaf.markers.clear(); c.intermediate.markers.clear(); }, [](Scene& s, const Chain&) { s.roots.swap(s.allowed); }},
        {"LeafDenied", "the user distrusts the leaf", "3 3 3", nullptr, [](Scene& s, const Chain&) { s.denied = {s.chain.leaf.der}; }},
        {"IntermediateDenied", "the user distrusts the intermediate", "3 3 3", nullptr, [](Scene& s, const Chain&) { s.denied = {s.chain.intermediate.der}; }},
        {"RootDenied", "the user distrusts the root", "3 3 3", nullptr, [](Scene& s, const Chain&) { s.denied = {s.chain.root.der}; }},
        {"RootDeniedAndLeftOut", "the user distrusts the root, which is left out of the list", "3 3 3", nullptr, [](Scene& s, const Chain&) { s.denied = {s.chain.root.der}; s.list.pop_back(); }},
        {"AllowedAndDenied", "the user trusts and distrusts the leaf", "3 3 3", nullptr, [](Scene& s, const Chain&) { s.allowed = s.denied = {s.chain.leaf.der}; }},
        {"DeniedAndCorrupt", "the user distrusts the root, and a signature is corrupt besides", "3 3 3", [](Chain& c) { c.leaf.corruptSignature = true; }, [](Scene& s, const Chain&) { s.denied = {s.chain.root.der}; }},
        // User trust goes by what a certificate says, and not by the bytes of its signature.
        {"LeafDeniedAndReencoded", "the user distrusts the leaf, which comes as (r, n - s)", "3 3 3", nullptr, [](Scene& s, const Chain&) { s.denied = {s.chain.leaf.der}; s.list[kLeaf] = twin(s, kLeaf); }},
        {"IntermediateDeniedAndReencoded", "the user distrusts the intermediate, which comes as (r, n - s)", "3 3 3", nullptr, [](Scene& s, const Chain&) { s.denied = {s.chain.intermediate.der}; s.list[kIntermediate] = twin(s, kIntermediate); }},
        {"RootDeniedAndReencoded", "the user distrusts the root, which comes as (r, n - s)", "3 3 3", nullptr, [](Scene& s, const Chain&) { s.denied = {s.chain.root.der}; s.list[kRoot] = twin(s, kRoot); }},
        {"TwinOfTheLeafDenied", "the user distrusts the leaf as (r, n - s)", "3 3 3", nullptr, [](Scene& s, const Chain&) { s.denied = {twin(s, kLeaf)}; }},
        {"TwinOfTheIntermediateDenied", "the user distrusts the intermediate as (r, n - s)", "3 3 3", nullptr, [](Scene& s, const Chain&) { s.denied = {twin(s, kIntermediate)}; }},
        {"TwinOfTheRootDenied", "the user distrusts the root as (r, n - s)", "3 3 3", nullptr, [](Scene& s, const Chain&) { s.denied = {twin(s, kRoot)}; }},
        {"TwinOfTheAllowedDenied", "the user trusts the leaf and distrusts it as (r, n - s)", "3 3 3", nullptr, [](Scene& s, const Chain&) { s.allowed = {s.chain.leaf.der}; s.denied = {twin(s, kLeaf)}; }},
        {"LeafDeniedAndCorrupt", "the user distrusts the leaf, which comes with a corrupt signature", "3 3 3", nullptr, [](Scene& s, const Chain&) { s.denied = {s.chain.leaf.der}; s.list[kLeaf].back() ^= std::byte{1}; }},
        {"IntermediateDeniedUnderAnotherAlgorithm", "the user distrusts the intermediate, whose algorithm outside is another", "3 3 3", nullptr, [](Scene& s, const Chain&) { s.denied = {s.chain.intermediate.der}; flipBehind(s.list[kIntermediate], kEcdsaWithSha2, 0, true, std::byte{1}); }},
        {"LeafDeniedAndRenewed", "the user distrusts the leaf, which was issued again with its key", "3 3 3", nullptr, [](Scene& s, const Chain& f) { s.denied = {s.chain.leaf.der}; s.list[kLeaf] = renewed(s, f, kLeaf); }},
        {"IntermediateDeniedAndRenewed", "the user distrusts the intermediate, which was issued again with its key", "3 3 3", nullptr, [](Scene& s, const Chain& f) { s.denied = {s.chain.intermediate.der}; s.list[kIntermediate] = renewed(s, f, kIntermediate); }},
        {"RenewedRootDenied", "the user distrusts the root as it was issued again with its key", "3 3 3", nullptr, [](Scene& s, const Chain& f) { s.denied = {renewed(s, f, kRoot)}; }},
        // The clock.
        {"ClockBeforeEveryDate", "the clock stands in 1990; the ticket policy has no option on dates", "4 5 5", nullptr, [](Scene& s, const Chain&) { s.now = {631152000}; }},
        {"ClockBehindEveryDate", "the clock stands in 2060; the ticket policy has no option on dates", "4 5 5", nullptr, [](Scene& s, const Chain&) { s.now = {2840140800}; }},
        // Hosts.
        {"AnotherHost", "for another host of the domain", "- 5 5", [](Chain& c) { names(c, "DNS:www.lumora.example"); }},
        {"ParentDomain", "for the domain above", "- 5 5", [](Chain& c) { names(c, "DNS:lumora.example"); }},
        {"Subdomain", "for a host below", "- 5 5", [](Chain& c) { names(c, "DNS:a.api.lumora.example"); }},
        {"HostWithAPrefix", "for a host that ends in the same letters", "- 5 5", [](Chain& c) { names(c, "DNS:xapi.lumora.example"); }},
        {"HostWithASuffix", "for a host that begins with the same letters", "- 5 5", [](Chain& c) { names(c, "DNS:api.lumora.example.net"); }},
        {"CommonNameOnly", "the host is the common name and nowhere else", "- 5 5", [](Chain& c) { c.leaf.subject = commonName(kHost); names(c, ""); }},
        {"CommonNameBesidesAnotherName", "the host is the common name, another is the DNS name", "- 5 5", [](Chain& c) { c.leaf.subject = commonName(kHost); names(c, "DNS:www.lumora.example"); }},
        {"NoNames", "an empty list of names", "- 5 5", [](Chain& c) { names(c, ""); replace(c.leaf, kAlternativeNames, false, bytes({0x30, 0})); }},
        {"MailAddress", "the host is that of a mail address", "- 5 5", [](Chain& c) { names(c, "email:root@api.lumora.example"); }},
        {"Uri", "the host is that of a URI", "- 5 5", [](Chain& c) { names(c, "URI:https://api.lumora.example/"); }},
        {"NameOfTheIntermediate", "the host is among the intermediate's names", "- 5 5", [](Chain& c) { c.intermediate.subjectAlternativeNames = c.leaf.subjectAlternativeNames; names(c, "DNS:www.lumora.example"); }},
        {"WildcardAlone", "a bare *", "- 5 5", [](Chain& c) { names(c, "DNS:*"); }},
        {"WildcardTopLevel", "a wildcard of a whole top-level domain", "- 5 5", [](Chain& c) { names(c, "DNS:*.example"); }, nullptr, "lumora.example"},
        {"WildcardTwoLabels", "a wildcard for two labels", "- 5 5", [](Chain& c) { names(c, "DNS:*.example"); }},
        {"WildcardOfTheParent", "a wildcard covers no domain of its own", "- 5 5", [](Chain& c) { names(c, "DNS:*.api.lumora.example"); }},
        {"WildcardInTheMiddle", "a wildcard behind the first label", "- 5 5", [](Chain& c) { names(c, "DNS:api.*.example"); }},
        {"WildcardPartOfALabel", "a wildcard in a part of a label", "- 5 5", [](Chain& c) { names(c, "DNS:a*.lumora.example"); }},
        {"WildcardAtALabelsEnd", "a wildcard behind letters", "- 5 5", [](Chain& c) { names(c, "DNS:*pi.lumora.example"); }},
        {"WildcardTwice", "two wildcards", "- 5 5", [](Chain& c) { names(c, "DNS:*.*.example"); }},
        {"TrailingDot", "a DNS name with a dot at its end", "- 5 5", [](Chain& c) { names(c, "DNS:api.lumora.example."); }},
        {"LeadingDot", "a DNS name with a dot in front", "- 5 5", [](Chain& c) { names(c, "DNS:.lumora.example"); }},
        {"DoubleDot", "a DNS name with an empty label", "- 5 5", [](Chain& c) { names(c, "DNS:api..lumora.example"); }},
        {"NameEmpty", "an empty DNS name", "- 5 5", [](Chain& c) { rawName(c, kDnsName, ""); }},
        {"NameWithNul", "a NUL behind the host, and another domain behind that", "- 5 5", [](Chain& c) { rawName(c, kDnsName, std::string_view("api.lumora.example\0.evil.example", 32)); }},
        {"NameWithASpace", "a space behind the host", "- 5 5", [](Chain& c) { rawName(c, kDnsName, "api.lumora.example "); }},
        {"NameAsOtherType", "the host as a registered identifier's bytes", "- 5 5", [](Chain& c) { rawName(c, 0x86, "api.lumora.example"); }},
        {"AddressForAName", "an address where a name is asked for", "- 5 5", [](Chain& c) { names(c, "IP:192.0.2.1"); }},
        {"NameForAnAddress", "the address is written as a DNS name", "- 5 5", [](Chain& c) { names(c, "DNS:192.0.2.1"); }, nullptr, "192.0.2.1"},
        {"AnotherAddress", "for another address", "- 5 5", [](Chain& c) { names(c, "IP:192.0.2.2"); }, nullptr, "192.0.2.1"},
        {"WildcardForAnAddress", "a wildcard does not cover an address", "- 5 5", [](Chain& c) { names(c, "DNS:*.0.2.1"); }, nullptr, "192.0.2.1"},
        {"AddressAsCommonName", "the address is the common name and nowhere else", "- 5 5", [](Chain& c) { c.leaf.subject = commonName("192.0.2.1"); names(c, "DNS:localhost"); }, nullptr, "192.0.2.1"},
        {"MappedAddress", "the IPv4 address inside an IPv6 one", "- 5 5", [](Chain& c) { names(c, "IP:::ffff:192.0.2.1"); }, nullptr, "192.0.2.1"},
        {"AddressOf5Bytes", "an address of five bytes", "- 6 6", [](Chain& c) { rawName(c, kAddress, "abcde"); }},
        {"AddressWithAMask", "an address with its mask behind it", "- 6 6", [](Chain& c) { rawName(c, kAddress, std::string_view("\xC0\0\2\1\xFF\xFF\xFF\xFF", 8)); }, nullptr, "192.0.2.1"},
        // At the margin, and good.
        {"Good", "nothing", "4 4 4", nullptr},
        {"GoodWithoutTheRoot", "nothing: the root comes from the anchors", "4 4 4", nullptr, [](Scene& s, const Chain&) { s.list.pop_back(); }},
        {"IssuersInAnotherOrder", "nothing: candidates stand in any order", "4 4 4", nullptr, [](Scene& s, const Chain&) { std::swap(s.list[1], s.list[2]); }},
        {"LeafTwiceBesidesTheIntermediate", "nothing: what is of no use is passed over", "4 4 4", nullptr, [](Scene& s, const Chain&) { s.list = {s.list[0], s.list[0], s.list[1]}; }},
        {"UnrelatedBehind", "nothing: what is of no use is passed over", "4 4 4", nullptr, [](Scene& s, const Chain& f) { s.list[2] = impostorOf(f).leaf.der; }},
        {"AllowedBesides", "nothing: the platform's anchor comes before the user's", "4 4 4", nullptr, [](Scene& s, const Chain&) { s.allowed = s.roots; }},
        {"Twins", "nothing: leaf and intermediate come as (r, n - s), which verifies", "4 4 4", nullptr, [](Scene& s, const Chain&) { s.list[kLeaf] = twin(s, kLeaf); s.list[kIntermediate] = twin(s, kIntermediate); }},
        {"Renewed", "nothing: leaf and intermediate were issued again", "4 4 4", nullptr, [](Scene& s, const Chain& f) { s.list[kLeaf] = renewed(s, f, kLeaf); s.list[kIntermediate] = renewed(s, f, kIntermediate); }},
        {"NamesakesDenied", "nothing: the user distrusts certificates of these names with other keys", "4 4 4", nullptr, [](Scene& s, const Chain& f) { s.denied = impostorOf(f).list(); }},
        {"KeysDeniedUnderOtherNames", "nothing: the user distrusts certificates of these keys with other names", "4 4 4", nullptr, [](Scene& s, const Chain& f) { Chain other = f; for (C* one : {&other.root, &other.intermediate, &other.leaf}) one->subject = commonName("Other " + one->subject.back().second); s.denied = other.issue().list(); }},
        {"HostInCapitals", "nothing: names differ in case alone", "- 4 4", [](Chain& c) { names(c, "DNS:API.Lumora.Example"); }},
        {"Wildcard", "nothing: a wildcard for the first label", "- 4 4", [](Chain& c) { names(c, "DNS:*.lumora.example"); }},
        {"HostWithItsDot", "nothing: the host is asked for with the root's dot", "- 4 4", nullptr, nullptr, "api.lumora.example."},
        {"Address", "nothing: the address is the one", "- 4 4", [](Chain& c) { names(c, "IP:192.0.2.1"); }, nullptr, "192.0.2.1"},
    };
    return faults;
}
// clang-format on

void add(std::vector<ChainCase>& cases, const CertificateFault& fault) {
    const std::string_view verdicts = fault.verdicts;
    for (std::size_t policy = 0; policy < kPolicies.size(); ++policy) {
        for (std::size_t position = 0; position < kPositions.size(); ++position) {
            const char expected = verdicts.at(policy * (kPositions.size() + 1) + position);
            if (expected == '-') continue;
            ChainCase one;
            one.name = std::string(fault.name) + "_" + kPositions.at(position) + "_" + kPolicies.at(policy);
            one.wrong = std::string(kPositions.at(position)) + ": " + fault.wrong;
            one.policy = static_cast<ChainPolicy>(policy);
            one.expected = expected;
            one.fields = [fault, position](ChainFields& chain) {
                const std::array all{&chain.leaf, &chain.intermediate, &chain.root};
                if (fault.fields) fault.fields(*all.at(position), chain);
            };
            one.arrangement = [fault, position](Scene& scene, const ChainFields&) {
                if (fault.der) fault.der(scene.list.at(position));
            };
            cases.push_back(std::move(one));
        }
    }
}

void add(std::vector<ChainCase>& cases, const ChainFault& fault) {
    const std::string_view verdicts = fault.verdicts;
    for (std::size_t policy = 0; policy < kPolicies.size(); ++policy) {
        const char expected = verdicts.at(policy * 2);
        if (expected == '-') continue;
        cases.push_back({std::string(fault.name) + "_" + kPolicies.at(policy), fault.wrong,
                         static_cast<ChainPolicy>(policy), expected, fault.host, fault.fields,
                         fault.arrangement});
    }
}

}  // namespace

std::vector<ChainCase> chainCases() {
    std::vector<ChainCase> cases;
    for (const CertificateFault& fault : certificateFaults()) add(cases, fault);
    for (const ChainFault& fault : chainFaults()) add(cases, fault);
    return cases;
}

}  // namespace pinwell::test
