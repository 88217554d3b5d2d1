// Whether a certificate's alternative names cover a host (RFC 9525, which replaces RFC 6125; RFC
// 5280, 4.2.1.6).
#pragma once

#include <optional>
#include <string_view>

#include "foundation/bytes.h"
#include "trust/general_name.h"

namespace pinwell::trust {

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
std::optional<foundation::Data> parseAddress(std::string_view host);

}  // namespace pinwell::trust
