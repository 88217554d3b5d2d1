// A directory of tickets with its index (index.h), as commands fill it.
#pragma once

#include <string>

#include "foundation/error.h"
#include "retrieval/report.h"
#include "retrieval/ticket_fetch.h"
#include "ticket/index.h"

namespace pinwell::ticket_files {

class TicketDirectory {
  public:
    /// Makes a missing directory, and reads its index. The error names the failed action.
    static foundation::Result<TicketDirectory> open(const std::string& path);

    /// Writes the ticket to the file of its record, and replaces an earlier one. Adds the result to the
    /// report: the file, a message, and the failure if it could not be written.
    void keep(const retrieval::FetchedTicket& ticket, retrieval::Report& report);

    /// Writes the index. The error names the failed action.
    foundation::Result<void> close() const;

  private:
    TicketDirectory(std::string path, Index index) : path_(std::move(path)), index_(std::move(index)) {}

    std::string path_;
    Index index_;
};

}  // namespace pinwell::ticket_files
