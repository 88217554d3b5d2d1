// Code-signed bundles, and plain executables that are handed over as such.
//
// The ticket is a file of its own, Contents/CodeResources below the bundle's root; the cdhash is that of the
// bundle's code signature. The ticket is written straight into the bundle, without the clone and swap of the
// base.
#pragma once

#include "src/PWHashedFile/PWHashedFile.h"

namespace pinwell {

class PWHashedBundle : public PWHashedFile {
  public:
    /// Reads nothing of the bundle, and only holds it.
    using PWHashedFile::PWHashedFile;

    /// Where the ticket is, or would be.
    URL codeResourcesURL() const;

    /// Not atomic: between the removal of an old ticket and the copy of the new one the bundle has none.
    /// SIGHUP, SIGINT and SIGTERM take effect afterwards.
    bool writeNewTicketDataFromURL(const URL& source, ErrorOut error) override;

    using PWHashedFile::_deleteExistingTicket;  // goes through the base's driver, and raises there

    /// Moves the ticket file to the trash, whole; answers whether that went well. The exit code stays as it
    /// is.
    bool _deleteExistingTicket();

    std::optional<Data> _ticketData() override;
    std::optional<Data> _cdHash() override;

  protected:
    std::string_view className() const override { return "PWHashedBundle"; }
};

}  // namespace pinwell
