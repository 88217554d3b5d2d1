// The files that pinwell-ticket makes: single tickets, and directories of tickets with an index.
//
// The index has the record of each file, and the state of its ticket when it was fetched:
//
//   {"version":1,"tickets":[{"recordName":"2/2/...","file":"2-2-....ticket","sha256":"...",
//                            "fetched":"2026-11-22T02:38:50Z","revoked":false}, ...]}
//
// Sorted by record name. A ticket that is fetched again replaces its entry.
#pragma once

#include <map>
#include <string>
#include <utility>

#include "base/bytes.h"
#include "base/error.h"
#include "retrieval/report.h"
#include "retrieval/ticket_fetch.h"

namespace pinwell::ticket_files {

/// Makes a new file, and returns after it is on stable storage. An existing file stays unchanged (EEXIST).
/// After a failed write there is no file.
base::Result<void> writeNewFile(base::ByteView contents, const std::string& path);

/// The same, but replaces an existing file, completely or not at all.
base::Result<void> replaceFile(base::ByteView contents, const std::string& path);

/// The name of the file with a record's ticket: "2-2-0a1b....ticket".
std::string fileNameOfRecord(const std::string& recordName);

inline constexpr const char* kIndexName = "index.json";
inline constexpr int kIndexVersion = 1;

struct IndexEntry {
    std::string file;     // a name in the directory
    std::string sha256;   // of its bytes, in hexadecimal
    std::string fetched;  // UTC, as in RFC 3339
    bool revoked = false;
};

class Index {
  public:
    /// The directory's index; empty if there is none. Returns an error if the file is no index, or one of a
    /// later version: it must not be overwritten then.
    static base::Result<Index> read(const std::string& directory);

    void set(const std::string& recordName, IndexEntry entry) {
        entries_.insert_or_assign(recordName, std::move(entry));
    }

    base::Result<void> write(const std::string& directory) const;

  private:
    std::map<std::string, IndexEntry> entries_;
};

/// A directory of tickets with its index, as commands fill it.
class TicketDirectory {
  public:
    /// Makes a missing directory, and reads its index. The error names the failed action.
    static base::Result<TicketDirectory> open(const std::string& path);

    /// Writes the ticket to the file of its record, and replaces an earlier one. Adds the result to the
    /// report: the file, a message, and the failure if it could not be written.
    void keep(const retrieval::FetchedTicket& ticket, retrieval::Report& report);

    /// Writes the index. The error names the failed action.
    base::Result<void> close() const;

  private:
    TicketDirectory(std::string path, Index index) : path_(std::move(path)), index_(std::move(index)) {}

    std::string path_;
    Index index_;
};

}  // namespace pinwell::ticket_files
