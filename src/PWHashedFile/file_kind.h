// Which kind of hashed file handles a path: decided from its uniform type identifier and extension.
#pragma once

#include <cstdint>
#include <optional>
#include <span>
#include <string>
#include <string_view>

#include "types/type_service.h"

namespace pinwell {

/// The outcome of assessmentClassForUTI.
enum class AssessmentClass : std::int32_t {
    bundle = 0,
    package = 1,
    diskImage = 2,
    unknown = 3,  // the directory test decides
};

/// Whether the type is one of the set or conforms to one; never for a missing type or an empty set.
bool itemConformsToUTI(types::TypeService& types, const std::optional<std::string>& identifier,
                       std::span<const std::string_view> set);

/// `extension` is the path's, possibly empty.
AssessmentClass assessmentClassForUTI(types::TypeService& types, const std::optional<std::string>& identifier,
                                      std::string_view extension);

}  // namespace pinwell
