#include "src/PWHashedFile/file_kind.h"

#include <algorithm>
#include <array>

namespace pinwell {
namespace {

constexpr std::array<std::string_view, 4> kPackageTypes{
    "com.ostrel.vexa-archive",
    "com.ostrel.installer-package-archive",
    "com.ostrel.installer-package",
    "com.ostrel.installer-meta-package",
};

// A plain executable is handled as a bundle: it has a cdhash, but no place for a ticket.
constexpr std::array<std::string_view, 7> kExecutableAndBundleTypes{
    "public.unix-executable",
    "com.ostrel.application",
    "com.ostrel.dashboard-widget",
    "com.ostrel.systempreference.prefpane",
    "com.ostrel.systempreference.screen-saver",
    "com.ostrel.systempreference.screen-slide-saver",
    "com.ostrel.menu-extra",
};

constexpr std::array<std::string_view, 1> kDiskImageTypes{"com.ostrel.disk-image-udif"};
constexpr std::array<std::string_view, 2> kGenericBundleTypes{"com.ostrel.bundle", "com.ostrel.package"};
constexpr std::array<std::string_view, 1> kBundleExtensions{"kext"};

std::string lowerCase(std::string_view text) {
    std::string lower(text);
    for (char& c : lower)
        if (c >= 'A' && c <= 'Z') c = static_cast<char>(c - 'A' + 'a');
    return lower;
}

}  // namespace

files::ItemType nameType(types::TypeService& types, const files::ItemFacts& facts) {
    types::Item item{facts.name, types::ItemKind::other, facts.isExecutable};
    if (facts.isSymbolicLink)
        item.kind = types::ItemKind::symbolicLink;
    else if (facts.isDirectory)
        item.kind = types::ItemKind::directory;
    else if (facts.isRegularFile)
        item.kind = types::ItemKind::regularFile;

    files::ItemType type;
    type.identifier = types.typeIdentifier(item);
    type.localizedDescription = types.localizedDescription(item);
    type.isPackage = types.conforms(type.identifier, "com.ostrel.package");
    type.isApplication = types.conforms(type.identifier, "com.ostrel.application");
    return type;
}

bool itemConformsToUTI(types::TypeService& types, const std::optional<std::string>& identifier,
                       std::span<const std::string_view> set) {
    if (!identifier) return false;
    return std::any_of(set.begin(), set.end(),
                       [&](std::string_view member) { return types.conforms(*identifier, member); });
}

AssessmentClass assessmentClassForUTI(types::TypeService& types, const std::optional<std::string>& identifier,
                                      std::string_view extension) {
    if (itemConformsToUTI(types, identifier, kPackageTypes)) return AssessmentClass::package;
    if (itemConformsToUTI(types, identifier, kExecutableAndBundleTypes)) return AssessmentClass::bundle;
    if (itemConformsToUTI(types, identifier, kDiskImageTypes)) return AssessmentClass::diskImage;
    if (extension.empty()) return AssessmentClass::unknown;

    const bool mayBeBundle = itemConformsToUTI(types, identifier, kGenericBundleTypes) ||
                             (identifier && types.isDynamic(*identifier));
    if (!mayBeBundle) return AssessmentClass::unknown;
    const bool listed = std::find(kBundleExtensions.begin(), kBundleExtensions.end(), lowerCase(extension)) !=
                        kBundleExtensions.end();
    return listed ? AssessmentClass::bundle : AssessmentClass::unknown;
}

std::string_view nameOf(ArtefactKind kind) noexcept {
    switch (kind) {
        case ArtefactKind::none:
            break;
        case ArtefactKind::bundle:
            return "bundle";
        case ArtefactKind::executable:
            return "executable";
        case ArtefactKind::diskImage:
            return "diskImage";
        case ArtefactKind::package:
            return "package";
    }
    return "";
}

}  // namespace pinwell
