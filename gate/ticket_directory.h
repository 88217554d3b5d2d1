// A directory of tickets that were fetched elsewhere: 2-2-HEX.ticket for the record 2/2/HEX.
#pragma once

#include <optional>
#include <string>

#include "foundation/bytes.h"
#include "verify/directory.h"

namespace pinwell::gate {

/// Maximum length of a ticket, as for stapled tickets.
inline constexpr std::uint64_t kMaximumTicketFile = std::uint64_t{64} * 1024 * 1024;

/// Immutable; may be used from any number of threads.
class TicketDirectory {
  public:
    /// Throws codesign::CodeError if it cannot be opened.
    explicit TicketDirectory(const std::string& path);

    struct Found {
        std::string file;                        // its path, whether it exists or not
        std::optional<foundation::Data> ticket;  // `nullopt`: there is none
        std::string problem;                     // why an existing file cannot be read
    };
    Found find(const std::string& recordName) const;

  private:
    std::string path_;
    verify::DirectoryRef directory_;
};

}  // namespace pinwell::gate
