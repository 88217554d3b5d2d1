// Requests, responses and status texts as values.
#include "https/response_head.h"
#include "session_fixture.h"

namespace pinwell::test {
namespace {

using https::localizedStringForStatusCode;

TEST(StatusText, IsTheRegisteredOneInLowerCase) {
    EXPECT_EQ(localizedStringForStatusCode(200), "ok");
    EXPECT_EQ(localizedStringForStatusCode(100), "continue");
    EXPECT_EQ(localizedStringForStatusCode(404), "not found");
    EXPECT_EQ(localizedStringForStatusCode(500), "internal server error");
    EXPECT_EQ(localizedStringForStatusCode(511), "network authentication required");
}

TEST(StatusText, IsTheClassOfAnUnregisteredNumber) {
    EXPECT_EQ(localizedStringForStatusCode(199), "informational");
    EXPECT_EQ(localizedStringForStatusCode(299), "success");
    EXPECT_EQ(localizedStringForStatusCode(399), "redirection");
    EXPECT_EQ(localizedStringForStatusCode(418), "client error");
    EXPECT_EQ(localizedStringForStatusCode(599), "server error");
}

TEST(StatusText, OfWhatIsNoStatusSaysSo) {
    for (const int status : {-1, 0, 99, 600, 1000})
        EXPECT_EQ(localizedStringForStatusCode(status), "unknown status") << status;
}

TEST(Request, JoinsHeadersOfOneNameAndKeepsTheFirstSpelling) {
    https::Request request;
    request.addHeader("Accept", "a");
    request.addHeader("ACCEPT", "b");
    ASSERT_EQ(request.headers.size(), 1U);
    EXPECT_EQ(request.headers.begin()->first, "Accept");
    EXPECT_EQ(request.headers.begin()->second, "a, b");
}

TEST(HTTPResponse, FindsHeadersWithoutRegardToCase) {
    const https::HTTPResponse response{
        *foundation::URL::fromString("https://a.example/"), 200, {{"X-Id", "1"}}};
    EXPECT_EQ(response.header("x-ID"), "1");
    EXPECT_FALSE(response.header("X-I"));
}

TEST(HTTPResponse, IsDescribedInOneLineWithItsHeadersSorted) {
    const https::HTTPResponse response{*foundation::URL::fromString("https://a.example/p"),
                                       200,
                                       {{"b", "2\x1b\n"}, {"A-Type", "text/plain; x"}}};
    EXPECT_EQ(foundation::Description<https::HTTPResponse>::of(response),
              "{ URL: https://a.example/p } { Status Code: 200, Headers { A-Type = \"text/plain; x\"; "
              "b = \"2\\x1b\\n\"; } }");
    EXPECT_EQ(foundation::Description<https::HTTPResponse>::of({response.url, 204, {}}),
              "{ URL: https://a.example/p } { Status Code: 204, Headers { } }");
}

class ResponseHead : public ::testing::Test {
  protected:
    https::ResponseHead head{100, 3};

    bool add(std::initializer_list<std::string_view> lines) {
        return std::all_of(lines.begin(), lines.end(),
                           [this](std::string_view line) { return head.addLine(line); });
    }
};

TEST_F(ResponseHead, IsCompleteAtTheEmptyLineOfAFinalAnswer) {
    EXPECT_TRUE(add({"HTTP/1.1 103 Early Hints\r\n", "A: 1\r\n", "\r\n"}));
    EXPECT_FALSE(head.isComplete());
    EXPECT_TRUE(add({"HTTP/2 204\r\n", "B:  2 \r\n", "\r\n"}));
    EXPECT_TRUE(head.isComplete());
    EXPECT_EQ(head.status(), 204);
    EXPECT_EQ(head.headers(), (https::Headers{{"B", "2"}}));
}

TEST_F(ResponseHead, UnfoldsALine) {
    EXPECT_TRUE(add({"HTTP/1.1 200\r\n", "A: 1\r\n", "\t2\r\n", "\r\n"}));
    EXPECT_EQ(head.headers(), (https::Headers{{"A", "1 2"}}));
}

TEST_F(ResponseHead, PassesOverALineThatIsNoField) {
    EXPECT_TRUE(add({"HTTP/1.1 200 OK\r\n", " folded nowhere\r\n", "no colon\r\n", "\r\n"}));
    EXPECT_TRUE(head.headers().empty());
}

TEST_F(ResponseHead, BeginsWithItsOneStatusLine) {
    EXPECT_TRUE(add({"HTTP/1.1 200 OK\r\n", "A: 1\r\n", "HTTP/1.1 404: B\r\n", "\r\n"}));
    EXPECT_EQ(head.status(), 200);
    EXPECT_EQ(head.headers(), (https::Headers{{"A", "1"}, {"HTTP/1.1 404", "B"}}));
}

TEST_F(ResponseHead, HasNoStatusWithoutANumber) {
    EXPECT_TRUE(add({"HTTP/1.1 x\r\n", "\r\n"}));
    EXPECT_EQ(head.status(), 0);
    EXPECT_FALSE(head.isComplete());
}

TEST_F(ResponseHead, RefusesOneFieldTooMany) {
    EXPECT_TRUE(add({"HTTP/1.1 200 OK\r\n", "A: 1\r\n", "A: 2\r\n", "A: 3\r\n"}));
    EXPECT_FALSE(add({"A: 4\r\n"}));
}

TEST_F(ResponseHead, CountsTrailersAndForgetsThem) {
    EXPECT_TRUE(add({"HTTP/1.1 200 OK\r\n", "A: 1\r\n", "\r\n", "T: 1\r\n", "T: 2\r\n"}));
    EXPECT_EQ(head.headers(), (https::Headers{{"A", "1"}}));
    EXPECT_FALSE(add({"T: 3\r\n"}));
}

TEST_F(ResponseHead, RefusesOneByteTooMany) {
    https::ResponseHead small(20, 3);
    EXPECT_TRUE(small.addLine("HTTP/1.1 200 OK\r\n"));  // 17
    EXPECT_FALSE(small.addLine("A:\r\n"));
}

}  // namespace
}  // namespace pinwell::test
