// The reports on all artefacts of a batch: the summary at the end, and a JUnit report for continuous
// integration systems.
#pragma once

#include <array>
#include <cstdint>
#include <string>
#include <string_view>

#include "base/error.h"
#include "base/handle.h"
#include "retrieval/report.h"

namespace pinwell::batch {

using retrieval::Report;

struct Summary {
    std::string_view operation;
    std::uint64_t total = 0;                  // reports
    std::uint64_t resumed = 0;                // done by an earlier run, and skipped
    std::uint64_t duplicates = 0;             // paths of files that were named before
    std::array<std::uint64_t, 32> byCause{};  // indexed by Cause
    int exitStatus = 0;
    double seconds = 0;

    void count(const Report& report);
    std::uint64_t numberOf(retrieval::Cause cause) const {
        return byCause.at(static_cast<std::size_t>(cause));
    }

    /// Whether every report is a verdict on its artefact.
    bool holdsVerdictsOnly() const;
};

/// "staple" or "validate".
std::string_view nameOfOperation(std::uint8_t operation) noexcept;

/// One line of JSON, without its newline, in the form of docs/batch.schema.json.
std::string asJson(const Summary& summary);

/// One line, without its newline.
std::string asText(const Summary& summary);

/// One test case for each artefact. Writes each at once, to a temporary file beside the report, which
/// replaces the report at the end. An unfinished report is removed.
class JUnitReport {
  public:
    /// Returns an error that names the path if it is not a regular file or cannot be written.
    static base::Result<JUnitReport> begin(const std::string& name);
    JUnitReport(JUnitReport&& other) noexcept;
    JUnitReport& operator=(JUnitReport&&) = delete;
    ~JUnitReport();

    /// The report's path, with a link resolved.
    const std::string& path() const noexcept { return path_; }

    void add(const Report& report);

    /// Returns an error if any of it could not be written.
    base::Result<void> finish(const Summary& summary);

  private:
    JUnitReport(std::string path, std::string temporary, base::FileDescriptor file)
        : path_(std::move(path)), temporary_(std::move(temporary)), file_(std::move(file)) {}
    void write(const std::string& text);
    void flush();

    std::string path_;
    std::string temporary_;  // empty if the report is in place, or moved from
    base::FileDescriptor file_;
    std::string pending_;
    int failure_ = 0;  // errno of the first write that failed
};

}  // namespace pinwell::batch
