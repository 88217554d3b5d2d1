// Uniform type identifiers: the type of an item, and the parents of each type.
//
// Stateless except for the shared MIME database, which is loaded on first use. May be used from any thread.
#pragma once

#include <memory>
#include <string>
#include <string_view>

namespace pinwell::types {

enum class ItemKind { regularFile, directory, symbolicLink, other };

/// The known facts about an item whose type is needed.
struct Item {
    std::string_view name;  // last path component
    ItemKind kind = ItemKind::other;
    bool isExecutable = false;  // any execute bit
};

class TypeService {
  public:
    virtual ~TypeService() = default;

    /// The identifier, from the name's extension (case-insensitive) and the kind.
    virtual std::string typeIdentifier(const Item& item) const = 0;

    /// A short lower-case English noun, in every locale.
    virtual std::string localizedDescription(const Item& item) const = 0;

    /// Equal, or declared to conform directly or through parents.
    virtual bool conforms(std::string_view identifier, std::string_view to) const = 0;

    /// Whether the identifier was generated for an undeclared type.
    virtual bool isDynamic(std::string_view identifier) const = 0;
};

/// Whether to use the freedesktop.org shared MIME database for undeclared types. That opens its library,
/// which reads files that the environment names.
enum class MimeDatabase { asked, leftAlone };

/// A service over this platform's declarations, and the database after them. Without the database an
/// undeclared type is dynamic, which does not affect the kind of an artefact.
std::unique_ptr<TypeService> makeTypeService(MimeDatabase database = MimeDatabase::asked);

}  // namespace pinwell::types
