#include <gtest/gtest.h>
#include <httplib.h>
#include <signal.h>

#include <atomic>
#include <filesystem>
#include <set>
#include <thread>

#include "base/bytes.h"
#include "base/text.h"
#include "running_service.h"
#include "support/file_properties.h"
#include "values/json.h"
#include "values/value.h"

namespace pinwell::lumora {
namespace {

using base::Data;
using pinwell::test::readFile;
using test::kLookupPath;
using test::RawClient;
using test::RunningService;
using values::Value;

constexpr const char* kIdentifier = "X-Ostrel-Request-UUID";

CodeHash hashOf(int fill) {
    return {2, Data(20, static_cast<std::byte>(fill))};
}

std::string bodyFor(const std::vector<std::string>& names) {
    std::string body;
    for (const std::string& name : names)
        body += (body.empty() ? "" : ",") + ("{\"recordName\":\"" + name + "\"}");
    return "{\"records\":[" + body + "]}";
}

Value parse(const std::string& text) {
    auto value = values::parseJSON(base::asBytes(text));
    EXPECT_TRUE(value) << text;
    return value ? *std::move(value) : Value();
}

httplib::Result lookup(httplib::SSLClient& client, const std::vector<std::string>& names) {
    return client.Post(kLookupPath, bodyFor(names), "application/json");
}

TEST(Serve, AnswersALookupOverATrustedConnection) {
    RunningService service;
    const std::string name = service.put(hashOf(1));
    const auto client = service.client();
    const auto result = lookup(*client, {name});
    ASSERT_TRUE(result) << httplib::to_string(result.error());
    EXPECT_EQ(result->status, 200);
    EXPECT_EQ(result->get_header_value("Content-Type"), "application/json");
    const Value answer = parse(result->body);
    const auto ticket = base::decodeBase64(*answer["records"][0]["fields"]["signedTicket"]["value"].string());
    ASSERT_TRUE(ticket);
    EXPECT_EQ(base::toString(*ticket).substr(0, 4), "s8ch");
}

TEST(Serve, IsNotTrustedWithoutItsRoot) {
    RunningService service;
    RunningService other;
    const auto client = service.client();
    client->set_ca_cert_path(other.rootPath().c_str());
    EXPECT_FALSE(lookup(*client, {"2/2/x"}));
}

TEST(Serve, DeliversALargeTicketFromTheAddressInItsResponse) {
    RunningService service;
    const std::string name = service.put(hashOf(2), true);
    const auto client = service.client();
    const auto result = lookup(*client, {name});
    ASSERT_TRUE(result);
    const Value answer = parse(result->body);
    const Value& asset = answer["records"][0]["fields"]["signedTicketAsset"]["value"];
    std::string url = *asset["downloadURL"].string();
    const std::string base = "https://127.0.0.1:" + std::to_string(service.port());
    ASSERT_TRUE(url.starts_with(base)) << url;
    url.replace(url.find("${f}"), 4, "lmasset.ticket");

    const auto download = client->Get(url.substr(base.size()));
    ASSERT_TRUE(download);
    EXPECT_EQ(download->status, 200);
    EXPECT_EQ(download->body.size(), asset["size"].unsignedIntegerValue());
    EXPECT_EQ(download->get_header_value("Content-Length"), std::to_string(download->body.size()));
    EXPECT_EQ(download->body.substr(0, 4), "s8ch");

    const auto part = client->Get(url.substr(base.size()), {{"Range", "bytes=1-2"}});
    ASSERT_TRUE(part);
    EXPECT_EQ(part->body, download->body);
}

TEST(Serve, GivesEveryRequestItsOwnIdentifier) {
    RunningService service;
    const auto client = service.client();
    client->set_keep_alive(true);
    std::set<std::string> identifiers;
    const auto note = [&](const httplib::Result& result) {
        ASSERT_TRUE(result);
        EXPECT_EQ(result->get_header_value_count(kIdentifier), 1U);
        identifiers.insert(result->get_header_value(kIdentifier));
    };
    note(lookup(*client, {"unknown"}));
    note(lookup(*client, {"unknown"}));
    note(client->Get("/nothing"));
    note(client->Get("/healthz"));
    note(client->Post(kLookupPath, "{", "application/json"));
    EXPECT_EQ(identifiers.size(), 5U);
    EXPECT_FALSE(identifiers.contains(""));
}

TEST(Serve, SeesTicketsAndRevocationsOfAnotherProcess) {
    RunningService service;
    const auto client = service.client();
    const std::string name = recordName(hashOf(3));
    const auto ticketNow = [&]() -> std::string {
        const auto result = lookup(*client, {name});
        const Value answer = parse(result->body);
        const Value& value = answer["records"][0]["fields"]["signedTicket"]["value"];
        return value.isNil() ? "" : *value.string();
    };
    EXPECT_EQ(ticketNow(), "");
    service.put(hashOf(3));
    const std::string valid = ticketNow();
    EXPECT_NE(valid, "");
    const auto outcome = test::runProgram({"revoke", service.path(), name});
    EXPECT_EQ(outcome.exitStatus, 0) << outcome.err;
    EXPECT_NE(ticketNow(), valid);
}

TEST(Serve, ServesManyClientsAtOnceWhileRecordsAreWritten) {
    RunningService service;
    const std::string name = service.put(hashOf(4));
    std::atomic<int> good{0};
    std::vector<std::thread> clients;
    for (int i = 0; i < 8; ++i) {
        clients.emplace_back([&] {
            const auto client = service.client();
            client->set_keep_alive(true);
            for (int request = 0; request < 20; ++request) {
                const auto result = lookup(*client, {name, "unknown"});
                if (result && result->status == 200) ++good;
            }
        });
    }
    for (int i = 0; i < 20; ++i) service.put(hashOf(100 + i));
    for (std::thread& client : clients) client.join();
    EXPECT_EQ(good, 160);
}

TEST(Serve, KeepsAConnectionForSeveralRequests) {
    RunningService service;
    RawClient client(service);
    const std::string request = "GET /healthz HTTP/1.1\r\nHost: localhost\r\n\r\n";
    for (int i = 0; i < 20; ++i) {
        ASSERT_TRUE(client.send(request));
        EXPECT_EQ(client.readUntil("}").substr(0, 15), "HTTP/1.1 200 OK");
    }
}

TEST(Serve, LogsEachRequestOnALineOfItsOwn) {
    RunningService service;
    const auto client = service.client();
    const auto result = client->Get("/no%0Athing");
    ASSERT_TRUE(result);
    {
        RawClient raw(service);
        raw.send("GET /a\x1b[31m\x7f HTTP/1.1\r\nHost: x\r\nConnection: close\r\n\r\n");
        raw.readToEnd();
    }
    service.sendSignal(SIGTERM);
    EXPECT_EQ(service.wait(), 0);
    const std::string output = service.output();
    EXPECT_NE(output.find("\"GET /no%0Athing\" 404 "), std::string::npos) << output;
    EXPECT_NE(output.find(result->get_header_value(kIdentifier)), std::string::npos) << output;
    EXPECT_EQ(output.find('\x1b'), std::string::npos);
    EXPECT_EQ(output.find('\x7f'), std::string::npos);
}

TEST(Serve, StopsCleanlyOnEitherSignal) {
    for (const int number : {SIGTERM, SIGINT}) {
        RunningService service;
        RawClient idle(service);  // an open connection does not keep it
        service.sendSignal(number);
        EXPECT_EQ(service.wait(), 0);
        EXPECT_TRUE(service.output().ends_with("stopped\n")) << service.output();
        EXPECT_EQ(service.errors(), "");
    }
}

TEST(Serve, FinishesARequestThatHasBegunBeforeItStops) {
    RunningService service;
    const std::string body = bodyFor({"unknown"});
    RawClient client(service);
    // The interim response proves that the request has begun before the signal is sent.
    ASSERT_TRUE(client.send(std::string("POST ") + kLookupPath +
                            " HTTP/1.1\r\nHost: localhost\r\nContent-Type: application/json\r\n"
                            "Expect: 100-continue\r\nContent-Length: " +
                            std::to_string(body.size()) + "\r\n\r\n"));
    EXPECT_EQ(client.readUntil("\r\n\r\n"), "HTTP/1.1 100 Continue\r\n\r\n");
    service.sendSignal(SIGTERM);
    ASSERT_TRUE(client.send(body));
    const std::string answer = client.readToEnd();
    EXPECT_EQ(answer.substr(0, 15), "HTTP/1.1 200 OK") << answer;
    EXPECT_NE(answer.find("Record not found"), std::string::npos);
    EXPECT_EQ(service.wait(), 0);
}

std::string certificateOf(const RunningService& service) {
    return RawClient(service).serverCertificate();
}

TEST(Serve, ReadsItsCertificateAgainOnHangUp) {
    RunningService service;
    RunningService other;
    const std::string before = certificateOf(service);
    for (const char* file : {"/service/server.pem", "/service/server.key"}) {
        std::filesystem::copy_file(other.path() + file, service.path() + file,
                                   std::filesystem::copy_options::overwrite_existing);
    }
    service.sendSignal(SIGHUP);
    while (service.output().find("again") == std::string::npos) std::this_thread::yield();
    EXPECT_NE(certificateOf(service), before);
    EXPECT_EQ(certificateOf(service), certificateOf(other));
}

TEST(Serve, KeepsItsCertificateIfTheNewOneIsUnusable) {
    RunningService service;
    const std::string before = certificateOf(service);
    pinwell::test::writeFile(service.path() + "/service/server.pem", "no certificate");
    for (int i = 0; i < 3; ++i) service.sendSignal(SIGHUP);
    while (service.errors().find("goes on") == std::string::npos) std::this_thread::yield();
    EXPECT_EQ(certificateOf(service), before);
    service.sendSignal(SIGTERM);
    EXPECT_EQ(service.wait(), 0);
}

TEST(Serve, KeepsItsCertificateAndHandlesSignalsIfTheKeyIsAPipe) {
    RunningService service;
    const std::string before = certificateOf(service);
    for (const char* file : {"/service/server.key", "/service/server.pem"}) {
        std::filesystem::remove(service.path() + file);
        pinwell::test::makeFifo(service.path() + file);
        service.sendSignal(SIGHUP);
        while (service.errors().find(std::string(file) + " is no regular file") == std::string::npos)
            std::this_thread::yield();
    }
    EXPECT_EQ(certificateOf(service), before);
    service.sendSignal(SIGTERM);
    EXPECT_EQ(service.wait(), 0);
}

TEST(Serve, PrintsItsAddressAndLeavesThePlatformUnchanged) {
    RunningService service;
    const std::string url = "https://127.0.0.1:" + std::to_string(service.port());
    EXPECT_NE(service.output().find("ready at " + url + "\n"), std::string::npos) << service.output();
    EXPECT_NE(service.output().find("localhost:8443"), std::string::npos) << service.output();
    EXPECT_EQ(service.directory().advertisedEndpoint(), (Endpoint{"localhost", 8443}));
}

TEST(Serve, RewritesThePlatformOnRequest) {
    RunningService service({"--update-platform"});
    EXPECT_EQ(service.directory().advertisedEndpoint(),
              (Endpoint{"127.0.0.1", static_cast<std::uint16_t>(service.port())}));
}

TEST(Serve, DoesNotShareAPort) {
    RunningService service;
    const auto outcome = test::runProgram(
        {"serve", service.path(), "--listen", "127.0.0.1:" + std::to_string(service.port())});
    EXPECT_EQ(outcome.exitStatus, 69);
    EXPECT_NE(outcome.err.find("127.0.0.1:" + std::to_string(service.port())), std::string::npos)
        << outcome.err;
}

}  // namespace
}  // namespace pinwell::lumora
