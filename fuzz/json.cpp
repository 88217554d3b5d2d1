// A JSON document, read and written.
#include "values/json.h"

#include "target.h"
#include "values/format.h"
#include "values/value.h"

namespace pinwell::fuzz {

void examine(ByteView input) {
    const auto value = values::parseJSON(input);
    if (!value) {
        require(!value.error().localizedDescription().empty(), "a refusal says why");
        return;
    }
    static_cast<void>(values::describe(*value));
    const auto written = values::serializeJSON(*value);
    require(written.has_value(), "what is read can be written");
    const auto again = values::parseJSON(*written);
    require(again && *again == *value, "what is written reads as the same");
    require(*values::serializeJSON(*again) == *written, "there is one way to write a value");
}

}  // namespace pinwell::fuzz
