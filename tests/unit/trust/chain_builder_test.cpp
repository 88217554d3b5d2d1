#include "trust/chain_builder.h"

#include <gtest/gtest.h>
#include <openssl/x509.h>

#include <atomic>

#include "scene.h"

namespace {

std::atomic<std::size_t> signatureChecks = 0;

}  // namespace

// The linker sends every call of X509_verify here (ld's --wrap).
extern "C" {
// NOLINTBEGIN: reserved names that are not ours to choose
int __real_X509_verify(X509* certificate, EVP_PKEY* key);
int __wrap_X509_verify(X509* certificate, EVP_PKEY* key);
int __wrap_X509_verify(X509* certificate, EVP_PKEY* key) {
    ++signatureChecks;
    return __real_X509_verify(certificate, key);
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
    // One name for all and no key identifiers: each certificate could have issued each, by all that can be
    // seen without checking a signature. The next in the list is the one that did.
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
    ChainBuilder builder(list, noAnchors, nothing);
    std::size_t shown = 0;
    signatureChecks = 0;
    builder.build([&](const CandidateChain& chain) {
        EXPECT_TRUE(chain.badSignature) << "what was not checked does not verify";
        ++shown;
        return false;
    });
    EXPECT_GT(shown, 0U);
    EXPECT_EQ(signatureChecks, 256U);
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
