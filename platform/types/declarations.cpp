#include "types/declarations.h"

#include <algorithm>

namespace pinwell::types {
namespace {

constexpr TypeDeclaration kTypes[] = {
    {"public.item", {}, "document"},
    {"public.data", {"public.item"}, "document"},
    {"public.directory", {"public.item"}, "folder"},
    {"public.folder", {"public.directory"}, "folder"},
    {"public.symlink", {"public.item"}, "alias"},
    {"public.executable", {"public.item"}, "executable"},
    {"public.unix-executable", {"public.executable", "public.data"}, "executable"},

    {"com.ostrel.bundle", {"public.directory"}, "bundle"},
    {"com.ostrel.package", {"public.directory"}, "package"},
    {"com.ostrel.application", {}, "application"},
    {"com.ostrel.application-bundle",
     {"com.ostrel.application", "com.ostrel.bundle", "com.ostrel.package"},
     "application"},
    {"com.ostrel.generic-bundle", {"com.ostrel.bundle"}, "bundle"},
    {"com.ostrel.plugin", {"com.ostrel.bundle"}, "plug-in"},
    {"com.ostrel.framework", {"com.ostrel.bundle"}, "framework"},
    {"com.ostrel.kernel-extension", {"com.ostrel.bundle", "com.ostrel.package"}, "kernel extension"},
    {"com.ostrel.dashboard-widget", {"com.ostrel.bundle", "com.ostrel.package"}, "dashboard widget"},
    {"com.ostrel.systempreference.prefpane", {"com.ostrel.bundle", "com.ostrel.package"}, "preference pane"},
    {"com.ostrel.systempreference.screen-saver", {"com.ostrel.bundle", "com.ostrel.package"}, "screen saver"},
    {"com.ostrel.systempreference.screen-slide-saver",
     {"com.ostrel.bundle", "com.ostrel.package"},
     "screen slide saver"},
    {"com.ostrel.menu-extra", {"com.ostrel.bundle", "com.ostrel.package"}, "menu extra"},

    {"com.ostrel.installer-package", {"com.ostrel.package"}, "installer package"},
    {"com.ostrel.installer-meta-package", {"com.ostrel.package"}, "installer package"},
    {"com.ostrel.installer-package-archive", {"public.data"}, "installer package"},
    {"com.ostrel.vexa-archive", {"public.data"}, "archive"},

    {"com.ostrel.disk-image", {"public.data"}, "disk image"},
    {"com.ostrel.disk-image-udif", {"com.ostrel.disk-image"}, "disk image"},
    {"com.ostrel.disk-image-iso", {"com.ostrel.disk-image"}, "disk image"},
    {"com.ostrel.disk-image-img", {"com.ostrel.disk-image"}, "disk image"},
    {"com.ostrel.disk-image-cdr", {"com.ostrel.disk-image"}, "disk image"},
    {"com.ostrel.disk-image-sparseimage", {"com.ostrel.disk-image"}, "disk image"},
};

constexpr ExtensionDeclaration kExtensions[] = {
    {"app", ItemKind::directory, "com.ostrel.application-bundle"},
    {"bundle", ItemKind::directory, "com.ostrel.generic-bundle"},
    {"plugin", ItemKind::directory, "com.ostrel.plugin"},
    {"framework", ItemKind::directory, "com.ostrel.framework"},
    {"kext", ItemKind::directory, "com.ostrel.kernel-extension"},
    {"wdgt", ItemKind::directory, "com.ostrel.dashboard-widget"},
    {"prefpane", ItemKind::directory, "com.ostrel.systempreference.prefpane"},
    {"saver", ItemKind::directory, "com.ostrel.systempreference.screen-saver"},
    {"slidesaver", ItemKind::directory, "com.ostrel.systempreference.screen-slide-saver"},
    {"menu", ItemKind::directory, "com.ostrel.menu-extra"},
    {"pkg", ItemKind::directory, "com.ostrel.installer-package"},
    {"mpkg", ItemKind::directory, "com.ostrel.installer-meta-package"},
    {"pkg", ItemKind::regularFile, "com.ostrel.installer-package-archive"},
    {"mpkg", ItemKind::regularFile, "com.ostrel.installer-package-archive"},
    {"vexa", ItemKind::regularFile, "com.ostrel.vexa-archive"},
    {"xar", ItemKind::regularFile, "com.ostrel.vexa-archive"},
    {"dmg", ItemKind::regularFile, "com.ostrel.disk-image-udif"},
    {"iso", ItemKind::regularFile, "com.ostrel.disk-image-iso"},
    {"img", ItemKind::regularFile, "com.ostrel.disk-image-img"},
    {"cdr", ItemKind::regularFile, "com.ostrel.disk-image-cdr"},
    {"sparseimage", ItemKind::regularFile, "com.ostrel.disk-image-sparseimage"},
};

}  // namespace

const TypeDeclaration* findType(std::string_view identifier) {
    const auto* found = std::find_if(std::begin(kTypes), std::end(kTypes),
                                     [&](const TypeDeclaration& type) { return type.identifier == identifier; });
    return found == std::end(kTypes) ? nullptr : found;
}

std::string_view findExtension(std::string_view extension, ItemKind kind) {
    const auto* found = std::find_if(
        std::begin(kExtensions), std::end(kExtensions),
        [&](const ExtensionDeclaration& entry) { return entry.extension == extension && entry.kind == kind; });
    return found == std::end(kExtensions) ? std::string_view() : found->identifier;
}

}  // namespace pinwell::types
