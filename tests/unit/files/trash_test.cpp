#include <sys/stat.h>

#include <cstdlib>
#include <filesystem>

#include "fixture.h"
#include "support/volume.h"
#include "values/value.h"

#if defined(__has_feature)
#if __has_feature(address_sanitizer)
#define PINWELL_ADDRESS_SANITIZER
#endif
#elif defined(__SANITIZE_ADDRESS__)
#define PINWELL_ADDRESS_SANITIZER
#endif
#ifdef PINWELL_ADDRESS_SANITIZER
#include <sanitizer/lsan_interface.h>
#endif

namespace pinwell::test {
namespace {

// During its life, the leak detector is off: if the move into the trash itself is refused, GLib 2.74 does not
// free the texts of the info file.
class KnownLeaks {
  public:
#ifdef PINWELL_ADDRESS_SANITIZER
    KnownLeaks() {
        __lsan_disable();
    }
    ~KnownLeaks() {
        __lsan_enable();
    }
#else
    KnownLeaks() {}   // NOLINT: not trivial, so that
    ~KnownLeaks() {}  // NOLINT: the guard is not an unused variable
#endif
    KnownLeaks(const KnownLeaks&) = delete;
    KnownLeaks& operator=(const KnownLeaks&) = delete;
};

using files::URL;
using testing::HasSubstr;

// The library reads its directories once in a process, so all tests of it share one home.
class Trash : public FilesTest {
  protected:
    static void SetUpTestSuite() {
        home = std::make_unique<TemporaryDirectory>();
        setenv("HOME", home->path().c_str(), 1);
        setenv("XDG_DATA_HOME", (*home / "data").c_str(), 1);
    }
    static void TearDownTestSuite() { home.reset(); }

    static std::string inTrash(std::string_view name) {
        return *home / "data/Trash/files/" + std::string(name);
    }

    static std::unique_ptr<TemporaryDirectory> home;
};

std::unique_ptr<TemporaryDirectory> Trash::home;

TEST_F(Trash, TakesAFileAndReturnsItsPlace) {
    writeFile(path("CodeResources"), "ticket");
    const auto place = manager->trashItem(url("CodeResources"));
    ASSERT_THAT(place, Succeeds());
    EXPECT_EQ(place->path(), inTrash("CodeResources"));
    EXPECT_EQ(readFile(place->path()), "ticket");
    EXPECT_FALSE(exists(path("CodeResources")));
    EXPECT_THAT(readFile(*home / "data/Trash/info/CodeResources.trashinfo"),
                HasSubstr("Path=" + path("CodeResources") + "\n"));
}

TEST_F(Trash, KeepsTwoItemsOfOneNameApart) {
    writeFile(path("twin"), "first");
    const auto first = manager->trashItem(url("twin"));
    writeFile(path("twin"), "second");
    const auto second = manager->trashItem(url("twin"));
    ASSERT_THAT(first, Succeeds());
    ASSERT_THAT(second, Succeeds());
    EXPECT_EQ(readFile(first->path()), "first");
    EXPECT_EQ(readFile(second->path()), "second");
}

TEST_F(Trash, TakesALinkAndNotItsTarget) {
    writeFile(path("target"), "x");
    makeLink(path("target"), path("link"));
    const auto place = manager->trashItem(url("link"));
    ASSERT_THAT(place, Succeeds());
    EXPECT_TRUE(S_ISLNK(statusOf(place->path()).st_mode));
    EXPECT_EQ(readFile(path("target")), "x");
}

TEST_F(Trash, TakesTheItemThatAPathUpFromALinkLeadsTo) {
    writeFile(path("item"), "another's");
    writeFile(path("real/item"), "meant");
    makeDirectory(path("real/inner"));
    makeLink(path("real/inner"), path("link"));
    const auto place = manager->trashItem(url("link/../item"));
    ASSERT_THAT(place, Succeeds());
    EXPECT_EQ(readFile(place->path()), "meant");
    EXPECT_TRUE(exists(path("item")));
    EXPECT_FALSE(exists(path("real/item")));
}

TEST_F(Trash, TakesADirectory) {
    writeFile(path("folder/file"), "x");
    const auto place = manager->trashItem(url("folder"));
    ASSERT_THAT(place, Succeeds());
    EXPECT_EQ(readFile(place->path() + "/file"), "x");
}

TEST_F(Trash, TakesANameThatIsNotUTF8AndOneWithSpacesAndPercents) {
    for (const char* name : {"\xFF\xC3\x28", "50% off \n.dmg"}) {
        writeFile(path(name), "x");
        const auto place = manager->trashItem(url(name));
        ASSERT_THAT(place, Succeeds());
        EXPECT_EQ(place->path(), inTrash(name));
        EXPECT_EQ(readFile(place->path()), "x");
    }
}

TEST_F(Trash, OfAnotherVolumeIsAtItsTop) {
    const Volume volume("xfs");
    if (volume.missing()) GTEST_SKIP() << *volume.missing();
    writeFile(volume / "folder/file", "x");
    const auto place = manager->trashItem(URL::fileURLWithPath(volume / "folder/file"));
    ASSERT_THAT(place, Succeeds());
    EXPECT_EQ(place->path(), volume / ".Trash-0/files/file");
    EXPECT_EQ(readFile(place->path()), "x");
}

TEST_F(Trash, OfAnotherVolumeIsTheSharedOneWhereThereIsOne) {
    const Volume volume("xfs");
    if (volume.missing()) GTEST_SKIP() << *volume.missing();
    makeDirectory(volume / ".Trash", 01777);
    writeFile(volume / "file", "x");
    const auto place = manager->trashItem(URL::fileURLWithPath(volume / "file"));
    ASSERT_THAT(place, Succeeds());
    EXPECT_EQ(place->path(), volume / ".Trash/0/files/file");
    EXPECT_EQ(readFile(place->path()), "x");
}

TEST_F(Trash, RefusesAMissingItem) {
    EXPECT_THAT(manager->trashItem(url("none")), FailsWith(ENOENT, path("none")));
}

TEST_F(Trash, RefusesAVolumeThatHasNone) {
    const auto place = manager->trashItem(URL::fileURLWithPath("/proc/self/status"));
    EXPECT_THAT(place, FailsWith(EOPNOTSUPP, "/proc/self/status"));
    const auto* beneath = place.error().underlying();
    ASSERT_NE(beneath, nullptr);
    EXPECT_FALSE(beneath->localizedFailureReason().empty());
}

TEST_F(Trash, LeavesTheItemWhereItMayNotBeMoved) {
    std::filesystem::remove_all(*home / "data");  // another test's trash could be another user's
    const AsOrdinaryUser user(directory.path(), home->path());
    writeFile(path("closed/file"), "x");
    setMode(path("closed"), 0500);
    const KnownLeaks knownLeaks;
    const auto place = manager->trashItem(url("closed/file"));
    ASSERT_FALSE(place);
    EXPECT_EQ(place.error().code(), EACCES);
    EXPECT_TRUE(exists(path("closed/file")));
}

}  // namespace
}  // namespace pinwell::test
