#include "types/declarations.h"

#include <algorithm>

namespace pinwell::types {
namespace {

constexpr std::string_view kBundle = "com.ostrel.bundle";
constexpr std::string_view kPackage = "com.ostrel.package";

// A parent without its own line has no parents.
constexpr std::array kDeclarations{
    Declaration{"com.ostrel.application-bundle", {kApplication, kBundle, kPackage}},
    Declaration{"com.ostrel.generic-bundle", {kBundle}},
    Declaration{"com.ostrel.plugin", {kBundle}},
    Declaration{"com.ostrel.framework", {kBundle}},
    Declaration{"com.ostrel.kernel-extension", {kBundle, kPackage}},
    Declaration{"com.ostrel.dashboard-widget", {kBundle, kPackage}},
    Declaration{"com.ostrel.systempreference.prefpane", {kBundle, kPackage}},
    Declaration{"com.ostrel.systempreference.screen-saver", {kBundle, kPackage}},
    Declaration{"com.ostrel.systempreference.screen-slide-saver", {kBundle, kPackage}},
    Declaration{"com.ostrel.menu-extra", {kBundle, kPackage}},
    Declaration{"com.ostrel.installer-package", {kPackage}},
    Declaration{"com.ostrel.installer-meta-package", {kPackage}},
    Declaration{"com.ostrel.installer-package-archive", {kData}},
    Declaration{"com.ostrel.vexa-archive", {kData}},
    Declaration{"com.ostrel.disk-image-udif", {kDiskImage}},
    Declaration{"com.ostrel.disk-image-iso", {kDiskImage}},
    Declaration{"com.ostrel.disk-image-img", {kDiskImage}},
    Declaration{"com.ostrel.disk-image-cdr", {kDiskImage}},
    Declaration{"com.ostrel.disk-image-sparseimage", {kDiskImage}},
    Declaration{kFolder, {kDirectory}},
    Declaration{kUnixExecutable, {"public.executable", kData}},
    Declaration{kData, {}},
    Declaration{kSymbolicLink, {}},
    Declaration{kItem, {}},
};

struct Extension {
    std::string_view extension;
    ItemKind kind;
    std::string_view identifier;
};

constexpr std::array kExtensions{
    Extension{"app", ItemKind::directory, "com.ostrel.application-bundle"},
    Extension{"bundle", ItemKind::directory, "com.ostrel.generic-bundle"},
    Extension{"plugin", ItemKind::directory, "com.ostrel.plugin"},
    Extension{"framework", ItemKind::directory, "com.ostrel.framework"},
    Extension{"kext", ItemKind::directory, "com.ostrel.kernel-extension"},
    Extension{"wdgt", ItemKind::directory, "com.ostrel.dashboard-widget"},
    Extension{"prefpane", ItemKind::directory, "com.ostrel.systempreference.prefpane"},
    Extension{"saver", ItemKind::directory, "com.ostrel.systempreference.screen-saver"},
    Extension{"slidesaver", ItemKind::directory, "com.ostrel.systempreference.screen-slide-saver"},
    Extension{"menu", ItemKind::directory, "com.ostrel.menu-extra"},
    Extension{"pkg", ItemKind::directory, "com.ostrel.installer-package"},
    Extension{"mpkg", ItemKind::directory, "com.ostrel.installer-meta-package"},
    Extension{"pkg", ItemKind::regularFile, "com.ostrel.installer-package-archive"},
    Extension{"mpkg", ItemKind::regularFile, "com.ostrel.installer-package-archive"},
    Extension{"vexa", ItemKind::regularFile, "com.ostrel.vexa-archive"},
    Extension{"xar", ItemKind::regularFile, "com.ostrel.vexa-archive"},
    Extension{"dmg", ItemKind::regularFile, "com.ostrel.disk-image-udif"},
    Extension{"iso", ItemKind::regularFile, "com.ostrel.disk-image-iso"},
    Extension{"img", ItemKind::regularFile, "com.ostrel.disk-image-img"},
    Extension{"cdr", ItemKind::regularFile, "com.ostrel.disk-image-cdr"},
    Extension{"sparseimage", ItemKind::regularFile, "com.ostrel.disk-image-sparseimage"},
};

}  // namespace

const Declaration* declarationOf(std::string_view identifier) noexcept {
    const auto* found =
        std::find_if(kDeclarations.begin(), kDeclarations.end(),
                     [&](const Declaration& entry) { return entry.identifier == identifier; });
    return found == kDeclarations.end() ? nullptr : found;
}

std::string_view declaredIdentifier(std::string_view extension, ItemKind kind) noexcept {
    const auto* found = std::find_if(kExtensions.begin(), kExtensions.end(), [&](const Extension& entry) {
        return entry.kind == kind && entry.extension == extension;
    });
    return found == kExtensions.end() ? std::string_view() : found->identifier;
}

}  // namespace pinwell::types
