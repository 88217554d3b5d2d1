#include "vector_artefacts.h"

#include <stdexcept>

#include "support/process.h"
#include "values/json.h"

namespace pinwell::test {

VectorArtefacts::VectorArtefacts() {
    const auto file = values::parseJSON(base::asBytes(readFile(VECTORS_DIRECTORY "/vectors.json")));
    if (!file) throw std::runtime_error(file.error().localizedDescription());
    const ProcessResult made =
        runProcess({.executable = "/usr/bin/python3",
                    .arguments = {VECTORS_DIRECTORY "/make_artefacts.py", directory_ / "vectors"}});
    const auto& vectors = *(*file)["vectors"].array();
    const std::vector<std::string> paths = made.outputLines();
    if (made.exitStatus != 0 || paths.size() != vectors.size()) throw std::runtime_error(made.errors);
    for (std::size_t i = 0; i < paths.size(); ++i) vectors_.push_back({vectors[i], paths[i]});
}

const VectorArtefacts& VectorArtefacts::shared() {
    static const VectorArtefacts artefacts;
    return artefacts;
}

const std::string& VectorArtefacts::named(std::string_view name) const {
    for (const Vector& vector : vectors_)
        if (*vector.expected["name"].string() == name) return vector.path;
    throw std::out_of_range(std::string(name));
}

std::string VectorArtefacts::platform() {
    return VECTORS_DIRECTORY "/platform";
}

}  // namespace pinwell::test
