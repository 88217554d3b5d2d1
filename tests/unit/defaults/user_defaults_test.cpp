#include "defaults/user_defaults.h"

#include <gtest/gtest.h>

#include <cstdlib>
#include <filesystem>

#include "support/temporary_directory.h"

namespace pinwell::defaults {
namespace {

class UserDefaultsDomain : public testing::Test {
  protected:
    UserDefaultsDomain() { setenv("XDG_CONFIG_HOME", directory.path().c_str(), 1); }
    ~UserDefaultsDomain() override { unsetenv("XDG_CONFIG_HOME"); }

    std::unique_ptr<UserDefaults> open(std::string_view document) {
        test::writeFile(directory / "com.example.tool.json", document);
        return opened();
    }
    static std::unique_ptr<UserDefaults> opened() {
        auto defaults = makeUserDefaultsService()->openDomain("com.example.tool");
        defaults->registerDefaults({{"name", "registered"}, {"flag", true}});
        return defaults;
    }
    static void expectRegistered(UserDefaults& defaults) {
        EXPECT_EQ(defaults.stringForKey("name"), "registered");
        EXPECT_TRUE(defaults.boolForKey("flag"));
    }

    test::TemporaryDirectory directory;
};

TEST_F(UserDefaultsDomain, AnswersWhatItsFileHolds) {
    const auto defaults = open(R"({"name":"stored","flag":false})");
    EXPECT_EQ(defaults->stringForKey("name"), "stored");
    EXPECT_FALSE(defaults->boolForKey("flag"));
}

TEST_F(UserDefaultsDomain, WithoutAFileAnswersTheRegisteredDefaults) { expectRegistered(*opened()); }

TEST_F(UserDefaultsDomain, MalformedAnswersTheRegisteredDefaults) {
    for (const char* document : {"", "{", "[]", "\"text\"", "{\"name\":\"stored\"} rest", "\xff\xfe"})
        expectRegistered(*open(document));
}

TEST_F(UserDefaultsDomain, FallsBackValueByValue) {
    const auto missing = open(R"({"name":"stored"})");
    EXPECT_EQ(missing->stringForKey("name"), "stored");
    EXPECT_TRUE(missing->boolForKey("flag"));
    const auto mistyped = open(R"({"name":7,"flag":"no"})");
    expectRegistered(*mistyped);
}

TEST_F(UserDefaultsDomain, TakesANumberForABoolean) {
    EXPECT_FALSE(open(R"({"flag":0})")->boolForKey("flag"));
    EXPECT_TRUE(open(R"({"flag":1})")->boolForKey("flag"));
}

TEST_F(UserDefaultsDomain, AnswersNothingForAKeyThatNeitherHas) {
    EXPECT_EQ(opened()->stringForKey("other"), "");
    EXPECT_FALSE(opened()->boolForKey("other"));
}

TEST_F(UserDefaultsDomain, TooLargeIsMalformed) {
    expectRegistered(*open("{\"name\":\"" + std::string(kMaximumDomainFile, 'a') + "\"}"));
}

TEST_F(UserDefaultsDomain, IsInDotConfigBelowHomeWithoutXDGConfigHome) {
    unsetenv("XDG_CONFIG_HOME");
    const char* home = std::getenv("HOME");
    const std::string saved = home == nullptr ? "" : home;
    setenv("HOME", directory.path().c_str(), 1);
    test::writeFile(directory / ".config/com.example.tool.json", std::string_view(R"({"name":"below home"})"));
    EXPECT_EQ(opened()->stringForKey("name"), "below home");
    setenv("XDG_CONFIG_HOME", "relative", 1);  // not absolute: ignored
    EXPECT_EQ(opened()->stringForKey("name"), "below home");
    if (home == nullptr) unsetenv("HOME");
    else setenv("HOME", saved.c_str(), 1);
}

}  // namespace
}  // namespace pinwell::defaults
