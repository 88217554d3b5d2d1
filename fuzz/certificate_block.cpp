// The certificate block of a ticket: a SEQUENCE of certificates, read, chained and judged by the real trust
// service, which has no anchors.
#include <memory>

#include "formats/satchel.h"
#include "target.h"
#include "trust/certificate.h"
#include "trust/der.h"

namespace pinwell::fuzz {
namespace {

namespace der = trust::der;

std::unique_ptr<trust::TrustService> serviceWithoutAnchors() {
    return trust::makeTrustService(
        config::PlatformDirectory("/nowhere"), [](std::string_view) {},
        [] { return values::Date{1795204500}; });
}

// The number of consecutive elements, and whether they fill the bytes.
std::pair<std::size_t, bool> elementsIn(ByteView bytes) {
    std::size_t count = 0;
    for (; !bytes.empty(); ++count) {
        const auto element = der::readElement(bytes);
        if (!element) return {count, false};
        require(element->whole.data() == bytes.data() && element->whole.size() <= bytes.size(),
                "an element begins where it was looked for and ends in time");
        require(element->contents.size() < element->whole.size(),
                "the contents leave room for tag and length");
        bytes = bytes.subspan(element->whole.size());
    }
    return {count, true};
}

void judge(const std::vector<trust::CertificateRef>& certificates, trust::TrustService& service) {
    trust::PolicyRef policy;
    require(_satchel_create_cert_policy(&policy, service) == satchel_status::kSuccess, "there is a policy");
    std::shared_ptr<trust::Trust> evaluated;
    require(_satchel_create_trust(certificates, policy, &evaluated, service) != satchel_status::kSuccess,
            "nothing is trusted without an anchor");
}

}  // namespace

void examine(ByteView input) {
    const auto [count, whole] = elementsIn(input);
    static_cast<void>(der::isNestedDefinite(input));

    const auto service = serviceWithoutAnchors();
    std::vector<trust::CertificateRef> certificates;
    if (readSatchelCertificates(input, &certificates, *service) != satchel_status::kSuccess) {
        require(certificates.empty(), "a refusal hands out no certificate");
        return;
    }
    require(count == 1 && whole, "the block is one element");
    require(!certificates.empty() && certificates.size() <= kSatchelMaximumCertificates,
            "there are one to three certificates");
    std::size_t total = 0;
    for (const auto& certificate : certificates) {
        require(certificate->der().size() <= trust::kMaximumCertificateSize, "a certificate is not too long");
        static_cast<void>(certificate->subjectSummary());
        total += certificate->der().size();
    }
    const auto sequence = der::readElement(input);
    require(sequence && total == sequence->contents.size(), "certificates fill the block");
    judge(certificates, *service);
}

}  // namespace pinwell::fuzz
