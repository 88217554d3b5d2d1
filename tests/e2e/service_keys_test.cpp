// Replaced and encrypted keys of the record service, and keys in a token: their effect on tickets and
// clients.
#include <csignal>
#include <filesystem>

#include "local_service.h"

namespace pinwell::test {
namespace {

using testing::ElementsAre;
using testing::HasSubstr;

class ServiceKeys : public LocalServiceTest {
  protected:
    ServiceKeys() { bundle = samples.at(0); }

    std::string inService(const std::string& name) const { return serviceDirectory + "/service/" + name; }

    testing::Matcher<const ProcessResult&> Stapled(const std::string& path) const {
        return Ended(0, ElementsAre("Processing: " + path, "Processing: " + path, kWorked));
    }
    testing::Matcher<const ProcessResult&> Validated() const {
        return Ended(0, ElementsAre(processing(), kValidated));
    }

    /// One line, and an empty standard output.
    void expectRefusal(const ProcessResult& result, const std::string& part) const {
        EXPECT_EQ(result.exitStatus, 78) << result.errors;
        EXPECT_EQ(result.output, "");
        EXPECT_EQ(linesOf(result.errors).size(), 1U) << result.errors;
        EXPECT_THAT(result.errors, HasSubstr(part));
    }
};

TEST_F(ServiceKeys, KeepTicketsOfAReplacedSignerGenuine) {
    record("issue", {bundle});
    serveRecords();
    EXPECT_THAT(staple(), Stapled(bundle));
    record("rotate", {"signer"});
    EXPECT_THAT(validate(), Validated());
    EXPECT_THAT(staple(), Stapled(bundle));

    // Clients and the running service notice nothing.
    const std::string image = samples.at(1);
    record("issue", {image});
    EXPECT_THAT(pinwell({"staple", image}), Stapled(image));
    record("issue", {bundle});
    EXPECT_THAT(validate(), Validated());
    EXPECT_THAT(staple(), Stapled(bundle));
    record("revoke", {bundle});
    EXPECT_EQ(validate().exitStatus, 77);
}

TEST_F(ServiceKeys, LetClientsFollowTheServerToItsNextKey) {
    record("issue", {bundle});
    serveRecords();
    record("rotate", {"server"});
    EXPECT_THAT(staple(), Stapled(bundle));  // with the old one still
    serving->sendSignal(SIGHUP);
    ASSERT_TRUE(serving->waitForLineWith("read the certificate and the key again"));
    EXPECT_THAT(staple(), Stapled(bundle));
    EXPECT_EQ(lumora({"check", serviceDirectory}).exitStatus, 0);
}

TEST_F(ServiceKeys, ServeAndSignIfEncrypted) {
    serviceDirectory = directory / "encrypted";
    writeFile(directory / "words", std::string_view("correct horse\n"));
    const ProcessResult init = lumora({"init", serviceDirectory, "--host", "127.0.0.1", "--passphrase-file",
                                       directory / "words", "--root-out", directory / "safe"});
    ASSERT_EQ(init.exitStatus, 0) << init.errors;
    environment["PINWELL_PLATFORM"] = serviceDirectory + "/platform";
    record("issue", {bundle});
    serveRecords();
    EXPECT_THAT(staple(), Stapled(bundle));
    record("rotate", {"server", "--root", directory / "safe"});
    serving->sendSignal(SIGHUP);  // the confined service reads the passphrase again
    ASSERT_TRUE(serving->waitForLineWith("read the certificate and the key again"))
        << serving->resultSoFar().errors;
    EXPECT_THAT(staple(), Stapled(bundle));
    writeFile(directory / "words", std::string_view("wrong"));
    expectRefusal(lumora({"issue", serviceDirectory, bundle}), "does not open the key");
}

/// With a token that SoftHSM keeps in files.
class TokenKeys : public ServiceKeys {
  protected:
    void SetUp() override {
        if (!HAS_TOKENS) GTEST_SKIP() << "this build is without PKCS #11";
        if (!std::filesystem::exists(SOFTHSM_PROGRAM) || !std::filesystem::exists(SOFTHSM_MODULE)) {
            GTEST_SKIP() << "SoftHSM is not installed";
        }
        std::filesystem::create_directory(directory / "tokens");
        writeFile(directory / "softhsm.conf",
                  std::string_view("directories.tokendir = " + (directory / "tokens") +
                                   "\nobjectstore.backend = file\n"));
        writeFile(directory / "pin", std::string_view("1234\n"));
        environment["SOFTHSM2_CONF"] = directory / "softhsm.conf";
        softhsm({"--init-token", "--free", "--label", "lumora", "--so-pin", "5678", "--pin", "1234"});
        // The key comes from a service that is not used otherwise.
        const ProcessResult other = lumora({"init", directory / "other"});
        ASSERT_EQ(other.exitStatus, 0) << other.errors;
        importKey("signer", "01", directory / "other/service/ticket-signer.key");
    }

    void importKey(const std::string& label, const std::string& identifier, const std::string& file) const {
        softhsm(
            {"--import", file, "--token", "lumora", "--label", label, "--id", identifier, "--pin", "1234"});
    }

    void softhsm(std::vector<std::string> arguments) const {
        Command command = this->command(std::move(arguments));
        command.executable = SOFTHSM_PROGRAM;
        const ProcessResult result = runProcess(command);
        ASSERT_EQ(result.exitStatus, 0) << result.output << result.errors;
    }

    std::string uri(const std::string& object = "signer", const std::string& pin = "pin") const {
        return "pkcs11:token=lumora;object=" + object + "?module-path=" + SOFTHSM_MODULE +
               "&pin-source=" + (directory / pin);
    }

    ProcessResult rotateTo(const std::string& key) const {
        return lumora({"rotate", serviceDirectory, "signer", "--key", key});
    }
};

TEST_F(TokenKeys, SignTickets) {
    const ProcessResult rotated = rotateTo(uri());
    ASSERT_EQ(rotated.exitStatus, 0) << rotated.errors;
    EXPECT_EQ(lumora({"check", serviceDirectory}).exitStatus, 0);
    std::filesystem::remove(inService("ticket-signer.key"));  // no longer needed
    record("issue", samples);
    serveRecords();
    for (const std::string& path : samples) EXPECT_THAT(pinwell({"staple", path}), Stapled(path));
    EXPECT_THAT(validate(), Validated());
    record("revoke", {bundle});
    EXPECT_EQ(validate().exitStatus, 77);
}

TEST_F(TokenKeys, CanBeReplacedByAKeyInAFile) {
    ASSERT_EQ(rotateTo(uri()).exitStatus, 0);
    record("issue", {bundle});
    serveRecords();
    EXPECT_THAT(staple(), Stapled(bundle));
    record("rotate", {"signer"});
    EXPECT_THAT(validate(), Validated());
    EXPECT_EQ(lumora({"check", serviceDirectory}).exitStatus, 0);
}

TEST_F(TokenKeys, AreReportedInOneLineIfUnusable) {
    writeFile(directory / "wrong-pin", std::string_view("4321\n"));
    const std::string before = readFile(inService("service.json"));
    expectRefusal(rotateTo("pkcs11:token=lumora;object=signer?pin-value=1234"), "holds a PIN");
    expectRefusal(rotateTo("pkcs11:nonsense"), "is no URI");
    expectRefusal(rotateTo("pkcs11:token=lumora?module-path=/nowhere.so"),
                  "cannot use the module /nowhere.so");
    expectRefusal(rotateTo(std::string("pkcs11:token=absent?module-path=") + SOFTHSM_MODULE),
                  "no such token");
    expectRefusal(rotateTo(std::string("pkcs11:token=lumora?module-path=") + SOFTHSM_MODULE), "needs a PIN");
    expectRefusal(rotateTo(uri("signer", "wrong-pin")), "refuses the PIN");
    expectRefusal(rotateTo(uri("absent")), "no such private EC key");
    EXPECT_EQ(rotateTo(uri("signer", "no-file")).exitStatus, 66);
    importKey("second", "02", directory / "other/service/root.key");
    expectRefusal(rotateTo("pkcs11:token=lumora?module-path=" + std::string(SOFTHSM_MODULE) +
                           "&pin-source=" + (directory / "pin")),
                  "several private EC keys fit");
    EXPECT_EQ(readFile(inService("service.json")), before);
}

TEST_F(TokenKeys, SignNothingIfTheyDoNotFitTheCertificate) {
    ASSERT_EQ(rotateTo(uri()).exitStatus, 0);
    importKey("second", "02", directory / "other/service/root.key");
    std::string settings = readFile(inService("service.json"));
    settings.replace(settings.find("object=signer"), 13, "object=second");
    writeFile(inService("service.json"), std::string_view(settings));
    expectRefusal(lumora({"issue", serviceDirectory, bundle}), "is not the one of the certificate");
    EXPECT_EQ(lumora({"check", serviceDirectory}).exitStatus, 78);
}

}  // namespace
}  // namespace pinwell::test
