#include "crypto/crypto.h"
#include "base/text.h"

#include <gtest/gtest.h>

#include <ostream>
#include <string>

namespace pinwell::crypto {
namespace {

using base::asBytes;
using base::toHex;

/// The digest of "abc", as FIPS 180-4 and RFC 1321 give it.
struct Known {
    const char* name;
    Digest digest;
    const char* ofAbc;

    friend void PrintTo(const Known& one, std::ostream* out) { *out << one.name; }
};

class KnownDigest : public testing::TestWithParam<Known> {};

TEST_P(KnownDigest, HasThePublishedValue) {
    EXPECT_EQ(toHex(digestOf(GetParam().digest, asBytes("abc"))), GetParam().ofAbc);
    EXPECT_EQ(availableDigestOf(GetParam().digest, asBytes("abc")),
              digestOf(GetParam().digest, asBytes("abc")));
}

TEST_P(KnownDigest, HasTheStatedSize) {
    EXPECT_EQ(digestOf(GetParam().digest, {}).size(), digestSize(GetParam().digest));
    EXPECT_LE(digestSize(GetParam().digest), kLongestDigest);
}

TEST_P(KnownDigest, IsTheSameOverSeveralParts) {
    Hasher hasher(GetParam().digest);
    hasher.update(asBytes("a"));
    hasher.update({});
    hasher.update(asBytes("bc"));
    EXPECT_EQ(toHex(hasher.finish()), GetParam().ofAbc);
}

INSTANTIATE_TEST_SUITE_P(
    Of, KnownDigest,
    testing::Values(
        Known{"MD5", Digest::md5, "900150983cd24fb0d6963f7d28e17f72"},
        Known{"SHA1", Digest::sha1, "a9993e364706816aba3e25717850c26c9cd0d89d"},
        Known{"SHA224", Digest::sha224, "23097d223405d8228642a477bda255b32aadbce4bda0b3f7e36c9da7"},
        Known{"SHA256", Digest::sha256, "ba7816bf8f01cfea414140de5dae2223b00361a396177a9cb410ff61f20015ad"},
        Known{
            "SHA384", Digest::sha384,
            "cb00753f45a35e8bb5a03d699ac65007272c32ab0eded1631a8b605a43ff5bed8086072ba1e7cc2358baeca134c825a"
            "7"},
        Known{
            "SHA512", Digest::sha512,
            "ddaf35a193617abacc417349ae20413112e6fa4e89a97ea20a9eeee64b55d39a2192992a274fc1a836ba3c23a3feebbd"
            "454d4423643ce80e2a9ac94fa54ca49f"}),
    [](const auto& tested) { return std::string(tested.param.name); });

TEST(Hasher, ComputesOneDigestAfterAnother) {
    Hasher hasher(Digest::sha256);
    const std::string first = toHex(hasher.of(asBytes("abc")));
    EXPECT_NE(toHex(hasher.of(asBytes("abd"))), first);
    EXPECT_EQ(toHex(hasher.of(asBytes("abc"))), first);
}

TEST(Hasher, DropsUnfinishedPartsWhenItBegins) {
    Hasher hasher(Digest::sha256);
    hasher.update(asBytes("unfinished"));
    hasher.begin();
    hasher.update(asBytes("abc"));
    EXPECT_EQ(toHex(hasher.finish()), toHex(digestOf(Digest::sha256, asBytes("abc"))));
}

TEST(Hasher, OfAThreadIsKeptForEachDigest) {
    EXPECT_EQ(&threadHasher(Digest::sha1), &threadHasher(Digest::sha1));
    EXPECT_NE(&threadHasher(Digest::sha1), &threadHasher(Digest::sha256));
}

}  // namespace
}  // namespace pinwell::crypto
