// A JSON document, read and written.
#include "foundation/json.h"

#include "foundation/description.h"
#include "foundation/value.h"
#include "target.h"

namespace pinwell::fuzz {

void examine(ByteView input) {
    const auto value = foundation::parseJSON(input);
    if (!value) {
        require(!value.error().localizedDescription().empty(), "a refusal says why");
        return;
    }
    static_cast<void>(foundation::describe(*value));
    const auto written = foundation::serializeJSON(*value);
    require(written.has_value(), "what is read can be written");
    const auto again = foundation::parseJSON(*written);
    require(again && *again == *value, "what is written reads as the same");
    require(*foundation::serializeJSON(*again) == *written, "there is one way to write a value");
}

}  // namespace pinwell::fuzz
