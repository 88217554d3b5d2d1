// The head of a response, line by line: accepted lines, and lines that are refused even if the transfer
// library accepts them.
#include "https/http_message.h"

#include <gtest/gtest.h>

#include <limits>
#include <string>
#include <vector>

namespace pinwell::test {
namespace {

using https::Headers;
using Line = https::ResponseHead::Line;

class ResponseHead : public ::testing::Test {
  protected:
    https::ResponseHead head{100, 3};

    /// The result of the last line; the lines before it are accepted.
    Line add(std::initializer_list<std::string_view> lines) {
        Line last = Line::taken;
        for (const std::string_view line : lines) {
            EXPECT_EQ(last, Line::taken) << "before " << line;
            last = head.addLine(line);
        }
        return last;
    }

    /// A fresh head of this status line.
    static Line startsWith(std::string_view statusLine) {
        return https::ResponseHead(1000, 3).addLine(statusLine);
    }

    /// A whole head of HTTP/1.1 with these fields.
    static https::ResponseHead headOf(const std::vector<std::string>& fields,
                                      std::string_view statusLine = "HTTP/1.1 200 OK\r\n") {
        https::ResponseHead whole(1000, 100);
        EXPECT_EQ(whole.addLine(statusLine), Line::taken);
        for (const std::string& field : fields) EXPECT_EQ(whole.addLine(field), Line::taken) << field;
        EXPECT_EQ(whole.addLine("\r\n"), Line::taken);
        return whole;
    }
};

TEST_F(ResponseHead, IsCompleteAtTheEmptyLineOfAFinalResponse) {
    EXPECT_EQ(add({"HTTP/1.1 103 Early Hints\r\n", "A: 1\r\n", "\r\n"}), Line::taken);
    EXPECT_FALSE(head.isComplete());
    EXPECT_EQ(add({"HTTP/2 204\r\n", "B:  2 \r\n", "\r\n"}), Line::taken);
    EXPECT_TRUE(head.isComplete());
    EXPECT_EQ(head.status(), 204);
    EXPECT_EQ(head.headers(), (Headers{{"B", "2"}}));
}

TEST_F(ResponseHead, TakesTheStatusLinesOfThreeVersions) {
    for (const char* line :
         {"HTTP/1.0 200 OK\r\n", "HTTP/1.1 200\r\n", "HTTP/1.1 200 \r\n", "HTTP/1.1 999 Odd one\n",
          "HTTP/2 200 \r\n", "HTTP/2 404\r\n", "HTTP/1.1 100 Continue\r\n"})
        EXPECT_EQ(startsWith(line), Line::taken) << line;
}

TEST_F(ResponseHead, RefusesAStatusLineOfAnotherForm) {
    for (const char* line : {"HTTP/1.1\r\n",
                             "HTTP/1.1 \r\n",
                             "HTTP/1.1 2\r\n",
                             "HTTP/1.1 20\r\n",
                             "HTTP/1.1 20 OK\r\n",
                             "HTTP/1.1 2000 OK\r\n",
                             "HTTP/1.1 099 Low\r\n",
                             "HTTP/1.1 000 None\r\n",
                             "HTTP/1.1 -200 OK\r\n",
                             "HTTP/1.1 +20 OK\r\n",
                             "HTTP/1.1 200OK\r\n",
                             "HTTP/1.1 200\tOK\r\n",
                             "HTTP/1.1  200 OK\r\n",
                             "HTTP/1.1\t200 OK\r\n",
                             "HTTP/1.1 2x0 OK\r\n",
                             " HTTP/1.1 200 OK\r\n",
                             "http/1.1 200 OK\r\n",
                             "HTTP/0.9 200 OK\r\n",
                             "HTTP/1.2 200 OK\r\n",
                             "HTTP/1.x 200 OK\r\n",
                             "HTTP/2.0 200 OK\r\n",
                             "HTTP/3 200\r\n",
                             "HTTP/11 200 OK\r\n",
                             "ICY 200 OK\r\n",
                             "A: 1\r\n",
                             "\r\n",
                             ""})
        EXPECT_EQ(startsWith(line), Line::malformed) << line;
}

TEST_F(ResponseHead, RefusesASwitchOfProtocols) {
    EXPECT_EQ(startsWith("HTTP/1.1 101 Switching Protocols\r\n"), Line::malformed);
}

TEST_F(ResponseHead, RefusesAnInterimResponseWithoutAFollowingStatusLine) {
    EXPECT_EQ(add({"HTTP/1.1 103 Early Hints\r\n", "\r\n", "A: 1\r\n"}), Line::malformed);
}

TEST_F(ResponseHead, UnfoldsALine) {
    EXPECT_EQ(add({"HTTP/1.1 200\r\n", "A: 1\r\n", "\t2\r\n", "\r\n"}), Line::taken);
    EXPECT_EQ(head.headers(), (Headers{{"A", "1 2"}}));
}

TEST_F(ResponseHead, RefusesAFoldedLineWithoutAField) {
    EXPECT_EQ(add({"HTTP/1.1 200 OK\r\n", " folded nowhere\r\n"}), Line::malformed);
}

// A library that does not unfold sees an empty value, and reads the body by other rules.
TEST_F(ResponseHead, RefusesToUnfoldFieldsThatTheTransferLibraryUses) {
    for (const char* field :
         {"Content-Length:\r\n", "content-length: 4\r\n", "Transfer-Encoding:\r\n", "Location: /\r\n"}) {
        head = https::ResponseHead(100, 3);
        EXPECT_EQ(add({"HTTP/1.1 200 OK\r\n", field, " 4\r\n"}), Line::malformed) << field;
    }
}

// "Content-Length : 4" is a length to one reader and an unknown field to another.
TEST_F(ResponseHead, RefusesAFieldWhoseNameIsNoToken) {
    for (const char* line : {"no colon\r\n", ": 1\r\n", "A : 1\r\n", "A\t: 1\r\n", "A B: 1\r\n", "(A): 1\r\n",
                             "\xc3\xa4: 1\r\n", "HTTP/1.1 404: B\r\n"}) {
        head = https::ResponseHead(100, 3);
        EXPECT_EQ(add({"HTTP/1.1 200 OK\r\n", line}), Line::malformed) << line;
    }
}

TEST_F(ResponseHead, RefusesALineThatHoldsANulOrALineEnd) {
    for (const std::string_view line :
         {std::string_view("A: a\0b\r\n", 9), std::string_view("A: 1\rB: 2\r\n"),
          std::string_view("A: 1\nB: 2\r\n"), std::string_view("A: 1\r\r\n")}) {
        head = https::ResponseHead(100, 3);
        EXPECT_EQ(add({"HTTP/1.1 200 OK\r\n", line}), Line::malformed) << line;
    }
    EXPECT_EQ(startsWith(std::string_view("HTTP/1.1 200 \0\r\n", 16)), Line::malformed);
}

TEST_F(ResponseHead, RefusesOneFieldTooMany) {
    EXPECT_EQ(add({"HTTP/1.1 200 OK\r\n", "A: 1\r\n", "A: 2\r\n", "A: 3\r\n"}), Line::taken);
    EXPECT_EQ(add({"A: 4\r\n"}), Line::tooLarge);
}

TEST_F(ResponseHead, CountsTrailersAndForgetsThem) {
    EXPECT_EQ(add({"HTTP/1.1 200 OK\r\n", "A: 1\r\n", "\r\n", "T: 1\r\n", "T: 2\r\n"}), Line::taken);
    EXPECT_EQ(head.headers(), (Headers{{"A", "1"}}));
    EXPECT_EQ(add({"T: 3\r\n"}), Line::tooLarge);
}

TEST_F(ResponseHead, RefusesOneByteTooMany) {
    https::ResponseHead small(22, 3);
    EXPECT_EQ(small.addLine("HTTP/1.1 200 OK\r\n"), Line::taken);  // 17
    EXPECT_EQ(small.addLine("A:1\r\n"), Line::taken);
    EXPECT_EQ(small.addLine("\n"), Line::tooLarge);
}

TEST_F(ResponseHead, RefusesALineOneByteTooLong) {
    https::ResponseHead large(3 * https::kMaximumHeaderLine, 3);
    const auto line = [](std::size_t size) { return "A: " + std::string(size - 5, 'a') + "\r\n"; };
    EXPECT_EQ(large.addLine("HTTP/1.1 200 OK\r\n"), Line::taken);
    EXPECT_EQ(large.addLine(line(https::kMaximumHeaderLine)), Line::taken);
    EXPECT_EQ(large.addLine(line(https::kMaximumHeaderLine + 1)), Line::tooLarge);
}

TEST_F(ResponseHead, ReturnsTheLengthOfTheBody) {
    EXPECT_EQ(headOf({"Content-Length: 12\r\n"}).bodyLength("GET"), 12U);
    EXPECT_EQ(headOf({"Content-Length: 0012\r\n"}).bodyLength("GET"), 12U);
    EXPECT_EQ(headOf({"Content-Length: 12, 12\r\n"}).bodyLength("GET"), 12U);
    EXPECT_EQ(headOf({"Content-Length: 99999999999999999999999\r\n"}).bodyLength("GET"),
              std::numeric_limits<std::uint64_t>::max());
    EXPECT_EQ(headOf({}).bodyLength("GET"), std::nullopt);
    EXPECT_EQ(headOf({"Content-Length: 12\r\n", "Transfer-Encoding: chunked\r\n"}).bodyLength("GET"),
              std::nullopt);
}

TEST_F(ResponseHead, ReturnsZeroWithoutABody) {
    EXPECT_EQ(headOf({"Content-Length: 12\r\n"}).bodyLength("HEAD"), 0U);
    EXPECT_EQ(headOf({"Content-Length: 12\r\n"}, "HTTP/1.1 304 Not Modified\r\n").bodyLength("GET"), 0U);
    EXPECT_EQ(headOf({}, "HTTP/1.1 204 No Content\r\n").bodyLength("GET"), 0U);
}

TEST_F(ResponseHead, HasAnOpenEndIfNothingDefinesTheBodysEnd) {
    EXPECT_TRUE(headOf({}).hasOpenEnd("GET"));
    EXPECT_FALSE(headOf({}).hasOpenEnd("HEAD"));
    EXPECT_FALSE(headOf({"Content-Length: 0\r\n"}).hasOpenEnd("GET"));
    EXPECT_FALSE(headOf({"Transfer-Encoding: Chunked\r\n"}).hasOpenEnd("GET"));
}

TEST_F(ResponseHead, HasNoPlainFramingWithLengthsThatDifferOrAreNone) {
    for (const char* value : {"4, 9", "-1", "+4", "4.0", "0x4", "4 4", "4;", "", "4,", ",4", "four", "\"4\""})
        EXPECT_FALSE(headOf({"Content-Length: " + std::string(value) + "\r\n"}).hasPlainFraming()) << value;
    EXPECT_FALSE(headOf({"Content-Length: 4\r\n", "content-length: 9\r\n"}).hasPlainFraming());
    EXPECT_TRUE(headOf({"Content-Length: 4\r\n", "content-length: 4\r\n"}).hasPlainFraming());
}

TEST_F(ResponseHead, HasNoPlainFramingWithCodingsOtherThanChunked) {
    for (const char* value : {"gzip", "gzip, chunked", "chunked, chunked", "identity", "", "chunked;q=1"})
        EXPECT_FALSE(headOf({"Transfer-Encoding: " + std::string(value) + "\r\n"}).hasPlainFraming())
            << value;
    EXPECT_TRUE(headOf({"Transfer-Encoding: chunked\r\n"}).hasPlainFraming());
}

TEST_F(ResponseHead, HasNoPlainFramingWithChunksInHTTP2) {
    EXPECT_FALSE(headOf({"transfer-encoding: chunked\r\n"}, "HTTP/2 200 \r\n").hasPlainFraming());
}

}  // namespace
}  // namespace pinwell::test
