#include "lumora-local/authority.h"

#include <gtest/gtest.h>

#include <set>

#include "certificates.h"
#include "fixed_now.h"
#include "lumora-local/certificates.h"

namespace pinwell::lumora {
namespace {

using test::carries;
using test::certificateFromPem;
using test::keyFromPem;

constexpr std::int64_t kDay = 86'400;

class AuthorityTest : public testing::Test {
  protected:
    const Authority authority_ = createAuthority({"tickets.example", "127.0.0.1", "::1"}, kNow);
    const test::CertificateHandle root_ = certificateFromPem(authority_.root.certificate);
    const test::CertificateHandle intermediate_ =
        certificateFromPem(authority_.ticketIntermediate.certificate);
    const test::CertificateHandle signer_ = certificateFromPem(authority_.ticketSigner.certificate);
    const test::CertificateHandle server_ = certificateFromPem(authority_.server.certificate);
    const std::vector<X509*> all_{root_.get(), intermediate_.get(), signer_.get(), server_.get()};
};

/// The library's own judgement of a chain, without purposes, which have their own check.
int verify(X509* leaf, X509* intermediate, X509* root, std::int64_t at) {
    X509_STORE* store = X509_STORE_new();
    X509_STORE_add_cert(store, root);
    STACK_OF(X509)* others = sk_X509_new_null();
    if (intermediate != nullptr) sk_X509_push(others, intermediate);
    X509_STORE_CTX* context = X509_STORE_CTX_new();
    X509_STORE_CTX_init(context, store, leaf, others);
    X509_VERIFY_PARAM_set_time(X509_STORE_CTX_get0_param(context), static_cast<time_t>(at));
    X509_VERIFY_PARAM_set_flags(X509_STORE_CTX_get0_param(context),
                                X509_V_FLAG_X509_STRICT | X509_V_FLAG_CHECK_SS_SIGNATURE);
    X509_verify_cert(context);
    const int error = X509_STORE_CTX_get_error(context);
    X509_STORE_CTX_free(context);
    sk_X509_free(others);
    X509_STORE_free(store);
    return error;
}

TEST_F(AuthorityTest, ChainsTheTicketSignerToTheRootThroughTheIntermediate) {
    EXPECT_EQ(verify(signer_.get(), intermediate_.get(), root_.get(), kNow.seconds), X509_V_OK);
    EXPECT_NE(verify(signer_.get(), nullptr, root_.get(), kNow.seconds), X509_V_OK);
}

TEST_F(AuthorityTest, ChainsTheServerToTheRoot) {
    EXPECT_EQ(verify(server_.get(), nullptr, root_.get(), kNow.seconds), X509_V_OK);
}

TEST_F(AuthorityTest, IsValidFromADayBeforeForTenYears) {
    EXPECT_EQ(verify(server_.get(), nullptr, root_.get(), kNow.seconds - kDay + 60), X509_V_OK);
    EXPECT_EQ(verify(server_.get(), nullptr, root_.get(), kNow.seconds + 3650 * kDay), X509_V_OK);
    EXPECT_NE(verify(server_.get(), nullptr, root_.get(), kNow.seconds - 2 * kDay), X509_V_OK);
    EXPECT_NE(verify(server_.get(), nullptr, root_.get(), kNow.seconds + 3660 * kDay), X509_V_OK);
}

TEST_F(AuthorityTest, MarksEachCertificateForItsUseAndNoOther) {
    const std::vector<std::pair<X509*, std::string_view>> marked{
        {intermediate_.get(), kTicketIntermediateMarkerOid},
        {signer_.get(), kTicketSignerMarkerOid},
        {server_.get(), kServerMarkerOid}};
    for (X509* certificate : all_) {
        for (const auto& [bearer, oid] : marked) {
            EXPECT_EQ(carries(certificate, std::string(oid)), certificate == bearer) << oid;
        }
    }
}

TEST_F(AuthorityTest, HasOnlyStandardCriticalExtensions) {
    for (X509* certificate : all_) {
        for (int i = 0; i < X509_get_ext_count(certificate); ++i) {
            X509_EXTENSION* extension = X509_get_ext(certificate, i);
            const int identifier = OBJ_obj2nid(X509_EXTENSION_get_object(extension));
            if (X509_EXTENSION_get_critical(extension) != 0) {
                EXPECT_TRUE(identifier == NID_basic_constraints || identifier == NID_key_usage);
            }
        }
    }
}

TEST_F(AuthorityTest, UsesP256KeysAndSha256) {
    for (X509* certificate : all_) {
        EXPECT_EQ(EVP_PKEY_get_base_id(X509_get0_pubkey(certificate)), EVP_PKEY_EC);
        EXPECT_EQ(EVP_PKEY_get_bits(X509_get0_pubkey(certificate)), 256);
        EXPECT_EQ(X509_get_signature_nid(certificate), NID_ecdsa_with_SHA256);
    }
}

TEST_F(AuthorityTest, ReturnsTheKeyOfEachCertificate) {
    for (const Identity* identity :
         {&authority_.root, &authority_.ticketIntermediate, &authority_.ticketSigner, &authority_.server}) {
        const test::KeyHandle key = keyFromPem(identity->privateKey);
        EXPECT_EQ(X509_check_private_key(certificateFromPem(identity->certificate).get(), key.get()), 1);
    }
}

TEST_F(AuthorityTest, LinksEveryCertificateToItsIssuersKey) {
    for (X509* certificate : all_) {
        X509* issuer = certificate == signer_.get() ? intermediate_.get() : root_.get();
        const ASN1_OCTET_STRING* wanted = X509_get0_subject_key_id(issuer);
        const ASN1_OCTET_STRING* found = X509_get0_authority_key_id(certificate);
        ASSERT_NE(wanted, nullptr);
        ASSERT_NE(found, nullptr);
        EXPECT_EQ(ASN1_OCTET_STRING_cmp(wanted, found), 0);
    }
}

TEST_F(AuthorityTest, LetsOnlyTheTwoAuthoritiesIssue) {
    EXPECT_EQ(X509_check_ca(root_.get()), 1);
    EXPECT_EQ(X509_check_ca(intermediate_.get()), 1);
    EXPECT_EQ(X509_check_ca(signer_.get()), 0);
    EXPECT_EQ(X509_check_ca(server_.get()), 0);
    EXPECT_EQ(X509_get_pathlen(intermediate_.get()), 0);
    EXPECT_EQ(X509_get_key_usage(signer_.get()), std::uint32_t{KU_DIGITAL_SIGNATURE});
    EXPECT_EQ(X509_get_key_usage(server_.get()), std::uint32_t{KU_DIGITAL_SIGNATURE});
    EXPECT_EQ(X509_get_key_usage(root_.get()), std::uint32_t{KU_KEY_CERT_SIGN | KU_CRL_SIGN});
    EXPECT_EQ(X509_get_extended_key_usage(server_.get()), std::uint32_t{XKU_SSL_SERVER});
}

TEST_F(AuthorityTest, NamesEverySubjectAndNumbersEveryCertificate) {
    std::set<std::string> serialNumbers;
    for (X509* certificate : all_) {
        EXPECT_GT(X509_NAME_entry_count(X509_get_subject_name(certificate)), 0);
        const ASN1_INTEGER* number = X509_get0_serialNumber(certificate);
        EXPECT_LE(number->length, 20);
        EXPECT_EQ(number->type, V_ASN1_INTEGER);  // not V_ASN1_NEG_INTEGER
        serialNumbers.insert(std::string(number->data, number->data + number->length));
    }
    EXPECT_EQ(serialNumbers.size(), all_.size());
}

TEST_F(AuthorityTest, NamesOnlyTheHostsInTheServerCertificate) {
    EXPECT_EQ(
        X509_check_host(server_.get(), "tickets.example", 0, X509_CHECK_FLAG_NEVER_CHECK_SUBJECT, nullptr),
        1);
    EXPECT_EQ(X509_check_ip_asc(server_.get(), "127.0.0.1", 0), 1);
    EXPECT_EQ(X509_check_ip_asc(server_.get(), "::1", 0), 1);
    EXPECT_EQ(X509_check_host(server_.get(), "localhost", 0, 0, nullptr), 0);
    EXPECT_EQ(X509_check_ip_asc(server_.get(), "127.0.0.2", 0), 0);
}

/// The fault of the chain signer, intermediate, root with these profiles.
std::optional<std::string> faultOfChain(const CertificateProfile& signer,
                                        const CertificateProfile& intermediate,
                                        const CertificateProfile& root) {
    const IssuedCertificate anchor = issueCertificate(root, nullptr, kNow);
    const IssuedCertificate between = issueCertificate(intermediate, &anchor, kNow);
    std::vector<CertificateHandle> chain;
    chain.push_back(issueCertificate(signer, &between, kNow).certificate);
    for (const IssuedCertificate* const issued : {&between, &anchor}) {
        X509_up_ref(issued->certificate.get());
        chain.emplace_back(issued->certificate.get());
    }
    return faultOfSignerChain(chain);
}

TEST(SignerChain, IsRefusedForTheCertificateAtFault) {
    const CertificateProfile root{
        .commonName = "Root", .basicConstraints = "critical,CA:TRUE", .keyUsage = "critical,keyCertSign"};
    CertificateProfile intermediate = root;
    intermediate.commonName = "Intermediate";
    intermediate.markerOid = kTicketIntermediateMarkerOid;
    const CertificateProfile signer{.commonName = "Signer",
                                    .basicConstraints = "critical,CA:FALSE",
                                    .keyUsage = "critical,digitalSignature",
                                    .markerOid = kTicketSignerMarkerOid};
    EXPECT_EQ(faultOfChain(signer, intermediate, root), std::nullopt);

    CertificateProfile changed = root;
    changed.basicConstraints = "critical,CA:FALSE";
    EXPECT_EQ(faultOfChain(signer, intermediate, changed), "Root may not issue certificates");
    changed = intermediate;
    changed.basicConstraints = "critical,CA:FALSE";
    EXPECT_EQ(faultOfChain(signer, changed, root), "Intermediate may not issue certificates");
    changed = intermediate;
    changed.markerOid = kTicketSignerMarkerOid;
    EXPECT_EQ(faultOfChain(signer, changed, root),
              "Intermediate lacks the extension 1.2.840.177245.100.6.2.17");
    changed = signer;
    changed.markerOid = kServerMarkerOid;
    EXPECT_EQ(faultOfChain(changed, intermediate, root),
              "Signer lacks the extension 1.2.840.177245.100.6.1.30");
}

TEST(SignerChain, IsRefusedUnlessEachCertificateIsIssuedByTheNext) {
    const auto read = [](const Authority& from, bool ownIntermediate, const Authority& other) {
        std::vector<CertificateHandle> chain;
        chain.push_back(certificateFromPem(from.ticketSigner.certificate));
        chain.push_back(certificateFromPem((ownIntermediate ? from : other).ticketIntermediate.certificate));
        chain.push_back(certificateFromPem(from.root.certificate));
        return chain;
    };
    const Authority first = createAuthority({"a.example"}, kNow);
    const Authority second = createAuthority({"a.example"}, kNow);
    EXPECT_EQ(faultOfSignerChain(read(first, true, second)), std::nullopt);
    const auto fault = faultOfSignerChain(read(first, false, second));
    ASSERT_TRUE(fault);
    EXPECT_NE(fault->find(" is not issued by "), std::string::npos) << *fault;
    auto two = read(first, true, second);
    two.pop_back();
    EXPECT_EQ(faultOfSignerChain(two), "it holds 2 certificates, not signer, intermediate and root");
}

TEST(Authority, AcceptsTheLongestHostName) {
    std::string longest;
    for (int i = 0; i < 126; ++i) longest += "a.";
    longest += "a";
    const Authority authority = createAuthority({longest}, kNow);
    const test::CertificateHandle server = certificateFromPem(authority.server.certificate);
    EXPECT_EQ(X509_check_host(server.get(), longest.c_str(), longest.size(), 0, nullptr), 1);
}

TEST(Authority, IsDifferentEachTime) {
    const std::vector<std::string> hosts{"localhost"};
    EXPECT_NE(createAuthority(hosts, kNow).root.privateKey, createAuthority(hosts, kNow).root.privateKey);
}

}  // namespace
}  // namespace pinwell::lumora
