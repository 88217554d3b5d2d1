#include "types/type_service.h"

#include <algorithm>
#include <array>
#include <optional>

#include "base/bytes.h"
#include "base/text.h"
#include "mime_database.h"
#include "values/url.h"

namespace pinwell::types {
namespace {

// The types that this platform declares, and their parents.
constexpr std::string_view kFolder = "public.folder";
constexpr std::string_view kDirectory = "public.directory";
constexpr std::string_view kData = "public.data";
constexpr std::string_view kUnixExecutable = "public.unix-executable";
constexpr std::string_view kSymbolicLink = "public.symlink";
constexpr std::string_view kItem = "public.item";  // a device, a socket, a pipe
constexpr std::string_view kApplication = "com.ostrel.application";
constexpr std::string_view kDiskImage = "com.ostrel.disk-image";
constexpr std::string_view kBundle = "com.ostrel.bundle";
constexpr std::string_view kPackage = "com.ostrel.package";

struct Declaration {
    std::string_view identifier;
    std::array<std::string_view, 3> parents;  // unused ones are empty
};

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

// Returns null for an undeclared identifier.
const Declaration* declarationOf(std::string_view identifier) noexcept {
    const auto* found =
        std::find_if(kDeclarations.begin(), kDeclarations.end(),
                     [&](const Declaration& entry) { return entry.identifier == identifier; });
    return found == kDeclarations.end() ? nullptr : found;
}

// The identifier declared for an extension, in lower case, on that kind of item; empty if there is none.
std::string_view declaredIdentifier(std::string_view extension, ItemKind kind) noexcept {
    const auto* found = std::find_if(kExtensions.begin(), kExtensions.end(), [&](const Extension& entry) {
        return entry.kind == kind && entry.extension == extension;
    });
    return found == kExtensions.end() ? std::string_view() : found->identifier;
}

constexpr std::string_view kDynamicPrefix = "dyn.";
constexpr std::string_view kPublicPrefix = "public.";
constexpr std::string_view kPublicDirectoryPrefix = "public.directory.";

std::string lowerCaseExtension(std::string_view name) {
    std::string extension(values::pathExtensionOfName(name));
    for (char& c : extension)
        if (c >= 'A' && c <= 'Z') c = static_cast<char>(c - 'A' + 'a');
    return extension;
}

std::string_view identifierWithoutExtension(const Item& item) {
    if (item.kind == ItemKind::directory) return kFolder;
    return item.isExecutable ? kUnixExecutable : kData;
}

// "public.text.plain" for a file, "public.directory.text.plain" for a directory.
std::string identifierForMIMEType(std::string mimeType, ItemKind kind) {
    std::replace(mimeType.begin(), mimeType.end(), '/', '.');
    return std::string(kind == ItemKind::directory ? kPublicDirectoryPrefix : kPublicPrefix) + mimeType;
}

// The parent of an identifier made by identifierForMIMEType; `nullopt` for any other.
std::optional<std::string_view> parentOfMIMEIdentifier(std::string_view identifier) {
    if (declarationOf(identifier) != nullptr) return std::nullopt;
    const auto hasTwoParts = [&](std::string_view prefix) {
        if (!identifier.starts_with(prefix)) return false;
        const std::string_view rest = identifier.substr(prefix.size());
        const std::size_t dot = rest.find('.');
        return dot != std::string_view::npos && dot > 0 && dot + 1 < rest.size();
    };
    if (hasTwoParts(kPublicDirectoryPrefix)) return kDirectory;
    if (hasTwoParts(kPublicPrefix)) return kData;
    return std::nullopt;
}

class Service final : public TypeService {
  public:
    explicit Service(MimeDatabase database) : database_(database) {}

    std::string typeIdentifier(const Item& item) const override {
        if (item.kind == ItemKind::symbolicLink) return std::string(kSymbolicLink);
        if (item.kind == ItemKind::other) return std::string(kItem);
        const std::string extension = lowerCaseExtension(item.name);
        if (extension.empty()) return std::string(identifierWithoutExtension(item));
        if (const auto declared = declaredIdentifier(extension, item.kind); !declared.empty())
            return std::string(declared);
        if (auto mimeType = mimeTypeFor(extension))
            return identifierForMIMEType(std::move(*mimeType), item.kind);
        return std::string(kDynamicPrefix) + base::toHex(base::asBytes(extension));
    }

    std::string localizedDescription(const Item& item) const override {
        if (item.kind == ItemKind::symbolicLink) return "alias";
        if (item.kind == ItemKind::other) return "document";
        const std::string extension = lowerCaseExtension(item.name);
        const std::string_view declared = declaredIdentifier(extension, item.kind);
        if (conforms(declared, kDiskImage)) return "disk image";
        if (conforms(declared, kApplication)) return "application";
        if (declared.starts_with("com.ostrel.installer-")) return "installer package";
        if (item.kind == ItemKind::directory) return declared.empty() ? "folder" : "document";
        const auto mimeType = extension.empty() ? std::nullopt : mimeTypeFor(extension);
        return (mimeType ? mimeDescription(*mimeType) : std::nullopt).value_or("document");
    }

    bool conforms(std::string_view identifier, std::string_view to) const override {
        if (identifier.empty() || to.empty()) return false;
        if (identifier == to) return true;
        if (const Declaration* declaration = declarationOf(identifier)) {
            return std::any_of(declaration->parents.begin(), declaration->parents.end(),
                               [&](std::string_view parent) { return conforms(parent, to); });
        }
        const auto parent = parentOfMIMEIdentifier(identifier);
        return parent && conforms(*parent, to);
    }

    bool isDynamic(std::string_view identifier) const override {
        return identifier.starts_with(kDynamicPrefix);
    }

  private:
    std::optional<std::string> mimeTypeFor(const std::string& extension) const {
        return database_ == MimeDatabase::asked ? mimeTypeForExtension(extension) : std::nullopt;
    }

    const MimeDatabase database_;
};

}  // namespace

std::unique_ptr<TypeService> makeTypeService(MimeDatabase database) {
    return std::make_unique<Service>(database);
}

}  // namespace pinwell::types
