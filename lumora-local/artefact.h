// What an artefact is to the service: the hash that names its record, and every hash its ticket vouches for.
#pragma once

#include <string>
#include <vector>

#include "lumora-local/code_hash.h"

namespace pinwell::lumora {

struct Artefact {
    std::string label;  // its file name
    CodeHash own;       // the hash that a client looks it up by

    /// `own` first, then those of all slices and of nested code; no duplicates.
    std::vector<CodeHash> hashes;
};

/// Whether a ticket for an artefact with this own hash can list `hash` as well.
bool canListWith(const CodeHash& own, const CodeHash& hash);

/// Joins an artefact's own hash with whatever else was found in it: no duplicates, and nothing that a ticket
/// with this own hash could not list.
std::vector<CodeHash> hashesForTicket(const CodeHash& own, const std::vector<CodeHash>& found);

class ArtefactHasher {
  public:
    virtual ~ArtefactHasher() = default;

    /// Reads the artefact at `path`. Blocks. Throws Failure: EX_NOINPUT when nothing is there, EX_DATAERR
    /// when it is not one of the supported kinds or has no hash.
    virtual Artefact examine(const std::string& path) = 0;
};

}  // namespace pinwell::lumora
