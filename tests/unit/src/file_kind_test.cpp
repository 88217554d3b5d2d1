#include "src/PWHashedFile/file_kind.h"

#include <gtest/gtest.h>

#include <array>
#include <set>

#include "types/type_service.h"

namespace pinwell {
namespace {

class FileKind : public testing::Test {
  protected:
    AssessmentClass classOf(const std::optional<std::string>& identifier, std::string_view extension) {
        return assessmentClassForUTI(*types, identifier, extension);
    }

    std::unique_ptr<types::TypeService> types = types::makeTypeService();
};

TEST_F(FileKind, AnApplicationIsABundle) {
    EXPECT_EQ(classOf("com.ostrel.application-bundle", "app"), AssessmentClass::bundle);
}

TEST_F(FileKind, APlainExecutableIsHandledAsABundle) {
    EXPECT_EQ(classOf("public.unix-executable", ""), AssessmentClass::bundle);
}

TEST_F(FileKind, EveryListedBundleTypeIsABundle) {
    for (const char* identifier :
         {"com.ostrel.application", "com.ostrel.dashboard-widget", "com.ostrel.systempreference.prefpane",
          "com.ostrel.systempreference.screen-saver", "com.ostrel.systempreference.screen-slide-saver",
          "com.ostrel.menu-extra"})
        EXPECT_EQ(classOf(identifier, ""), AssessmentClass::bundle) << identifier;
}

TEST_F(FileKind, InstallerPackagesOfEitherFormAreFlatPackages) {
    for (const char* identifier : {"com.ostrel.installer-package-archive", "com.ostrel.installer-package",
                                   "com.ostrel.installer-meta-package"})
        EXPECT_EQ(classOf(identifier, "pkg"), AssessmentClass::package) << identifier;
}

TEST_F(FileKind, ASignedArchiveOfThePlatformsOwnFormatIsAFlatPackage) {
    EXPECT_EQ(classOf("com.ostrel.vexa-archive", "vexa"), AssessmentClass::package);
}

TEST_F(FileKind, OnlyTheUDIFDiskImageTypeIsADiskImage) {
    EXPECT_EQ(classOf("com.ostrel.disk-image-udif", "dmg"), AssessmentClass::diskImage);
    EXPECT_EQ(classOf("com.ostrel.disk-image-iso", "iso"), AssessmentClass::unknown);
}

TEST_F(FileKind, AGenericBundleNamedKEXTInCapitalsIsABundleByItsExtension) {
    EXPECT_EQ(classOf("com.ostrel.generic-bundle", "KEXT"), AssessmentClass::bundle);
}

TEST_F(FileKind, AGenericPackageIsABundleByItsExtensionAlone) {
    EXPECT_EQ(classOf("com.ostrel.package", "kext"), AssessmentClass::bundle);
    EXPECT_EQ(classOf("com.ostrel.package", "rtfd"), AssessmentClass::unknown);
}

/// Its only type conforms to all types of the test, which no type of the platform does.
class ManifoldType final : public types::TypeService {
  public:
    explicit ManifoldType(std::set<std::string_view> all) : all_(std::move(all)) {}
    std::string typeIdentifier(const types::Item&) const override { return "manifold"; }
    std::string localizedDescription(const types::Item&) const override { return "manifold"; }
    bool conforms(std::string_view, std::string_view to) const override { return all_.contains(to); }
    bool isDynamic(std::string_view) const override { return false; }

  private:
    std::set<std::string_view> all_;
};

TEST(FileKindOfManyTypes, IsAPackageBeforeABundleAndABundleBeforeADiskImage) {
    ManifoldType everything(
        {"com.ostrel.installer-package", "com.ostrel.application", "com.ostrel.disk-image-udif"});
    EXPECT_EQ(assessmentClassForUTI(everything, "manifold", "dmg"), AssessmentClass::package);
    ManifoldType executableImage({"public.unix-executable", "com.ostrel.disk-image-udif"});
    EXPECT_EQ(assessmentClassForUTI(executableImage, "manifold", "dmg"), AssessmentClass::bundle);
    ManifoldType bundledImage({"com.ostrel.disk-image-udif", "com.ostrel.bundle"});
    EXPECT_EQ(assessmentClassForUTI(bundledImage, "manifold", "kext"), AssessmentClass::diskImage);
}

TEST_F(FileKind, ADynamicTypeWithExtensionKextIsABundleThoughItConformsToNothing) {
    const types::Item item{"driver.unheardof", types::ItemKind::directory, false};
    const std::string dynamic = types->typeIdentifier(item);
    ASSERT_TRUE(types->isDynamic(dynamic));
    EXPECT_EQ(classOf(dynamic, "kext"), AssessmentClass::bundle);
    EXPECT_EQ(classOf(dynamic, "unheardof"), AssessmentClass::unknown);
}

TEST_F(FileKind, AFrameworkIsLeftToTheDirectoryTest) {
    EXPECT_EQ(classOf("com.ostrel.framework", "framework"), AssessmentClass::unknown);
    EXPECT_EQ(classOf("com.ostrel.plugin", "plugin"), AssessmentClass::unknown);
}

TEST_F(FileKind, WithoutAnExtensionAGenericBundleIsUnknown) {
    EXPECT_EQ(classOf("com.ostrel.generic-bundle", ""), AssessmentClass::unknown);
}

TEST_F(FileKind, ATextFileIsUnknownEvenWithExtensionKext) {
    EXPECT_EQ(classOf("public.plain-text", "kext"), AssessmentClass::unknown);
    EXPECT_EQ(classOf("public.data", "txt"), AssessmentClass::unknown);
}

TEST_F(FileKind, AMissingTypeFailsEveryConformanceTest) {
    EXPECT_EQ(classOf(std::nullopt, "kext"), AssessmentClass::unknown);
    EXPECT_EQ(classOf(std::nullopt, "app"), AssessmentClass::unknown);
}

TEST_F(FileKind, NothingConformsToAnEmptySet) {
    EXPECT_FALSE(itemConformsToUTI(*types, "com.ostrel.application", {}));
}

TEST_F(FileKind, ATypeConformsToASetThatHoldsItOrOneOfItsParents) {
    const std::array<std::string_view, 2> set{"public.data", "com.ostrel.bundle"};
    EXPECT_TRUE(itemConformsToUTI(*types, "com.ostrel.bundle", set));
    EXPECT_TRUE(itemConformsToUTI(*types, "com.ostrel.application-bundle", set));
    EXPECT_FALSE(itemConformsToUTI(*types, "public.folder", set));
    EXPECT_FALSE(itemConformsToUTI(*types, std::nullopt, set));
}

}  // namespace
}  // namespace pinwell
