// The names of foundation/value.h, for headers that only pass values on: an edit of value.h builds again what
// looks into a value, and nothing else.
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
