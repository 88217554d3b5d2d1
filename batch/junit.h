// A JUnit report for continuous integration systems: one test case for each artefact.
#pragma once

#include <memory>
#include <string>

#include "batch/report.h"
#include "foundation/error.h"
#include "foundation/file_io.h"

namespace pinwell::batch {

/// Writes each test case at once, to a temporary file beside the report, which replaces the report at the
/// end. An unfinished report is removed.
class JUnitReport {
  public:
    /// Returns an error that names the path if it is not a regular file or cannot be written.
    static foundation::Result<JUnitReport> begin(const std::string& name);
    JUnitReport(JUnitReport&& other) noexcept;
    JUnitReport& operator=(JUnitReport&&) = delete;
    ~JUnitReport();

    /// The report's path, with a link resolved.
    const std::string& path() const noexcept { return path_; }

    void add(const Report& report);

    /// Returns an error if any of it could not be written.
    foundation::Result<void> finish(const Summary& summary);

  private:
    JUnitReport(std::string path, std::string temporary, foundation::FileDescriptor file)
        : path_(std::move(path)), temporary_(std::move(temporary)), file_(std::move(file)) {}
    void write(const std::string& text);
    void flush();

    std::string path_;
    std::string temporary_;  // empty if the report is in place, or moved from
    foundation::FileDescriptor file_;
    std::string pending_;
    int failure_ = 0;  // errno of the first write that failed
};

}  // namespace pinwell::batch
