// Code-signed bundles, and plain executables.
//
// The ticket is a file of its own, Contents/CodeResources below the bundle's root; the cdhash is from the
// bundle's code signature. The ticket is written directly into the bundle, without the clone and swap of the
// base.
#pragma once

#include "src/PWHashedFile/PWHashedFile.h"

namespace pinwell {

class PWHashedBundle : public PWHashedFile {
  public:
    /// Only opens the bundle; reads nothing of it.
    using PWHashedFile::PWHashedFile;

    /// The ticket's place, with or without a ticket there.
    URL codeResourcesURL() const;

    /// Not atomic: between the removal of an old ticket and the copy of the new one the bundle has none.
    /// SIGHUP, SIGINT and SIGTERM take effect after the write.
    bool writeNewTicketDataFromURL(const URL& source, ErrorOut error) override;

    using PWHashedFile::_deleteExistingTicket;  // goes through the base's driver, and throws there

    /// Moves the whole ticket file to the trash; returns whether that succeeded. Does not change the exit
    /// code.
    bool _deleteExistingTicket();

    std::optional<TicketPlaceFault> ticketPlaceFault() override;

    std::optional<Data> _ticketData() override;
    std::optional<Data> _cdHash() override;

  protected:
    std::string_view className() const override { return "PWHashedBundle"; }
};

}  // namespace pinwell
