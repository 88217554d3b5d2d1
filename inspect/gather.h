// Gathers everything about a path that concerns its ticket. Only reads; no network.
#pragma once

#include <optional>
#include <string>

#include "formats/explain_ticket.h"
#include "report.h"
#include "src/platform.h"
#include "values/url.h"

namespace pinwell::inspect {

/// Reads the artefact, or the bare ticket, at `path` and judges its ticket with the services of `platform`.
/// The tool's message functions must be silent.
class Inspector {
  public:
    explicit Inspector(const Platform& platform) : platform_(platform) {}

    /// Never throws for a fault of the path or its contents.
    Report inspect(const std::string& path) const;

  private:
    // Each returns the fault of the ticket's place.
    std::optional<TicketPlaceFault> gatherBundle(const values::URL& url, Report& report) const;
    std::optional<TicketPlaceFault> gatherImage(const values::URL& url, Report& report) const;
    std::optional<TicketPlaceFault> gatherPackage(const values::URL& url, Report& report) const;
    void gatherHeldTicket(base::ByteView bytes, std::uint64_t fileOffset, Report& report) const;
    bool gatherBareTicket(const values::URL& url, bool mustLookLikeOne, Report& report) const;

    Platform platform_;
};

}  // namespace pinwell::inspect
