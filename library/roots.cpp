#include "library/roots.h"

#include <utility>

#include "foundation/platform_directory.h"
#include "trust/certificate.h"

namespace pinwell::ticket {
inline namespace v0 {

TrustedRoots::TrustedRoots(std::shared_ptr<const Contents> contents) noexcept
    : contents_(std::move(contents)) {}

Result<TrustedRoots> TrustedRoots::fromCertificates(ByteView pemOrDer) {
    Contents contents;
    if (auto certificate = trust::X509Certificate::parse(pemOrDer)) {
        contents.anchors.roots.push_back(std::move(certificate));
    } else if (auto list = trust::readPem(pemOrDer)) {
        contents.anchors.roots = *std::move(list);
    } else {
        return Error{ErrorCode::noCertificates, 0, 0,
                     "these are neither certificates in PEM nor one certificate in DER"};
    }
    return TrustedRoots(std::make_shared<const Contents>(std::move(contents)));
}

TrustedRoots TrustedRoots::fromPlatformDirectory(const std::string& path) {
    auto contents = std::make_shared<Contents>();
    contents->anchors = trust::loadAnchors(foundation::PlatformDirectory(path), [&](std::string_view line) {
        contents->problems.emplace_back(line);
    });
    return TrustedRoots(std::move(contents));
}

const std::vector<std::string>& TrustedRoots::problems() const noexcept {
    return contents_->problems;
}

std::size_t TrustedRoots::size() const noexcept {
    return contents_->anchors.roots.size();
}

}  // namespace v0
}  // namespace pinwell::ticket
