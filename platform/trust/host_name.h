// Whether a certificate's alternative names cover a host (RFC 9525, which replaces RFC 6125; RFC
// 5280, 4.2.1.6).
#pragma once

#include <string_view>

#include "trust/extensions.h"

namespace pinwell::trust {

/// `host` is a DNS name, with or without a dot at its end, or an IP address, an IPv6 one with or without
/// brackets. An address is matched by an address alone, byte for byte; a DNS name by a DNS name alone,
/// without regard to case. A wildcard is the whole leftmost label of a name that has at least two more, and
/// stands for exactly one label. The subject's common name is never looked at.
bool coversHost(const AlternativeNames& names, std::string_view host);

}  // namespace pinwell::trust
