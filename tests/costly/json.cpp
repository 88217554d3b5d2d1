// JSON: responses of the service, platform.json, user defaults.
#include "values/json.h"
#include "base/bytes.h"
#include "costly_input.h"
#include "values/value.h"

namespace pinwell::test {
namespace {

using base::toData;

bool read(const Data& document) {
    return values::parseJSON(document).has_value();
}

std::string number(std::size_t i) {
    return std::to_string(i);
}

/// A list of records, like a response of the service.
Data control(std::size_t length) {
    return toData("[" +
                  filled(
                      [](std::size_t i) {
                          return "{\"recordName\":\"2/2/" + number(i) +
                                 "\",\"fields\":{\"signedTicket\":{\"value\":\"" + std::string(1500, 'A') +
                                 "\",\"type\":\"BYTES\"}}},";
                      },
                      length) +
                  "0]");
}

CostlyInput row(std::string name, std::string cost, bool isTaken,
                std::function<std::string(std::size_t)> make) {
    return {.name = "JSON" + name,
            .cost = std::move(cost),
            .read = read,
            .isTaken = isTaken,
            .costly = [make = std::move(make)](std::size_t length) { return toData(make(length)); },
            .control = control,
            // A value is an object in memory, and the control has few of them: short values take ten times
            // the time of the control.
            .times = 30};
}

}  // namespace

std::vector<CostlyInput> jsonInputs() {
    using Length = std::size_t;
    return {
        row("Lists", "lists inside lists", false, [](Length n) { return filled("[", n); }),
        row("Objects", "objects inside objects", false, [](Length n) { return filled("{\"a\":", n); }),
        row("Zeros", "the shortest values that there are", true,
            [](Length n) { return "[" + filled("0,", n) + "0]"; }),
        row("EmptyLists", "values that take far more room in memory", true,
            [](Length n) { return "[" + filled("[],", n) + "0]"; }),
        row("EmptyObjects", "values that take the most room in memory", true,
            [](Length n) { return "[" + filled("{},", n) + "0]"; }),
        row("Keys", "members of one object", true,
            [](Length n) {
                return "{" + filled([](std::size_t i) { return "\"" + number(i) + "\":0,"; }, n) + "\"\":0}";
            }),
        row("OneKey", "one key, over and over", true,
            [](Length n) { return "{" + filled("\"a\":[0],", n) + "\"a\":0}"; }),
        row("CommonPrefix", "keys that differ in their last characters", true,
            [](Length n) {
                const auto key = [](std::size_t i) {
                    return "\"" + std::string(4096, 'k') + number(i) + "\":0,";
                };
                return "{" + filled(key, n) + "\"\":0}";
            }),
        row("Digits", "digits of one number", false, [](Length n) { return "[" + filled("9", n) + "]"; }),
        row("Fraction", "digits behind the point", true,
            [](Length n) { return "[0." + filled("3", n) + "]"; }),
        row("Exponent", "digits of an exponent", false,
            [](Length n) { return "[1e" + filled("9", n) + "]"; }),
        row("Escapes", "escapes in one text", true,
            [](Length n) { return "[\"" + filled("\\u00e9", n) + "\"]"; }),
        row("Unterminated", "a text without an end, which the parser quotes in its complaint", false,
            [](Length n) { return "[\"" + filled("\xC3\xA9", n); }),
        row("WhiteSpace", "white space", true, [](Length n) { return "[" + filled(" \n", n) + "]"; }),
    };
}

}  // namespace pinwell::test
