#include "types/type_service.h"

#include <algorithm>
#include <optional>

#include "foundation/bytes.h"
#include "foundation/url.h"
#include "types/declarations.h"
#include "types/mime_database.h"

namespace pinwell::types {
namespace {

constexpr std::string_view kDynamicPrefix = "dyn.";
constexpr std::string_view kPublicPrefix = "public.";
constexpr std::string_view kPublicDirectoryPrefix = "public.directory.";

std::string lowerCaseExtension(std::string_view name) {
    std::string extension(foundation::pathExtensionOfName(name));
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

    std::string typeIdentifier(const Item& item) override {
        if (item.kind == ItemKind::symbolicLink) return std::string(kSymbolicLink);
        if (item.kind == ItemKind::other) return std::string(kItem);
        const std::string extension = lowerCaseExtension(item.name);
        if (extension.empty()) return std::string(identifierWithoutExtension(item));
        if (const auto declared = declaredIdentifier(extension, item.kind); !declared.empty())
            return std::string(declared);
        if (auto mimeType = mimeTypeFor(extension))
            return identifierForMIMEType(std::move(*mimeType), item.kind);
        return std::string(kDynamicPrefix) + foundation::toHex(foundation::asBytes(extension));
    }

    std::string localizedDescription(const Item& item) override {
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

    bool conforms(std::string_view identifier, std::string_view to) override {
        if (identifier.empty() || to.empty()) return false;
        if (identifier == to) return true;
        if (const Declaration* declaration = declarationOf(identifier)) {
            return std::any_of(declaration->parents.begin(), declaration->parents.end(),
                               [&](std::string_view parent) { return conforms(parent, to); });
        }
        const auto parent = parentOfMIMEIdentifier(identifier);
        return parent && conforms(*parent, to);
    }

    bool isDynamic(std::string_view identifier) override { return identifier.starts_with(kDynamicPrefix); }

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
