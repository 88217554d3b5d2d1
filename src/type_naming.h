// What joins the file manager to the type service: main puts it into the one, and neither knows the other.
#pragma once

#include "files/file_manager.h"
#include "types/type_service.h"

namespace pinwell {

/// The type of an item, from what the file manager found out about it.
files::ItemType nameType(types::TypeService& types, const files::ItemFacts& facts);

}  // namespace pinwell
