#include "lumora-local/certificate_dates.h"

#include <array>

#include "lumora-local/certificate_file.h"

namespace pinwell::lumora {

std::vector<CertificateDate> certificateDates(const ServiceDirectory& directory) {
    std::vector<CertificateDate> dates;
    const auto add = [&](const char* role, const std::string& path) {
        try {
            dates.push_back({role, foundation::Date{expiryOf(readCertificateFile(path).get())}});
        } catch (const Failure&) {
            // A service for lookups has no signer; another file may have become unreadable.
        }
    };
    add("server", directory.serverCertificatePath());
    constexpr std::array kRoles{"signer", "intermediate", "root"};
    const std::vector<std::string>& chain = directory.signerChainPaths();
    for (std::size_t i = 0; i < chain.size() && i < kRoles.size(); ++i) add(kRoles.at(i), chain[i]);
    return dates;
}

}  // namespace pinwell::lumora
