// Tickets with one thing wrong in each.
#pragma once

#include <functional>
#include <ostream>
#include <string>
#include <vector>

#include "subjects.h"

namespace pinwell::test {

struct TicketFault {
    const char* name;
    const char* wrong;
    int exit;
    std::function<Data(const Subject&, const IssuedChain&)> ticket;
    std::function<void(SignerAnchors&)> anchors = nullptr;  // of a valid ticket

    friend void PrintTo(const TicketFault& fault, std::ostream* out) { *out << fault.wrong; }
};

const std::vector<TicketFault>& ticketFaults();

/// A valid ticket.
Data goodTicket(const Subject& subject, const IssuedChain& chain);

}  // namespace pinwell::test
