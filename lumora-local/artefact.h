// An artefact for the service: the hash that names its record, and all hashes that its ticket lists.
#pragma once

#include <string>
#include <vector>

#include "lumora-local/record_name.h"

namespace pinwell::lumora {

struct Artefact {
    std::string label;  // its file name
    CodeHash own;       // clients look the artefact up by this hash

    /// `own` first, then the hashes of all slices and of nested code; no duplicates.
    std::vector<CodeHash> hashes;
};

class ArtefactHasher {
  public:
    virtual ~ArtefactHasher() = default;

    /// Reads the artefact at `path`. Blocks. Throws Failure: EX_NOINPUT if there is no file, EX_DATAERR if it
    /// is of no supported kind or has no hash.
    virtual Artefact examine(const std::string& path) = 0;
};

}  // namespace pinwell::lumora
