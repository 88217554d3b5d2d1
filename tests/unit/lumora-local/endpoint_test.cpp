#include "lumora-local/endpoint.h"

#include <gtest/gtest.h>

namespace pinwell::lumora {
namespace {

TEST(CanonicalHost, LowercasesNames) {
    EXPECT_EQ(canonicalHost("Tickets.Example"), "tickets.example");
}

TEST(CanonicalHost, WritesAddressesInCanonicalForm) {
    EXPECT_EQ(canonicalHost("192.0.2.1"), "192.0.2.1");
    EXPECT_EQ(canonicalHost("2001:DB8:0:0::1"), "2001:db8::1");
}

TEST(CanonicalHost, RefusesOtherTexts) {
    for (const std::string& text :
         {std::string(), std::string("a..b"), std::string(".a"), std::string("a."), std::string("-a"),
          std::string("a-"), std::string("a_b"), std::string("a b"), std::string("a,IP:1.2.3.4"),
          std::string("*.a"), std::string("300.1.1.1"), std::string("1.2.3"), std::string("[::1]"),
          std::string("::1%lo"), std::string("a\0b", 3), std::string(64, 'a'),
          std::string("\xC3\xA4.example")}) {
        EXPECT_EQ(canonicalHost(text), std::nullopt) << text;
    }
}

TEST(CanonicalHost, RefusesTooLongNames) {
    std::string longest;
    for (int i = 0; i < 126; ++i) longest += "a.";
    longest += "a";
    ASSERT_EQ(longest.size(), 253U);
    EXPECT_TRUE(canonicalHost(longest));
    EXPECT_FALSE(canonicalHost("a." + longest));
    EXPECT_TRUE(canonicalHost(std::string(63, 'a')));
}

TEST(Endpoint, IsReadWithAndWithoutAPort) {
    EXPECT_EQ(parseEndpoint("localhost:1", 9), (Endpoint{"localhost", 1}));
    EXPECT_EQ(parseEndpoint("localhost", 9), (Endpoint{"localhost", 9}));
    EXPECT_EQ(parseEndpoint("[::1]:65535", 9), (Endpoint{"::1", 65535}));
    EXPECT_EQ(parseEndpoint("[::1]", 9), (Endpoint{"::1", 9}));
    EXPECT_EQ(parseEndpoint("::1", 9), (Endpoint{"::1", 9}));
    EXPECT_EQ(parseEndpoint("127.0.0.1:0", 9), (Endpoint{"127.0.0.1", 0}));
}

TEST(Endpoint, RefusesMalformedText) {
    for (const char* text : {"", ":", ":80", "a:", "a:b", "a:-1", "a:65536", "a: 1", "a:1 ", "[::1", "[::1]1",
                             "[::1]:", "[a]:1", "[]:1", "a:1:2", "https://a"}) {
        EXPECT_EQ(parseEndpoint(text, 9), std::nullopt) << text;
    }
}

TEST(Endpoint, IsWrittenWithBracketsAroundAnIPv6Address) {
    EXPECT_EQ(toString(Endpoint{"::1", 8443}), "[::1]:8443");
    EXPECT_EQ(toString(Endpoint{"localhost", 8443}), "localhost:8443");
}

}  // namespace
}  // namespace pinwell::lumora
