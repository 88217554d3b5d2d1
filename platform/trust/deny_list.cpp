#include "trust/deny_list.h"

#include "foundation/bytes.h"
#include "trust/der.h"

namespace pinwell::trust {
namespace {

struct DeniedParts {
    ByteView signedPart;
    Data key;
};

/// Skips every check that is not needed to find the key.
std::optional<DeniedParts> findParts(ByteView der) {
    using der::Cursor;
    try {
        Cursor whole = Cursor(der).enter(der::kConstructedSequence);
        const der::Element signedPart = whole.take(der::kConstructedSequence);
        Cursor body(signedPart.contents);
        body.takeIf(der::contextTag(0, true));
        body.any();                                                        // serial number
        for (int i = 0; i < 4; ++i) body.take(der::kConstructedSequence);  // up to the subject
        const std::optional<Data> key = readKeyIdentity(body.take(der::kConstructedSequence).contents);
        if (!key) return std::nullopt;
        return DeniedParts{signedPart.whole, *key};
    } catch (const der::Malformed&) {
        return std::nullopt;
    }
}

}  // namespace

DenyList::DenyList(const CertificateList& certificates) {
    for (const X509CertificateRef& certificate : certificates) add(certificate);
}

void DenyList::add(const X509CertificateRef& certificate) {
    certificates_.push_back(certificate);
    signedParts_.insert(std::string(foundation::asText(certificate->parts().signedPart)));
    keys_.insert(foundation::toString(certificate->subjectKey().identity));
    ++size_;
}

bool DenyList::addUnreadable(ByteView der) {
    const std::optional<DeniedParts> parts = findParts(der);
    if (!parts) return false;
    signedParts_.insert(foundation::toString(parts->signedPart));
    keys_.insert(foundation::toString(parts->key));
    ++size_;
    return true;
}

bool DenyList::reaches(const X509Certificate& certificate) const {
    return keys_.contains(foundation::toString(certificate.subjectKey().identity)) ||
           signedParts_.contains(foundation::toString(certificate.parts().signedPart));
}

}  // namespace pinwell::trust
