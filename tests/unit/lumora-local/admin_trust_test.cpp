// The clients that the administration listener accepts.
#include <gtest/gtest.h>

#include "admin_instance.h"
#include "lumora-local/certificates.h"
#include "lumora-local/key_file.h"
#include "serving_instance.h"

namespace pinwell::lumora {
namespace {

using pinwell::test::writeFile;
using test::AdminAnswer;
using test::AdminClient;
using test::AdminInstance;
using values::Date;

constexpr std::int64_t kYear = std::int64_t{366} * 86'400;

CertificateProfile authority(const std::string& name = "Clients") {
    return {.commonName = name, .basicConstraints = "critical,CA:TRUE", .keyUsage = "critical,keyCertSign"};
}

CertificateProfile client(const std::string& name = "auditor") {
    return {.commonName = name,
            .basicConstraints = "critical,CA:FALSE",
            .keyUsage = "critical,digitalSignature",
            .extendedKeyUsage = "clientAuth"};
}

class AdminTrustTest : public testing::Test {
  protected:
    AdminTrustTest() : root_(issueCertificate(authority(), nullptr, Date::now())) {
        writeFile(authorities_, encodeCertificate(root_.certificate.get()));
        instance_ = std::make_unique<AdminInstance>(service_, authorities_);
    }

    /// The status for a client with this certificate, and with further ones of its chain.
    int statusFor(const IssuedCertificate& shown,
                  const std::vector<const IssuedCertificate*>& chain = {}) const {
        std::string pem = encodeCertificate(shown.certificate.get());
        for (const IssuedCertificate* further : chain) pem += encodeCertificate(further->certificate.get());
        writeFile(service_.scratch("shown.pem"), pem);
        writeFile(service_.scratch("shown.key"), encodeKey(shown.key.get(), ""));
        return AdminClient(service_.path(), instance_->adminPort(), service_.scratch("shown.pem"),
                           service_.scratch("shown.key"))
            .get("/v1/records")
            .status;
    }

    IssuedCertificate issued(const CertificateProfile& profile) const {
        return issueCertificate(profile, &root_, Date::now());
    }

    const test::ServiceWithClients service_;
    const std::string authorities_ = service_.scratch("authorities.pem");
    const IssuedCertificate root_;
    std::unique_ptr<AdminInstance> instance_;
};

TEST_F(AdminTrustTest, AcceptsACertificateOfTheAuthority) {
    EXPECT_EQ(statusFor(issued(client())), 200);
}

TEST_F(AdminTrustTest, AcceptsAnRsaKeyOfOrdinarySize) {
    CertificateProfile profile = client();
    profile.keyKind = KeyKind::rsa2048;
    EXPECT_EQ(statusFor(issued(profile)), 200);
}

TEST_F(AdminTrustTest, AcceptsAChainOverAnIntermediate) {
    const IssuedCertificate intermediate = issued(authority("Builders"));
    const IssuedCertificate shown = issueCertificate(client(), &intermediate, Date::now());
    EXPECT_EQ(statusFor(shown), -1);
    writeFile(service_.scratch("chain.pem"),
              encodeCertificate(shown.certificate.get()) + encodeCertificate(intermediate.certificate.get()));
    // The library of the other tests sends only the first certificate of a file.
    const auto answer = pinwell::test::runProcess(
        {.executable = "/usr/bin/curl",
         .arguments = {"--silent", "--show-error", "--fail", "--cacert",
                       service_.path() + "/platform/roots/lumora-local.pem", "--cert",
                       service_.scratch("chain.pem"), "--key", service_.scratch("shown.key"),
                       "https://127.0.0.1:" + std::to_string(instance_->adminPort()) + "/v1/records"}});
    EXPECT_EQ(answer.output, R"({"next":null,"records":[]})") << answer.errors;
}

TEST_F(AdminTrustTest, TrustsAnIntermediateWithoutItsRoot) {
    const IssuedCertificate intermediate = issued(authority("Builders"));
    instance_.reset();
    writeFile(authorities_, encodeCertificate(intermediate.certificate.get()));
    instance_ = std::make_unique<AdminInstance>(service_, authorities_);
    EXPECT_EQ(statusFor(issueCertificate(client(), &intermediate, Date::now())), 200);
    EXPECT_EQ(statusFor(issued(client())), -1);
}

TEST_F(AdminTrustTest, RefusesClientsWithoutACertificate) {
    EXPECT_EQ(test::healthOf(service_.path(), instance_->adminPort()), -1);
    EXPECT_EQ(test::healthOf(service_.path(), instance_->port()), 200);
    const auto end = instance_->stop();
    EXPECT_NE(end.errors.find(": no connection: "), std::string::npos) << end.errors;
}

TEST_F(AdminTrustTest, RefusesCertificatesOfOtherAuthorities) {
    const IssuedCertificate other = issueCertificate(authority(), nullptr, Date::now());
    EXPECT_EQ(statusFor(issueCertificate(client(), &other, Date::now())), -1);
    EXPECT_EQ(statusFor(issueCertificate(client(), &other, Date::now()), {&other}), -1);
    EXPECT_EQ(statusFor(issueCertificate(client(), nullptr, Date::now())), -1);
    // The program's own certificates are of another authority here.
    EXPECT_EQ(instance_->client("auditor").get("/v1/records").status, -1);
}

TEST_F(AdminTrustTest, RefusesCertificatesThatAreNotValidNow) {
    EXPECT_EQ(statusFor(issueCertificate(client(), &root_, Date{Date::now().seconds - 11 * kYear})), -1);
    EXPECT_EQ(statusFor(issueCertificate(client(), &root_, Date{Date::now().seconds + kYear})), -1);
}

TEST_F(AdminTrustTest, RefusesCertificatesForOtherPurposes) {
    CertificateProfile profile = client();
    profile.extendedKeyUsage = "serverAuth";
    EXPECT_EQ(statusFor(issued(profile)), -1);
    profile.extendedKeyUsage = "";
    EXPECT_EQ(statusFor(issued(profile)), -1);
    profile.extendedKeyUsage = "serverAuth,clientAuth";
    EXPECT_EQ(statusFor(issued(profile)), 200);
}

TEST_F(AdminTrustTest, RefusesCertificatesThatAClientIssued) {
    const IssuedCertificate plain = issued(client());
    EXPECT_EQ(statusFor(issueCertificate(client("manager"), &plain, Date::now()), {&plain}), -1);
}

TEST_F(AdminTrustTest, RefusesNamesWithControlCharacters) {
    EXPECT_EQ(statusFor(issued(client("auditor\n"))), -1);
    EXPECT_EQ(statusFor(issued(client("a\x1b[2J"))), -1);
}

TEST_F(AdminTrustTest, UsesTheNameUnchanged) {
    EXPECT_EQ(statusFor(issued(client("Auditor"))), 403);
    EXPECT_EQ(statusFor(issued(client("auditor "))), 403);
    EXPECT_EQ(statusFor(issued(client("R\u00fcdiger"))), 403);
}

}  // namespace
}  // namespace pinwell::lumora
