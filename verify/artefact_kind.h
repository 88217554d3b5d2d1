// The kind of artefact of a hashed file, for checks of its bytes.
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

/// An opened artefact, or the reason why it was not opened. `file` is null if the path cannot be read or is
/// of a kind without tickets: the sentence in `problem` says which.
struct OpenedArtefact {
    std::shared_ptr<PWHashedFile> file;
    Kind kind = Kind::bundle;
    std::string problem;
};

/// Opens the artefact at `url` like the tool, after checking that it can be read. It has no kind if it is a
/// file of a directory's kind, or an executable file that is not an executable image. The tool's message
/// functions must be silent.
OpenedArtefact openArtefact(const foundation::URL& url, const Platform& platform);

}  // namespace pinwell::verify
