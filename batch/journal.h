// The journal of finished artefacts: the next run skips them.
//
// A text file. Each artefact that ends appends one line in one write. The first line is "pinwell-batch
// journal 1". Every other line has six fields with a space between them, or two:
//
//   STATUS CAUSE OPERATION STATE RECORDNAME PATH
//   ended OPERATION
//
// STATE identifies the state of the artefact's files (ArtefactRun::filesState); "-" means unknown. PATH is
// absolute; "%" and bytes outside printable ASCII are written as "%" and two hexadecimal digits. If a path
// has several lines, the last one counts. A malformed line is ignored, and so is a line without its end,
// which a killed run may leave.
//
// An "ended" line cancels all earlier lines of its operation: that run was complete, and the next one starts
// from the beginning.
#pragma once

#include <cstdint>
#include <functional>
#include <map>
#include <string>
#include <string_view>
#include <unordered_map>

#include "base/error.h"
#include "base/handle.h"
#include "retrieval/report.h"
#include "selection.h"

namespace pinwell::batch {

/// The identity of an artefact: its path, and the state of its files.
struct JournalItem {
    std::string path;  // canonicalPath()
    std::uint8_t operation = 0;
    std::string filesState;  // without a space; empty if unknown
    std::string recordName;
};

/// For the coordinator's thread. Any thread may call hasDone() on an open journal.
class Journal {
  public:
    /// Reads the file, or creates it. Returns an error that names the file, also if it is not a journal; such
    /// a file is not changed.
    static base::Result<Journal> open(const std::string& path);

    /// Whether the journal, when it was opened, listed this item in this state as successful.
    bool hasDone(const JournalItem& item) const;

    /// Appends the result of an artefact. Returns an error if it cannot be written.
    base::Result<void> add(const JournalItem& item, int exitStatus, retrieval::Cause cause);

    /// Appends an "ended" line, which cancels all earlier lines of the operation.
    base::Result<void> end(std::uint8_t operation);

    /// Returns when the whole journal is on stable storage.
    base::Result<void> synchronize();

  private:
    Journal(std::string path, base::FileDescriptor file) : path_(std::move(path)), file_(std::move(file)) {}
    base::Result<void> read();
    void readLine(std::string_view line);
    base::Result<void> append(std::string_view text);

    std::string path_;
    base::FileDescriptor file_;
    bool endsWithinALine_ = false;  // after an incomplete write

    // From the operation's name and the path, as in the file, to the state and the record's name. As digests,
    // so that a long journal takes some 60 bytes for each path.
    struct FirstHalf {
        std::size_t operator()(const TextDigest& digest) const noexcept { return digest.first; }
    };
    using ByPath = std::unordered_map<TextDigest, TextDigest, FirstHalf>;
    std::map<std::string, ByPath, std::less<>> worked_{{"staple", {}}, {"validate", {}}};
};

}  // namespace pinwell::batch
