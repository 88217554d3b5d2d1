#include "chain_faults.h"

#include <algorithm>
#include <array>
#include <optional>
#include <string_view>

#include "chain_vocabulary.h"
#include "support/key_forms.h"
#include "support/ticket_builder.h"

namespace pinwell::test {
namespace {

using namespace faults;
using trust::kDay;
using trust::kHost;
using trust::kNow;
using trust::Scene;

enum Position : std::size_t { kLeaf, kIntermediate, kRoot };
constexpr std::array kPositions{"leaf", "intermediate", "root"};
constexpr std::array kPolicies{"ticket", "pinned", "compatibility"};

struct ChainFault {
    const char* name;
    const char* wrong;
    const char* verdicts;
    std::function<void(ChainFields&)> fields;
    std::function<void(Scene&, const ChainFields&)> arrangement = nullptr;
    std::string host = kHost;
};

/// The same chain in every word, of other keys.
IssuedChain impostorOf(ChainFields fields) {
    fields.root.key = SigningKey::cached(KeyKind::p256, "impostor root");
    fields.intermediate.key = SigningKey::cached(KeyKind::p256, "impostor intermediate");
    fields.leaf.key = SigningKey::cached(KeyKind::p256, "impostor leaf");
    return fields.issue();
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

/// The chain's certificate after a renewal by its issuer: another serial number, other dates, the same key.
Data renewed(const Scene& scene, const ChainFields& fields, Position position) {
    CertificateFields later = position == kLeaf           ? fields.leaf
                              : position == kIntermediate ? fields.intermediate
                                                          : fields.root;
    later.serial += 100;
    later.notBefore.seconds += kDay;
    if (position == kRoot) return issueCertificate(later, nullptr).der;
    return issueCertificate(later, &at(scene.chain, position == kLeaf ? kIntermediate : kRoot)).der;
}

/// The leaf issued again with its key in another form.
Data leafWithKey(const Scene& scene, const ChainFields& fields, Data (*form)(base::ByteView)) {
    CertificateFields leaf = fields.leaf;
    leaf.serial += 100;
    leaf.edit = [form](CertificateElements& all) { all.key = form(all.key); };
    return issueCertificate(leaf, &scene.chain.intermediate).der;
}

/// Levels of certificates between leaf and intermediate, where each could have issued each of the level
/// below.
void branchOut(Scene& scene, const ChainFields& fields, int levels, int width) {
    std::vector<Data> list;
    IssuedCertificate above = scene.chain.intermediate;
    for (int level = 0; level < levels; ++level) {
        CertificateFields next = fields.intermediate;
        next.subject = commonName("Level " + std::to_string(level));
        IssuedCertificate issued = above;
        for (int i = 0; i < width; ++i) {
            ++next.serial;
            issued = issueCertificate(next, &above);
            list.push_back(issued.der);
        }
        above = issued;
    }
    list.insert(list.begin(), issueCertificate(fields.leaf, &above).der);
    list.push_back(scene.chain.intermediate.der);
    scene.list = std::move(list);
}

/// Certificates of one name and without key identifiers, each issued by the next one: every pair must be
/// checked.
void namesakes(Scene& scene, const ChainFields& fields) {
    const auto key = [](std::size_t i) {
        return SigningKey::cached(KeyKind::p256, "namesake " + std::to_string(i));
    };
    constexpr std::size_t kCount = 40;
    scene.list.clear();
    for (std::size_t i = 0; i < kCount; ++i) {
        CertificateFields one = i == 0 ? fields.leaf : fields.intermediate;
        one.subject = commonName("Same");
        one.issuer = one.subject;
        one.key = key(i);
        one.signer = key((i + 1) % kCount);
        one.subjectKeyIdentifier = one.authorityKeyIdentifier = KeyIdentifier::omitted();
        scene.list.push_back(issueCertificate(one, nullptr).der);
    }
}

/// That many names of the leaf below that many constraints of the root, which all permit the host.
void crossNames(ChainFields& chain, int nameCount, int constraintCount) {
    const Data host = derElement(0x82, base::asBytes(kHost));
    Data all;
    for (int i = 0; i < nameCount; ++i) base::append(all, host);
    chain.leaf.subjectAlternativeNames.clear();
    replace(chain.leaf, kAlternativeNames, false, derElement(0x30, all));
    Data subtrees;
    for (int i = 0; i < constraintCount; ++i) base::append(subtrees, derElement(0x30, host));
    replace(chain.root, kNameConstraints, false, derElement(0x30, derElement(0xA0, subtrees)));
}

void names(ChainFields& chain, const char* words) {
    chain.leaf.subjectAlternativeNames = words;
}

/// One general name, byte for byte.
void rawName(ChainFields& chain, std::uint8_t tag, std::string_view text) {
    chain.leaf.subjectAlternativeNames.clear();
    replace(chain.leaf, kAlternativeNames, false, derElement(0x30, derElement(tag, base::asBytes(text))));
}
constexpr std::uint8_t kDnsName = 0x82;
constexpr std::uint8_t kAddress = 0x87;
// clang-format off
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
        // The contents of the list.
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
        // User trust depends on a certificate's contents, not on the bytes of its signature.
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
        {"KeysDeniedUnderOtherNames", "the user distrusts certificates of these keys with other names", "3 3 3", nullptr, [](Scene& s, const Chain& f) { Chain other = f; for (C* one : {&other.root, &other.intermediate, &other.leaf}) one->subject = commonName("Other " + one->subject.back().second); s.denied = other.issue().list(); }},
        {"LeafDeniedUnderAnotherName", "the user distrusts the leaf, whose key comes under another name", "3 3 3", nullptr, [](Scene& s, const Chain& f) { s.denied = {s.chain.leaf.der}; Chain other = f; other.leaf.subject = commonName("Another"); s.list[kLeaf] = issueCertificate(other.leaf, &s.chain.intermediate).der; }},
        {"LeafDeniedAndCompressed", "the user distrusts the leaf, whose point comes compressed", "3 3 3", nullptr, [](Scene& s, const Chain& f) { s.denied = {s.chain.leaf.der}; s.list[kLeaf] = leafWithKey(s, f, compressedPoint); }},
        {"LeafDeniedAndHybrid", "the user distrusts the leaf, whose point comes in the hybrid form", "3 3 3", nullptr, [](Scene& s, const Chain& f) { s.denied = {s.chain.leaf.der}; s.list[kLeaf] = leafWithKey(s, f, hybridPoint); }},
        {"LeafDeniedOnADescribedCurve", "the user distrusts the leaf, whose curve comes by its numbers", "3 3 3", nullptr, [](Scene& s, const Chain& f) { s.denied = {s.chain.leaf.der}; s.list[kLeaf] = leafWithKey(s, f, onDescribedCurve); }},
        {"LeafDeniedAsPss", "the user distrusts the leaf, whose RSA key comes as RSASSA-PSS", "3 3 3", [](Chain& c) { useKey(c.leaf, KeyKind::rsa2048); }, [](Scene& s, const Chain& f) { s.denied = {s.chain.leaf.der}; s.list[kLeaf] = leafWithKey(s, f, asPssKey); }},
        {"CompressedLeafDenied", "the user distrusts the leaf's compressed form", "3 3 3", nullptr, [](Scene& s, const Chain& f) { s.denied = {leafWithKey(s, f, compressedPoint)}; }},
        {"HybridLeafDenied", "the user distrusts the leaf's hybrid form", "3 3 3", nullptr, [](Scene& s, const Chain& f) { s.denied = {leafWithKey(s, f, hybridPoint)}; }},
        {"LeafOnADescribedCurveDenied", "the user distrusts the leaf with its curve by numbers", "3 3 3", nullptr, [](Scene& s, const Chain& f) { s.denied = {leafWithKey(s, f, onDescribedCurve)}; }},
        {"PssLeafDenied", "the user distrusts the leaf's RSA key as RSASSA-PSS", "3 3 3", [](Chain& c) { useKey(c.leaf, KeyKind::rsa2048); }, [](Scene& s, const Chain& f) { s.denied = {leafWithKey(s, f, asPssKey)}; }},
        {"LeafOfVersion4Denied", "the user distrusts a certificate of the leaf's key that nobody can read", "3 3 3", nullptr, [](Scene& s, const Chain& f) { Chain other = f; other.leaf.version = 4; s.denied = {issueCertificate(other.leaf, &s.chain.intermediate).der}; }},
        {"IntermediateDeniedAndCompressed", "the user distrusts the intermediate, whose point comes compressed", "3 3 3", nullptr, [](Scene& s, const Chain& f) { s.denied = {s.chain.intermediate.der}; Chain other = f; other.intermediate.edit = [](E& e) { e.key = compressedPoint(e.key); }; s.list[kIntermediate] = issueCertificate(other.intermediate, &s.chain.root).der; }},
        // The search.
        {"TooManyChains", "more chains than are looked at, none of which is anchored", "5 5 5", nullptr, [](Scene& s, const Chain& f) { s.roots.clear(); branchOut(s, f, 5, 3); }},
        {"TooManySignatures", "more pairs of certificates than are checked", "5 5 5", nullptr, namesakes},
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
        {"AddressExcluded", "an issuer excludes the address's range", "- 5 5", [](Chain& c) { names(c, "IP:192.0.2.1"); c.intermediate.nameConstraints = "excluded;IP:192.0.2.0/255.255.255.0"; }, nullptr, "192.0.2.1"},
        {"AddressNotPermitted", "the root permits another range", "- 5 5", [](Chain& c) { names(c, "IP:192.0.2.1"); c.root.nameConstraints = "critical,permitted;IP:198.51.100.0/255.255.255.0"; }, nullptr, "192.0.2.1"},
        {"AddressOfTheOtherLengthPermitted", "the root permits addresses of the other length alone", "- 5 5", [](Chain& c) { names(c, "IP:192.0.2.1"); c.root.nameConstraints = "permitted;IP:::/::"; }, nullptr, "192.0.2.1"},
        {"AnotherNameExcluded", "a name besides the host is excluded", "- 5 5", [](Chain& c) { names(c, "DNS:api.lumora.example,DNS:evil.example"); c.root.nameConstraints = "permitted;DNS:lumora.example"; }},
        {"AnAddressBesidesExcluded", "an address besides the host is excluded", "- 5 5", [](Chain& c) { names(c, "DNS:api.lumora.example,IP:192.0.2.1"); c.root.nameConstraints = "excluded;IP:0.0.0.0/0.0.0.0"; }},
        {"WildcardOverAnExcludedName", "a wildcard covers a name that is excluded", "- 5 5", [](Chain& c) { names(c, "DNS:*.lumora.example"); c.root.nameConstraints = "excluded;DNS:www.lumora.example"; }},
        {"WildcardOverTheExcludedHost", "a wildcard covers the host, which is excluded", "- 5 5", [](Chain& c) { names(c, "DNS:*.lumora.example"); c.root.nameConstraints = "excluded;DNS:api.lumora.example"; }},
        {"WildcardWiderThanPermitted", "a wildcard covers more than the host that is permitted", "- 5 5", [](Chain& c) { names(c, "DNS:*.lumora.example"); c.root.nameConstraints = "permitted;DNS:api.lumora.example"; }},
        {"NameOfTheIntermediateExcluded", "the root excludes a name of the intermediate", "- 5 5", [](Chain& c) { c.intermediate.subjectAlternativeNames = "DNS:evil.example"; c.root.nameConstraints = "permitted;DNS:lumora.example"; }},
        {"NameWithNulBelowAConstraint", "a name with a NUL besides the host, below a constraint", "- 5 5", [](Chain& c) { c.leaf.subjectAlternativeNames.clear(); replace(c.leaf, kAlternativeNames, false, derElement(0x30, joined(derElement(kDnsName, base::asBytes(kHost)), derElement(kDnsName, base::asBytes(std::string_view("a\0.lumora.example", 17)))))); c.root.nameConstraints = "permitted;DNS:lumora.example"; }},
        {"TooManyNames", "four thousand names below a thousand constraints", "- 5 5", [](Chain& c) { crossNames(c, 4000, 1000); }},
        {"NameOfEightBits", "a DNS name that is not of 7-bit characters", "- 6 6", [](Chain& c) { rawName(c, kDnsName, "caf\xE9.example"); }},
        {"NameOfAnUnknownForm", "a name of a form that there is not", "- 6 6", [](Chain& c) { rawName(c, 0x89, "api.lumora.example"); }},
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
        {"HostInCapitals", "nothing: names differ in case alone", "- 4 4", [](Chain& c) { names(c, "DNS:API.Lumora.Example"); }},
        {"Wildcard", "nothing: a wildcard for the first label", "- 4 4", [](Chain& c) { names(c, "DNS:*.lumora.example"); }},
        {"HostWithItsDot", "nothing: the host is asked for with the root's dot", "- 4 4", nullptr, nullptr, "api.lumora.example."},
        {"ConstrainedToTheHost", "nothing: every issuer permits the host", "- 4 4", [](Chain& c) { c.root.nameConstraints = c.intermediate.nameConstraints = "critical,permitted;DNS:lumora.example,excluded;IP:0.0.0.0/0.0.0.0"; }},
        {"ConstrainedLeaf", "nothing: a leaf constrains nobody", "- 4 4", [](Chain& c) { c.leaf.nameConstraints = "critical,excluded;DNS:lumora.example"; }},
        {"KeyUsageForKeyEncipherment", "nothing: encipherment of keys is a use of TLS", "- 4 4", [](Chain& c) { useKey(c.leaf, KeyKind::rsa2048); c.leaf.keyUsage = "critical,keyEncipherment"; }},
        {"PssChain", "nothing: every key is RSA, every signature RSASSA-PSS", "4 4 4", [](Chain& c) { everyKeyRsa(c); for (C* one : {&c.root, &c.intermediate, &c.leaf}) one->pss.emplace(); }},
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
