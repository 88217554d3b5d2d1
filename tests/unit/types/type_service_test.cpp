#include "types/type_service.h"

#include <gtest/gtest.h>

#include <cstdlib>
#include <string>

namespace pinwell::types {
namespace {

class Types : public testing::Test {
  protected:
    std::string identifier(std::string_view name, ItemKind kind, bool executable = false) {
        return service->typeIdentifier({name, kind, executable});
    }
    std::string description(std::string_view name, ItemKind kind) {
        return service->localizedDescription({name, kind, false});
    }

    std::unique_ptr<TypeService> service = makeTypeService();
};

struct Row {
    const char* name;
    ItemKind kind;
    const char* identifier;
    const char* conformsTo;
};

class DeclaredTypes : public Types, public testing::WithParamInterface<Row> {};

TEST_P(DeclaredTypes, AreFoundByExtensionAndKind) {
    const Row row = GetParam();
    EXPECT_EQ(identifier(row.name, row.kind), row.identifier);
    EXPECT_TRUE(service->conforms(row.identifier, row.conformsTo));
    EXPECT_TRUE(service->conforms(row.identifier, row.identifier));
    EXPECT_FALSE(service->isDynamic(row.identifier));
}

constexpr auto kDirectory = ItemKind::directory;
constexpr auto kFile = ItemKind::regularFile;

INSTANTIATE_TEST_SUITE_P(
    Table, DeclaredTypes,
    testing::Values(
        Row{"a.app", kDirectory, "com.ostrel.application-bundle", "com.ostrel.application"},
        Row{"a.app", kDirectory, "com.ostrel.application-bundle", "com.ostrel.bundle"},
        Row{"a.app", kDirectory, "com.ostrel.application-bundle", "com.ostrel.package"},
        Row{"a.bundle", kDirectory, "com.ostrel.generic-bundle", "com.ostrel.bundle"},
        Row{"a.plugin", kDirectory, "com.ostrel.plugin", "com.ostrel.bundle"},
        Row{"a.framework", kDirectory, "com.ostrel.framework", "com.ostrel.bundle"},
        Row{"a.kext", kDirectory, "com.ostrel.kernel-extension", "com.ostrel.package"},
        Row{"a.wdgt", kDirectory, "com.ostrel.dashboard-widget", "com.ostrel.bundle"},
        Row{"a.prefPane", kDirectory, "com.ostrel.systempreference.prefpane", "com.ostrel.package"},
        Row{"a.saver", kDirectory, "com.ostrel.systempreference.screen-saver", "com.ostrel.bundle"},
        Row{"a.slideSaver", kDirectory, "com.ostrel.systempreference.screen-slide-saver", "com.ostrel.bundle"},
        Row{"a.menu", kDirectory, "com.ostrel.menu-extra", "com.ostrel.package"},
        Row{"a.pkg", kDirectory, "com.ostrel.installer-package", "com.ostrel.package"},
        Row{"a.mpkg", kDirectory, "com.ostrel.installer-meta-package", "com.ostrel.package"},
        Row{"a.pkg", kFile, "com.ostrel.installer-package-archive", "public.data"},
        Row{"a.MPKG", kFile, "com.ostrel.installer-package-archive", "public.data"},
        Row{"a.vexa", kFile, "com.ostrel.vexa-archive", "public.data"},
        Row{"a.xar", kFile, "com.ostrel.vexa-archive", "public.data"},
        Row{"a.dmg", kFile, "com.ostrel.disk-image-udif", "com.ostrel.disk-image"},
        Row{"a.iso", kFile, "com.ostrel.disk-image-iso", "com.ostrel.disk-image"},
        Row{"a.img", kFile, "com.ostrel.disk-image-img", "com.ostrel.disk-image"},
        Row{"a.cdr", kFile, "com.ostrel.disk-image-cdr", "com.ostrel.disk-image"},
        Row{"a.sparseimage", kFile, "com.ostrel.disk-image-sparseimage", "com.ostrel.disk-image"},
        Row{"a", kDirectory, "public.folder", "public.directory"},
        Row{"a", kFile, "public.data", "public.data"}));

TEST_F(Types, AnExecutableWithoutAnExtensionIsAUnixExecutable) {
    EXPECT_EQ(identifier("tool", kFile, true), "public.unix-executable");
    EXPECT_TRUE(service->conforms("public.unix-executable", "public.executable"));
    EXPECT_TRUE(service->conforms("public.unix-executable", "public.data"));
    EXPECT_NE(identifier("tool.txt", kFile, true), "public.unix-executable");
}

TEST_F(Types, AnApplicationsNameOnAFileMakesNoApplication) {
    EXPECT_TRUE(service->isDynamic(identifier("a.app", kFile)));
    EXPECT_TRUE(service->isDynamic(identifier("a.dmg", kDirectory)) ||
                service->conforms(identifier("a.dmg", kDirectory), "public.directory"));
    EXPECT_FALSE(service->conforms(identifier("a.dmg", kDirectory), "com.ostrel.disk-image-udif"));
}

TEST_F(Types, ALinkIsALinkWhateverItsName) {
    EXPECT_EQ(identifier("a.app", ItemKind::symbolicLink), "public.symlink");
    EXPECT_EQ(description("a.app", ItemKind::symbolicLink), "alias");
}

TEST_F(Types, ATypeOfTheMimeDatabaseIsDeclaredAndConformsToData) {
    const std::string text = identifier("notes.txt", kFile);
    EXPECT_TRUE(text.starts_with("public."));
    EXPECT_TRUE(service->conforms(text, "public.data"));
    EXPECT_FALSE(service->conforms(text, "public.directory"));
    EXPECT_FALSE(service->isDynamic(text));
    EXPECT_TRUE(service->conforms(identifier("notes.txt", kDirectory), "public.directory"));
}

TEST_F(Types, AnUnknownExtensionMakesADynamicTypeThatConformsToNothingElse) {
    const std::string dynamic = identifier("a.unheardof", kFile);
    EXPECT_TRUE(service->isDynamic(dynamic));
    EXPECT_TRUE(service->conforms(dynamic, dynamic));
    EXPECT_FALSE(service->conforms(dynamic, "public.data"));
    EXPECT_FALSE(service->conforms(dynamic, "public.item"));
}

TEST_F(Types, DynamicTypesDifferWhereExtensionsDoButNotByCase) {
    EXPECT_EQ(identifier("a.unheardof", kFile), identifier("b.UNHEARDOF", kFile));
    EXPECT_NE(identifier("a.unheardof", kFile), identifier("a.unheardofs", kFile));
    EXPECT_NE(identifier("a.x\xff", kFile), identifier("a.x\xfe", kFile));
}

TEST_F(Types, ADotAtEitherEndOfTheNameMakesNoExtension) {
    EXPECT_EQ(identifier(".app", kDirectory), "public.folder");
    EXPECT_EQ(identifier("app.", kDirectory), "public.folder");
}

TEST_F(Types, AVeryLongExtensionIsAnOrdinaryUnknownOne) {
    EXPECT_TRUE(service->isDynamic(identifier("a." + std::string(250, 'q'), kFile)));
}

TEST_F(Types, UnrelatedTypesDoNotConform) {
    EXPECT_FALSE(service->conforms("com.ostrel.bundle", "com.ostrel.application-bundle"));
    EXPECT_FALSE(service->conforms("com.ostrel.framework", "com.ostrel.package"));
    EXPECT_FALSE(service->conforms("com.example.unheard-of", "public.data"));
    EXPECT_FALSE(service->conforms("", "public.data"));
}

TEST_F(Types, DescriptionsAreShortNouns) {
    EXPECT_EQ(description("things", kDirectory), "folder");
    EXPECT_EQ(description("things.unheardof", kDirectory), "folder");
    EXPECT_EQ(description("a.dmg", kFile), "disk image");
    EXPECT_EQ(description("a.pkg", kFile), "installer package");
    EXPECT_EQ(description("a.mpkg", kDirectory), "installer package");
    EXPECT_EQ(description("a.app", kDirectory), "application");
    EXPECT_EQ(description("notes.txt", kFile), "plain text document");
    EXPECT_EQ(description("a.unheardof", kFile), "document");
    EXPECT_EQ(description("plain", kFile), "document");
}

TEST_F(Types, DescriptionsAreEnglishWhateverTheLocale) {
    for (const char* name : {"LANGUAGE", "LC_ALL", "LANG"}) setenv(name, "de_DE.UTF-8", 1);
    EXPECT_EQ(description("notes.txt", kFile), "plain text document");
    for (const char* name : {"LANGUAGE", "LC_ALL", "LANG"}) unsetenv(name);
}

}  // namespace
}  // namespace pinwell::types
