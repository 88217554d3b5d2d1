// A JUnit report, as continuous integration systems show it: one test case an artefact.
#pragma once

#include <memory>
#include <string>

#include "batch/report.h"
#include "foundation/error.h"
#include "foundation/file_io.h"

namespace pinwell::batch {

/// Test cases are written as they come, to a file beside the one that is wanted, which takes its place at the
/// end. A report that is not finished is removed.
class JUnitReport {
  public:
    /// An error names what is there and no file, or cannot be written.
    static foundation::Result<JUnitReport> begin(const std::string& name);
    JUnitReport(JUnitReport&& other) noexcept;
    JUnitReport& operator=(JUnitReport&&) = delete;
    ~JUnitReport();

    /// Where it will be: no link, but what the link led to.
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
    std::string temporary_;  // empty once it is in place, or moved from
    foundation::FileDescriptor file_;
    std::string pending_;
    int failure_ = 0;  // errno of the first write that failed
};

/// Text as XML 1.0 has it, in an attribute or between tags. Control characters are escaped as on a terminal.
std::string escapedForXml(const std::string& text);

}  // namespace pinwell::batch
