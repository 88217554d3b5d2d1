#include <nlohmann/json.hpp>

#include "gate/render.h"

namespace pinwell::gate {

using Json = nlohmann::ordered_json;

std::string renderJson(const std::vector<Result>& results) {
    Json list = Json::array();
    for (const Result& result : results) {
        Json checks = Json::array();
        for (const verify::Check& check : verify::flattened(result.checks))
            checks.push_back({{"name", check.name},
                              {"place", check.place},
                              {"outcome", verify::outcomeName(check.outcome)},
                              {"expected", check.expected},
                              {"found", check.found}});
        list.push_back({{"path", result.path},
                        {"verdict", verdictName(result.verdict)},
                        {"exitStatus", exitStatusOf(result.verdict)},
                        {"checks", std::move(checks)}});
    }
    const Json document{{"version", 1}, {"results", std::move(list)}};
    // File names need not be UTF-8.
    return document.dump(2, ' ', false, Json::error_handler_t::replace) + "\n";
}

}  // namespace pinwell::gate
