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
// The chain must be trusted by the platform's own anchors under the ticket-signing policy
// (satchel_internal.h). A chain that only the user trusts is refused, and so is a signer whose key is not an
// elliptic-curve key.
//
// The functions keep no state and may be called from any thread if the given trust service allows it. They
// return 0 for success and -1 for any refusal, without the reason.
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

/// A decoded container: the places of its parts in the caller's buffer. Owns nothing; valid as long as that
/// buffer. All zero unless a decode succeeded.
struct satchel_view {
    const std::byte* certificates = nullptr;  // the whole block, with its tag and length
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

/// The fields and parts of a container, valid or damaged, to show a damaged one.
struct satchel_survey {
    std::optional<satchel_fields> header;  // `nullopt` if it is shorter

    /// The best guess at the places of the parts. If the lengths do not add up, the certificate block's own
    /// DER length decides which of the two is wrong. A missing part is null.
    satchel_view view;

    /// `nullopt` if satchel_decode_header accepts the container.
    std::optional<ticket_fault> fault;
};
satchel_survey satchel_survey_container(foundation::ByteView container);

/// Reads the framing alone: the certificate block, the payload and the signature are located, not read.
std::int32_t satchel_decode_header(const std::byte* container, std::uint64_t length, satchel_view* view);

/// Whether the chain is trusted and the signature verifies with its first certificate. `view` is decoded, and
/// its buffer still exists.
std::int32_t satchel_verify_signature(const satchel_view* view, trust::TrustService& service);

/// Decodes, verifies, and returns the payload as a part of the caller's container. After a failure `payload`
/// is null and `payload_length` 0.
std::int32_t satchel_get_validated_payload(const std::byte* container, std::uint64_t length,
                                           const std::byte** payload, std::uint64_t* payload_length,
                                           trust::TrustService& service);

}  // namespace pinwell
