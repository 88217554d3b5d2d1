// The types that this platform declares, and their parents.
#pragma once

#include <array>
#include <string_view>

#include "types/type_service.h"

namespace pinwell::types {

inline constexpr std::string_view kFolder = "public.folder";
inline constexpr std::string_view kDirectory = "public.directory";
inline constexpr std::string_view kData = "public.data";
inline constexpr std::string_view kUnixExecutable = "public.unix-executable";
inline constexpr std::string_view kSymbolicLink = "public.symlink";
inline constexpr std::string_view kItem = "public.item";  // a device, a socket, a pipe
inline constexpr std::string_view kApplication = "com.ostrel.application";
inline constexpr std::string_view kDiskImage = "com.ostrel.disk-image";

struct Declaration {
    std::string_view identifier;
    std::array<std::string_view, 3> parents;  // unused ones are empty
};

/// Returns null for an undeclared identifier.
const Declaration* declarationOf(std::string_view identifier) noexcept;

/// The identifier declared for an extension, in lower case, on that kind of item; empty if there is none.
std::string_view declaredIdentifier(std::string_view extension, ItemKind kind) noexcept;

}  // namespace pinwell::types
