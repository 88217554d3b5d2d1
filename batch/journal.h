// What an earlier run has done, so that the next one leaves it out.
//
// A text file, appended to as artefacts end, one line in one write. The first line is "pinwell-batch journal
// 1". Each other one has seven fields with a space between them:
//
//   STATUS CAUSE OPERATION SIZE SECONDS.NANOSECONDS RECORDNAME PATH
//
// Size and time of modification are those of the file that carries the ticket, after the run; "-" stands for
// what is not known. The path is absolute; bytes of it that are no printable ASCII, and "%", are "%" and two
// hexadecimal digits. Of several lines for a path the last one counts. A line without its end, as a run that
// was killed may leave it, counts for nothing, and neither does one that is malformed.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <unordered_map>

#include "files/file_manager.h"
#include "foundation/error.h"
#include "foundation/file_io.h"
#include "retrieval/cause.h"

namespace pinwell::batch {

/// What tells a file as it was from the same path later, beside its hash.
struct FileState {
    std::uint64_t size = 0;
    std::int64_t seconds = 0;  // of the modification time
    std::int64_t nanoseconds = 0;

    bool operator==(const FileState&) const = default;
};

struct JournalEntry {
    int exitStatus = 0;
    retrieval::Cause cause = retrieval::Cause::worked;
    std::uint8_t operation = 0;
    std::optional<FileState> state;
    std::string recordName;
};

/// For the coordinator's thread, except find(), which is for all once the journal is open.
class Journal {
  public:
    /// Reads what is there, and makes the file if there is none. An error names the file, also if it is none
    /// of ours: nothing is appended to that.
    static foundation::Result<Journal> open(const std::string& path);

    /// What it says of a path that worked; `nullopt` if it failed, or is not there.
    const JournalEntry* find(const std::string& canonicalPath, std::uint8_t operation) const;

    /// Appends a line. Returns an error if that cannot be written.
    foundation::Result<void> add(const std::string& canonicalPath, const JournalEntry& entry);

    /// Returns when all of it is on stable storage.
    foundation::Result<void> synchronize();

  private:
    Journal(std::string path, foundation::FileDescriptor file)
        : path_(std::move(path)), file_(std::move(file)) {}
    foundation::Result<void> read();
    void readLine(std::string_view line);
    foundation::Result<void> append(std::string_view text);

    std::string path_;
    foundation::FileDescriptor file_;
    bool endsWithinALine_ = false;                          // since a write was cut short
    std::unordered_map<std::string, JournalEntry> worked_;  // by operation and escaped path
};

}  // namespace pinwell::batch
