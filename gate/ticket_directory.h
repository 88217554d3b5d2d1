// A directory of tickets that were fetched elsewhere: 2-2-HEX.ticket for the record 2/2/HEX.
#pragma once

#include <optional>
#include <string>
#include <utility>

#include "foundation/bytes.h"
#include "foundation/error.h"
#include "verify/directory.h"

namespace pinwell::gate {

/// Maximum length of a ticket, as for stapled tickets.
inline constexpr std::uint64_t kMaximumTicketFile = std::uint64_t{64} * 1024 * 1024;

/// Immutable; may be used from any number of threads.
class TicketDirectory {
  public:
    static foundation::Result<TicketDirectory> open(const std::string& path);

    struct Found {
        std::string file;                        // its path, whether it exists or not
        std::optional<foundation::Data> ticket;  // `nullopt`: there is none
        std::string problem;                     // why an existing file cannot be read
    };
    Found find(const std::string& recordName) const;

  private:
    TicketDirectory(std::string path, verify::DirectoryRef directory)
        : path_(std::move(path)), directory_(std::move(directory)) {}

    std::string path_;
    verify::DirectoryRef directory_;
};

}  // namespace pinwell::gate
