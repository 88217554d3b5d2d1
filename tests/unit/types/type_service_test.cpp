#include "types/type_service.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <set>
#include <string>

namespace pinwell::types {
namespace {

using testing::StartsWith;

Item file(std::string_view name) {
    return {name, ItemKind::regularFile, false};
}
Item executable(std::string_view name) {
    return {name, ItemKind::regularFile, true};
}
Item directory(std::string_view name) {
    return {name, ItemKind::directory, true};
}
Item link(std::string_view name) {
    return {name, ItemKind::symbolicLink, true};
}
Item device(std::string_view name) {
    return {name, ItemKind::other, false};
}

class Types : public testing::Test {
  protected:
    std::string identifier(const Item& item) { return service_->typeIdentifier(item); }
    std::string description(const Item& item) { return service_->localizedDescription(item); }
    bool conforms(std::string_view type, std::string_view to) { return service_->conforms(type, to); }
    bool isDynamic(std::string_view type) { return service_->isDynamic(type); }

  private:
    std::unique_ptr<TypeService> service_ = makeTypeService();
};

TEST_F(Types, OfDirectoriesWithADeclaredExtension) {
    EXPECT_EQ(identifier(directory("a.app")), "com.ostrel.application-bundle");
    EXPECT_EQ(identifier(directory("a.bundle")), "com.ostrel.generic-bundle");
    EXPECT_EQ(identifier(directory("a.plugin")), "com.ostrel.plugin");
    EXPECT_EQ(identifier(directory("a.framework")), "com.ostrel.framework");
    EXPECT_EQ(identifier(directory("a.kext")), "com.ostrel.kernel-extension");
    EXPECT_EQ(identifier(directory("a.wdgt")), "com.ostrel.dashboard-widget");
    EXPECT_EQ(identifier(directory("a.prefpane")), "com.ostrel.systempreference.prefpane");
    EXPECT_EQ(identifier(directory("a.saver")), "com.ostrel.systempreference.screen-saver");
    EXPECT_EQ(identifier(directory("a.slidesaver")), "com.ostrel.systempreference.screen-slide-saver");
    EXPECT_EQ(identifier(directory("a.menu")), "com.ostrel.menu-extra");
    EXPECT_EQ(identifier(directory("a.pkg")), "com.ostrel.installer-package");
    EXPECT_EQ(identifier(directory("a.mpkg")), "com.ostrel.installer-meta-package");
}

TEST_F(Types, OfFilesWithADeclaredExtension) {
    EXPECT_EQ(identifier(file("a.pkg")), "com.ostrel.installer-package-archive");
    EXPECT_EQ(identifier(file("a.mpkg")), "com.ostrel.installer-package-archive");
    EXPECT_EQ(identifier(file("a.vexa")), "com.ostrel.vexa-archive");
    EXPECT_EQ(identifier(file("a.xar")), "com.ostrel.vexa-archive");
    EXPECT_EQ(identifier(file("a.dmg")), "com.ostrel.disk-image-udif");
    EXPECT_EQ(identifier(file("a.iso")), "com.ostrel.disk-image-iso");
    EXPECT_EQ(identifier(file("a.img")), "com.ostrel.disk-image-img");
    EXPECT_EQ(identifier(file("a.cdr")), "com.ostrel.disk-image-cdr");
    EXPECT_EQ(identifier(file("a.sparseimage")), "com.ostrel.disk-image-sparseimage");
}

TEST_F(Types, DisregardTheCaseOfAnExtension) {
    EXPECT_EQ(identifier(directory("A.APP")), "com.ostrel.application-bundle");
    EXPECT_EQ(identifier(file("a.DmG")), "com.ostrel.disk-image-udif");
    EXPECT_EQ(identifier(directory("a.PrefPane")), "com.ostrel.systempreference.prefpane");
    EXPECT_EQ(identifier(file("a.UNKNOWN-extension")), identifier(file("a.unknown-EXTENSION")));
    EXPECT_EQ(identifier(file("a.TXT")), identifier(file("a.txt")));
}

TEST_F(Types, AreBoundToTheKindOfItem) {
    EXPECT_FALSE(conforms(identifier(file("a.app")), "com.ostrel.application"));
    EXPECT_FALSE(conforms(identifier(directory("a.dmg")), "com.ostrel.disk-image"));
    EXPECT_EQ(identifier(device("a.pkg")), "public.item");
    EXPECT_EQ(identifier(device("a.kext")), "public.item");
}

TEST_F(Types, OfLinksAreTheLinksOwn) {
    EXPECT_EQ(identifier(link("a.app")), "public.symlink");
    EXPECT_EQ(identifier(link("a")), "public.symlink");
}

TEST_F(Types, WithoutAnExtension) {
    EXPECT_EQ(identifier(directory("a")), "public.folder");
    EXPECT_EQ(identifier(file("a")), "public.data");
    EXPECT_EQ(identifier(executable("a")), "public.unix-executable");
    EXPECT_EQ(identifier(file(".dmg")), "public.data");
    EXPECT_EQ(identifier(file("dmg")), "public.data");
    EXPECT_EQ(identifier(file("a.")), "public.data");
    EXPECT_EQ(identifier(directory("..")), "public.folder");
    EXPECT_EQ(identifier(directory("")), "public.folder");
}

TEST_F(Types, OfAnExecutableWithAnExtensionFollowItsExtension) {
    EXPECT_EQ(identifier(executable("a.dmg")), "com.ostrel.disk-image-udif");
    EXPECT_FALSE(conforms(identifier(executable("a.txt")), "public.unix-executable"));
}

TEST_F(Types, KnownToTheSharedDatabaseAreDeclared) {
    const std::string text = identifier(file("a.txt"));
    EXPECT_EQ(text, "public.text.plain");
    EXPECT_FALSE(isDynamic(text));
    EXPECT_TRUE(conforms(text, "public.data"));
    EXPECT_FALSE(conforms(text, "public.directory"));
    EXPECT_NE(identifier(file("a.png")), text);
}

TEST_F(Types, KnownToTheSharedDatabaseOnADirectory) {
    const std::string type = identifier(directory("a.txt"));
    EXPECT_FALSE(isDynamic(type));
    EXPECT_TRUE(conforms(type, "public.directory"));
    EXPECT_FALSE(conforms(type, "public.data"));
    EXPECT_FALSE(conforms(type, "com.ostrel.package"));
}

TEST_F(Types, UnknownToAllAreDynamicAndConformToNothingElse) {
    const std::string type = identifier(directory("a.zzunknown"));
    EXPECT_THAT(type, StartsWith("dyn."));
    EXPECT_TRUE(isDynamic(type));
    EXPECT_TRUE(conforms(type, type));
    EXPECT_FALSE(conforms(type, "public.data"));
    EXPECT_FALSE(conforms(type, "public.directory"));
    EXPECT_FALSE(conforms(type, "com.ostrel.bundle"));
}

TEST_F(Types, UnknownToAllDifferWhenTheirExtensionsDo) {
    std::set<std::string> seen;
    for (const std::string_view extension : {"zza", "zzb", "zz-a", "zz_a", "zz a", "zz\xC3\xA9", "zz\xC3\xA8",
                                             "zz\xFF", "zz\x01", "zz%41", "zz41", "7a7a61"})
        EXPECT_TRUE(seen.insert(identifier(file("x." + std::string(extension)))).second) << extension;
}

TEST_F(Types, SurviveHostileExtensions) {
    EXPECT_TRUE(isDynamic(identifier(file("a." + std::string(1'000'000, 'z')))));
    EXPECT_TRUE(isDynamic(identifier(file("a.\xFF\xFE\x80"))));
    EXPECT_TRUE(isDynamic(identifier(file("a.[*?"))));
    EXPECT_TRUE(isDynamic(identifier(file(std::string_view("a.txt\0", 6)))));
    EXPECT_EQ(description(file("a." + std::string(1'000'000, 'z'))), "document");
    EXPECT_EQ(description(file("a.\xFF\xFE\x80")), "document");
}

TEST_F(Types, ConformToThemselvesAndToEveryAncestor) {
    EXPECT_TRUE(conforms("public.data", "public.data"));
    EXPECT_TRUE(conforms("com.ostrel.unheard-of", "com.ostrel.unheard-of"));
    for (const std::string_view parent :
         {"com.ostrel.application", "com.ostrel.bundle", "com.ostrel.package"})
        EXPECT_TRUE(conforms("com.ostrel.application-bundle", parent)) << parent;
    for (const std::string_view type :
         {"com.ostrel.generic-bundle", "com.ostrel.plugin", "com.ostrel.framework"}) {
        EXPECT_TRUE(conforms(type, "com.ostrel.bundle")) << type;
        EXPECT_FALSE(conforms(type, "com.ostrel.package")) << type;
    }
    for (const std::string_view type :
         {"com.ostrel.kernel-extension", "com.ostrel.dashboard-widget",
          "com.ostrel.systempreference.prefpane", "com.ostrel.systempreference.screen-saver",
          "com.ostrel.systempreference.screen-slide-saver", "com.ostrel.menu-extra"}) {
        EXPECT_TRUE(conforms(type, "com.ostrel.bundle")) << type;
        EXPECT_TRUE(conforms(type, "com.ostrel.package")) << type;
        EXPECT_FALSE(conforms(type, "com.ostrel.application")) << type;
    }
    EXPECT_TRUE(conforms("com.ostrel.installer-package", "com.ostrel.package"));
    EXPECT_TRUE(conforms("com.ostrel.installer-meta-package", "com.ostrel.package"));
    EXPECT_FALSE(conforms("com.ostrel.installer-package", "com.ostrel.bundle"));
    EXPECT_TRUE(conforms("com.ostrel.installer-package-archive", "public.data"));
    EXPECT_TRUE(conforms("com.ostrel.vexa-archive", "public.data"));
    EXPECT_TRUE(conforms("com.ostrel.disk-image-udif", "com.ostrel.disk-image"));
    EXPECT_FALSE(conforms("com.ostrel.disk-image-iso", "com.ostrel.disk-image-udif"));
    EXPECT_TRUE(conforms("public.folder", "public.directory"));
    EXPECT_TRUE(conforms("public.unix-executable", "public.executable"));
    EXPECT_TRUE(conforms("public.unix-executable", "public.data"));
    EXPECT_FALSE(conforms("public.data", "public.unix-executable"));
}

TEST_F(Types, ThatAreMissingConformToNothing) {
    EXPECT_FALSE(conforms("", "public.data"));
    EXPECT_FALSE(conforms("public.data", ""));
    EXPECT_FALSE(conforms("", ""));
}

TEST_F(Types, OfAnotherServiceConformToNothing) {
    EXPECT_FALSE(conforms("public.symlink", "public.data"));
    EXPECT_FALSE(conforms("public.item", "public.data"));
    EXPECT_FALSE(conforms("public.anything", "public.data"));
    EXPECT_FALSE(conforms("com.ostrel.unheard-of", "public.data"));
    EXPECT_FALSE(isDynamic("public.data"));
    EXPECT_FALSE(isDynamic(""));
}

TEST_F(Types, AreDescribedByAShortNoun) {
    EXPECT_EQ(description(directory("a")), "folder");
    EXPECT_EQ(description(directory("a.zzunknown")), "folder");
    EXPECT_EQ(description(directory("a.txt")), "folder");
    EXPECT_EQ(description(directory("a.app")), "application");
    EXPECT_EQ(description(directory("a.pkg")), "installer package");
    EXPECT_EQ(description(file("a.mpkg")), "installer package");
    EXPECT_EQ(description(file("a.dmg")), "disk image");
    EXPECT_EQ(description(file("a.ISO")), "disk image");
    EXPECT_EQ(description(link("a.app")), "alias");
    // Later versions of the MIME database begin a description with a capital.
    EXPECT_THAT(description(file("a.txt")), testing::AnyOf("plain text document", "Plain text document"));
    EXPECT_EQ(description(file("a")), "document");
    EXPECT_EQ(description(executable("a")), "document");
    EXPECT_EQ(description(file("a.zzunknown")), "document");
    EXPECT_EQ(description(device("a.txt")), "document");
}

}  // namespace
}  // namespace pinwell::types
