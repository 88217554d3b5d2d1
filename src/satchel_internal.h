// The steps inside satchel_verify_signature, with a status for each kind of refusal.
//
// For satchel.cpp, its tests, and the companion and the library that explain a refusal.
// satchel_verify_signature turns each of the statuses into -1.
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

/// A step also passes on every status of the trust service.
namespace satchel_status {
inline constexpr trust::Status kSuccess = 0;

/// An out-parameter is null; or the certificate block is not exactly one constructed
/// SEQUENCE.
inline constexpr trust::Status kBadParameter = -67673;

/// A part of the view is missing, a DER tag or length cannot be read, an object cannot be made.
inline constexpr trust::Status kNotAvailable = -67672;

/// The policy constructor, named or local, returned nothing.
inline constexpr trust::Status kNoPolicy = -67671;

/// The SEQUENCE is not one to three certificates of permitted size.
inline constexpr trust::Status kBadCertificates = -26275;

/// The platform itself does not trust the chain.
inline constexpr trust::Status kNotTrusted = -67843;

/// The signature does not verify, and the trust service gave no status of its own.
inline constexpr trust::Status kBadSignature = -67688;
}  // namespace satchel_status

/// The name of the ticket-signing policy's constructor in the platform security library.
inline constexpr const char* kTicketPolicyConstructor = "SecPolicyCreateOstrelQuillonPlusTicket";

/// Identifier and name of the policy made here if there is no such constructor, and the form of its chains:
/// three certificates, the intermediate and the leaf each with a marker extension.
inline constexpr std::string_view kTicketPolicyOid = "1.2.840.177245.100.1.90";
inline constexpr std::string_view kTicketIntermediateMarkerOid = "1.2.840.177245.100.6.2.17";
inline constexpr std::string_view kTicketLeafMarkerOid = "1.2.840.177245.100.6.1.30";
inline constexpr std::int64_t kTicketChainLength = 3;
inline constexpr std::int64_t kTicketMinimumRSABits = 2048;
inline constexpr std::int64_t kTicketMinimumEllipticCurveBits = 256;

/// All of satchel_verify_signature, status and all.
trust::Status _satchel_verify(const satchel_view* view, trust::TrustService& service);

/// The elements of the certificate block, as views of it, before the first that breaks a rule.
struct satchel_certificate_block {
    std::array<foundation::ByteView, kSatchelMaximumCertificates> elements;
    std::size_t count = 0;
    trust::Status status = satchel_status::kSuccess;
    std::optional<ticket_fault> fault;  // if the status is not success

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

/// The platform security library's ticket-signing policy. Without it (no library, or the library does not
/// know the name), a policy of the same content made here.
trust::Status _satchel_create_cert_policy(trust::PolicyRef* policy, trust::TrustService& service);

/// Adds a value under a key and keeps the old value: a list grows by the value, a single value and the new
/// one become a list of two.
trust::Status _satchel_fuse_option(foundation::Dictionary& options, std::string_view key,
                                   foundation::Value value);

/// A trust object with verdict 4 (trusted, no user setting); null for any other
/// verdict.
trust::Status _satchel_create_trust(const std::vector<trust::CertificateRef>& certificates,
                                    const trust::PolicyRef& policy, std::shared_ptr<trust::Trust>* evaluated,
                                    trust::TrustService& service);

/// `signature` is the field of 72 bytes, padding included.
trust::Status _satchel_validate_signature(const trust::PublicKey& key, foundation::ByteView signed_data,
                                          foundation::ByteView signature, trust::TrustService& service);

/// Returns null unless both the identifier and the options are given. The name may be missing.
trust::PolicyRef satchel_make_policy(const std::string* oid, const std::string* name,
                                     const foundation::Dictionary* options);

}  // namespace pinwell
