// Properties of an item itself, read without opening it. For this folder only.
#pragma once

#include "files/posix.h"

namespace pinwell::files {

/// `name` is the last component of the item's path.
Result<ResourceProperties> resourcePropertiesOfItem(const Place& place, const std::string& name,
                                                    const TypeNaming& typeNaming);
Result<ItemState> stateOfItemAt(const Place& place);

Result<bool> itemIsRegularFile(const Place& place);

}  // namespace pinwell::files
