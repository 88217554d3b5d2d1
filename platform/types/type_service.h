// Uniform type identifiers: what kind of thing a path is, and which kinds are kinds of which.
//
// Stateless but for the shared MIME database, which is loaded on first need. May be used from any thread.
#pragma once

#include <memory>
#include <string>
#include <string_view>

namespace pinwell::types {

enum class ItemKind { regularFile, directory, symbolicLink, other };

/// What is known of an item when its type is asked for.
struct Item {
    std::string_view name;  // last path component
    ItemKind kind = ItemKind::other;
    bool isExecutable = false;  // any execute bit
};

class TypeService {
  public:
    virtual ~TypeService() = default;

    /// The identifier, from the name's extension (case-insensitive) and the kind.
    virtual std::string typeIdentifier(const Item& item) = 0;

    /// A short lower-case English noun, whatever the locale.
    virtual std::string localizedDescription(const Item& item) = 0;

    /// Equal, or declared to conform directly or through parents.
    virtual bool conforms(std::string_view identifier, std::string_view to) = 0;

    /// Made up for an undeclared type.
    virtual bool isDynamic(std::string_view identifier) = 0;
};

/// Whether the freedesktop.org shared MIME database is asked about what this platform does not declare. Its
/// library is opened for that, and reads files that the environment names.
enum class MimeDatabase { asked, leftAlone };

/// The declarations of this platform, and the database behind them. Without it an undeclared type is dynamic,
/// which makes no difference to what kind of artefact something is.
std::unique_ptr<TypeService> makeTypeService(MimeDatabase database = MimeDatabase::asked);

}  // namespace pinwell::types
