// The names of a certificate's alternative names and name constraints (RFC 5280, 4.2.1.6).
//
//   [0] other name   [3] X.400 address    [6] URI              7-bit text
//   [1] mail address [4] directory name   [7] IP address       bytes
//   [2] DNS name     [5] EDI party name   [8] registered identifier
//
// 0, 3, 4 and 5 are constructed, the others primitive; 1, 2 and 6 are 7-bit text (IA5String).
#pragma once

#include <string>
#include <vector>

#include "foundation/bytes.h"
#include "trust/der.h"

namespace pinwell::trust {

struct AlternativeNames {
    std::vector<std::string> dnsNames;        // as written; any 7-bit text
    std::vector<foundation::Data> addresses;  // 4 or 16 bytes, network order
};

enum class GeneralNameForm { dnsName, address, other };

struct GeneralName {
    GeneralNameForm form = GeneralNameForm::other;
    foundation::ByteView contents;
};

/// Throws der::Malformed for an unknown tag, and for text that is not 7-bit.
GeneralName readGeneralName(const der::Element& element);

}  // namespace pinwell::trust
