// Which kind of artefact a hashed file is, for those who look at its bytes.
#pragma once

#include <memory>
#include <optional>
#include <string_view>

#include "foundation/error.h"
#include "foundation/url.h"
#include "src/PWHashedFile/PWHashedFile.h"
#include "verify/verify.h"

namespace pinwell::verify {

/// "bundle", "executable", "diskImage", "package".
std::string_view nameOf(Kind kind);

/// An artefact that was opened, or why it was not. `file` is null if the path cannot be read or is of no kind
/// that carries a ticket: `problem` is a sentence that says which.
struct OpenedArtefact {
    std::shared_ptr<PWHashedFile> file;
    Kind kind = Kind::bundle;
    std::string problem;
};

/// Opens what is at `url` as the tool does, once it is known that it can be read: a file of a kind that is
/// a directory's, or an executable file that is no executable image, is of no kind. The tool's message
/// functions must be silent.
OpenedArtefact openArtefact(const foundation::URL& url, const Platform& platform);

}  // namespace pinwell::verify
