// When the certificates expire that a running service depends on.
#pragma once

#include <string>
#include <vector>

#include "foundation/date.h"
#include "lumora-local/service_directory.h"

namespace pinwell::lumora {

struct CertificateDate {
    std::string role;  // server, signer, intermediate or root
    foundation::Date expiry;
};

/// Of the server's certificate and of the ticket signer's chain. A file that cannot be read is left out.
std::vector<CertificateDate> certificateDates(const ServiceDirectory& directory);

}  // namespace pinwell::lumora
