// The service over a platform directory: reads its files as anchors.
#include "foundation/file_io.h"
#include "foundation/format.h"
#include "trust/anchors.h"
#include "trust/trust_service.h"

namespace pinwell::trust {
namespace {

using LogError = std::function<void(std::string_view)>;

/// Passes on the contents of each readable file.
void readFiles(const std::vector<std::string>& paths, std::size_t maximumSize, const LogError& logError,
               const std::function<void(const std::string& path, ByteView text)>& use) {
    for (const std::string& path : paths) {
        const foundation::Result<Data> text = foundation::readSmallFile(path, maximumSize);
        if (text) {
            use(path, *text);
        } else {
            logError(
                foundation::format("Could not read certificates. %@", text.error().localizedDescription()));
        }
    }
}

CertificateList loadFiles(const std::vector<std::string>& paths, const LogError& logError) {
    CertificateList certificates;
    readFiles(paths, kMaximumPemFileSize, logError, [&](const std::string& path, ByteView text) {
        if (const std::optional<CertificateList> read = readPem(text)) {
            certificates.insert(certificates.end(), read->begin(), read->end());
        } else {
            logError(
                foundation::format("Could not read certificates. %@: not a PEM file of certificates.", path));
        }
    });
    return certificates;
}

DenyList loadDenied(const std::vector<std::string>& paths, const LogError& logError) {
    DenyList denied;
    readFiles(paths, kMaximumDeniedFileSize, logError, [&](const std::string& path, ByteView text) {
        readDeniedPem(text, denied, [&](const std::string& reason) {
            logError(foundation::format("Could not read certificates. %@: %@.", path, reason));
        });
    });
    return denied;
}

}  // namespace

Anchors loadAnchors(const foundation::PlatformDirectory& directory, const LogError& logError) {
    return {loadFiles(directory.rootCertificateFiles(), logError),
            loadFiles(directory.compatibilityRootCertificateFiles(), logError),
            loadFiles(directory.userAllowedCertificateFiles(), logError),
            loadDenied(directory.userDeniedCertificateFiles(), logError)};
}

std::unique_ptr<TrustService> makeTrustService(foundation::PlatformDirectory directory,
                                               std::function<void(std::string_view)> logError,
                                               std::function<Date()> now) {
    return makeTrustService([directory = std::move(directory),
                             logError = std::move(logError)] { return loadAnchors(directory, logError); },
                            std::move(now));
}

}  // namespace pinwell::trust
