// Broken, slow, greedy or hostile clients. Each test ends with a check that the service still responds.
#include <gtest/gtest.h>
#include <httplib.h>
#include <signal.h>

#include "running_service.h"

namespace pinwell::lumora {
namespace {

using test::kLookupPath;
using test::RawClient;
using test::RunningService;

class HostileClient : public testing::Test {
  protected:
    ~HostileClient() override {
        const auto result = service_.client()->Get("/healthz");
        EXPECT_TRUE(result && result->status == 200);
        service_.sendSignal(SIGTERM);
        EXPECT_EQ(service_.wait(), 0) << service_.errors();
    }

    /// The whole response to some bytes, after which the service must close by itself.
    std::string answerTo(const std::string& bytes) {
        RawClient client(service_);
        client.send(bytes);
        return client.readToEnd();
    }

    static std::string lookupHead(const std::string& headers) {
        return std::string("POST ") + kLookupPath +
               " HTTP/1.1\r\nHost: localhost\r\nContent-Type: application/json\r\n" + headers + "\r\n";
    }

    RunningService service_;
};

int statusOf(const std::string& answer) {
    return answer.starts_with("HTTP/1.1 ") ? std::stoi(answer.substr(9, 3)) : 0;
}

void expectRefusal(const std::string& answer, int status) {
    EXPECT_EQ(statusOf(answer), status) << answer;
    EXPECT_NE(answer.find("X-Ostrel-Request-UUID: "), std::string::npos) << answer;
    EXPECT_NE(answer.find("\"serverErrorCode\":"), std::string::npos) << answer;
    EXPECT_NE(answer.find("application/json"), std::string::npos) << answer;
}

TEST_F(HostileClient, SendsHalfARequestAndLeaves) {
    RawClient client(service_);
    ASSERT_TRUE(client.send(lookupHead("Content-Length: 100\r\n") + "{\"records\":"));
    client.drop();
}

TEST_F(HostileClient, LeavesInTheMiddleOfTheHead) {
    RawClient client(service_);
    ASSERT_TRUE(client.send("POST /data"));
    client.drop();
}

TEST_F(HostileClient, SendsNoTls) {
    httplib::Client client("127.0.0.1", service_.port());
    EXPECT_FALSE(client.Get("/healthz"));
}

TEST_F(HostileClient, SendsAnEndlessHeaderLine) {
    RawClient client(service_);
    ASSERT_TRUE(client.send("GET /healthz HTTP/1.1\r\nHost: localhost\r\nX: "));
    const std::string block(16 * 1024, 'a');
    for (int i = 0; i < 64 && client.send(block); ++i) continue;
    expectRefusal(client.readToEnd(), 431);
}

TEST_F(HostileClient, SendsEndlesslyManyHeaders) {
    RawClient client(service_);
    ASSERT_TRUE(client.send("GET /healthz HTTP/1.1\r\nHost: localhost\r\n"));
    std::string block;
    for (int i = 0; i < 1000; ++i) block += "X: y\r\n";
    for (int i = 0; i < 100 && client.send(block); ++i) continue;
    expectRefusal(client.readToEnd(), 431);
}

TEST_F(HostileClient, SendsAnOverlongTarget) {
    expectRefusal(answerTo("GET /" + std::string(5'000, 'a') +
                           " HTTP/1.1\r\nHost: localhost\r\nConnection: close\r\n\r\n"),
                  414);
    expectRefusal(answerTo("GET /" + std::string(20'000, 'a') +
                           " HTTP/1.1\r\nHost: localhost\r\nConnection: close\r\n\r\n"),
                  414);
}

TEST_F(HostileClient, SendsNoHttp) {
    for (const char* bytes : {"\r\n\r\n", "GET\r\n\r\n", "GET / HTTP/9.9\r\n\r\n", "FETCH / HTTP/1.1\r\n\r\n",
                              "\x16\x03\x01\r\n\r\n"}) {
        expectRefusal(answerTo(bytes), 400);
    }
}

TEST_F(HostileClient, SendsTooLargeABody) {
    const auto client = service_.client();
    const auto result = client->Post(kLookupPath, std::string(1024 * 1024 + 1, ' '), "application/json");
    ASSERT_TRUE(result) << httplib::to_string(result.error());
    EXPECT_EQ(result->status, 413);
    EXPECT_NE(result->body.find("PAYLOAD_TOO_LARGE"), std::string::npos);

    const auto largest = client->Post(kLookupPath, std::string(1024 * 1024, ' '), "application/json");
    ASSERT_TRUE(largest);
    EXPECT_EQ(largest->status, 400);  // read whole, and no JSON
}

TEST_F(HostileClient, AnnouncesTooLargeABodyFirst) {
    expectRefusal(answerTo(lookupHead("Expect: 100-continue\r\nContent-Length: 99999999999\r\n")), 413);
}

TEST_F(HostileClient, SendsTooLargeABodyInChunks) {
    RawClient client(service_);
    ASSERT_TRUE(client.send(lookupHead("Transfer-Encoding: chunked\r\n")));
    const std::string chunk = "10000\r\n" + std::string(0x10000, ' ') + "\r\n";
    for (int i = 0; i < 32 && client.send(chunk); ++i) continue;
    expectRefusal(client.readToEnd(), 413);
}

TEST_F(HostileClient, SendsABodyInTinyChunksWithoutEnd) {
    RawClient client(service_);
    ASSERT_TRUE(client.send(lookupHead("Transfer-Encoding: chunked\r\n")));
    std::string chunks;
    for (int i = 0; i < 10'000; ++i) chunks += "1;x=yyyyyyyyyyyyyyyyyyyyyyyyyyyyyyyy\r\n \r\n";
    for (int i = 0; i < 16 && client.send(chunks); ++i) continue;
    expectRefusal(client.readToEnd(), 413);
}

TEST_F(HostileClient, IsUnclearAboutTheLength) {
    expectRefusal(answerTo(lookupHead("Content-Length: -1\r\n")), 400);
    expectRefusal(answerTo(lookupHead("Content-Length: abc\r\n")), 400);
    expectRefusal(answerTo(lookupHead("Content-Length: 2\r\nContent-Length: 3\r\n") + "{}"), 400);
    expectRefusal(answerTo(lookupHead("Content-Length: 2\r\nTransfer-Encoding: chunked\r\n") + "{}"), 400);
    expectRefusal(answerTo(lookupHead("Connection: close\r\n")), 411);
}

TEST_F(HostileClient, NamesTwoHosts) {
    const std::string length = "Content-Length: 2\r\n";
    expectRefusal(answerTo(lookupHead("Host: another.example\r\n" + length) + "{}"), 400);
    expectRefusal(answerTo(lookupHead("Host: localhost\r\n" + length) + "{}"), 400);
}

TEST_F(HostileClient, NamesNoHost) {
    expectRefusal(answerTo("GET /healthz HTTP/1.1\r\nConnection: close\r\n\r\n"), 400);
    EXPECT_EQ(answerTo("GET /healthz HTTP/1.0\r\n\r\n").substr(8, 4), " 200");
}

TEST_F(HostileClient, CompressesItsBody) {
    expectRefusal(answerTo(lookupHead("Content-Encoding: gzip\r\nContent-Length: 2\r\n") + "{}"), 415);
}

TEST_F(HostileClient, SendsABodyWhereNoneIsRead) {
    // It must not count as a second request.
    const std::string smuggled = "GET /healthz HTTP/1.1\r\nHost: localhost\r\n\r\n";
    const std::string length = "Content-Length: " + std::to_string(smuggled.size()) + "\r\n\r\n";
    for (const std::string& head :
         {std::string("GET /nothing"), std::string("POST /nothing"), std::string("PUT /")}) {
        const std::string answer = answerTo(head + " HTTP/1.1\r\nHost: localhost\r\n" + length + smuggled);
        expectRefusal(answer, 404);
        EXPECT_EQ(answer.find("\"status\":\"ok\""), std::string::npos) << answer;
    }
}

TEST_F(HostileClient, SendsSeveralRequestsAtOnce) {
    const std::string body = R"({"records":[{"recordName":"a"}]})";
    const std::string request = lookupHead("Content-Length: " + std::to_string(body.size()) + "\r\n") + body;
    const std::string answer = answerTo(request + "GET /healthz HTTP/1.1\r\nHost: x\r\n\r\n" +
                                        "GET /nothing HTTP/1.1\r\nHost: x\r\nConnection: close\r\n\r\n");
    const std::size_t first = answer.find("Record not found");
    const std::size_t second = answer.find("\"status\":\"ok\"");
    const std::size_t third = answer.find("HTTP/1.1 404");
    EXPECT_NE(first, std::string::npos) << answer;
    EXPECT_LT(first, second);
    EXPECT_LT(second, third);
    EXPECT_NE(third, std::string::npos);
}

TEST_F(HostileClient, SendsDeeplyNestedJson) {
    const std::string body(500'000, '[');
    const auto result = service_.client()->Post(kLookupPath, body, "application/json");
    ASSERT_TRUE(result);
    EXPECT_EQ(result->status, 400);
}

TEST_F(HostileClient, OpensManySilentConnections) {
    std::vector<std::unique_ptr<RawClient>> clients;
    for (int i = 0; i < 12; ++i) clients.push_back(std::make_unique<RawClient>(service_));
}

TEST_F(HostileClient, DoesNotReadItsResponses) {
    RawClient client(service_);
    for (int i = 0; i < 50; ++i) client.send("GET /healthz HTTP/1.1\r\nHost: x\r\n\r\n");
    client.drop();
}

}  // namespace
}  // namespace pinwell::lumora
