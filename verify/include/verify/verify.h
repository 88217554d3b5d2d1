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

#include <memory>
#include <string>
#include <string_view>

#include "src/PWHashedFile/PWHashedFile.h"
#include "src/platform.h"
#include "values/url.h"
#include "verify/check.h"
#include "verify/code.h"
#include "verify/workers.h"

namespace pinwell::verify {

using Kind = ArtefactKind;

/// An opened artefact, or the reason why it was not opened. `file` is null if the path cannot be read or is
/// of a kind without tickets: the sentence in `problem` says which.
struct OpenedArtefact {
    std::shared_ptr<PWHashedFile> file;
    Kind kind = Kind::none;
    std::string problem;
};

/// Opens the artefact at `url` like the tool, after checking that it can be read. It has no kind if it is a
/// file of a directory's kind, or an executable file that is not an executable image. The tool's message
/// functions must be silent.
OpenedArtefact openArtefact(const values::URL& url, const Platform& platform);

/// Of every kind except `none`.
struct Subject {
    Kind kind = Kind::none;
    std::string path;
};

struct Report {
    VerifiedCode code;
    Section root;
};

/// Never throws for a fault of the artefact: the checks report it. Throws std::bad_alloc.
Report verifyArtefact(const Subject& subject, Workers& workers);

}  // namespace pinwell::verify
