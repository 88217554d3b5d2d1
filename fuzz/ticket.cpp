// A ticket container and its payload; the input is the container. A payload by itself is read as well.
#include <algorithm>

#include "base/byte_io.h"
#include "formats/satchel.h"
#include "formats/tm_ticket.h"
#include "support/fake_trust_service.h"
#include "target.h"

namespace pinwell::fuzz {
namespace {

// The payload of this decoded ticket, without the entries.
Data encodedHeader(const tm_ticket* ticket, ByteView payload) {
    base::ByteWriter writer;
    writer.text(kTicketMagic).le16(tm_ticket_get_version(ticket));
    writer.bytes(payload.subspan(6, 2));  // the hash length, which only the entries contain
    writer.le32(tm_ticket_get_cdhash_count(ticket)).le32(tm_ticket_get_flags(ticket));
    return writer.le64(tm_ticket_get_signature_time(ticket)).data();
}

void examineEntries(const tm_ticket* ticket, ByteView payload) {
    const std::uint32_t count = tm_ticket_get_cdhash_count(ticket);
    const ByteView entries = payload.subspan(kTicketHeaderSize);
    require(count == 0 || entries.size() % count == 0, "entries of one size fill the payload");
    const bool named = tm_ticket_get_version(ticket) == 2;
    for (std::uint32_t i = 0; i < count; ++i) {
        tm_cdhash hash;
        if (tm_ticket_copy_cdhash(ticket, i, &hash) != 0) continue;
        const ByteView entry = entries.subspan(i * (entries.size() / count), entries.size() / count);
        const ByteView copied = ByteView(hash.hash).first(hash.length);
        require(std::ranges::equal(copied, entry.subspan(named ? 1 : 0, hash.length)),
                "the hash is the entry's");
        const auto rest = ByteView(hash.hash).subspan(hash.length);
        require(std::ranges::all_of(rest, [](std::byte byte) { return byte == std::byte{}; }),
                "nothing stands behind the hash");
    }
    tm_cdhash beyond;
    require(tm_ticket_copy_cdhash(ticket, count, &beyond) != 0, "there is no entry behind the last");
}

void examinePayload(ByteView payload) {
    tm_ticket* decoded = nullptr;
    if (tm_ticket_decode(payload.data(), static_cast<std::int64_t>(payload.size()), &decoded) != 0) {
        require(decoded == nullptr, "a refusal hands out no ticket");
        return;
    }
    const TicketPointer ticket(decoded);
    require(std::ranges::equal(encodedHeader(decoded, payload), payload.first(kTicketHeaderSize)),
            "a ticket's fields are its payload's");
    examineEntries(decoded, payload);
    const TicketPointer copy(tm_ticket_copy(decoded));
    require(tm_ticket_get_cdhash_count(copy.get()) == tm_ticket_get_cdhash_count(decoded),
            "a copy is as long");
}

void examineView(const satchel_view& view, ByteView container) {
    base::ByteWriter writer;
    writer.text(kSatchelMagic).le16(view.version).bytes(container.subspan(6, 2));
    writer.le32(static_cast<std::uint32_t>(view.certificatesLength));
    writer.le32(static_cast<std::uint32_t>(view.payloadLength));
    writer.bytes({view.certificates, view.certificatesLength});
    writer.bytes({view.payload, view.payloadLength});
    require(std::ranges::equal(writer.data(), ByteView(view.signedData, view.signedDataLength)),
            "the signed bytes are the parts before the signature");
    writer.bytes({view.signature, view.signatureLength});
    require(std::ranges::equal(writer.data(), container), "the parts make up the container");
}

}  // namespace

void examine(ByteView input) {
    examinePayload(input);
    satchel_view view;
    if (satchel_decode_header(input.data(), input.size(), &view) != 0) {
        require(view == satchel_view{}, "a refusal leaves no view");
        return;
    }
    examineView(view, input);
    examinePayload({view.payload, view.payloadLength});

    test::FakeTrustService trust;
    const std::byte* payload = nullptr;
    std::uint64_t length = 0;
    const auto validated =
        satchel_get_validated_payload(input.data(), input.size(), &payload, &length, trust);
    require((validated == 0) == (payload == view.payload && length == view.payloadLength),
            "what is validated is the payload, and else nothing is handed out");
    require(validated != 0 || !trust.signatureChecks.empty(), "nothing is validated without its signature");
    require(trust.parsedCertificates.size() <= kSatchelMaximumCertificates, "certificates are counted");
}

}  // namespace pinwell::fuzz
