// The names of a certificate's alternative names and name constraints (RFC 5280, 4.2.1.6).
//
//   [0] other name   [3] X.400 address    [6] URI              7-bit text
//   [1] mail address [4] directory name   [7] IP address       bytes
//   [2] DNS name     [5] EDI party name   [8] registered identifier
//
// 0, 3, 4 and 5 are constructed, the others primitive; 1, 2 and 6 are 7-bit text (IA5String).
#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "base/bytes.h"
#include "trust/der.h"

namespace pinwell::trust {

struct AlternativeNames {
    std::vector<std::string> dnsNames;  // as written; any 7-bit text
    std::vector<base::Data> addresses;  // 4 or 16 bytes, network order
};

enum class GeneralNameForm { dnsName, address, other };

struct GeneralName {
    GeneralNameForm form = GeneralNameForm::other;
    base::ByteView contents;
};

/// Throws der::Malformed for an unknown tag, and for text that is not 7-bit.
GeneralName readGeneralName(const der::Element& element);

// Whether a certificate's alternative names cover a host (RFC 9525, which replaces RFC 6125; RFC
// 5280, 4.2.1.6).

/// `host` is a DNS name, with or without a dot at its end, or an IP address, an IPv6 one with or without
/// brackets. An address matches only an address, byte for byte; a DNS name matches only a DNS name, without
/// regard to case. A wildcard is the whole leftmost label of a name with at least two more, and matches
/// exactly one label. The subject's common name is never used.
bool coversHost(const AlternativeNames& names, std::string_view host);

/// Letters, digits, hyphens, and the underscore that real hosts have, in labels of 1 to 63 bytes, 253 bytes
/// in all, without a dot at the end.
bool isDnsName(std::string_view name);

/// Without regard to the case of ASCII letters.
bool equalNames(std::string_view a, std::string_view b);

/// 4 or 16 bytes in network order; an IPv6 address may be in brackets. `nullopt` if it is not an address.
std::optional<base::Data> parseAddress(std::string_view host);

}  // namespace pinwell::trust
