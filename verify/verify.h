// Deep verification: from the hash that a ticket lists down to every byte of the artefact.
//
//   Workers workers;
//   const Report report = verifyArtefact({Kind::bundle, "Sample.app"}, workers);
//   if (worstOutcome(report.root) == Outcome::failed) ...
//
// Tickets are not read here. The caller checks that a ticket lists `report.code`.
//
// Reads only. Work is in proportion to the artefact's bytes: each is read once. Memory holds the whole
// signature, and the seal or the table of contents; it does not grow with the other bytes. Several artefacts
// may be verified at once, with the same workers.
#pragma once

#include <string>

#include "verify/check.h"
#include "verify/executable.h"
#include "verify/workers.h"

namespace pinwell::verify {

enum class Kind { bundle, executable, diskImage, package };

struct Subject {
    Kind kind = Kind::bundle;
    std::string path;
};

struct Report {
    VerifiedCode code;
    Section root;
};

/// Never throws for a fault of the artefact: the checks report it. Throws std::bad_alloc.
Report verifyArtefact(const Subject& subject, Workers& workers);

}  // namespace pinwell::verify
