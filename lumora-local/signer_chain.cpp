#include "lumora-local/signer_chain.h"

#include "lumora-local/authority.h"
#include "lumora-local/certificate_file.h"

namespace pinwell::lumora {
namespace {

using MarkerHandle = foundation::Handle<ASN1_OBJECT, ASN1_OBJECT_free>;

constexpr std::size_t kChainLength = 3;

}  // namespace

bool carriesMarker(X509* certificate, std::string_view oid) {
    const MarkerHandle object(OBJ_txt2obj(std::string(oid).c_str(), 1));
    return object != nullptr && X509_get_ext_by_OBJ(certificate, object.get(), -1) >= 0;
}

std::optional<std::string> faultOfIssue(X509* certificate, X509* issuer) {
    EVP_PKEY* key = X509_get0_pubkey(issuer);
    const bool named = X509_NAME_cmp(X509_get_issuer_name(certificate), X509_get_subject_name(issuer)) == 0;
    const bool signedByIt = named && key != nullptr && X509_verify(certificate, key) == 1;
    ERR_clear_error();
    if (signedByIt) return std::nullopt;
    return foundation::format("%@ is not issued by %@", nameOf(certificate), nameOf(issuer));
}

std::optional<std::string> faultOfSignerChain(const std::vector<CertificateHandle>& chain) {
    if (chain.size() != kChainLength) {
        return foundation::format("it holds %zu certificates, not signer, intermediate and root",
                                  chain.size());
    }
    X509* signer = chain[0].get();
    X509* intermediate = chain[1].get();
    X509* root = chain[2].get();
    if (auto fault = faultOfIssue(signer, intermediate)) return fault;
    if (auto fault = faultOfIssue(intermediate, root)) return fault;
    if (auto fault = faultOfIssue(root, root)) return fault;
    if (X509_check_ca(intermediate) != 1) return nameOf(intermediate) + " may not issue certificates";
    if (X509_check_ca(root) != 1) return nameOf(root) + " may not issue certificates";
    if (!carriesMarker(signer, kTicketSignerMarkerOid)) {
        return nameOf(signer) + " lacks the extension " + std::string(kTicketSignerMarkerOid);
    }
    if (!carriesMarker(intermediate, kTicketIntermediateMarkerOid)) {
        return nameOf(intermediate) + " lacks the extension " + std::string(kTicketIntermediateMarkerOid);
    }
    return std::nullopt;
}

}  // namespace pinwell::lumora
