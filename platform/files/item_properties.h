// Questions about an item itself, none of which opens it. For this folder only.
#pragma once

#include <string>

#include "files/file_manager.h"

namespace pinwell::files {

Result<ResourceProperties> resourcePropertiesOfItem(const URL& item, const TypeNaming& typeNaming);
Result<ItemState> stateOfItemAt(const std::string& path);

Result<bool> itemIsRegularFile(const std::string& path);

}  // namespace pinwell::files
