// The types that this platform declares: their identifiers, extensions, parents and descriptions.
//
//   identifier  reverse-DNS, as the tool's lists name them
//   extension   lower case, without the dot; a type without extensions is reached by what the item is
//   parents     what it directly conforms to; conformance is transitive and reflexive
#pragma once

#include <array>
#include <string_view>

#include "types/type_service.h"

namespace pinwell::types {

struct TypeDeclaration {
    std::string_view identifier;
    std::array<std::string_view, 3> parents;
    std::string_view description;
};

struct ExtensionDeclaration {
    std::string_view extension;
    ItemKind kind;
    std::string_view identifier;
};

/// Null when the identifier is not declared.
const TypeDeclaration* findType(std::string_view identifier);

/// The identifier for an extension in lower case on an item of that kind; empty when none is declared.
std::string_view findExtension(std::string_view extension, ItemKind kind);

}  // namespace pinwell::types
