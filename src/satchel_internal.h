// The steps inside satchel_verify_signature, with the statuses that tell its refusals apart.
//
// For satchel.cpp, its tests, and the companion and the library that explain a refusal. The statuses end at
// satchel_verify_signature, which makes -1 of each.
#pragma once

#include <array>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "foundation/bytes.h"
#include "foundation/value.h"
#include "src/satchel.h"
#include "trust/trust.h"

namespace pinwell {

/// Besides these, a step passes on whatever status the trust service answers.
namespace satchel_status {
inline constexpr trust::Status kSuccess = 0;

/// A result has no place to go; or the certificate block is not one constructed SEQUENCE that ends where it
/// ends.
inline constexpr trust::Status kBadParameter = -67673;

/// A part of the view is missing, a DER tag or length cannot be read, an object cannot be made.
inline constexpr trust::Status kNotAvailable = -67672;

/// The policy constructor, named or local, returned nothing.
inline constexpr trust::Status kNoPolicy = -67671;

/// The SEQUENCE does not hold one to three certificates of permitted size and nothing else.
inline constexpr trust::Status kBadCertificates = -26275;

/// The chain was judged, and not as trusted by the platform itself.
inline constexpr trust::Status kNotTrusted = -67843;

/// The signature does not verify, and the trust service gave no status of its own.
inline constexpr trust::Status kBadSignature = -67688;
}  // namespace satchel_status

/// What the platform security library calls its constructor of the ticket-signing policy.
inline constexpr const char* kTicketPolicyConstructor = "SecPolicyCreateOstrelQuillonPlusTicket";

/// Identifier and name of the policy made here when there is no such constructor, and what its chains look
/// like: three certificates, the intermediate and the leaf each with a marker extension.
inline constexpr std::string_view kTicketPolicyOid = "1.2.840.177245.100.1.90";
inline constexpr std::string_view kTicketIntermediateMarkerOid = "1.2.840.177245.100.6.2.17";
inline constexpr std::string_view kTicketLeafMarkerOid = "1.2.840.177245.100.6.1.30";
inline constexpr std::int64_t kTicketChainLength = 3;
inline constexpr std::int64_t kTicketMinimumRSABits = 2048;
inline constexpr std::int64_t kTicketMinimumEllipticCurveBits = 256;

/// All of satchel_verify_signature, status and all.
trust::Status _satchel_verify(const satchel_view* view, trust::TrustService& service);

/// The elements of the certificate block, as views of it, up to the first that breaks a rule.
struct satchel_certificate_block {
    std::array<foundation::ByteView, kSatchelMaximumCertificates> elements;
    std::size_t count = 0;
    trust::Status status = satchel_status::kSuccess;
    std::optional<ticket_fault> fault;  // when the status is not success

    void refuse(trust::Status why, std::uint64_t offset, const char* rule) {
        status = why;
        fault = ticket_fault{offset, rule};
    }
};
satchel_certificate_block satchel_survey_certificates(foundation::ByteView block);

/// The certificates of the block, signer first; empty unless it succeeds.
trust::Status _satchel_copy_certificates(foundation::ByteView block,
                                         std::vector<trust::CertificateRef>* certificates,
                                         trust::TrustService& service);

/// The platform security library's ticket-signing policy; only where that cannot be had (no library, or it
/// does not know the name) one of the same content made here.
trust::Status _satchel_create_cert_policy(trust::PolicyRef* policy, trust::TrustService& service);

/// Adds a value under a key without losing what is there: a list grows by the value, a single value and the
/// new one become a list of two.
trust::Status _satchel_fuse_option(foundation::Dictionary& options, std::string_view key,
                                   foundation::Value value);

/// A trust object that has been evaluated to verdict 4 (trusted, no user setting); null for any other
/// verdict.
trust::Status _satchel_create_trust(const std::vector<trust::CertificateRef>& certificates,
                                    const trust::PolicyRef& policy, std::shared_ptr<trust::Trust>* evaluated,
                                    trust::TrustService& service);

/// `signature` is the field of 72 bytes, padding included.
trust::Status _satchel_validate_signature(const trust::PublicKey& key, foundation::ByteView signed_data,
                                          foundation::ByteView signature, trust::TrustService& service);

/// Null unless both the identifier and the options are given. The name may be missing.
trust::PolicyRef satchel_make_policy(const std::string* oid, const std::string* name,
                                     const foundation::Dictionary* options);

}  // namespace pinwell
