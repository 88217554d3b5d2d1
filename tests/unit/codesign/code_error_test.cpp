#include "codesign/code_error.h"

#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <system_error>

#include "base/byte_io.h"
#include "support/temporary_directory.h"

namespace pinwell::test {
namespace {

using base::ReadFailure;
using codesign::asCodeError;
using codesign::CodeError;
using codesign::Status;

template <class Failure>
CodeError meaningOf(const Failure& failure) {
    try {
        throw failure;
    } catch (const std::runtime_error& caught) {
        return asCodeError(caught);
    }
}

TEST(CodeErrorOfAFailure, HasTheStatusOfItsKind) {
    struct Row {
        ReadFailure::Kind kind;
        Status status;
        const char* reason;
    };
    const Row rows[] = {
        {ReadFailure::Kind::pastEnd, codesign::kInvalidSignature, "it"},
        {ReadFailure::Kind::cutShort, codesign::kIOError, "it"},
        {ReadFailure::Kind::unreadable, codesign::kIOError, "it"},
        {ReadFailure::Kind::noRoom, codesign::kIOError, "there is no room to hold the signature"},
    };
    for (const Row& row : rows) {
        const CodeError error = meaningOf(ReadFailure(row.kind, "it"));
        EXPECT_EQ(error.status(), row.status);
        EXPECT_STREQ(error.what(), row.reason);
    }
    EXPECT_EQ(meaningOf(base::ShortRead("a field", 0, 4, 3)).status(), codesign::kInvalidSignature);
}

TEST(CodeErrorOfAFailure, IsACodeErrorItself) {
    const CodeError error = meaningOf(CodeError(codesign::kUnimplemented, "too deep"));
    EXPECT_EQ(error.status(), codesign::kUnimplemented);
    EXPECT_STREQ(error.what(), "too deep");
}

TEST(CodeErrorOfAFailure, LeavesOtherExceptionsAsTheyAre) {
    EXPECT_THROW(meaningOf(std::system_error(EIO, std::generic_category())), std::system_error);
}

CodeError refusalOf(const std::string& path) {
    try {
        codesign::openCode(base::Places(), path);
    } catch (const CodeError& error) {
        return error;
    }
    return {codesign::kSuccess, "opened"};
}

TEST(OpenedCode, IsARegularFile) {
    const TemporaryDirectory scratch;
    writeFile(scratch / "file", "x");
    ASSERT_EQ(symlink("file", (scratch / "link").c_str()), 0);
    ASSERT_EQ(mkfifo((scratch / "pipe").c_str(), 0600), 0);
    EXPECT_EQ(refusalOf(scratch / "file").status(), codesign::kSuccess);
    for (const char* name : {"pipe", "."}) {
        const CodeError error = refusalOf(scratch / name);
        EXPECT_EQ(error.status(), codesign::kStaticCodeNotFound) << name;
        EXPECT_STREQ(error.what(), "not a regular file") << name;
    }
    for (const char* name : {"link", "none", "file/below"}) {
        const CodeError error = refusalOf(scratch / name);
        EXPECT_EQ(error.status(), codesign::kStaticCodeNotFound) << name;
        EXPECT_STREQ(error.what(), "cannot open the file") << name;
    }
}

}  // namespace
}  // namespace pinwell::test
