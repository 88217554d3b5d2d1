// The artefacts of the test vectors (tests/vectors), made once for a program. Tests only read them.
#pragma once

#include <string>
#include <vector>

#include "support/temporary_directory.h"
#include "values/value.h"

namespace pinwell::test {

struct Vector {
    values::Value expected;
    std::string path;
};

class VectorArtefacts {
  public:
    /// Made by the first call; throws if they cannot be made.
    static const VectorArtefacts& shared();

    const std::vector<Vector>& all() const noexcept { return vectors_; }

    /// The path of the artefact of the vector with this name; throws if there is none.
    const std::string& named(std::string_view name) const;

    /// The platform directory that their tickets are judged by.
    static std::string platform();

  private:
    VectorArtefacts();

    TemporaryDirectory directory_;
    std::vector<Vector> vectors_;
};

}  // namespace pinwell::test
