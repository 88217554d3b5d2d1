// A directory of tickets that were fetched elsewhere: 2-2-HEX.ticket for the record 2/2/HEX.
#pragma once

#include <optional>
#include <string>

#include "foundation/bytes.h"
#include "verify/directory.h"

namespace pinwell::gate {

/// Longest ticket that is read, as for stapled ones.
inline constexpr std::uint64_t kMaximumTicketFile = std::uint64_t{64} * 1024 * 1024;

/// Immutable; may be used from any number of threads.
class TicketDirectory {
  public:
    /// Throws codesign::CodeError if it cannot be opened.
    explicit TicketDirectory(const std::string& path);

    struct Found {
        std::string file;                        // where it is, or would be
        std::optional<foundation::Data> ticket;  // `nullopt`: there is none
        std::string problem;                     // why there is something that cannot be read
    };
    Found find(const std::string& recordName) const;

  private:
    std::string path_;
    verify::DirectoryRef directory_;
};

}  // namespace pinwell::gate
