// The names of foundation/value.h, for headers that only pass values on. So an edit of value.h rebuilds only
// sources that read values.
#pragma once

#include <functional>
#include <map>
#include <string>
#include <vector>

namespace pinwell::foundation {

class Value;

using Array = std::vector<Value>;
using Dictionary = std::map<std::string, Value, std::less<>>;

}  // namespace pinwell::foundation
