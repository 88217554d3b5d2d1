// The type of an item, and the kind of hashed file for it. The kind depends on the uniform type identifier
// and the extension.
#pragma once

#include <cstdint>
#include <optional>
#include <span>
#include <string>
#include <string_view>

#include "files/file_manager.h"
#include "types/type_service.h"

namespace pinwell {

/// The type of an item, from the file manager's facts about it. HostPlatform passes it to the file manager:
/// neither that service nor the type service knows the other.
files::ItemType nameType(types::TypeService& types, const files::ItemFacts& facts);

/// The outcome of assessmentClassForUTI.
enum class AssessmentClass : std::int32_t {
    bundle = 0,
    package = 1,
    diskImage = 2,
    unknown = 3,  // the directory test decides
};

/// Whether the type is in the set, or conforms to a type in it. False for a missing type or an empty set.
bool itemConformsToUTI(types::TypeService& types, const std::optional<std::string>& identifier,
                       std::span<const std::string_view> set);

/// `extension` is the path's, possibly empty.
AssessmentClass assessmentClassForUTI(types::TypeService& types, const std::optional<std::string>& identifier,
                                      std::string_view extension);

/// The kind of an artefact in the reports of the companions and the library.
enum class ArtefactKind : std::uint8_t {
    none,  // not known yet, or without tickets
    bundle,
    executable,  // outside a bundle
    diskImage,
    package,
};

/// "bundle", "executable", "diskImage", "package"; empty for `none`.
std::string_view nameOf(ArtefactKind kind) noexcept;

}  // namespace pinwell
