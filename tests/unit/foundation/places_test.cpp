#include "foundation/places.h"

#include <fcntl.h>
#include <gtest/gtest.h>

#include <cerrno>
#include <filesystem>

#include "support/file_properties.h"
#include "support/temporary_directory.h"

namespace pinwell::foundation {
namespace {

using test::makeDirectory;
using test::makeLink;
using test::readFile;
using test::writeFile;

class HeldPlaces : public testing::Test {
  protected:
    std::string path(std::string_view name) const { return directory_ / name; }

    // The contents read at that place, or the name of the reason for a failure.
    std::string at(std::string_view name) const {
        const auto place = places_.find(path(name));
        if (!place) return place.error().localizedFailureReason();
        const auto file = place->open(O_RDONLY);
        if (!file) return file.error().localizedFailureReason();
        return readFile("/proc/self/fd/" + std::to_string(file->get()));
    }

    test::TemporaryDirectory directory_;
    Places places_;
};

TEST_F(HeldPlaces, FindsItemsThatAreNotHeldAsTheKernelDoes) {
    writeFile(path("real/file"), "there");
    makeLink(path("real"), path("link"));
    EXPECT_EQ(at("link/file"), "there");
    EXPECT_EQ(places_.find(path("none/file")).error().code(), ENOENT);
}

TEST_F(HeldPlaces, DoesNotFollowTheLastLink) {
    writeFile(path("file"), "there");
    makeLink("file", path("link"));
    EXPECT_EQ(places_.find(path("link"))->open(O_RDONLY).error().code(), ELOOP);
    EXPECT_TRUE(S_ISLNK(places_.find(path("link"))->status()->st_mode));
}

TEST_F(HeldPlaces, FindsEverythingBelowAHeldDirectoryFromItsDescriptor) {
    writeFile(path("Held.app/Contents/file"), "held");
    const auto anchor = places_.hold(path("Held.app"));
    ASSERT_TRUE(anchor);

    std::filesystem::rename(path("Held.app"), path("moved"));
    writeFile(path("Held.app/Contents/file"), "another");
    EXPECT_EQ(at("Held.app/Contents/file"), "held");
    EXPECT_TRUE(S_ISDIR(places_.find(path("Held.app"))->status()->st_mode));
}

TEST_F(HeldPlaces, RefusesLinksOutOfAHeldDirectory) {
    writeFile(path("outside/file"), "outside");
    makeDirectory(path("Held.app"));
    makeLink("../outside", path("Held.app/Contents"));
    EXPECT_EQ(at("Held.app/Contents/file"), "outside");

    const auto anchor = places_.hold(path("Held.app"));
    EXPECT_EQ(places_.find(path("Held.app/Contents/file")).error().code(), EXDEV);
    EXPECT_EQ(at("Held.app/../outside/file"), "Invalid cross-device link");
}

TEST_F(HeldPlaces, FindsAHeldFileInTheDirectoryThatWasOpened) {
    writeFile(path("held/file"), "held");
    writeFile(path("other/file"), "another");
    const auto anchor = places_.hold(path("held/file"));
    ASSERT_TRUE(anchor);

    std::filesystem::rename(path("held"), path("moved"));
    makeLink("other", path("held"));
    EXPECT_EQ(at("held/file"), "held");
    // Its siblings are found in the held directory. Deeper paths are resolved again, as they are written.
    writeFile(path("moved/sibling"), "sibling");
    writeFile(path("other/below/file"), "below");
    EXPECT_EQ(at("held/sibling"), "sibling");
    EXPECT_EQ(at("held/below/file"), "below");
}

TEST_F(HeldPlaces, KeepsTheDescriptorOfAnItemThatIsHeldTwice) {
    writeFile(path("held/file"), "held");
    auto first = places_.hold(path("held/file"));
    std::filesystem::rename(path("held"), path("moved"));
    writeFile(path("held/file"), "another");
    const auto second = places_.hold(path("held/file"));
    EXPECT_EQ(*first, *second);
    first = Error::posix(0);
    EXPECT_EQ(at("held/file"), "held");
}

TEST_F(HeldPlaces, LetsGoWithTheLastHolder) {
    writeFile(path("held/file"), "held");
    {
        const auto anchor = places_.hold(path("held/file"));
        std::filesystem::rename(path("held"), path("moved"));
        writeFile(path("held/file"), "another");
        EXPECT_EQ(at("held/file"), "held");
    }
    EXPECT_EQ(at("held/file"), "another");
}

TEST_F(HeldPlaces, FindsFromTheNearestOfSeveral) {
    writeFile(path("outer/inner/file"), "first");
    const auto outer = places_.hold(path("outer"));
    const auto inner = places_.hold(path("outer/inner"));
    std::filesystem::rename(path("outer/inner"), path("moved"));
    writeFile(path("outer/inner/file"), "second");
    EXPECT_EQ(at("outer/inner/file"), "first");
}

TEST_F(HeldPlaces, DoesNotTakeASiblingForSomethingBelow) {
    writeFile(path("Held.app/file"), "held");
    writeFile(path("Held.app2/file"), "sibling");
    const auto anchor = places_.hold(path("Held.app"));
    std::filesystem::remove_all(path("Held.app"));
    EXPECT_EQ(at("Held.app2/file"), "sibling");
}

TEST_F(HeldPlaces, CannotHoldAMissingItem) {
    EXPECT_EQ(places_.hold(path("none")).error().code(), ENOENT);
    EXPECT_EQ(places_.hold(path("none/none")).error().code(), ENOENT);
}

TEST_F(HeldPlaces, HoldsALinkItself) {
    makeDirectory(path("real"));
    makeLink("real", path("Link.app"));
    const auto anchor = places_.hold(path("Link.app"));
    ASSERT_TRUE(anchor);
    EXPECT_FALSE((*anchor)->isTree());
    EXPECT_TRUE(S_ISLNK(places_.find(path("Link.app"))->status()->st_mode));
}

TEST_F(HeldPlaces, HoldsTheRootDirectory) {
    const auto anchor = places_.hold("/");
    ASSERT_TRUE(anchor);
    writeFile(path("file"), "there");
    EXPECT_EQ(at("file"), "there");
}

}  // namespace
}  // namespace pinwell::foundation
