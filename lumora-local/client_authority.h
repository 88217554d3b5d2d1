// Certificates for the clients of the administration listener, from an authority of the service.
//
//   DIR/service/clients/ca.pem   the authority's certificate, for --client-ca
//   DIR/service/clients/ca.key   its key, encrypted like the service's other keys
//
// The authority is for clients only: no other part of the service trusts it.
#pragma once

#include <string>

#include "foundation/date.h"
#include "lumora-local/service_directory.h"

namespace pinwell::lumora {

/// The path of the authority's certificate, present or future.
std::string clientAuthorityPath(const ServiceDirectory& directory);

/// Makes `folder`, which must be missing or empty, with client.pem and client.key (mode 0600, unencrypted)
/// for a client of that name. The first call also makes the authority. Throws Failure: EX_USAGE if the name
/// is not 1 to 64 bytes of UTF-8 without control characters.
void makeClientCertificate(const ServiceDirectory& directory, const std::string& name,
                           const std::string& folder, foundation::Date now);

}  // namespace pinwell::lumora
