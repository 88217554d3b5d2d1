// Certificates for the clients of the administration listener, from an authority of the service's own.
//
//   DIR/service/clients/ca.pem   the authority's certificate, for --client-ca
//   DIR/service/clients/ca.key   its key, encrypted as the service's other keys are
//
// The authority vouches for clients alone: nothing else of the service trusts it.
#pragma once

#include <string>

#include "foundation/date.h"
#include "lumora-local/service_directory.h"

namespace pinwell::lumora {

/// Where the authority's certificate is, or will be.
std::string clientAuthorityPath(const ServiceDirectory& directory);

/// Makes `folder`, which must not exist or be empty, with client.pem and client.key (mode 0600, in the
/// clear) for a client of that name; the first time, the authority too. Throws Failure: EX_USAGE if the name
/// is not 1 to 64 bytes of UTF-8 without control characters.
void makeClientCertificate(const ServiceDirectory& directory, const std::string& name,
                           const std::string& folder, foundation::Date now);

}  // namespace pinwell::lumora
