// Deep verification: from the hash that a ticket lists down to every byte of the artefact.
//
//   Workers workers;
//   const Report report = verifyArtefact({Kind::bundle, "Sample.app"}, workers);
//   if (worstOutcome(report.root) == Outcome::failed) ...
//
// No ticket is looked at here. Whoever has one asks whether it lists `report.code`.
//
// Reads only. Work is in proportion to the bytes that the artefact has: each is read once. Memory does not
// grow with them, apart from the signature and the seal or the table of contents, which are held whole.
// Several artefacts may be verified at once, with the same workers.
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

/// Never throws for what is wrong with the artefact: that is what the checks say. Throws std::bad_alloc.
Report verifyArtefact(const Subject& subject, Workers& workers);

}  // namespace pinwell::verify
