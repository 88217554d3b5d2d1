// Certificate chains with one fault each, and the verdicts of the three policies.
//
// Two tables. A certificate fault is put into the leaf, the intermediate and the root in turn, a chain fault
// into the whole. Both state verdicts, one character for each case:
//
//   1 3 4 5 6   the verdict's number: by the user alone, denied, trusted, recoverable, fatal
//   x           not a readable certificate: no verdict is reached
//   p           the list itself is refused as a bad parameter
//   -           the fault does not apply there
//
// A certificate fault has "ticket pinned compatibility", each leaf, intermediate, root: "444 555 555". A
// chain fault has one for each policy: "5 5 4". If a policy accepts a fault, the text gives the reason.
#pragma once

#include <functional>
#include <ostream>
#include <string>
#include <vector>

#include "unit/trust/scene.h"

namespace pinwell::test {

enum class ChainPolicy { ticket, pinned, compatibility };

/// One chain before one policy. For a server policy the chain is a server's, for the ticket policy a
/// signer's.
struct ChainCase {
    std::string name;
    std::string wrong;
    ChainPolicy policy = ChainPolicy::ticket;
    char expected = '4';
    std::string host = trust::kHost;
    std::function<void(ChainFields&)> fields;                                   // before it is issued
    std::function<void(trust::Scene&, const ChainFields& issued)> arrangement;  // afterwards

    friend void PrintTo(const ChainCase& one, std::ostream* out) { *out << one.wrong; }
};

/// Every case of both tables.
std::vector<ChainCase> chainCases();

}  // namespace pinwell::test
