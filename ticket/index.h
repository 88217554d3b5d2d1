// The index of a directory of tickets: which record each file is the ticket of, and what was known of it
// then.
//
//   {"version":1,"tickets":[{"recordName":"2/2/...","file":"2-2-....ticket","sha256":"...",
//                            "fetched":"2026-11-22T02:38:50Z","revoked":false}, ...]}
//
// Sorted by record name. A ticket that is fetched again replaces its entry.
#pragma once

#include <map>
#include <string>

#include "foundation/error.h"

namespace pinwell::ticket_files {

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
    /// What the directory's index says; empty if there is none. An error if it is not one, or of a later
    /// version: it is not to be overwritten then.
    static foundation::Result<Index> read(const std::string& directory);

    void set(const std::string& recordName, IndexEntry entry) {
        entries_.insert_or_assign(recordName, std::move(entry));
    }

    foundation::Result<void> write(const std::string& directory) const;

  private:
    std::map<std::string, IndexEntry> entries_;
};

}  // namespace pinwell::ticket_files
