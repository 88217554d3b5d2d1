// A property list, in XML or in the binary form.
#include "values/property_list.h"

#include <algorithm>

#include "base/bytes.h"
#include "target.h"
#include "values/format.h"
#include "values/value.h"

namespace pinwell::fuzz {
namespace {

using values::Value;

// The number of values, and of levels.
struct Extent {
    std::size_t values = 0;
    unsigned depth = 0;
    bool hasReals = false;  // they are written with fewer digits than they have
};

void measure(const Value& value, unsigned depth, Extent& extent) {
    ++extent.values;
    extent.depth = std::max(extent.depth, depth);
    extent.hasReals = extent.hasReals || value.real() != nullptr;
    if (const auto* elements = value.array())
        for (const Value& element : *elements) measure(element, depth + 1, extent);
    if (const auto* members = value.dictionary())
        for (const auto& [key, member] : *members) measure(member, depth + 1, extent);
}

}  // namespace

void examine(ByteView input) {
    const auto value = values::parsePropertyList(input);
    if (!value) return;
    Extent extent;
    measure(*value, 0, extent);
    require(extent.depth <= values::kMaximumPropertyListDepth, "nesting is bounded");
    require(extent.values <= values::kMaximumPropertyListValues, "values are counted");
    static_cast<void>(values::describe(*value));

    const auto written = values::serializePropertyList(*value);
    if (!written || extent.hasReals) return;
    const auto again = values::parsePropertyList(*written);
    require(again && *again == *value, "what is written reads as the same");
}

}  // namespace pinwell::fuzz
