// Renews the keys of a service, and installs certificates of another authority.
//
// New files get new names. Last, service.json is replaced in one step and names them. So a reader finds
// either the old keys and certificates or the new ones. The old files remain for processes that have read the
// old service.json. A ticket contains its own chain, so earlier tickets stay genuine while clients trust the
// root.
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

}  // namespace pinwell::lumora
