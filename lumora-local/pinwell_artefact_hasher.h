// Reads artefacts with the tool's own code, so the service and the tool always use the same name for a
// record.
#pragma once

#include <memory>

#include "lumora-local/artefact.h"

namespace pinwell::lumora {

/// Silences the tool's message functions for the whole process: the Failure has their text.
std::unique_ptr<ArtefactHasher> makePinwellArtefactHasher();

}  // namespace pinwell::lumora
