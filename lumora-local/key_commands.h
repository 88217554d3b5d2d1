// The commands that make keys and certificates for a service: rotate, certify, client-certificate.
//
// rotate and certify give new files new names. Last, service.json is replaced in one step and names them. So
// a reader finds either the old keys and certificates or the new ones. The old files remain for processes
// that have read the old service.json. A ticket contains its own chain, so earlier tickets stay genuine while
// clients trust the root.
//
// client-certificate has an authority of its own, for clients of the administration listener only: no other
// part of the service trusts it.
//
//   DIR/service/clients/ca.pem   the authority's certificate, for --client-ca
//   DIR/service/clients/ca.key   its key, encrypted like the service's other keys
#pragma once

#include <string>
#include <vector>

#include "foundation/date.h"
#include "lumora-local/service_directory.h"

namespace pinwell::lumora {

/// The changes, as lines for a person.
using RotationReport = std::vector<std::string>;

struct SignerRotation {
    std::string tokenKey;     // a pkcs11: URI whose key becomes the signer's; empty: a fresh key in a file
    std::string requestFile;  // makes a request for another authority's certificate; nothing else changes yet
};

/// Gives the signer a new key, certified by the service's own intermediate certificate. Throws Failure:
/// EX_CONFIG if that one's key is not in the service.
RotationReport rotateSigner(const ServiceDirectory& directory, const SignerRotation& rotation,
                            foundation::Date now);

/// Gives the server a new key and certificate for the hosts of service.json. `rootDirectory` has root.key; if
/// empty, the service has it. Throws Failure.
RotationReport rotateServer(const ServiceDirectory& directory, const std::string& rootDirectory,
                            foundation::Date now);

/// Installs the three certificates of the PEM file `chainFile`, signer first. They are for the last requested
/// key, or for `key` (a file or a pkcs11: URI) if that is not empty. A new root is added to the platform
/// directory. Throws Failure (EX_DATAERR) if clients would refuse the chain, or it is for another key. Then
/// nothing is changed.
RotationReport certifySignerElsewhere(const ServiceDirectory& directory, const std::string& chainFile,
                                      const std::string& key, foundation::Date now);

/// The path of the authority's certificate, present or future.
std::string clientAuthorityPath(const ServiceDirectory& directory);

/// Makes `folder`, which must be missing or empty, with client.pem and client.key (mode 0600, unencrypted)
/// for a client of that name. The first call also makes the authority. Throws Failure: EX_USAGE if the name
/// is not 1 to 64 bytes of UTF-8 without control characters.
void makeClientCertificate(const ServiceDirectory& directory, const std::string& name,
                           const std::string& folder, foundation::Date now);

}  // namespace pinwell::lumora
