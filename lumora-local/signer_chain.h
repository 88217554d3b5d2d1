// The conditions of ticket readers on a signer's three certificates. Includes OpenSSL's headers: for .cpp
// files of this folder.
#pragma once

#include <optional>
#include <string>
#include <vector>

#include "lumora-local/openssl_handles.h"

namespace pinwell::lumora {

/// The fault of the chain signer, intermediate, root; `nullopt` if clients that trust the root accept its
/// tickets. Dates do not count, as for tickets.
std::optional<std::string> faultOfSignerChain(const std::vector<CertificateHandle>& chain);

/// The fault of `certificate` as a certificate issued by `issuer`; `nullopt` if it has none.
std::optional<std::string> faultOfIssue(X509* certificate, X509* issuer);

bool carriesMarker(X509* certificate, std::string_view oid);

}  // namespace pinwell::lumora
