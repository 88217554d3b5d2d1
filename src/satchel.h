// The satchel: the signed container in which a ticket travels.
//
// Taken whole from memory. All integers are little-endian.
//
//   Offset      Size  Field
//   0           4     magic, "s8ch"
//   4           2     version, 1
//   6           2     reserved: never interpreted, but signed like the rest of the header
//   8           4     A, length of the certificate block; not zero (found out by verification)
//   12          4     B, length of the payload; not zero
//   16          A     certificate block
//   16 + A      B     payload, opaque here (tm_ticket.h reads it)
//   16 + A + B  72    signature field
//
// The container is exactly A + B + 88 bytes long. What is signed is everything before the signature field.
//
// Certificate block: one DER element, a constructed SEQUENCE of definite length that ends where the block
// ends. It holds one to three certificates in DER and nothing else: the signer first, then its issuers in
// order, each at most 131072 bytes with its tag and length.
//
// Signature field: an ECDSA signature over SHA-256 of the signed bytes, in the DER form of X9.62,
// left-aligned. DER makes it 72 bytes or fewer for a 256-bit curve; what it leaves of the field is zero, and
// the trust service refuses any other padding.
//
// The chain must be trusted by the platform's own anchors under the ticket-signing policy
// (satchel_internal.h). A chain that is trusted only because the user chose to trust it does not count, and
// neither does a signer with another kind of key than an elliptic-curve one.
//
// The functions keep no state and may be called from any thread, as far as the trust service given to them
// allows. They return 0 for success and -1 for any refusal, and say nothing about the reason.
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string_view>

#include "foundation/bytes.h"
#include "src/ticket_fault.h"
#include "trust/trust.h"

namespace pinwell {

inline constexpr std::string_view kSatchelMagic = "s8ch";
inline constexpr std::uint16_t kSatchelVersion = 1;
inline constexpr std::size_t kSatchelHeaderSize = 16;
inline constexpr std::size_t kSatchelSignatureSize = 72;
inline constexpr std::size_t kSatchelMaximumCertificates = 3;
inline constexpr std::size_t kSatchelMaximumCertificateSize = 131072;

/// A decoded container: where its parts lie in the caller's buffer. Owns nothing; valid as long as that
/// buffer. All zero unless a decode succeeded.
struct satchel_view {
    const std::byte* certificates = nullptr;  // the whole block, outer tag and length included
    std::uint64_t certificates_length = 0;    // A; may be zero after decoding
    const std::byte* payload = nullptr;
    std::uint64_t payload_length = 0;  // B
    const std::byte* signature = nullptr;
    std::uint64_t signature_length = 0;  // always 72
    const std::byte* signed_data = nullptr;
    std::uint64_t signed_data_length = 0;  // 16 + A + B
    std::uint16_t version = 0;

    bool operator==(const satchel_view&) const = default;
};

/// The fields of a container's header, as stored.
struct satchel_fields {
    std::uint16_t version = 0;
    std::uint16_t reserved = 0;
    std::uint32_t certificates_length = 0;
    std::uint32_t payload_length = 0;
};

/// What a container says of itself, whether or not it keeps to the rules: for showing a damaged one.
struct satchel_survey {
    std::optional<satchel_fields> header;  // nothing when it is shorter than that

    /// Where the parts are, as good as that can be told. When the lengths do not add up, the one that does
    /// not fit the certificate block's own is taken to be wrong. A part that is not there is null.
    satchel_view view;

    /// Nothing when satchel_decode_header accepts the container.
    std::optional<ticket_fault> fault;
};
satchel_survey satchel_survey_container(foundation::ByteView container);

/// Reads the framing alone: the certificate block, the payload and the signature are located, not looked at.
std::int32_t satchel_decode_header(const std::byte* container, std::uint64_t length, satchel_view* view);

/// Whether the chain is trusted and the signature is its first certificate's. `view` is as decoded from a
/// buffer that is still there.
std::int32_t satchel_verify_signature(const satchel_view* view, trust::TrustService& service);

/// Decodes, verifies, and hands out the payload, which stays part of the caller's container. After a failure
/// `payload` is null and `payload_length` 0.
std::int32_t satchel_get_validated_payload(const std::byte* container, std::uint64_t length,
                                           const std::byte** payload, std::uint64_t* payload_length,
                                           trust::TrustService& service);

}  // namespace pinwell
