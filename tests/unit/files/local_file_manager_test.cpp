// Facts about an item: its properties, its state, and the main executable of a bundle.
#include <cstdlib>

#include "fixture.h"
#include "values/value.h"

namespace pinwell::test {
namespace {

using files::ItemFacts;
using files::ItemType;
using files::URL;
using testing::Key;
using testing::UnorderedElementsAre;

class ItemProperties : public FilesTest {
  protected:
    // The facts passed to the type service.
    ItemFacts factsOf(std::string_view name) {
        ItemFacts seen;
        const auto asking = files::makeLocalFileManager([&seen](const ItemFacts& facts) {
            seen = facts;
            return ItemType{};
        });
        EXPECT_THAT(asking->resourceProperties(url(name)), Succeeds());
        return seen;
    }
};

TEST_F(ItemProperties, AreTheFactsOfTheItemAndTheTypeService) {
    makeDirectory(path("Tool.app"));
    const auto naming = [](const ItemFacts&) {
        return ItemType{"com.ostrel.application-bundle", "application", true, true};
    };
    const auto properties = files::makeLocalFileManager(naming)->resourceProperties(url("Tool.app"));
    ASSERT_THAT(properties, Succeeds());
    const auto all = properties->dictionary();
    EXPECT_THAT(all, UnorderedElementsAre(Key("isDirectory"), Key("isPackage"), Key("isApplication"),
                                          Key("isSymbolicLink"), Key("typeIdentifier"),
                                          Key("localizedTypeDescription")));
    EXPECT_TRUE(all.at("isDirectory").boolValue());
    EXPECT_TRUE(all.at("isPackage").boolValue());
    EXPECT_TRUE(all.at("isApplication").boolValue());
    EXPECT_FALSE(all.at("isSymbolicLink").boolValue());
    EXPECT_EQ(*all.at("typeIdentifier").string(), "com.ostrel.application-bundle");
    EXPECT_EQ(*all.at("localizedTypeDescription").string(), "application");
}

TEST_F(ItemProperties, TellTheTypeServiceNameAndKind) {
    writeFile(path("image.dmg"), "x");
    const ItemFacts facts = factsOf("image.dmg");
    EXPECT_EQ(facts.name, "image.dmg");
    EXPECT_TRUE(facts.isRegularFile);
    EXPECT_FALSE(facts.isDirectory);
    EXPECT_FALSE(facts.isSymbolicLink);
    EXPECT_FALSE(facts.isExecutable);
}

TEST_F(ItemProperties, TakeAnyExecuteBitForExecutable) {
    writeFile(path("tool"), "x");
    for (const mode_t mode : {0610U, 0601U, 0700U}) {
        setMode(path("tool"), mode);
        EXPECT_TRUE(factsOf("tool").isExecutable) << mode;
    }
}

TEST_F(ItemProperties, DoNotFollowALink) {
    makeDirectory(path("folder"));
    makeLink("folder", path("link"));
    const auto properties = manager->resourceProperties(url("link"));
    ASSERT_THAT(properties, Succeeds());
    EXPECT_TRUE(properties->isSymbolicLink);
    EXPECT_FALSE(properties->isDirectory);
}

TEST_F(ItemProperties, OfALinkThatLeadsNowhereAreALinks) {
    makeLink("nowhere", path("link"));
    EXPECT_TRUE(factsOf("link").isSymbolicLink);
}

TEST_F(ItemProperties, AreHadForANameThatIsNotUTF8) {
    writeFile(path("\xFF\xFE.dmg"), "x");
    EXPECT_EQ(factsOf("\xFF\xFE.dmg").name, "\xFF\xFE.dmg");
}

TEST_F(ItemProperties, AreHadForANameOf255Bytes) {
    const std::string name(255, 'n');
    writeFile(path(name), "x");
    EXPECT_EQ(factsOf(name).name, name);
}

TEST_F(ItemProperties, FailForAMissingItem) {
    EXPECT_THAT(manager->resourceProperties(url("none")), FailsWith(ENOENT, path("none")));
}

TEST_F(ItemProperties, FailBelowAFile) {
    writeFile(path("file"), "x");
    EXPECT_THAT(manager->resourceProperties(url("file/below")), FailsWith(ENOTDIR, path("file/below")));
}

TEST_F(ItemProperties, FailForANameOf256Bytes) {
    const std::string name(256, 'n');
    EXPECT_THAT(manager->resourceProperties(url(name)), FailsWith(ENAMETOOLONG, path(name)));
}

TEST_F(ItemProperties, FailForAPathThroughALoopOfLinks) {
    makeLink("b", path("a"));
    makeLink("a", path("b"));
    EXPECT_THAT(manager->resourceProperties(url("a/file")), FailsWith(ELOOP, path("a/file")));
}

TEST_F(ItemProperties, FailInADirectoryThatMayNotBeSearched) {
    const AsOrdinaryUser user(directory.path());
    makeDirectory(path("closed"), 0);
    EXPECT_THAT(manager->resourceProperties(url("closed/file")), FailsWith(EACCES, path("closed/file")));
}

TEST_F(ItemProperties, FailForAnEmptyPath) {
    const auto properties = manager->resourceProperties(URL::fileURLWithPath(""));
    ASSERT_FALSE(properties);
    EXPECT_EQ(properties.error().code(), ENOENT);
}

TEST_F(ItemProperties, FailForAPathWithAZeroByteRatherThanLookAtItsBeginning) {
    writeFile(path("file"), "x");
    const auto properties = manager->resourceProperties(url(std::string("file\0more", 9)));
    ASSERT_FALSE(properties);
    EXPECT_EQ(properties.error().code(), EINVAL);
}

TEST_F(ItemProperties, FailForAWebAddress) {
    const auto properties = manager->resourceProperties(*URL::fromString("https://host.example/tmp"));
    ASSERT_FALSE(properties);
    EXPECT_EQ(properties.error().code(), EINVAL);
}

class RegularFileQuestion : public FilesTest {
  protected:
    bool answer(std::string_view name) {
        const auto result = manager->isRegularFile(url(name));
        EXPECT_THAT(result, Succeeds());
        return result && *result;
    }
};

TEST_F(RegularFileQuestion, IsYesForAFileAlone) {
    writeFile(path("file"), "x");
    makeDirectory(path("folder"));
    makeLink("file", path("link"));
    makeFifo(path("fifo"));
    EXPECT_TRUE(answer("file"));
    EXPECT_FALSE(answer("folder"));
    EXPECT_FALSE(answer("link"));
    EXPECT_FALSE(answer("fifo"));
}

TEST_F(RegularFileQuestion, FailsForAMissingFile) {
    EXPECT_THAT(manager->isRegularFile(url("none")), FailsWith(ENOENT, path("none")));
}

using TemporaryDirectoryQuestion = FilesTest;

TEST_F(TemporaryDirectoryQuestion, IsTheEnvironmentsWhenAbsolute) {
    const char* before = std::getenv("TMPDIR");
    const std::optional<std::string> kept =
        before != nullptr ? std::optional<std::string>(before) : std::nullopt;
    setenv("TMPDIR", "/somewhere/else/", 1);
    EXPECT_EQ(manager->temporaryDirectory().path(), "/somewhere/else");
    for (const char* unusable : {"", "relative/path"}) {
        setenv("TMPDIR", unusable, 1);
        EXPECT_EQ(manager->temporaryDirectory().path(), "/tmp") << unusable;
    }
    unsetenv("TMPDIR");
    EXPECT_EQ(manager->temporaryDirectory().path(), "/tmp");
    if (kept) setenv("TMPDIR", kept->c_str(), 1);
}

// The bundle's main executable.
using BundleExecutable = FilesTest;

TEST_F(BundleExecutable, IsTheFileNamedAsTheBundleIs) {
    writeFile(path("Tool.app/Contents/Linux/Tool"), "x");
    const auto executable = manager->mainExecutableOfBundle(url("Tool.app"));
    ASSERT_TRUE(executable.has_value());
    EXPECT_EQ(*executable, url("Tool.app/Contents/Linux/Tool"));
}

TEST_F(BundleExecutable, IsNotHadOfAnEmptyDirectory) {
    makeDirectory(path("Tool.app"));
    EXPECT_EQ(manager->mainExecutableOfBundle(url("Tool.app")), std::nullopt);
}

TEST_F(BundleExecutable, ReturnsNulloptForNonFileUrl) {
    EXPECT_EQ(manager->mainExecutableOfBundle(*files::URL::fromString("https://host.example/Tool.app")),
              std::nullopt);
}

}  // namespace
}  // namespace pinwell::test
