#include "values/bundle.h"

#include <gtest/gtest.h>
#include <sys/stat.h>

#include <filesystem>
#include <stdexcept>

#include "support/temporary_directory.h"
#include "values/property_list.h"
#include "values/value.h"

namespace pinwell::values {
namespace {

// One bundle, made file by file.
class SampleBundle {
  public:
    explicit SampleBundle(std::string_view name) : path_(directory_ / name) {
        std::filesystem::create_directory(path_);
    }

    const std::string& path() const { return path_; }
    std::string operator/(std::string_view name) const { return path_ + "/" + std::string(name); }

    SampleBundle& file(std::string_view name, std::string_view contents = "x") {
        test::writeFile(*this / name, contents);
        return *this;
    }
    SampleBundle& program(std::string_view name, mode_t executeBits = S_IXUSR) {
        file(name);
        const std::string path = *this / name;
        if (chmod(path.c_str(), S_IRUSR | S_IWUSR | executeBits) != 0) throw std::runtime_error(path);
        return *this;
    }
    SampleBundle& list(std::string_view name, const Value& executable) {
        return file(name,
                    base::toString(*serializePropertyList(Dictionary{{"CFBundleExecutable", executable}})));
    }
    SampleBundle& link(std::string_view name, const std::string& target) {
        std::filesystem::create_directories(std::filesystem::path(*this / name).parent_path());
        std::filesystem::create_symlink(target, *this / name);
        return *this;
    }

    std::optional<std::string> mainExecutable() const { return mainExecutableOfBundle(path_); }

  private:
    test::TemporaryDirectory directory_;
    std::string path_;
};

TEST(Bundle, HasTheExecutableThatItsPropertyListNames) {
    SampleBundle bundle("Sample.app");
    bundle.list("Contents/Info.plist", "tool").file("Contents/MacDir/tool").file("Contents/MacDir/Sample");
    EXPECT_EQ(bundle.mainExecutable(), bundle / "Contents/MacDir/tool");
}

TEST(Bundle, ReadsABinaryPropertyList) {
    SampleBundle bundle("Sample.app");
    // {"CFBundleExecutable": "tool"}: the objects at 8, 11 and 32, and the offset table at 37.
    std::string list(
        "bplist00\xD1\x01\x02\x5F\x10\x12"
        "CFBundleExecutable"
        "\x54tool"
        "\x08\x0B\x20",
        40);
    list += std::string(6, '\0') + std::string("\1\1", 2);
    for (const char number : {'\x03', '\0', '\x25'}) list += std::string(7, '\0') + number;
    ASSERT_TRUE(parsePropertyList(base::asBytes(list)));
    bundle.file("Contents/Info.plist", list).file("Contents/D/tool");
    EXPECT_EQ(bundle.mainExecutable(), bundle / "Contents/D/tool");
}

TEST(Bundle, FallsBackOnItsOwnName) {
    SampleBundle bundle("Sample.app");
    bundle.file("Contents/Anything/Sample");
    EXPECT_EQ(bundle.mainExecutable(), bundle / "Contents/Anything/Sample");
}

TEST(Bundle, FallsBackOnItsOwnNameWhenThePropertyListNamesNothing) {
    for (const Value& name :
         {Value("../../etc/passwd"), Value(".."), Value("."), Value(""), Value(5), Value("a/b")}) {
        SampleBundle bundle("Sample.app");
        bundle.list("Contents/Info.plist", name).file("Contents/D/Sample").file("Contents/D/a/b");
        EXPECT_EQ(bundle.mainExecutable(), bundle / "Contents/D/Sample");
    }
}

TEST(Bundle, FallsBackOnItsOwnNameWhenThePropertyListIsMalformed) {
    SampleBundle bundle("Sample.app");
    bundle.file("Contents/Info.plist", "junk")
        .list("Info.plist", "other")
        .file("Contents/D/Sample")
        .file("Contents/D/other");
    EXPECT_EQ(bundle.mainExecutable(), bundle / "Contents/D/Sample");
}

TEST(Bundle, LooksForItsPropertyListInOrder) {
    SampleBundle bundle("Sample.app");
    bundle.list("Info.plist", "third").file("third").file("second").file("first");
    EXPECT_EQ(bundle.mainExecutable(), bundle / "third");
    bundle.list("Resources/Info.plist", "second");
    EXPECT_EQ(bundle.mainExecutable(), bundle / "second");
    bundle.list("Contents/Info.plist", "first").file("Contents/D/first");
    EXPECT_EQ(bundle.mainExecutable(), bundle / "Contents/D/first");
}

TEST(Bundle, HasNoneWhenTheNamedFileIsMissing) {
    SampleBundle bundle("Sample.app");
    bundle.list("Contents/Info.plist", "tool").file("Contents/D/Sample");
    EXPECT_EQ(bundle.mainExecutable(), std::nullopt);
}

TEST(Bundle, HasNoneIfTwoFilesCouldBeIt) {
    SampleBundle bundle("Sample.app");
    bundle.file("Contents/a/Sample");
    EXPECT_EQ(bundle.mainExecutable(), bundle / "Contents/a/Sample");
    bundle.file("Contents/b/Sample");
    EXPECT_EQ(bundle.mainExecutable(), std::nullopt);
}

TEST(Bundle, HasNoneIfTwoExecutableFilesCouldBeIt) {
    SampleBundle bundle("Sample.app");
    bundle.program("Contents/a/Sample").program("Contents/b/Sample").file("Contents/c/Sample");
    EXPECT_EQ(bundle.mainExecutable(), std::nullopt);
}

TEST(Bundle, CountsFilesWithoutExecuteBitOnlyIfNoneHasOne) {
    for (const mode_t bit : {mode_t{S_IXUSR}, mode_t{S_IXGRP}, mode_t{S_IXOTH}}) {
        SampleBundle bundle("Sample.app");
        bundle.file("Contents/a/Sample").file("Contents/c/Sample").program("Contents/b/Sample", bit);
        EXPECT_EQ(bundle.mainExecutable(), bundle / "Contents/b/Sample") << bit;
    }
}

TEST(Bundle, CountsNoLinkAmongTheFilesThatCouldBeItsExecutable) {
    SampleBundle bundle("Sample.app");
    bundle.file("Contents/a/Sample").link("Contents/b/Sample", "../a/Sample").link("Contents/c", "a");
    EXPECT_EQ(bundle.mainExecutable(), bundle / "Contents/a/Sample");
}

TEST(Bundle, LooksOnlyInDirectSubDirectoriesOfContents) {
    SampleBundle bundle("Sample.app");
    bundle.file("Contents/Sample").file("Contents/a/b/Sample").file("Sample");
    EXPECT_EQ(bundle.mainExecutable(), std::nullopt);
}

TEST(Bundle, WithoutContentsHasItsExecutableInTheRoot) {
    SampleBundle bundle("Sample.bundle");
    bundle.file("Sample");
    EXPECT_EQ(bundle.mainExecutable(), bundle / "Sample");
}

TEST(Bundle, DoesNotTakeALinkForItsExecutable) {
    SampleBundle bundle("Sample.app");
    bundle.link("Contents/D/Sample", "/bin/sh");
    EXPECT_EQ(bundle.mainExecutable(), std::nullopt);
}

TEST(Bundle, DoesNotLookThroughALinkForItsExecutable) {
    SampleBundle bundle("Sample.app");
    bundle.file("elsewhere/Sample").link("Contents/D", "../elsewhere");
    EXPECT_EQ(bundle.mainExecutable(), std::nullopt);
}

TEST(Bundle, DoesNotTakeADirectoryOrAPipeForItsExecutable) {
    SampleBundle bundle("Sample.app");
    bundle.file("Contents/a/Sample/x").file("Contents/b/x");
    ASSERT_EQ(mkfifo((bundle / "Contents/b/Sample").c_str(), 0600), 0);
    EXPECT_EQ(bundle.mainExecutable(), std::nullopt);
}

TEST(Bundle, DoesNotWaitForAPipeInPlaceOfItsPropertyList) {
    SampleBundle bundle("Sample.app");
    bundle.file("Contents/D/Sample");
    ASSERT_EQ(mkfifo((bundle / "Contents/Info.plist").c_str(), 0600), 0);
    EXPECT_EQ(bundle.mainExecutable(), bundle / "Contents/D/Sample");
}

TEST(Framework, IsLookedAtThroughItsCurrentVersion) {
    SampleBundle bundle("Kit.framework");
    bundle.file("Versions/A/Kit").file("Versions/A/tool").list("Versions/A/Resources/Info.plist", "tool");
    bundle.link("Versions/Current", "A");
    EXPECT_EQ(bundle.mainExecutable(), bundle / "Versions/Current/tool");
}

TEST(Framework, FallsBackOnItsOwnName) {
    SampleBundle bundle("Kit.framework");
    bundle.file("Versions/A/Kit").link("Versions/Current", "A");
    EXPECT_EQ(bundle.mainExecutable(), bundle / "Versions/Current/Kit");
}

TEST(Framework, WithALinkThatLeadsNowhereIsAFlatBundle) {
    SampleBundle bundle("Kit.framework");
    bundle.file("Kit").link("Versions/Current", "missing");
    EXPECT_EQ(bundle.mainExecutable(), bundle / "Kit");
}

// Another bundle beside the one under test, for links to lead to.
class LinkedBundle : public SampleBundle {
  public:
    LinkedBundle() : SampleBundle("Sample.app") {
        file("../Other.app/Contents/D/Sample").list("../Other.app/Contents/Info.plist", "tool");
        file("../Other.app/Contents/D/tool").file("../Other.app/Versions/A/Sample");
    }
};

TEST(LinkOutOfABundle, InPlaceOfContentsMakesItAFlatBundle) {
    LinkedBundle bundle;
    bundle.link("Contents", "../Other.app/Contents").file("Sample");
    EXPECT_EQ(bundle.mainExecutable(), bundle / "Sample");
}

TEST(LinkOutOfABundle, InPlaceOfContentsLeadsToNoExecutable) {
    LinkedBundle relative;
    EXPECT_EQ(relative.link("Contents", "../Other.app/Contents").mainExecutable(), std::nullopt);
    LinkedBundle absolute;
    EXPECT_EQ(absolute.link("Contents", absolute / "../Other.app/Contents").mainExecutable(), std::nullopt);
}

TEST(LinkOutOfABundle, InPlaceOfTheCurrentVersionMakesItNoFramework) {
    LinkedBundle bundle;
    bundle.link("Versions/Current", "../../Other.app/Versions/A").file("Sample");
    EXPECT_EQ(bundle.mainExecutable(), bundle / "Sample");
}

TEST(LinkOutOfABundle, InPlaceOfThePropertyListHidesIt) {
    LinkedBundle bundle;
    bundle.link("Contents/Info.plist", "../../Other.app/Contents/Info.plist");
    bundle.file("Contents/D/tool").file("Contents/D/Sample");
    EXPECT_EQ(bundle.mainExecutable(), bundle / "Contents/D/Sample");
}

TEST(LinkOutOfABundle, InPlaceOfThePropertyListLeavesTheNextOne) {
    LinkedBundle bundle;
    bundle.link("Contents/Info.plist", "../../Other.app/Contents/Info.plist").list("Info.plist", "second");
    bundle.file("Contents/D/tool").file("Contents/D/second");
    EXPECT_EQ(bundle.mainExecutable(), bundle / "Contents/D/second");
}

TEST(LinkOutOfABundle, InPlaceOfTheResourcesHidesThePropertyListInThem) {
    LinkedBundle bundle;
    bundle.link("Resources", "../Other.app/Contents").file("tool").file("Sample");
    EXPECT_EQ(bundle.mainExecutable(), bundle / "Sample");
}

TEST(LinkInABundle, ThatStaysInItIsFollowed) {
    LinkedBundle bundle;
    bundle.file("Real/D/tool").list("lists/Info.plist", "tool");
    bundle.link("Real/Info.plist", "../lists/Info.plist").link("Contents", "Real");
    EXPECT_EQ(bundle.mainExecutable(), bundle / "Contents/D/tool");
}

TEST(Bundle, IsADirectory) {
    SampleBundle bundle("Sample.app");
    bundle.file("file");
    EXPECT_EQ(mainExecutableOfBundle(bundle / "file"), std::nullopt);
    EXPECT_EQ(mainExecutableOfBundle(bundle / "nothing"), std::nullopt);
    EXPECT_EQ(mainExecutableOfBundle(bundle.path()), std::nullopt);
    EXPECT_EQ(mainExecutableOfBundle("/"), std::nullopt);
}

}  // namespace
}  // namespace pinwell::values
