#include "runtime/process.h"

#include <gtest/gtest.h>

#include <set>
#include <string>
#include <string_view>

#include "support/environment.h"

namespace pinwell::runtime {
namespace {

using test::ScopedVariable;

TEST(Process, IsNamedWithoutItsDirectory) {
    EXPECT_EQ(processName(), "runtime_test");
}

TEST(Process, MakesStringsThatNeverRepeat) {
    std::set<std::string> seen;
    for (int i = 0; i < 1000; ++i) EXPECT_TRUE(seen.insert(globallyUniqueString()).second);
}

TEST(Process, MakesStringsOfVersion4) {
    constexpr std::string_view shape = "xxxxxxxx-xxxx-4xxx-vxxx-xxxxxxxxxxxx";
    for (int i = 0; i < 100; ++i) {
        const std::string text = globallyUniqueString();
        ASSERT_EQ(text.size(), shape.size());
        for (std::size_t at = 0; at < shape.size(); ++at) {
            if (shape[at] == 'x')
                EXPECT_TRUE(std::string_view("0123456789ABCDEF").find(text[at]) != std::string_view::npos)
                    << text;
            else if (shape[at] == 'v')
                EXPECT_TRUE(std::string_view("89AB").find(text[at]) != std::string_view::npos) << text;
            else
                EXPECT_EQ(text[at], shape[at]) << text;
        }
    }
}

TEST(TemporaryDirectory, IsTheOneThatTheEnvironmentNames) {
    const ScopedVariable variable("TMPDIR", "/var/some where/");
    EXPECT_EQ(temporaryDirectory().path(), "/var/some where");
}

TEST(TemporaryDirectory, IsTheSystemsOwnWhenTheEnvironmentNamesNone) {
    for (const std::optional<std::string>& value : {std::optional<std::string>(), {""}, {"relative/path"}}) {
        const ScopedVariable variable("TMPDIR", value);
        EXPECT_EQ(temporaryDirectory().path(), "/tmp");
    }
}

TEST(SecureEnvironment, DistinguishesEmptyFromUnset) {
    const ScopedVariable empty("PINWELL_TEST_EMPTY", "");
    const ScopedVariable unset("PINWELL_TEST_UNSET", std::nullopt);
    EXPECT_EQ(secureEnvironment("PINWELL_TEST_EMPTY"), "");
    EXPECT_EQ(secureEnvironment("PINWELL_TEST_UNSET"), std::nullopt);
}

}  // namespace
}  // namespace pinwell::runtime
