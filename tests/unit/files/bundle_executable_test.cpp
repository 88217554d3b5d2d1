#include "fixture.h"

namespace pinwell::test {
namespace {

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
