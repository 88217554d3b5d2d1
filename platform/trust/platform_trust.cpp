// The service over a platform directory: where files become anchors.
#include "foundation/file_io.h"
#include "foundation/format.h"
#include "trust/anchors.h"
#include "trust/trust_service.h"

namespace pinwell::trust {
namespace {

CertificateList loadFiles(const std::vector<std::string>& paths,
                          const std::function<void(std::string_view)>& logError) {
    CertificateList certificates;
    for (const std::string& path : paths) {
        const foundation::Result<Data> text = foundation::readSmallFile(path, kMaximumPemFileSize);
        if (!text) {
            logError(
                foundation::format("Could not read certificates. %@", text.error().localizedDescription()));
            continue;
        }
        const std::optional<CertificateList> read = readPem(*text);
        if (!read) {
            logError(
                foundation::format("Could not read certificates. %@: not a PEM file of certificates.", path));
            continue;
        }
        certificates.insert(certificates.end(), read->begin(), read->end());
    }
    return certificates;
}

}  // namespace

Anchors loadAnchors(const foundation::PlatformDirectory& directory,
                    const std::function<void(std::string_view)>& logError) {
    return {loadFiles(directory.rootCertificateFiles(), logError),
            loadFiles(directory.compatibilityRootCertificateFiles(), logError),
            loadFiles(directory.userAllowedCertificateFiles(), logError),
            loadFiles(directory.userDeniedCertificateFiles(), logError)};
}

std::unique_ptr<TrustService> makeTrustService(foundation::PlatformDirectory directory,
                                               std::function<void(std::string_view)> logError,
                                               std::function<Date()> now) {
    return makeTrustService([directory = std::move(directory),
                             logError = std::move(logError)] { return loadAnchors(directory, logError); },
                            std::move(now));
}

}  // namespace pinwell::trust
