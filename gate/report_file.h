// Where a document of the run goes: a file, or standard output.
#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "foundation/file_io.h"

namespace pinwell::gate {

/// Is opened before any artefact is read, since a confined process opens nothing more. What a file held stays
/// until the document is there to replace it, so that a run which is interrupted, or which finds that the
/// file is an artefact, has lost nothing.
class ReportFile {
  public:
    /// Empty: standard output.
    explicit ReportFile(std::string path) : path_(std::move(path)) {}

    /// Opens the file, or makes it. Returns what is wrong, if something is.
    std::optional<std::string> open();

    /// The first of `paths` that is this file, by any name; `nullptr` if none is. Never for devices and
    /// pipes.
    const std::string* amongst(const std::vector<std::string>& paths) const;

    /// Whether both are one file. Never for devices and pipes.
    bool isSameAs(const ReportFile& other) const;

    /// Writes all of the document, in the place of what was there. A reader that has gone away is no error.
    /// Returns what is wrong, if something is.
    std::optional<std::string> write(std::string_view document);

  private:
    std::string path_;
    foundation::FileDescriptor file_;
};

/// The first of `directories` that a file at `path` would be in, directly or deeper; `nullptr` if none.
const std::string* directoryAround(const std::string& path, const std::vector<std::string>& directories);

}  // namespace pinwell::gate
