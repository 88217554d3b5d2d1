// A table of chains, each with its verdict.
#include <gtest/gtest.h>

#include "elements.h"
#include "scene.h"

namespace pinwell::trust {
namespace {

using test::BasicConstraints;
using test::ChainFields;
using test::KeyIdentifier;
using test::KeyKind;
using test::ServerChain;
using test::SignatureDigest;
using test::SigningKey;
using test::TicketChain;

enum class Kind { ticket, pinned, compatibility };

using Fields = std::function<void(ChainFields&)>;
using Setting = std::function<void(Scene&)>;

const Fields kAsItShouldBe = [](ChainFields&) {};
const Setting kRootInRoots = [](Scene&) {};

struct Row {
    const char* title;
    Kind kind;
    Verdict verdict;
    Fields fields;
    Setting setting = kRootInRoots;
};

constexpr Verdict kTrusted = Verdict::unspecified;
constexpr Verdict kByUser = Verdict::proceed;
constexpr Verdict kDenied = Verdict::deny;
constexpr Verdict kRefused = Verdict::recoverableFailure;
constexpr Verdict kFatal = Verdict::fatalFailure;

const std::string kUnknownOid = "1.2.3.4.5";

Policy policyOf(Kind kind) {
    switch (kind) {
        case Kind::ticket:
            return ticketPolicy();
        case Kind::pinned:
            return *pinnedServerPolicy(kHost);
        case Kind::compatibility:
            return *compatibilityServerPolicy(kHost);
    }
    return {};
}

class Chain : public testing::TestWithParam<Row> {};

TEST_P(Chain, HasItsVerdict) {
    const Row& row = GetParam();
    ChainFields fields =
        row.kind == Kind::ticket ? ChainFields(TicketChain()) : ChainFields(ServerChain(kHost));
    row.fields(fields);
    Scene scene(fields);
    row.setting(scene);
    const auto trust = scene.trust(policyOf(row.kind));
    const auto verdict = trust->evaluate();
    ASSERT_TRUE(verdict);
    EXPECT_EQ(*verdict, row.verdict) << trust->failureDescription().value_or("no failure");
}

std::string titleOf(const testing::TestParamInfo<Row>& info) {
    return info.param.title;
}

void rootAllowedOnly(Scene& scene) {
    scene.roots.clear();
    scene.allowed = {scene.chain.root.der};
}

// clang-format off
INSTANTIATE_TEST_SUITE_P(Ticket, Chain, testing::Values(
    Row{"Good", Kind::ticket, kTrusted, kAsItShouldBe},
    Row{"GoodWithTheRootLeftOut", Kind::ticket, kTrusted, kAsItShouldBe, [](Scene& s) { s.list.pop_back(); }},
    Row{"GoodWithAnUnrelatedCertificateBehind", Kind::ticket, kTrusted, kAsItShouldBe, [](Scene& s) { s.list[2] = ServerChain().issue().root.der; }},
    Row{"GoodWithRsaKeys", Kind::ticket, kTrusted, [](ChainFields& c) { c.root.key = c.intermediate.key = c.leaf.key = SigningKey::cached(KeyKind::rsa2048, "one"); }},
    Row{"GoodOnP384", Kind::ticket, kTrusted, [](ChainFields& c) { c.intermediate.key = SigningKey::cached(KeyKind::p384, "i"); }},
    Row{"ExpiredLeaf", Kind::ticket, kTrusted, [](ChainFields& c) { c.leaf.notAfter = {kNow.seconds - kDay}; }},
    Row{"ExpiredIntermediate", Kind::ticket, kTrusted, [](ChainFields& c) { c.intermediate.notAfter = {kNow.seconds - kDay}; }},
    Row{"ExpiredRoot", Kind::ticket, kTrusted, [](ChainFields& c) { c.root.notAfter = {kNow.seconds - kDay}; }},
    Row{"LeafNotValidYet", Kind::ticket, kTrusted, [](ChainFields& c) { c.leaf.notBefore = {kNow.seconds + kDay}; }},
    Row{"LeafForAnotherPurpose", Kind::ticket, kTrusted, [](ChainFields& c) { c.leaf.extendedKeyUsage = "critical,clientAuth"; }},
    Row{"LeafWithoutKeyUsage", Kind::ticket, kTrusted, [](ChainFields& c) { c.leaf.keyUsage.clear(); }},
    Row{"LeafWithoutBasicConstraints", Kind::ticket, kTrusted, [](ChainFields& c) { c.leaf.basicConstraints.reset(); }},
    Row{"LeafThatIsAnAuthority", Kind::ticket, kTrusted, [](ChainFields& c) { c.leaf.basicConstraints = BasicConstraints{true}; }},
    Row{"RootSignedWithSha1", Kind::ticket, kTrusted, [](ChainFields& c) { c.root.digest = SignatureDigest::sha1; }},
    Row{"NoKeyIdentifiers", Kind::ticket, kTrusted, [](ChainFields& c) { c.intermediate.authorityKeyIdentifier = c.leaf.authorityKeyIdentifier = KeyIdentifier::omitted(); c.root.subjectKeyIdentifier = c.intermediate.subjectKeyIdentifier = KeyIdentifier::omitted(); }},
    Row{"KeyIdentifierOnOneSideOnly", Kind::ticket, kTrusted, [](ChainFields& c) { c.leaf.authorityKeyIdentifier = KeyIdentifier::omitted(); }},
    Row{"MarkerIsCritical", Kind::ticket, kTrusted, [](ChainFields& c) { c.leaf.markers.clear(); c.leaf.extensions = {{test::kTicketLeafMarker, true}}; }},
    Row{"UnknownExtensionNotCritical", Kind::ticket, kTrusted, [](ChainFields& c) { c.leaf.extensions = {{kUnknownOid, false}}; }},
    Row{"RootSignatureCorruptInTheList", Kind::ticket, kTrusted, kAsItShouldBe, [](Scene& s) { s.list[2].back() ^= std::byte{1}; }},

    Row{"LeafMarkerMissing", Kind::ticket, kRefused, [](ChainFields& c) { c.leaf.markers.clear(); }},
    Row{"IntermediateMarkerMissing", Kind::ticket, kRefused, [](ChainFields& c) { c.intermediate.markers.clear(); }},
    Row{"MarkersExchanged", Kind::ticket, kRefused, [](ChainFields& c) { std::swap(c.leaf.markers, c.intermediate.markers); }},
    Row{"LeafSubjectEmpty", Kind::ticket, kRefused, [](ChainFields& c) { c.leaf.subject.clear(); }},
    Row{"IntermediateSubjectEmpty", Kind::ticket, kRefused, [](ChainFields& c) { c.intermediate.subject.clear(); }},
    Row{"RootSubjectEmpty", Kind::ticket, kRefused, [](ChainFields& c) { c.root.subject.clear(); }},
    Row{"LeafKeyP224", Kind::ticket, kRefused, [](ChainFields& c) { c.leaf.key = SigningKey::cached(KeyKind::p224, "l"); }},
    Row{"IntermediateKeyP224", Kind::ticket, kRefused, [](ChainFields& c) { c.intermediate.key = SigningKey::cached(KeyKind::p224, "i"); }},
    Row{"RootKeyP224", Kind::ticket, kRefused, [](ChainFields& c) { c.root.key = SigningKey::cached(KeyKind::p224, "r"); }},
    Row{"LeafKeyRsa1024", Kind::ticket, kRefused, [](ChainFields& c) { c.leaf.key = SigningKey::cached(KeyKind::rsa1024, "l"); }},
    Row{"IntermediateKeyRsa1024", Kind::ticket, kRefused, [](ChainFields& c) { c.intermediate.key = SigningKey::cached(KeyKind::rsa1024, "i"); }},
    Row{"LeafKeyOfAnotherKind", Kind::ticket, kRefused, [](ChainFields& c) { c.leaf.key = SigningKey::cached(KeyKind::ed25519, "l"); }},
    Row{"LeafNamesAnotherKeyIdentifier", Kind::ticket, kRefused, [](ChainFields& c) { c.leaf.authorityKeyIdentifier = KeyIdentifier::given("another"); }},
    Row{"IntermediateNamesAnotherKeyIdentifier", Kind::ticket, kRefused, [](ChainFields& c) { c.intermediate.authorityKeyIdentifier = KeyIdentifier::given("another"); }},
    Row{"IntermediateNoAuthority", Kind::ticket, kRefused, [](ChainFields& c) { c.intermediate.basicConstraints = BasicConstraints{false}; }},
    Row{"IntermediateWithoutBasicConstraints", Kind::ticket, kRefused, [](ChainFields& c) { c.intermediate.basicConstraints.reset(); }},
    Row{"RootNoAuthority", Kind::ticket, kRefused, [](ChainFields& c) { c.root.basicConstraints = BasicConstraints{false}; }},
    Row{"RootPathLengthZero", Kind::ticket, kRefused, [](ChainFields& c) { c.root.basicConstraints = BasicConstraints{true, 0}; }},
    Row{"RootPathLengthOne", Kind::ticket, kTrusted, [](ChainFields& c) { c.root.basicConstraints = BasicConstraints{true, 1}; }},
    Row{"IntermediateMayNotSignCertificates", Kind::ticket, kRefused, [](ChainFields& c) { c.intermediate.keyUsage = "critical,digitalSignature"; }},
    Row{"LeafSignedWithSha1", Kind::ticket, kRefused, [](ChainFields& c) { c.leaf.digest = SignatureDigest::sha1; }},
    Row{"IntermediateSignedWithSha1", Kind::ticket, kRefused, [](ChainFields& c) { c.intermediate.digest = SignatureDigest::sha1; }},
    Row{"LeafSignedWithMd5", Kind::ticket, kRefused, [](ChainFields& c) { c.intermediate.key = SigningKey::cached(KeyKind::rsa2048, "i"); c.leaf.digest = SignatureDigest::md5; }},
    Row{"NoAnchors", Kind::ticket, kRefused, kAsItShouldBe, [](Scene& s) { s.roots.clear(); }},
    Row{"RootOnlyAmongCompatibilityRoots", Kind::ticket, kRefused, kAsItShouldBe, [](Scene& s) { s.roots.swap(s.compatibility); }},
    Row{"RootThatDiffersInItsSerialNumberIsNoAnchor", Kind::ticket, kRefused, kAsItShouldBe, [](Scene& s) { TicketChain other; other.root.serial = 99; s.list = {other.issue().root.der}; }},
    Row{"IntermediateLeftOut", Kind::ticket, kRefused, kAsItShouldBe, [](Scene& s) { s.list = {s.chain.leaf.der, s.chain.root.der}; }},
    Row{"LeafIsTheRoot", Kind::ticket, kRefused, kAsItShouldBe, [](Scene& s) { s.list = {s.chain.root.der}; }},
    Row{"IntermediateAsAnchorMakesAChainOfTwo", Kind::ticket, kRefused, kAsItShouldBe, [](Scene& s) { s.roots = {s.chain.intermediate.der}; s.list.pop_back(); }},
    Row{"IssuerNameDoesNotFit", Kind::ticket, kRefused, [](ChainFields& c) { c.leaf.issuer = test::commonName("Somebody Else"); }},

    Row{"LeafSignatureCorrupt", Kind::ticket, kFatal, [](ChainFields& c) { c.leaf.corruptSignature = true; }},
    Row{"IntermediateSignatureCorrupt", Kind::ticket, kFatal, [](ChainFields& c) { c.intermediate.corruptSignature = true; }},
    Row{"LeafCriticalExtensionUnknown", Kind::ticket, kFatal, [](ChainFields& c) { c.leaf.extensions = {{kUnknownOid, true}}; }},
    Row{"IntermediateCriticalExtensionUnknown", Kind::ticket, kFatal, [](ChainFields& c) { c.intermediate.extensions = {{kUnknownOid, true}}; }},
    Row{"RootCriticalExtensionUnknown", Kind::ticket, kFatal, [](ChainFields& c) { c.root.extensions = {{kUnknownOid, true}}; }},
    Row{"LeafBasicConstraintsMalformed", Kind::ticket, kFatal, [](ChainFields& c) { c.leaf.basicConstraints.reset(); c.leaf.extensions = {{"2.5.29.19", true}}; }},
    Row{"LeafExtensionTwice", Kind::ticket, kFatal, [](ChainFields& c) { c.leaf.extensions = {{kUnknownOid, false}, {kUnknownOid, false}}; }},
    Row{"LeafExtensionWithBytesBehindItsValue", Kind::ticket, kFatal, [](ChainFields& c) { c.leaf.subjectKeyIdentifier = KeyIdentifier::omitted(); c.leaf.extensions = {{"2.5.29.14", false, Data{std::byte{4}, std::byte{1}, std::byte{7}, std::byte{0}}}}; }},
    Row{"UnknownCriticalIsGraverThanAMissingMarker", Kind::ticket, kFatal, [](ChainFields& c) { c.leaf.markers.clear(); c.leaf.extensions = {{kUnknownOid, true}}; }},

    Row{"RootAllowedByTheUserOnly", Kind::ticket, kByUser, kAsItShouldBe, rootAllowedOnly},
    Row{"RootAllowedByTheUserAndLeftOut", Kind::ticket, kByUser, kAsItShouldBe, [](Scene& s) { rootAllowedOnly(s); s.list.pop_back(); }},
    Row{"LeafAllowedByTheUser", Kind::ticket, kByUser, kAsItShouldBe, [](Scene& s) { s.roots.clear(); s.allowed = {s.chain.leaf.der}; }},
    Row{"AllowedBesidesThePlatformsOwn", Kind::ticket, kTrusted, kAsItShouldBe, [](Scene& s) { s.allowed = {s.chain.leaf.der, s.chain.root.der}; }},
    Row{"AllowedButWithoutTheMarker", Kind::ticket, kRefused, [](ChainFields& c) { c.leaf.markers.clear(); }, rootAllowedOnly},
    Row{"LeafDenied", Kind::ticket, kDenied, kAsItShouldBe, [](Scene& s) { s.denied = {s.chain.leaf.der}; }},
    Row{"IntermediateDenied", Kind::ticket, kDenied, kAsItShouldBe, [](Scene& s) { s.denied = {s.chain.intermediate.der}; }},
    Row{"RootDenied", Kind::ticket, kDenied, kAsItShouldBe, [](Scene& s) { s.denied = {s.chain.root.der}; }},
    Row{"RootDeniedAndKnownFromThereOnly", Kind::ticket, kDenied, kAsItShouldBe, [](Scene& s) { s.roots.clear(); s.list.pop_back(); s.denied = {s.chain.root.der}; }},
    Row{"DeniedOutweighsAllowed", Kind::ticket, kDenied, kAsItShouldBe, [](Scene& s) { s.allowed = s.denied = {s.chain.leaf.der}; }},
    Row{"DeniedOutweighsABadSignature", Kind::ticket, kDenied, [](ChainFields& c) { c.leaf.corruptSignature = true; }, [](Scene& s) { s.denied = {s.chain.root.der}; }}),
    titleOf);

INSTANTIATE_TEST_SUITE_P(PinnedServer, Chain, testing::Values(
    Row{"Good", Kind::pinned, kTrusted, kAsItShouldBe},
    Row{"GoodWithTheRootLeftOut", Kind::pinned, kTrusted, kAsItShouldBe, [](Scene& s) { s.list.pop_back(); }},
    Row{"CertificatesBehindTheLeafInAnyOrder", Kind::pinned, kTrusted, kAsItShouldBe, [](Scene& s) { s.list = {s.chain.leaf.der, TicketChain().issue().leaf.der, s.chain.root.der, s.chain.intermediate.der}; }},
    Row{"LeafUnderTheRootItself", Kind::pinned, kTrusted, kAsItShouldBe, [](Scene& s) { s.list = {test::issueCertificate(ServerChain(kHost).leaf, &s.chain.root).der}; }},
    Row{"Wildcard", Kind::pinned, kTrusted, [](ChainFields& c) { c.leaf.subjectAlternativeNames = "DNS:*.lumora.example"; }},
    Row{"LeafSubjectEmpty", Kind::pinned, kTrusted, [](ChainFields& c) { c.leaf.subject.clear(); }},
    Row{"KeyIdentifierDiffers", Kind::pinned, kTrusted, [](ChainFields& c) { c.leaf.authorityKeyIdentifier = KeyIdentifier::given("another"); }},
    Row{"LastSecondOfValidity", Kind::pinned, kTrusted, [](ChainFields& c) { c.leaf.notAfter = kNow; }},
    Row{"FirstSecondOfValidity", Kind::pinned, kTrusted, [](ChainFields& c) { c.leaf.notBefore = kNow; }},
    Row{"MarkerMissing", Kind::pinned, kRefused, [](ChainFields& c) { c.leaf.markers.clear(); }},
    Row{"LeafExpired", Kind::pinned, kRefused, [](ChainFields& c) { c.leaf.notAfter = {kNow.seconds - 1}; }},
    Row{"LeafNotValidYet", Kind::pinned, kRefused, [](ChainFields& c) { c.leaf.notBefore = {kNow.seconds + 1}; }},
    Row{"IntermediateExpired", Kind::pinned, kRefused, [](ChainFields& c) { c.intermediate.notAfter = {kNow.seconds - kDay}; }},
    Row{"RootExpired", Kind::pinned, kRefused, [](ChainFields& c) { c.root.notAfter = {kNow.seconds - kDay}; }},
    Row{"AnotherHost", Kind::pinned, kRefused, [](ChainFields& c) { c.leaf.subjectAlternativeNames = "DNS:www.lumora.example"; }},
    Row{"HostInTheCommonNameOnly", Kind::pinned, kRefused, [](ChainFields& c) { c.leaf.subject = {{"CN", kHost}}; c.leaf.subjectAlternativeNames.clear(); }},
    Row{"HostAsMailDomainOnly", Kind::pinned, kRefused, [](ChainFields& c) { c.leaf.subjectAlternativeNames = "email:root@api.lumora.example"; }},
    Row{"PurposeOfAClient", Kind::pinned, kRefused, [](ChainFields& c) { c.leaf.extendedKeyUsage = "clientAuth"; }},
    Row{"NoPurposeNamed", Kind::pinned, kRefused, [](ChainFields& c) { c.leaf.extendedKeyUsage.clear(); }},
    Row{"AnyPurposeNamed", Kind::pinned, kRefused, [](ChainFields& c) { c.leaf.extendedKeyUsage = "anyExtendedKeyUsage"; }},
    Row{"IntermediateForClientsOnly", Kind::pinned, kRefused, [](ChainFields& c) { c.intermediate.extendedKeyUsage = "clientAuth"; }},
    Row{"RootForClientsOnly", Kind::pinned, kRefused, [](ChainFields& c) { c.root.extendedKeyUsage = "critical,clientAuth"; }},
    Row{"IntermediateForAnyPurpose", Kind::pinned, kTrusted, [](ChainFields& c) { c.intermediate.extendedKeyUsage = "anyExtendedKeyUsage"; }},
    Row{"IntermediateForServersAndOthers", Kind::pinned, kTrusted, [](ChainFields& c) { c.intermediate.extendedKeyUsage = "clientAuth,serverAuth"; }},
    Row{"LeafWhoseKeyUsageIsNoneOfTls", Kind::pinned, kRefused, [](ChainFields& c) { c.leaf.keyUsage = "critical,nonRepudiation"; }},
    Row{"LeafForKeyAgreement", Kind::pinned, kRefused, [](ChainFields& c) { c.leaf.keyUsage = "critical,keyAgreement"; }},
    Row{"LeafOfAnEllipticCurveForKeyEncipherment", Kind::pinned, kRefused, [](ChainFields& c) { c.leaf.keyUsage = "critical,keyEncipherment"; }},
    Row{"HostExcludedByTheIntermediate", Kind::pinned, kRefused, [](ChainFields& c) { c.intermediate.nameConstraints = "excluded;DNS:lumora.example"; }},
    Row{"HostExcludedByTheRoot", Kind::pinned, kRefused, [](ChainFields& c) { c.root.nameConstraints = "critical,excluded;DNS:api.lumora.example"; }},
    Row{"HostPermittedByTheRoot", Kind::pinned, kTrusted, [](ChainFields& c) { c.root.nameConstraints = "critical,permitted;DNS:lumora.example"; }},
    Row{"AnotherNameNotPermitted", Kind::pinned, kRefused, [](ChainFields& c) { c.leaf.subjectAlternativeNames += ",DNS:other.example"; c.root.nameConstraints = "permitted;DNS:lumora.example"; }},
    Row{"MailConstrainedByTheRoot", Kind::pinned, kRefused, [](ChainFields& c) { c.root.nameConstraints = "permitted;email:lumora.example"; }},
    Row{"NameConstraintsOfTheLeaf", Kind::pinned, kTrusted, [](ChainFields& c) { c.leaf.nameConstraints = "critical,excluded;DNS:lumora.example"; }},
    Row{"PoliciesCritical", Kind::pinned, kTrusted, [](ChainFields& c) { c.intermediate.extensions = {{"2.5.29.32", true, derElement(0x30, derElement(0x30, bytes({6, 2, 0x2A, 3})))}}; }},
    Row{"IntermediateNoAuthority", Kind::pinned, kRefused, [](ChainFields& c) { c.intermediate.basicConstraints = BasicConstraints{false}; }},
    Row{"RootOnlyAmongCompatibilityRoots", Kind::pinned, kRefused, kAsItShouldBe, [](Scene& s) { s.roots.swap(s.compatibility); }},
    Row{"LeafKeyRsa1024", Kind::pinned, kRefused, [](ChainFields& c) { c.leaf.key = SigningKey::cached(KeyKind::rsa1024, "l"); }},
    Row{"IntermediateSignedWithSha1", Kind::pinned, kRefused, [](ChainFields& c) { c.intermediate.digest = SignatureDigest::sha1; }},
    Row{"LeafSignatureCorrupt", Kind::pinned, kFatal, [](ChainFields& c) { c.leaf.corruptSignature = true; }},
    Row{"LeafCriticalExtensionUnknown", Kind::pinned, kFatal, [](ChainFields& c) { c.leaf.extensions = {{kUnknownOid, true}}; }},
    Row{"NameConstraintsCritical", Kind::pinned, kFatal, [](ChainFields& c) { c.intermediate.extensions = {{"2.5.29.30", true}}; }},
    Row{"AddressOfOddLength", Kind::pinned, kFatal, [](ChainFields& c) { c.leaf.subjectAlternativeNames.clear(); c.leaf.extensions = {{"2.5.29.17", false, Data{std::byte{0x30}, std::byte{3}, std::byte{0x87}, std::byte{1}, std::byte{7}}}}; }},
    Row{"RootAllowedByTheUserOnly", Kind::pinned, kByUser, kAsItShouldBe, rootAllowedOnly},
    Row{"LeafAllowedByTheUserOnly", Kind::pinned, kByUser, kAsItShouldBe, [](Scene& s) { s.roots.clear(); s.list = {s.chain.leaf.der}; s.allowed = s.list; }},
    Row{"AllowedButExpired", Kind::pinned, kRefused, [](ChainFields& c) { c.leaf.notAfter = {kNow.seconds - kDay}; }, rootAllowedOnly},
    Row{"IntermediateDenied", Kind::pinned, kDenied, kAsItShouldBe, [](Scene& s) { s.denied = {s.chain.intermediate.der}; }}),
    titleOf);

INSTANTIATE_TEST_SUITE_P(CompatibilityServer, Chain, testing::Values(
    Row{"GoodUnderTheMakersRoot", Kind::compatibility, kTrusted, kAsItShouldBe},
    Row{"GoodUnderACompatibilityRoot", Kind::compatibility, kTrusted, kAsItShouldBe, [](Scene& s) { s.roots.swap(s.compatibility); }},
    Row{"MarkerMissing", Kind::compatibility, kTrusted, [](ChainFields& c) { c.leaf.markers.clear(); }},
    Row{"NoAnchors", Kind::compatibility, kRefused, kAsItShouldBe, [](Scene& s) { s.roots.clear(); }},
    Row{"LeafExpired", Kind::compatibility, kRefused, [](ChainFields& c) { c.leaf.notAfter = {kNow.seconds - kDay}; }},
    Row{"AnotherHost", Kind::compatibility, kRefused, [](ChainFields& c) { c.leaf.subjectAlternativeNames = "DNS:lumora.example"; }},
    Row{"PurposeOfAClient", Kind::compatibility, kRefused, [](ChainFields& c) { c.leaf.extendedKeyUsage = "clientAuth"; }},
    Row{"SelfSignedLeaf", Kind::compatibility, kRefused, kAsItShouldBe, [](Scene& s) { s.list = {test::issueCertificate(ServerChain(kHost).leaf, nullptr).der}; }},
    Row{"IntermediateSignatureCorrupt", Kind::compatibility, kFatal, [](ChainFields& c) { c.intermediate.corruptSignature = true; }},
    Row{"RootAllowedByTheUserOnly", Kind::compatibility, kByUser, kAsItShouldBe, rootAllowedOnly},
    Row{"CompatibilityRootDenied", Kind::compatibility, kDenied, kAsItShouldBe, [](Scene& s) { s.roots.swap(s.compatibility); s.denied = {s.chain.root.der}; }}),
    titleOf);
// clang-format on

}  // namespace
}  // namespace pinwell::trust
