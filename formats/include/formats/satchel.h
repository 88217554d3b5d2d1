// The satchel: the signed container of a ticket.
//
// Read whole from memory. All integers are little-endian.
//
//   Offset      Size  Field
//   0           4     magic, "s8ch"
//   4           2     version, 1
//   6           2     reserved: never interpreted, but signed like the rest of the header
//   8           4     A, length of the certificate block; not zero (verification checks that)
//   12          4     B, length of the payload; not zero
//   16          A     certificate block
//   16 + A      B     payload, opaque here (tm_ticket.h reads it)
//   16 + A + B  72    signature field
//
// The container is exactly A + B + 88 bytes long. Every byte before the signature field is signed.
//
// Certificate block: one DER element, a constructed SEQUENCE of definite length that ends where the block
// ends. It holds one to three certificates in DER and nothing else: the signer first, then its issuers in
// order, each at most 131072 bytes with its tag and length.
//
// Signature field: an ECDSA signature over SHA-256 of the signed bytes, in the DER form of X9.62,
// left-aligned. For a 256-bit curve it has at most 72 bytes in DER. The rest of the field is zero; the trust
// service refuses any other padding.
//
// The chain must be trusted by the platform's own anchors under the ticket-signing policy, whose values are
// below. A chain that only the user trusts is refused, and so is a signer whose key is not an elliptic-curve
// key.
//
// The functions keep no state and may be called from any thread if the given trust service allows it. They
// return 0 for success and -1 for any refusal, without the reason.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "base/bytes.h"
#include "formats/findings.h"
#include "trust/trust.h"
#include "values/value.h"

namespace pinwell {

inline constexpr std::string_view kSatchelMagic = "s8ch";
inline constexpr std::uint16_t kSatchelVersion = 1;
inline constexpr std::size_t kSatchelHeaderSize = 16;
inline constexpr std::size_t kSatchelSignatureSize = 72;
inline constexpr std::size_t kSatchelMaximumCertificates = 3;
inline constexpr std::size_t kSatchelMaximumCertificateSize = 131072;

/// A decoded container: the places of its parts in the caller's buffer. Owns nothing; valid as long as that
/// buffer. All zero unless a decode succeeded.
struct satchel_view {
    const std::byte* certificates = nullptr;  // the whole block, with its tag and length
    std::uint64_t certificatesLength = 0;     // A; may be zero after decoding
    const std::byte* payload = nullptr;
    std::uint64_t payloadLength = 0;  // B
    const std::byte* signature = nullptr;
    std::uint64_t signatureLength = 0;  // always 72
    const std::byte* signedData = nullptr;
    std::uint64_t signedDataLength = 0;  // 16 + A + B
    std::uint16_t version = 0;

    bool operator==(const satchel_view&) const = default;
};

/// The fields of a container's header, as stored.
struct SatchelFields {
    std::uint16_t version = 0;
    std::uint16_t reserved = 0;
    std::uint32_t certificatesLength = 0;
    std::uint32_t payloadLength = 0;
};

/// The fields and parts of a container, valid or damaged, to show a damaged one.
struct SatchelSurvey {
    std::optional<SatchelFields> header;  // `nullopt` if it is shorter

    /// The best guess at the places of the parts. If the lengths do not add up, the certificate block's own
    /// DER length decides which of the two is wrong. A missing part is null.
    satchel_view view;

    /// `nullopt` if satchel_decode_header accepts the container.
    std::optional<TicketFault> fault;
};
SatchelSurvey surveySatchelContainer(base::ByteView container);

/// Reads the framing alone: the certificate block, the payload and the signature are located, not read.
std::int32_t satchel_decode_header(const std::byte* container, std::uint64_t length, satchel_view* view);

/// Whether the chain is trusted and the signature verifies with its first certificate. `view` is decoded, and
/// its buffer still exists.
std::int32_t satchel_verify_signature(const satchel_view* view, trust::TrustService& service);

/// Decodes, verifies, and returns the payload as a part of the caller's container. After a failure `payload`
/// is null and `payloadLength` 0.
std::int32_t satchel_get_validated_payload(const std::byte* container, std::uint64_t length,
                                           const std::byte** payload, std::uint64_t* payloadLength,
                                           trust::TrustService& service);

// The steps inside satchel_verify_signature, with a status for each kind of refusal. satchel_verify_signature
// turns each of the statuses into -1. For this folder, its tests, and programs that show a damaged ticket.

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
trust::Status verifySatchel(const satchel_view* view, trust::TrustService& service);

/// The elements of the certificate block up to the first that breaks a rule, as views of the block.
struct SatchelCertificateBlock {
    std::array<base::ByteView, kSatchelMaximumCertificates> elements;
    std::size_t count = 0;
    trust::Status status = satchel_status::kSuccess;
    std::optional<TicketFault> fault;  // if the status is not success

    void refuse(trust::Status why, std::uint64_t offset, const char* rule) {
        status = why;
        fault = TicketFault{offset, rule};
    }
};
SatchelCertificateBlock surveySatchelCertificates(base::ByteView block);

/// The certificates of the block, signer first; empty unless it succeeds.
trust::Status readSatchelCertificates(base::ByteView block, std::vector<trust::CertificateRef>* certificates,
                                      trust::TrustService& service);

/// The platform security library's ticket-signing policy. Without it (no library, or the library does not
/// know the name), a policy of the same content made here.
trust::Status _satchel_create_cert_policy(trust::PolicyRef* policy, trust::TrustService& service);

/// Adds a value under a key and keeps the old value: a list grows by the value, a single value and the new
/// one become a list of two.
trust::Status _satchel_fuse_option(values::Dictionary& options, std::string_view key, values::Value value);

/// A trust object with verdict 4 (trusted, no user setting); null for any other
/// verdict.
trust::Status _satchel_create_trust(const std::vector<trust::CertificateRef>& certificates,
                                    const trust::PolicyRef& policy, std::shared_ptr<trust::Trust>* evaluated,
                                    trust::TrustService& service);

/// `signature` is the field of 72 bytes, padding included.
trust::Status _satchel_validate_signature(const trust::PublicKey& key, base::ByteView signedData,
                                          base::ByteView signature, trust::TrustService& service);

/// Returns null unless both the identifier and the options are given. The name may be missing.
trust::PolicyRef satchel_make_policy(const std::string* oid, const std::string* name,
                                     const values::Dictionary* options);

}  // namespace pinwell
