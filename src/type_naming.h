// Connects the file manager to the type service: main passes it to the file manager, and neither knows the
// other.
#pragma once

#include "files/file_manager.h"
#include "types/type_service.h"

namespace pinwell {

/// The type of an item, from the file manager's facts about it.
files::ItemType nameType(types::TypeService& types, const files::ItemFacts& facts);

}  // namespace pinwell
