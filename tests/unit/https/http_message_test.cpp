// Requests, responses and status texts as values.
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

TEST(StatusText, OfAnInvalidStatusReportsIt) {
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
    const https::HTTPResponse response{*values::URL::fromString("https://a.example/"), 200, {{"X-Id", "1"}}};
    EXPECT_EQ(response.header("x-ID"), "1");
    EXPECT_FALSE(response.header("X-I"));
}

TEST(HTTPResponse, IsDescribedInOneLineWithItsHeadersSorted) {
    const https::HTTPResponse response{*values::URL::fromString("https://a.example/p"),
                                       200,
                                       {{"b", "2\x1b\n"}, {"A-Type", "text/plain; x"}}};
    EXPECT_EQ(values::Description<https::HTTPResponse>::of(response),
              "{ URL: https://a.example/p } { Status Code: 200, Headers { A-Type = \"text/plain; x\"; "
              "b = \"2\\x1b\\n\"; } }");
    EXPECT_EQ(values::Description<https::HTTPResponse>::of({response.url, 204, {}}),
              "{ URL: https://a.example/p } { Status Code: 204, Headers { } }");
}

}  // namespace
}  // namespace pinwell::test
