// What an earlier run has done, so that the next one leaves it out.
//
// A text file, appended to as artefacts end, one line in one write. The first line is "pinwell-batch journal
// 1". Each other one has six fields with a space between them, or two:
//
//   STATUS CAUSE OPERATION STATE RECORDNAME PATH
//   ended OPERATION
//
// STATE tells the artefact's files from what is there later (ArtefactRun::filesState); "-" stands for what is
// not known. The path is absolute; bytes of it that are no printable ASCII, and "%", are "%" and two
// hexadecimal digits. Of several lines for a path the last one counts. A line without its end, as a run that
// was killed may leave it, counts for nothing, and neither does one that is malformed.
//
// After an "ended" line, what lines before it say of its operation counts no more: the run had come to its
// end, and the next one begins anew.
#pragma once

#include <cstdint>
#include <functional>
#include <map>
#include <string>
#include <string_view>
#include <unordered_map>

#include "batch/selection.h"
#include "foundation/error.h"
#include "foundation/file_io.h"
#include "retrieval/cause.h"

namespace pinwell::batch {

/// What an artefact was: by path, and by what is at the path.
struct JournalItem {
    std::string path;  // canonicalPath()
    std::uint8_t operation = 0;
    std::string filesState;  // without a space; empty if it is not known
    std::string recordName;
};

/// For the coordinator's thread, except hasDone(), which is for all once the journal is open.
class Journal {
  public:
    /// Reads what is there, and makes the file if there is none. An error names the file, also if it is none
    /// of ours: nothing is appended to that.
    static foundation::Result<Journal> open(const std::string& path);

    /// Whether it was there as it is now when the journal was opened, and had worked.
    bool hasDone(const JournalItem& item) const;

    /// Appends how an artefact ended. Returns an error if that cannot be written.
    foundation::Result<void> add(const JournalItem& item, int exitStatus, retrieval::Cause cause);

    /// Appends that a run has come to its end, and with it all that the journal says of the operation.
    foundation::Result<void> end(std::uint8_t operation);

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
    bool endsWithinALine_ = false;  // since a write was cut short

    // By the operation's name, and by the path as it is in the file: the state and the record's name. As
    // digests, so that a long journal takes some 60 bytes a path.
    struct FirstHalf {
        std::size_t operator()(const TextDigest& digest) const noexcept { return digest.first; }
    };
    using ByPath = std::unordered_map<TextDigest, TextDigest, FirstHalf>;
    std::map<std::string, ByPath, std::less<>> worked_{{"staple", {}}, {"validate", {}}};
};

}  // namespace pinwell::batch
