// An artefact as the commands that do not staple see it.
#pragma once

#include <memory>
#include <string>
#include <vector>

#include "foundation/bytes.h"
#include "retrieval/report.h"
#include "src/PWHashedFile/PWHashedFile.h"

namespace pinwell::ticket_files {

/// Opened, with what it said meanwhile in the report. The file is null if it could not be read or is of no
/// kind that carries a ticket; the report says which.
struct OpenedArtefact {
    retrieval::Report report;
    std::shared_ptr<PWHashedFile> file;
    std::uint32_t algorithm = 0;
    foundation::Data hash;  // empty if it has none
};

/// `operation` is the command's name. `beforeReading`, if given, is called when the kind is known and nothing
/// has been read; false ends it as notWritable.
OpenedArtefact openArtefact(const std::string& path, std::string_view operation, const Platform& platform,
                            const PWHashedFile::BeforeReading& beforeReading = {});

/// "2-2-0a1b....ticket": the file that a record's ticket is kept in.
std::string fileNameOfRecord(const std::string& recordName);

}  // namespace pinwell::ticket_files
