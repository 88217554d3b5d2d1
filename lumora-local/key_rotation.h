// Renewing the keys of a service, and bringing in a certificate from an authority elsewhere.
//
// New files get names of their own; service.json is rewritten last, in one step, and names them. So whoever
// reads keys and certificates meanwhile finds either the old ones or the new ones, and the old files stay for
// those who have read the old service.json. A ticket holds its own chain up to the root, so that earlier
// tickets stay genuine for as long as clients trust that root.
#pragma once

#include <string>
#include <vector>

#include "foundation/date.h"
#include "lumora-local/service_directory.h"

namespace pinwell::lumora {

/// What was changed, as lines for a person.
using RotationReport = std::vector<std::string>;

struct SignerRotation {
    std::string tokenKey;     // a pkcs11: URI whose key becomes the signer's; empty: a fresh key in a file
    std::string requestFile;  // made: a request for a certificate from elsewhere; nothing else changes yet
};

/// Gives the signer a new key, certified by the service's own intermediate certificate. Throws Failure:
/// EX_CONFIG if that one's key is not in the service.
RotationReport rotateSigner(const ServiceDirectory& directory, const SignerRotation& rotation,
                            foundation::Date now);

/// Gives the server a new key and certificate for the hosts of service.json. `rootDirectory` holds root.key;
/// empty: it is in the service. Throws Failure.
RotationReport rotateServer(const ServiceDirectory& directory, const std::string& rootDirectory,
                            foundation::Date now);

/// Takes the three certificates of the PEM file `chainFile`, signer first, for the key that was requested
/// last, or for `key` (a file or a pkcs11: URI) if that is not empty. A root that the platform directory does
/// not have is added to it. Throws Failure (EX_DATAERR) if the chain is none that clients accept, or is not
/// for the key; nothing is changed then.
RotationReport certifySignerElsewhere(const ServiceDirectory& directory, const std::string& chainFile,
                                      const std::string& key, foundation::Date now);

}  // namespace pinwell::lumora
