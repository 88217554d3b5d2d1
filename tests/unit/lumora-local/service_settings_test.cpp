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

TEST(ServiceSettings, NameTheMemberAndItsFault) {
    const std::pair<const char*, const char*> faults[] = {
        {R"({"hosts":"a"})", R"("hosts" is not an array)"},
        {R"({"hosts":[""]})", R"("hosts" holds what is not a text)"},
        {R"({"hosts":["a b"]})", R"("hosts": "a b" is not a host)"},
        {R"({"hosts":["a"],"log":"xml"})", R"("log" is neither text nor json)"},
        {R"({"hosts":["a"],"role":"full"})", R"("role" is full; it can be "lookup" or absent)"},
        {R"({"hosts":["a"],"store":"mysql://"})", R"("store" is not a URL that begins with postgresql://)"},
        {R"({"hosts":["a"],"store":7})", R"("store" is not a URL that begins with postgresql://)"},
        {R"({"hosts":["a"],"signer":{"key":"k"}})",
         R"("signer" needs a "key" and a "chain" of three certificates)"},
        {R"({"hosts":["a"],"server":{"key":"k"}})", R"("server" needs a "key" and a "certificate")"},
        {R"({"hosts":["a"],"admin":{"clients":"c.pem"}})", R"("admin.listen" is not ADDRESS:PORT)"},
        {R"({"hosts":["a"],"admin":{"listen":"127.0.0.1:x","clients":"c.pem"}})",
         R"("admin.listen" is not ADDRESS:PORT)"},
        {R"({"hosts":["a"],"admin":{"listen":"127.0.0.1:8444"}})", R"("admin.clients" is missing)"},
    };
    for (const auto& [text, complaint] : faults)
        EXPECT_EQ(complaintAbout(text), "/site/service/service.json: " + std::string(complaint));
    EXPECT_EQ(complaintAbout(R"({"hosts":[]})"), "/site/service/service.json names no hosts");
}

TEST(ServiceSettings, HaveAnAdminListenerWithADefaultPort) {
    const auto settings =
        parseText(R"({"hosts":["a"],"admin":{"listen":"127.0.0.1","clients":"clients/ca.pem"}})");
    ASSERT_TRUE(settings.admin);
    EXPECT_EQ(settings.admin->listen.port, kDefaultAdminPort);
    EXPECT_EQ(settings.admin->clientAuthorities, "/site/service/clients/ca.pem");
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
