#include "base/error.h"

#include <gtest/gtest.h>

#include <cerrno>

namespace pinwell::base {
namespace {

TEST(Error, OfThePlatformNamesThePath) {
    const Error error = Error::posix(ENOENT, "/a/b");
    EXPECT_EQ(error.domain(), kPOSIXErrorDomain);
    EXPECT_EQ(error.code(), ENOENT);
    EXPECT_EQ(error.localizedFailureReason(), "No such file or directory");
    EXPECT_EQ(error.localizedDescription(), "/a/b: No such file or directory");
}

TEST(Error, WithoutAPathIsTheBareReason) {
    EXPECT_EQ(Error::posix(EACCES).localizedDescription(), "Permission denied");
    EXPECT_TRUE(Error::posix(EACCES).path().empty());
}

TEST(Error, OfAnUnknownNumberStillHasAText) {
    EXPECT_EQ(Error::posix(987654).localizedFailureReason(), "Error 987654.");
    EXPECT_EQ(Error::osStatus(-12345).localizedFailureReason(), "Status -12345.");
    EXPECT_EQ(Error::osStatus(kParameterError).localizedFailureReason(), "A parameter was not valid.");
}

TEST(Error, GivesItsStatusOnlyIfItHoldsOne) {
    EXPECT_EQ(Error::osStatus(-67061).statusOr(1), -67061);
    EXPECT_EQ(Error::posix(ENOENT).statusOr(1), 1);
    EXPECT_EQ(Error(kOSStatusErrorDomain, 0, "success").statusOr(1), 1);
    EXPECT_EQ(Error(kOSStatusErrorDomain, std::int64_t{1} << 32, "zero if truncated").statusOr(1), 1);
}

TEST(Error, TakesFurtherUserInformation) {
    const Error error = Error("D", 1, "t")
                            .withPath("/a")
                            .withPath("/b")
                            .withURL("https://a.example")
                            .causedBy(Error("E", 2, "u"));
    EXPECT_EQ(error.path(), "/b");
    EXPECT_EQ(error.url(), "https://a.example");
    ASSERT_NE(error.underlying(), nullptr);
    EXPECT_EQ(error.underlying()->code(), 2);
    EXPECT_EQ(error.localizedDescription(), "/b: t");
}

TEST(Error, EqualsOneWithTheSameContents) {
    const Error caused = Error("D", 1, "t").causedBy(Error("E", 2, "u"));
    EXPECT_EQ(caused, Error("D", 1, "t").causedBy(Error("E", 2, "u")));
    EXPECT_NE(caused, Error("D", 1, "t").causedBy(Error("E", 3, "u")));
    EXPECT_NE(caused, Error("D", 1, "t"));
    EXPECT_NE(Error("D", 1, "t"), Error("D", 1, "t").withPath("/a"));
    EXPECT_NE(Error("D", 1, "t"), Error("D", 1, "t").withURL("https://a.example"));
    EXPECT_NE(Error("D", 1, "t"), Error("D", 2, "t"));
}

TEST(Result, IsAValueOrAnError) {
    const Result<int> good = 5;
    const Result<int> bad = Error("D", 1, "t");
    ASSERT_TRUE(good);
    EXPECT_EQ(*good, 5);
    ASSERT_FALSE(bad);
    EXPECT_EQ(bad.error().code(), 1);
    EXPECT_FALSE(Result<int>(bad).asOptional());
}

TEST(Result, OfNothingIsSuccessByDefault) {
    EXPECT_TRUE(Result<void>());
    EXPECT_FALSE(Result<void>(Error("D", 1, "t")));
}

}  // namespace
}  // namespace pinwell::base
