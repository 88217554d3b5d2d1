// The artefacts of a tree, as trees are found: with links, cycles, special files and thousands of others.
#include "gate/find.h"

#include <gmock/gmock.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <unistd.h>

#include <cstring>
#include <filesystem>

#include "base/handle.h"
#include "gate_fixture.h"
#include "support/disk_image_builder.h"
#include "support/executable_image_builder.h"

namespace pinwell::test {
namespace {

using gate::FoundArtefacts;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;

namespace fs = std::filesystem;

class TreeOfArtefacts : public GateTest {
  protected:
    TreeOfArtefacts() { fs::create_directory(tree); }

    std::string imageAt(const std::string& below) const {
        writeFile(tree + "/" + below, DiskImageBuilder().build());
        return tree + "/" + below;
    }

    const std::string tree = directory / "tree";
};

TEST_F(TreeOfArtefacts, IsWalkedInTheOrderOfItsNames) {
    const std::string second = imageAt("b/a.dmg");
    const std::string first = imageAt("a.dmg");
    const std::string third = imageAt("b.dmg");
    writeFile(tree + "/text", std::string_view("text\n"));
    writeFile(tree + "/program", ExecutableImageBuilder().build());
    BundleBuilder().write(tree + "/Sample.app");
    const FoundArtefacts found = find(tree);
    EXPECT_THAT(found.paths, ElementsAre(tree + "/Sample.app", first, second, third, tree + "/program"));
    EXPECT_THAT(found.problem, IsEmpty());
}

TEST_F(TreeOfArtefacts, IsFollowedByTheLinkThatIsNamed) {
    imageAt("a.dmg");
    fs::create_directory_symlink(tree, directory / "link");
    EXPECT_THAT(find(directory / "link").paths, ElementsAre(directory / "link/a.dmg"));
}

TEST_F(TreeOfArtefacts, IsNotLeftByLinksInIt) {
    const std::string image = imageAt("a.dmg");
    writeFile(directory / "outside/b.dmg", DiskImageBuilder().build());
    fs::create_symlink(directory / "outside/b.dmg", tree + "/link.dmg");
    fs::create_directory_symlink(directory / "outside", tree + "/outside");
    fs::create_directory_symlink("..", tree + "/cycle");
    fs::create_directory_symlink("self", tree + "/self");
    const FoundArtefacts found = find(tree);
    EXPECT_THAT(found.paths, ElementsAre(image));
    EXPECT_THAT(found.problem, IsEmpty());
}

TEST_F(TreeOfArtefacts, MayHoldSpecialFiles) {
    const std::string image = imageAt("z.dmg");
    ASSERT_EQ(mkfifo((tree + "/fifo.dmg").c_str(), 0600), 0);
    const base::FileDescriptor socket(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0));
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    const std::string path = tree + "/socket.dmg";
    ASSERT_LT(path.size(), sizeof address.sun_path);
    std::memcpy(address.sun_path, path.c_str(), path.size() + 1);
    ASSERT_EQ(::bind(socket.get(), reinterpret_cast<const sockaddr*>(&address), sizeof address), 0);
    const FoundArtefacts found = find(tree);
    EXPECT_THAT(found.paths, ElementsAre(image));
    EXPECT_THAT(found.problem, IsEmpty());
}

TEST_F(TreeOfArtefacts, MayHoldNamesThatAreNoText) {
    const std::string image = imageAt("\xff\xc3\x28\n\x1b.dmg");
    EXPECT_THAT(find(tree).paths, ElementsAre(image));
}

TEST_F(TreeOfArtefacts, HasAProblemIfADirectoryCannotBeRead) {
    if (geteuid() == 0) GTEST_SKIP() << "the superuser can read it";
    const std::string image = imageAt("a.dmg");
    fs::create_directory(tree + "/closed");
    fs::permissions(tree + "/closed", fs::perms::none);
    const FoundArtefacts found = find(tree);
    fs::permissions(tree + "/closed", fs::perms::owner_all);
    EXPECT_THAT(found.paths, ElementsAre(image));
    EXPECT_THAT(found.problem, HasSubstr(tree + "/closed"));
}

TEST_F(TreeOfArtefacts, HasAProblemIfItIsTooDeep) {
    std::string below;
    for (unsigned depth = 0; depth < gate::kMaximumTreeDepth; ++depth) below += "d/";
    imageAt(below + "a.dmg");
    const FoundArtefacts found = find(tree);
    EXPECT_THAT(found.paths, IsEmpty());
    EXPECT_THAT(found.problem, HasSubstr("is too deep"));
}

TEST_F(TreeOfArtefacts, MayHoldManyOtherFiles) {
    constexpr int kFiles = 500;
    for (int i = 0; i < kFiles; ++i)
        writeFile(tree + "/file" + std::to_string(i), std::string_view("text\n"));
    const std::string image = imageAt("z.dmg");
    EXPECT_THAT(find(tree).paths, ElementsAre(image));
}

TEST_F(TreeOfArtefacts, IsNoneIfThereIsNothing) {
    EXPECT_THAT(find(tree).paths, IsEmpty());
    EXPECT_THAT(find(directory / "missing").paths, IsEmpty());
}

}  // namespace
}  // namespace pinwell::test
