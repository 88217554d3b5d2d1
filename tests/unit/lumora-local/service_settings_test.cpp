#include "lumora-local/service_settings.h"

#include <gtest/gtest.h>

#include "lumora-local/failure.h"
#include "values/json.h"

namespace pinwell::lumora {
namespace {

ServiceSettings parseText(std::string_view text) {
    const auto document = values::parseJSON(base::asBytes(text));
    if (!document) throw std::runtime_error("no JSON");
    return parseServiceSettings(*document, "/site/service/service.json");
}

std::string complaintAbout(std::string_view text) {
    try {
        parseText(text);
    } catch (const Failure& failure) {
        EXPECT_EQ(failure.exitStatus(), EX_CONFIG) << text;
        return failure.what();
    }
    return "";
}

TEST(ServiceSettings, NameTheFilesOfInitByDefault) {
    const ServiceSettings settings = parseText(R"({"hosts":["localhost"]})");
    EXPECT_EQ(settings.hosts, std::vector<std::string>{"localhost"});
    EXPECT_EQ(settings.passphraseFile, "");
    EXPECT_EQ(settings.signer.key, "/site/service/ticket-signer.key");
    EXPECT_EQ(settings.signer.chain,
              (std::vector<std::string>{"/site/service/ticket-signer.pem",
                                        "/site/service/ticket-intermediate.pem", "/site/service/root.pem"}));
    EXPECT_EQ(settings.server.key, "/site/service/server.key");
    EXPECT_EQ(settings.server.certificate, "/site/service/server.pem");
}

TEST(ServiceSettings, NameFilesBesideThemOrAnywhere) {
    const ServiceSettings settings = parseText(
        R"({"hosts":["a.example"],"passphraseFile":"words","server":{"key":"/etc/tls/k","certificate":"c.pem"}})");
    EXPECT_EQ(settings.passphraseFile, "/site/service/words");
    EXPECT_EQ(settings.server.key, "/etc/tls/k");
    EXPECT_EQ(settings.server.certificate, "/site/service/c.pem");
}

TEST(ServiceSettings, KeepTokensAndCredentialsUnchanged) {
    const ServiceSettings settings = parseText(
        R"({"hosts":["a"],"passphraseFile":"credential:keys",
            "signer":{"key":"pkcs11:object=k","chain":["s","i","r"],"requested":"next.key"}})");
    EXPECT_EQ(settings.passphraseFile, "credential:keys");
    EXPECT_EQ(settings.signer.key, "pkcs11:object=k");
    EXPECT_EQ(settings.signer.requested, "/site/service/next.key");
}

TEST(ServiceSettings, NameTheFileAndTheUnknownKey) {
    EXPECT_EQ(complaintAbout(R"({"hosts":["a"],"hots":["b"]})"),
              "/site/service/service.json: unknown key \"hots\"");
    EXPECT_EQ(complaintAbout(R"({"hosts":["a"],"server":{"key":"k","certificate":"c","chain":"d"}})"),
              "/site/service/service.json: unknown key \"server.chain\"");
}

TEST(ServiceSettings, AreRefusedIfInvalid) {
    for (const char* text : {
             R"([])",
             R"({})",
             R"({"hosts":[]})",
             R"({"hosts":"a"})",
             R"({"hosts":[1]})",
             R"({"hosts":["a b"]})",
             R"({"hosts":["A"]})",
             R"({"hosts":["a"],"passphraseFile":""})",
             R"({"hosts":["a"],"passphraseFile":7})",
             R"({"hosts":["a"],"signer":"k"})",
             R"({"hosts":["a"],"signer":{}})",
             R"({"hosts":["a"],"signer":{"key":"k"}})",
             R"({"hosts":["a"],"signer":{"key":"k","chain":["s","i"]}})",
             R"({"hosts":["a"],"signer":{"key":"k","requested":"r"}})",
             R"({"hosts":["a"],"server":{"key":"k"}})",
             R"({"hosts":["a"],"server":{"key":"pkcs11:object=k","certificate":"c"}})",
         }) {
        EXPECT_TRUE(complaintAbout(text).starts_with("/site/service/service.json")) << text;
    }
}

}  // namespace
}  // namespace pinwell::lumora
