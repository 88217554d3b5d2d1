#include "gate/render.h"

namespace pinwell::gate {

std::string render(Format kind, const std::vector<Result>& results) {
    switch (kind) {
        case Format::text:
            return renderText(results);
        case Format::json:
            return renderJson(results);
        case Format::sarif:
            return renderSarif(results);
        case Format::junit:
            return renderJUnit(results);
        case Format::html:
            break;
    }
    return renderHtml(results);
}

}  // namespace pinwell::gate
