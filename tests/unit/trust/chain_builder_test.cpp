#include "trust/chain_builder.h"

#include <gtest/gtest.h>
#include <openssl/evp.h>

#include <atomic>

#include "scene.h"

namespace {

std::atomic<std::size_t> signatureChecks = 0;

}  // namespace

// The linker sends every call of EVP_DigestVerify here (ld's --wrap).
extern "C" {
// NOLINTBEGIN: reserved names that are not ours to choose
using Bytes = const unsigned char*;
int __real_EVP_DigestVerify(EVP_MD_CTX* context, Bytes signature, size_t size, Bytes message, size_t length);
int __wrap_EVP_DigestVerify(EVP_MD_CTX* context, Bytes signature, size_t size, Bytes message, size_t length);
int __wrap_EVP_DigestVerify(EVP_MD_CTX* context, Bytes signature, size_t size, Bytes message, size_t length) {
    ++signatureChecks;
    return __real_EVP_DigestVerify(context, signature, size, message, length);
}
// NOLINTEND
}

namespace pinwell::trust {
namespace {

using test::CertificateFields;
using test::IssuedCertificate;
using test::KeyKind;
using test::SigningKey;

Policy anchorOnly() {
    return {"1.2.3", std::nullopt, {{std::string(option::kPlatformAnchor), Dictionary{}}}};
}

CertificateFields authority(const std::string& name, const std::string& key, std::int64_t serial = 1) {
    CertificateFields fields;
    fields.subject = {{"CN", name}};
    fields.key = SigningKey::cached(KeyKind::p256, key);
    fields.serial = serial;
    fields.basicConstraints = test::BasicConstraints{true};
    return fields;
}

TEST(ChainBuilder, PrefersTheCrossCertificateThatLeadsToAnAnchor) {
    Scene scene{test::TicketChain()};
    const IssuedCertificate stranger = issueCertificate(authority("Stranger", "stranger"), nullptr);
    test::TicketChain fields;
    const IssuedCertificate cross = issueCertificate(fields.intermediate, &stranger);
    scene.list = {scene.chain.leaf.der, cross.der, stranger.der, scene.chain.intermediate.der};
    EXPECT_EQ(scene.verdict(ticketPolicy()), Verdict::unspecified);
}

TEST(ChainBuilder, PassesOverAnIssuerOfTheSameNameWithAnotherKey) {
    Scene scene{test::TicketChain()};
    test::TicketChain impostor;
    impostor.intermediate.key = SigningKey::cached(KeyKind::p256, "impostor");
    scene.list = {scene.chain.leaf.der, impostor.issue().intermediate.der, scene.chain.intermediate.der};
    EXPECT_EQ(scene.verdict(ticketPolicy()), Verdict::unspecified);
}

TEST(ChainBuilder, DoesNotTakeAnAnchorOfTheSameNameForTheIssuer) {
    test::TicketChain other;
    other.root.key = SigningKey::cached(KeyKind::p256, "other root");
    Scene scene{test::TicketChain()};
    scene.roots = {other.issue().root.der};
    EXPECT_EQ(scene.verdict(ticketPolicy()), Verdict::recoverableFailure);
    scene.list.pop_back();
    EXPECT_EQ(scene.verdict(ticketPolicy()), Verdict::recoverableFailure);
}

TEST(ChainBuilder, GoesRoundTheDeniedCertificateWhereThereIsAnotherWay) {
    Scene scene{test::TicketChain()};
    const IssuedCertificate other = issueCertificate(authority("Other Root", "other root"), nullptr);
    scene.list.push_back(issueCertificate(test::TicketChain().intermediate, &other).der);
    scene.roots.push_back(other.der);
    scene.denied = {scene.chain.root.der};
    EXPECT_EQ(scene.verdict(ticketPolicy()), Verdict::unspecified);
}

TEST(ChainBuilder, EndsWhenTwoAuthoritiesCertifyEachOther) {
    const IssuedCertificate a = issueCertificate(authority("A", "a"), nullptr);
    const IssuedCertificate b = issueCertificate(authority("B", "b"), nullptr);
    Scene scene{test::TicketChain()};
    scene.list = {issueCertificate(CertificateFields{}, &a).der};
    for (std::int64_t serial = 1; serial <= 20; ++serial) {
        scene.list.push_back(issueCertificate(authority("A", "a", serial), &b).der);
        scene.list.push_back(issueCertificate(authority("B", "b", serial), &a).der);
    }
    EXPECT_EQ(scene.verdict(anchorOnly()), Verdict::recoverableFailure);
}

TEST(ChainBuilder, EndsInAThicketOfSelfIssuedCertificates) {
    std::vector<IssuedCertificate> keys;
    for (int i = 0; i < 8; ++i) {
        keys.push_back(issueCertificate(authority("Same", "same" + std::to_string(i)), nullptr));
    }
    Scene scene{test::TicketChain()};
    CertificateFields leaf;
    leaf.issuer = test::commonName("Same");
    scene.list = {issueCertificate(leaf, &keys[0]).der};
    for (int i = 0; i < 8; ++i) {
        for (int j = 0; j < 8 && scene.list.size() < kMaximumCertificates; ++j) {
            if (i == j) continue;
            scene.list.push_back(issueCertificate(authority("Same", "same" + std::to_string(i)),
                                                  &keys[static_cast<std::size_t>(j)])
                                     .der);
        }
    }
    EXPECT_EQ(scene.verdict(anchorOnly()), Verdict::recoverableFailure);
}

TEST(ChainBuilder, MakesNoMoreSignatureChecksThanItsLimit) {
    // One name for all and no key identifiers: without checking a signature, each certificate could be the
    // issuer of each. The next in the list is the real issuer.
    std::vector<IssuedCertificate> keys;
    CertificateFields fields = authority("Same", "same0");
    fields.subjectKeyIdentifier = fields.authorityKeyIdentifier = test::KeyIdentifier::omitted();
    for (std::size_t i = 0; i < kMaximumCertificates; ++i) {
        fields.key = SigningKey::cached(KeyKind::p256, "same" + std::to_string(i));
        keys.push_back(issueCertificate(fields, nullptr));
    }
    CertificateList list;
    for (std::size_t i = 0; i < keys.size(); ++i) {
        fields.key = keys[i].key;
        list.push_back(X509Certificate::parse(issueCertificate(fields, &keys[(i + 1) % keys.size()]).der));
    }
    const CertificateList noAnchors;
    const Anchors nothing;
    SignatureChecks checks;
    ChainBuilder builder(list, noAnchors, nothing, checks);
    signatureChecks = 0;
    builder.build([](const CandidateChain&) { return false; });
    EXPECT_TRUE(builder.isExhausted());
    EXPECT_EQ(signatureChecks, 256U);
    ChainBuilder(list, noAnchors, nothing, checks).build([](const CandidateChain&) { return false; });
    EXPECT_EQ(signatureChecks, 256U) << "the bound is one for all searches of a list";
}

TEST(ChainBuilder, MakesNoCheckAfterItFindsAChain) {
    Scene scene{test::TicketChain()};
    test::TicketChain impostor;
    for (int i = 0; i < 40; ++i) {
        impostor.intermediate.key = SigningKey::cached(KeyKind::p256, "same" + std::to_string(i));
        scene.list.push_back(issueCertificate(impostor.intermediate, &scene.chain.root).der);
    }
    signatureChecks = 0;
    EXPECT_EQ(scene.verdict(ticketPolicy()), Verdict::unspecified);
    EXPECT_EQ(signatureChecks, 2U) << "key identifiers lead the way";
}

// Searches that end at a bound.

constexpr const char* kGivenUp =
    "the search for a chain was given up, since the certificates allow too many or too long chains";

/// A leaf below levels of certificates, where each could have issued each of the level below: the same name
/// and key under several serial numbers.
Scene ladder(int levels, int width) {
    Scene scene{test::TicketChain()};
    scene.list.clear();
    CertificateFields top = authority("top", "top");
    IssuedCertificate above = issueCertificate(top, nullptr);
    for (int level = 0; level < levels; ++level) {
        const std::string name = "level " + std::to_string(level);
        IssuedCertificate issued = above;
        for (int i = 0; i < width; ++i) {
            issued = issueCertificate(authority(name, name, i + 1), &above);
            scene.list.push_back(issued.der);
        }
        above = issued;
    }
    scene.list.insert(scene.list.begin(), issueCertificate(CertificateFields{}, &above).der);
    return scene;
}

/// More certificates of one name than the limit of checks.
Scene thicket() {
    Scene scene{test::TicketChain()};
    CertificateFields fields = authority("Same", "same0");
    fields.subjectKeyIdentifier = fields.authorityKeyIdentifier = test::KeyIdentifier::omitted();
    scene.list.clear();
    for (std::size_t i = 0; i < kMaximumCertificates; ++i) {
        fields.key = SigningKey::cached(KeyKind::p256, "same" + std::to_string(i));
        fields.signer =
            SigningKey::cached(KeyKind::p256, "same" + std::to_string((i + 1) % kMaximumCertificates));
        fields.issuer = fields.subject;
        scene.list.push_back(issueCertificate(fields, nullptr).der);
    }
    return scene;
}

/// One issuer above the other, without an anchor.
Scene tower(std::size_t height) {
    Scene scene{test::TicketChain()};
    scene.list.clear();
    IssuedCertificate above = issueCertificate(authority("0", "0"), nullptr);
    for (std::size_t i = 1; i < height; ++i) {
        above = issueCertificate(authority(std::to_string(i), std::to_string(i)), &above);
        scene.list.insert(scene.list.begin(), above.der);
    }
    return scene;
}

struct Bounded {
    const char* name;
    std::function<Scene()> make;
};

class ExhaustedSearch : public testing::TestWithParam<Bounded> {};

TEST_P(ExhaustedSearch, ReportsTheBoundAsTheOnlyCause) {
    const Scene scene = GetParam().make();
    const auto trust = scene.trust(anchorOnly());
    const auto verdict = trust->evaluate();
    ASSERT_TRUE(verdict);
    EXPECT_EQ(*verdict, Verdict::recoverableFailure);
    EXPECT_TRUE(trust->failureDescription().value_or("").ends_with(kGivenUp))
        << trust->failureDescription().value_or("");
    ASSERT_EQ(trust->properties().size(), 1U);
    EXPECT_EQ(trust->properties()[0]["error"], values::Value(kGivenUp));
}

TEST_P(ExhaustedSearch, FindsALeafThatIsDistrustedAllTheSame) {
    Scene scene = GetParam().make();
    scene.denied = {scene.list.front()};
    EXPECT_EQ(scene.verdict(anchorOnly()), Verdict::deny);
}

INSTANTIATE_TEST_SUITE_P(Of, ExhaustedSearch,
                         testing::Values(Bounded{"Checks", thicket},
                                         Bounded{"Chains", [] { return ladder(5, 3); }},
                                         Bounded{"Length", [] { return tower(kMaximumChainLength + 3); }}),
                         [](const auto& tested) { return tested.param.name; });

TEST(CompleteSearch, NamesItsCause) {
    for (const Scene& scene : {ladder(3, 3), tower(kMaximumChainLength)}) {
        const auto trust = scene.trust(anchorOnly());
        const auto verdict = trust->evaluate();
        ASSERT_TRUE(verdict);
        EXPECT_EQ(*verdict, Verdict::recoverableFailure);
        EXPECT_FALSE(trust->failureDescription().value_or("").ends_with(kGivenUp));
    }
}

TEST(ChainBuilder, GoesNoFurtherThanItsLimit) {
    const auto chainOf = [](std::size_t length) {
        std::vector<IssuedCertificate> made{issueCertificate(authority("0", "0"), nullptr)};
        while (made.size() < length) {
            const std::string name = std::to_string(made.size());
            made.push_back(issueCertificate(authority(name, name), &made.back()));
        }
        Scene scene{test::TicketChain()};
        scene.list.clear();
        for (auto at = made.rbegin(); at != made.rend(); ++at) scene.list.push_back(at->der);
        scene.roots = {made.front().der};
        return scene.verdict(anchorOnly());
    };
    EXPECT_EQ(chainOf(kMaximumChainLength), Verdict::unspecified);
    EXPECT_EQ(chainOf(kMaximumChainLength + 1), Verdict::recoverableFailure);
}

}  // namespace
}  // namespace pinwell::trust
