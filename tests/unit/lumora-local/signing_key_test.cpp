// The process that uses a token, with misbehaving tokens.
#include "lumora-local/signing_key.h"

#include <gtest/gtest.h>
#include <unistd.h>

#include <csignal>

#include "crypto/crypto.h"
#include "lumora-local/failure.h"

namespace pinwell::lumora {
namespace {

using base::ByteView;
using base::Data;
using std::chrono::milliseconds;

/// Signs by returning the digest, after something that the test chooses has happened.
class FakeToken final : public DigestSigner {
  public:
    explicit FakeToken(void (*mishap)(const Data& digest)) : mishap_(mishap) {}

    Data publicKey() const override { return base::toData("public"); }
    Data signDigest(ByteView digest) const override {
        mishap_(base::toData(digest));
        return base::toData(digest);
    }

  private:
    void (*mishap_)(const Data& digest);
};

std::unique_ptr<SigningKey> keyWith(void (*mishap)(const Data& digest),
                                    milliseconds patience = kSigningPatience) {
    return startSigningProcess([mishap] { return std::make_unique<FakeToken>(mishap); }, patience);
}

/// The text of the failure of sign().
std::string failureOf(const SigningKey& key, std::string_view message = "message") {
    try {
        key.sign(base::asBytes(message));
    } catch (const Failure& failure) {
        EXPECT_EQ(failure.exitStatus(), EX_IOERR);
        return failure.what();
    }
    return "none";
}

constexpr const char* kGone = "the process that speaks to the token has ended, or does not answer";

TEST(SigningProcess, SignsTheDigestOfEachMessage) {
    const auto key = keyWith([](const Data&) {});
    EXPECT_EQ(key->publicKey(), base::toData("public"));
    for (const char* message : {"one", "two"})
        EXPECT_EQ(key->sign(base::asBytes(message)), crypto::sha256(base::asBytes(message)));
}

TEST(SigningProcess, PassesOnTheTokensError) {
    const auto key = keyWith([](const Data&) { throw Failure(EX_IOERR, "the token is full"); });
    EXPECT_EQ(failureOf(*key), "the token is full");
    EXPECT_EQ(failureOf(*key), "the token is full");
}

TEST(SigningProcess, PassesOnTheErrorOfOpeningTheKey) {
    try {
        startSigningProcess(
            []() -> std::unique_ptr<DigestSigner> { throw Failure(EX_CONFIG, "no such token"); });
        FAIL() << "a key that is not there was opened";
    } catch (const Failure& failure) {
        EXPECT_EQ(failure.exitStatus(), EX_CONFIG);
        EXPECT_STREQ(failure.what(), "no such token");
    }
}

TEST(SigningProcess, GivesUpOnATokenThatDoesNotRespond) {
    auto key = keyWith([](const Data&) { ::pause(); }, milliseconds(50));
    EXPECT_EQ(failureOf(*key), kGone);
    // A late response is not taken for the response to another message.
    EXPECT_EQ(failureOf(*key), kGone);
    key.reset();  // does not wait for the child either
}

TEST(SigningProcess, ReportsThatTheProcessHasEnded) {
    auto key = keyWith([](const Data&) { ::_exit(1); });
    EXPECT_EQ(failureOf(*key), kGone);
    EXPECT_EQ(failureOf(*key), kGone);
    key.reset();
}

}  // namespace
}  // namespace pinwell::lumora
