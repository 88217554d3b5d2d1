#include "types/type_service.h"

#include <algorithm>
#include <optional>

#include "foundation/bytes.h"
#include "types/declarations.h"
#include "types/mime_database.h"

namespace pinwell::types {
namespace {

constexpr std::string_view kDynamicPrefix = "dyn.";
// Types that only the shared MIME database declares: what it calls them, below one name for each kind of item.
constexpr std::string_view kMimeFilePrefix = "public.mime.";
constexpr std::string_view kMimeDirectoryPrefix = "public.mime-directory.";

char lowerCase(char c) { return c >= 'A' && c <= 'Z' ? static_cast<char>(c - 'A' + 'a') : c; }

// The extension in lower case, by the rule that a dot at either end of the name makes none.
std::string extensionOf(std::string_view name) {
    const std::size_t dot = name.rfind('.');
    if (dot == std::string_view::npos || dot == 0 || dot + 1 == name.size()) return {};
    std::string extension(name.substr(dot + 1));
    std::transform(extension.begin(), extension.end(), extension.begin(), lowerCase);
    return extension;
}

// "text/x-c++src" as part of an identifier, which holds letters, digits, dots and hyphens only.
std::string identifierPart(std::string_view mimeType) {
    std::string part(mimeType);
    for (char& c : part) {
        c = lowerCase(c);
        const bool allowed = (c >= 'a' && c <= 'z') || (c >= '0' && c <= '9') || c == '-' || c == '.';
        if (!allowed) c = c == '/' ? '.' : '-';
    }
    return part;
}

class DeclaredTypeService final : public TypeService {
  public:
    std::string typeIdentifier(const Item& item) override {
        if (item.kind == ItemKind::symbolicLink) return "public.symlink";
        if (item.kind == ItemKind::other) return "public.item";
        const bool isDirectory = item.kind == ItemKind::directory;
        const std::string extension = extensionOf(item.name);
        if (extension.empty()) {
            if (isDirectory) return "public.folder";
            return item.isExecutable ? "public.unix-executable" : "public.data";
        }
        if (const auto declared = findExtension(extension, item.kind); !declared.empty()) return std::string(declared);
        if (const auto mimeType = mimeTypeForName(std::string(item.name)))
            return std::string(isDirectory ? kMimeDirectoryPrefix : kMimeFilePrefix) + identifierPart(*mimeType);
        return std::string(kDynamicPrefix) + foundation::toHex(foundation::asBytes(extension));
    }

    std::string localizedDescription(const Item& item) override {
        if (item.kind == ItemKind::symbolicLink) return "alias";
        const std::string extension = extensionOf(item.name);
        if (const auto declared = findExtension(extension, item.kind); !declared.empty())
            return std::string(findType(declared)->description);
        if (item.kind == ItemKind::directory) return "folder";
        if (item.kind == ItemKind::other || extension.empty()) return "document";
        const auto mimeType = mimeTypeForName(std::string(item.name));
        return mimeType ? mimeTypeDescription(*mimeType).value_or("document") : "document";
    }

    bool conforms(std::string_view identifier, std::string_view to) override {
        if (identifier == to) return true;
        if (identifier.starts_with(kMimeFilePrefix)) return conforms("public.data", to);
        if (identifier.starts_with(kMimeDirectoryPrefix)) return conforms("public.directory", to);
        const TypeDeclaration* type = findType(identifier);
        return type != nullptr && std::any_of(type->parents.begin(), type->parents.end(), [&](std::string_view parent) {
                   return !parent.empty() && conforms(parent, to);
               });
    }

    bool isDynamic(std::string_view identifier) override { return identifier.starts_with(kDynamicPrefix); }
};

}  // namespace

std::unique_ptr<TypeService> makeTypeService() { return std::make_unique<DeclaredTypeService>(); }

}  // namespace pinwell::types
