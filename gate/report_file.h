// The output of a document: a file, or standard output.
#pragma once

#include <string>
#include <string_view>
#include <vector>

#include "base/error.h"
#include "base/handle.h"

namespace pinwell::gate {

/// Errors name the file: their reason is a line for people. Opened before any artefact is read, because a
/// confined process can open no more files. The old contents stay until the document replaces them. So
/// nothing is lost if the run is interrupted, or if the file turns out to be an artefact.
class ReportFile {
  public:
    /// Empty: standard output.
    explicit ReportFile(std::string path) : path_(std::move(path)) {}

    /// Opens or creates the file.
    base::Result<void> open();

    /// The first of `paths` that is this file, by any name; `nullptr` if none is. Always `nullptr` for
    /// devices and pipes.
    const std::string* amongst(const std::vector<std::string>& paths) const;

    /// Whether both are one file. Always false for devices and pipes.
    bool isSameAs(const ReportFile& other) const;

    /// Replaces the contents by the document. A closed pipe is not an error.
    base::Result<void> write(std::string_view document);

  private:
    std::string path_;
    base::FileDescriptor file_;
};

/// The first of `directories` that would contain a file at `path`, at any depth; `nullptr` if none.
const std::string* directoryAround(const std::string& path, const std::vector<std::string>& directories);

}  // namespace pinwell::gate
