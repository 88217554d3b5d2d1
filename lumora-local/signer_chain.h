// What readers of tickets demand of a signer's three certificates. Includes OpenSSL's headers: for .cpp files
// of this folder.
#pragma once

#include <optional>
#include <string>
#include <vector>

#include "lumora-local/openssl_handles.h"

namespace pinwell::lumora {

/// What is wrong with the chain signer, intermediate, root; `nullopt` if a ticket with it is accepted by
/// those who trust the root. Dates play no part, as they play none for tickets.
std::optional<std::string> faultOfSignerChain(const std::vector<CertificateHandle>& chain);

/// What is wrong with `certificate` as one that `issuer` has issued; `nullopt` if nothing is.
std::optional<std::string> faultOfIssue(X509* certificate, X509* issuer);

bool carriesMarker(X509* certificate, std::string_view oid);

}  // namespace pinwell::lumora
