#include "defaults/user_defaults.h"

#include <gtest/gtest.h>
#include <sys/stat.h>

#include <filesystem>

#include "support/environment.h"
#include "support/fake_user_defaults.h"
#include "support/temporary_directory.h"

namespace pinwell::defaults {
namespace {

using test::ScopedVariable;
using test::TemporaryDirectory;
using values::Dictionary;

constexpr std::string_view kDomain = "com.example.tool";

class UserDefaultsTest : public testing::Test {
  protected:
    std::unique_ptr<UserDefaults> open(std::string_view domain = kDomain) {
        auto defaults = makeUserDefaultsService()->openDomain(domain);
        defaults->registerDefaults({{"container", "registered"}, {"production", true}});
        return defaults;
    }

    // The domain's file with these contents, opened.
    std::unique_ptr<UserDefaults> openFile(std::string_view contents) {
        test::writeFile(directory_ / "com.example.tool.json", contents);
        return open();
    }

    // That every value is the registered one.
    static void expectRegistered(UserDefaults& defaults) {
        EXPECT_EQ(defaults.stringForKey("container"), "registered");
        EXPECT_TRUE(defaults.boolForKey("production"));
    }

    TemporaryDirectory directory_;

  private:
    ScopedVariable configuration_{"XDG_CONFIG_HOME", directory_.path()};
};

TEST_F(UserDefaultsTest, ReturnTheUsersValue) {
    const auto defaults = openFile(R"({"container": "chosen", "production": false})");
    EXPECT_EQ(defaults->stringForKey("container"), "chosen");
    EXPECT_FALSE(defaults->boolForKey("production"));
}

TEST_F(UserDefaultsTest, ReturnTheRegisteredValueForAMissingOne) {
    const auto defaults = openFile(R"({"production": false})");
    EXPECT_EQ(defaults->stringForKey("container"), "registered");
    EXPECT_FALSE(defaults->boolForKey("production"));
}

TEST_F(UserDefaultsTest, ReturnTheRegisteredValueForOneOfAnotherType) {
    const auto defaults = openFile(R"({"container": 5, "production": "false"})");
    expectRegistered(*defaults);
    expectRegistered(*openFile(R"({"container": null, "production": 0})"));
    expectRegistered(*openFile(R"({"container": ["x"], "production": null})"));
}

TEST_F(UserDefaultsTest, MayBeEmptyText) {
    EXPECT_EQ(openFile(R"({"container": ""})")->stringForKey("container"), "");
}

TEST_F(UserDefaultsTest, ReturnNothingForAnUnknownKey) {
    const auto defaults = openFile("{}");
    EXPECT_EQ(defaults->stringForKey("unknown"), "");
    EXPECT_FALSE(defaults->boolForKey("unknown"));
    EXPECT_EQ(defaults->stringForKey("production"), "");
    EXPECT_FALSE(defaults->boolForKey("container"));
}

TEST_F(UserDefaultsTest, AreTheRegisteredOnesWithoutAFile) {
    expectRegistered(*open());
}

TEST_F(UserDefaultsTest, AreTheRegisteredOnesWhenTheFileIsMalformed) {
    for (const std::string_view contents :
         {"", "junk", "[]", "\"text\"", R"({"container": "chosen")", R"({"container": "chosen"} x)"})
        expectRegistered(*openFile(contents));
}

TEST_F(UserDefaultsTest, AreTheRegisteredOnesWhenTheFileIsTooLong) {
    expectRegistered(
        *openFile(R"({"container": "chosen", "production": false})" + std::string(kMaximumDomainFile, ' ')));
}

TEST_F(UserDefaultsTest, AreTheRegisteredOnesWhenTheFileIsADirectoryOrAPipe) {
    const std::string path = directory_ / "com.example.tool.json";
    std::filesystem::create_directory(path);
    expectRegistered(*open());
    std::filesystem::remove(path);
    ASSERT_EQ(mkfifo(path.c_str(), 0600), 0);
    expectRegistered(*open());
}

TEST_F(UserDefaultsTest, DoNotLeaveTheirDirectory) {
    std::filesystem::create_directory(directory_ / "inner");
    test::writeFile(directory_ / "outside.json", R"({"container": "chosen"})");
    const ScopedVariable inner("XDG_CONFIG_HOME", directory_ / "inner");
    expectRegistered(*open("../outside"));
}

TEST_F(UserDefaultsTest, RegisterAgainValueByValue) {
    const auto defaults = openFile("{}");
    defaults->registerDefaults({{"container", "again"}});
    EXPECT_EQ(defaults->stringForKey("container"), "again");
    EXPECT_TRUE(defaults->boolForKey("production"));
}

TEST_F(UserDefaultsTest, AreFoundBelowTheHomeDirectoryWithoutAConfigurationDirectory) {
    test::writeFile(directory_ / ".config/com.example.tool.json", R"({"container": "home"})");
    const ScopedVariable home("HOME", directory_.path());
    for (const std::optional<std::string>& value : {std::optional<std::string>(), {""}, {"relative"}}) {
        const ScopedVariable configuration("XDG_CONFIG_HOME", value);
        EXPECT_EQ(open()->stringForKey("container"), "home");
    }
}

TEST_F(UserDefaultsTest, AreTheRegisteredOnesWithoutAHomeDirectory) {
    const ScopedVariable configuration("XDG_CONFIG_HOME", std::nullopt);
    const ScopedVariable home("HOME", std::nullopt);
    expectRegistered(*open());
}

TEST(FakeUserDefaults, BehaveLikeTheRealOnes) {
    test::FakeUserDefaultsService service;
    service.domains.insert_or_assign("d", Dictionary{{"text", "chosen"}, {"flag", 1}});
    const auto defaults = service.openDomain("d");
    defaults->registerDefaults({{"text", "registered"}, {"flag", true}, {"other", "registered"}});
    defaults->registerDefaults({{"other", "again"}});
    EXPECT_EQ(defaults->stringForKey("text"), "chosen");
    EXPECT_TRUE(defaults->boolForKey("flag"));
    EXPECT_EQ(defaults->stringForKey("other"), "again");
    EXPECT_EQ(defaults->stringForKey("unknown"), "");
    EXPECT_EQ(service.openDomain("other")->stringForKey("text"), "");
    EXPECT_EQ(service.opened, (std::vector<std::string>{"d", "other"}));
}

}  // namespace
}  // namespace pinwell::defaults
