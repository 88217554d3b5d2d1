// Which paths of a list are worked on.
#include "batch/selection.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <filesystem>

#include "support/temporary_directory.h"

namespace pinwell::test {
namespace {

using batch::canonicalPath;
using batch::partOf;
using batch::Selection;
using Choice = Selection::Choice;

TEST(PartOfAList, IsTheSameForEachSpellingOfAPath) {
    for (const std::uint64_t parts : {2U, 3U, 100U}) {
        const auto part = partOf("release/Sample.dmg", parts);
        EXPECT_EQ(partOf("release//Sample.dmg", parts), part);
        EXPECT_EQ(partOf("./release/./Sample.dmg", parts), part) << "of " << parts;
        EXPECT_EQ(partOf("release/x/../Sample.dmg", parts), part);
    }
}

TEST(PartOfAList, IsTheSameOnEveryHostAndInEveryRelease) {
    EXPECT_EQ(partOf("a.dmg", 1), 1U);
    EXPECT_EQ(partOf("a.dmg", 1000), 920U);
    EXPECT_EQ(partOf("release/Sample.app", 1000), 594U);
}

TEST(PartOfAList, IsAboutAsLargeAsTheOthers) {
    std::map<std::uint64_t, int> sizes;
    for (int i = 0; i < 10'000; ++i) ++sizes[partOf("release/Image" + std::to_string(i) + ".dmg", 7)];
    EXPECT_EQ(sizes.size(), 7U);
    for (const auto& [part, size] : sizes) {
        EXPECT_GE(part, 1U);
        EXPECT_LE(part, 7U);
        EXPECT_NEAR(size, 10'000 / 7, 150) << part;
    }
}

class Selections : public testing::Test {
  protected:
    TemporaryDirectory directory;
    Selection selection{1, 1};
};

TEST_F(Selections, TakeAPathOnce) {
    writeFile(directory / "folder/a.dmg", "a");
    std::filesystem::create_directory_symlink("folder", directory / "link");
    EXPECT_EQ(selection.choose(directory / "folder/a.dmg"), Choice::wanted);
    EXPECT_EQ(selection.choose(directory / "folder/a.dmg"), Choice::namedBefore);
    EXPECT_EQ(selection.choose(directory / "folder//a.dmg"), Choice::namedBefore);
    EXPECT_EQ(selection.choose(directory / "link/a.dmg"), Choice::namedBefore);
    EXPECT_EQ(selection.choose(directory / "folder/../folder/a.dmg"), Choice::namedBefore);
    EXPECT_EQ(selection.choose(directory / "folder/b.dmg"), Choice::wanted);
}

TEST_F(Selections, TakeAFolderOnce) {
    std::filesystem::create_directory(directory / "A.app");
    EXPECT_EQ(selection.choose(directory / "A.app"), Choice::wanted);
    EXPECT_EQ(selection.choose(directory / "A.app/"), Choice::namedBefore);
    EXPECT_EQ(selection.choose(directory / "A.app//"), Choice::namedBefore);
}

TEST_F(Selections, TakeAFileOfTwoNamesOnce) {
    writeFile(directory / "a", "a");
    std::filesystem::create_hard_link(directory / "a", directory / "b");
    EXPECT_EQ(selection.choose(directory / "a"), Choice::wanted);
    EXPECT_EQ(selection.choose(directory / "b"), Choice::namedBefore);
    // The first name now has another file, so the second name's file is a different one.
    std::filesystem::remove(directory / "a");
    writeFile(directory / "a", "new");
    std::filesystem::create_hard_link(directory / "b", directory / "c");
    EXPECT_EQ(selection.choose(directory / "c"), Choice::wanted);
}

TEST_F(Selections, TakeALinkForItself) {
    writeFile(directory / "a", "a");
    std::filesystem::create_symlink("a", directory / "link");
    EXPECT_EQ(selection.choose(directory / "a"), Choice::wanted);
    EXPECT_EQ(selection.choose(directory / "link"), Choice::wanted);
}

TEST_F(Selections, TakeAMissingFileOnce) {
    EXPECT_EQ(selection.choose("/no/such/path"), Choice::wanted);
    EXPECT_EQ(selection.choose("/no/such/path"), Choice::namedBefore);
}

TEST_F(Selections, LeaveOtherPartsAlone) {
    std::size_t wanted = 0;
    for (const std::uint64_t part : {1U, 2U, 3U}) {
        Selection one(part, 3);
        for (int i = 0; i < 30; ++i) {
            const Choice choice = one.choose("/nowhere/" + std::to_string(i));
            EXPECT_NE(choice, Choice::namedBefore);
            wanted += choice == Choice::wanted ? 1U : 0U;
        }
    }
    EXPECT_EQ(wanted, 30U);
}

TEST(CanonicalPath, IsAbsoluteAndWithoutLinksAbove) {
    const TemporaryDirectory directory;
    writeFile(directory / "folder/a", "a");
    std::filesystem::create_directory_symlink("folder", directory / "link");
    const std::string real = std::filesystem::canonical(directory.path());
    EXPECT_EQ(canonicalPath(directory / "link/a"), real + "/folder/a");
    EXPECT_EQ(canonicalPath(directory / "link"), real + "/link");
    EXPECT_EQ(canonicalPath(directory / "link/."), real + "/folder");
    EXPECT_EQ(canonicalPath("/"), "/");
    EXPECT_EQ(canonicalPath("/no/such/file"), "/no/such/file");
}

TEST(TextSet, ContainsAddedTexts) {
    batch::TextSet set;
    for (int i = 0; i < 5000; ++i) EXPECT_TRUE(set.add(std::to_string(i)));
    for (int i = 0; i < 5000; ++i) EXPECT_FALSE(set.add(std::to_string(i)));
    EXPECT_EQ(set.size(), 5000U);
    EXPECT_TRUE(set.add(""));
    EXPECT_FALSE(set.add(""));
}

}  // namespace
}  // namespace pinwell::test
