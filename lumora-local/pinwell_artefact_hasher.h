// Artefacts as the tool itself sees them, so that the service can never name a record differently than the
// tool looks it up.
#pragma once

#include <memory>

#include "lumora-local/artefact.h"

namespace pinwell::lumora {

/// Silences the tool's message functions for the whole process: what they would say is said by the Failure.
std::unique_ptr<ArtefactHasher> makePinwellArtefactHasher();

}  // namespace pinwell::lumora
