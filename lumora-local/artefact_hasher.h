// An artefact for the service: the hash that names its record, and all hashes that its ticket lists.
#pragma once

#include <memory>
#include <string>
#include <vector>

#include "record_name.h"

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

/// Reads artefacts with the tool's own code, so the service and the tool always use the same name for a
/// record. Silences the tool's message functions for the whole process: the Failure has their text. Part of
/// the program only, and not of the service's library.
std::unique_ptr<ArtefactHasher> makePinwellArtefactHasher();

}  // namespace pinwell::lumora
