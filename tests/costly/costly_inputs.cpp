#include <stdexcept>
#include <unordered_set>

#include "costly_input.h"

namespace pinwell::test {
namespace {

std::vector<CostlyInput> allRows() {
    std::vector<CostlyInput> rows;
    for (const auto& group :
         {archiveInputs, artefactInputs, certificateInputs, jsonInputs, propertyListInputs}) {
        std::vector<CostlyInput> more = group();
        rows.insert(rows.end(), std::make_move_iterator(more.begin()), std::make_move_iterator(more.end()));
    }
    std::unordered_set<std::string> names;
    for (const CostlyInput& row : rows)
        if (!names.insert(row.name).second) throw std::logic_error("two rows are called " + row.name);
    return rows;
}

}  // namespace

const std::vector<CostlyInput>& costlyInputs() {
    static const std::vector<CostlyInput> rows = allRows();
    return rows;
}

std::string filled(std::string_view text, std::size_t length) {
    std::string all;
    all.reserve(length + text.size());
    do all += text;
    while (all.size() < length);
    return all;
}

std::string filled(const std::function<std::string(std::size_t)>& make, std::size_t length) {
    std::string all;
    for (std::size_t i = 0; i == 0 || all.size() < length; ++i) all += make(i);
    return all;
}

}  // namespace pinwell::test
