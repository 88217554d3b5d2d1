// Decodes a ticket with the surveys of the tool.
#include <utility>

#include "library/conversion.h"
#include "src/satchel.h"
#include "src/satchel_internal.h"
#include "src/tm_ticket.h"

namespace pinwell::ticket {
inline namespace v0 {

static_assert(kFlagRevoked == kTicketRevoked);

std::uint32_t version() noexcept {
    return PINWELL_TICKET_VERSION;
}

Result<Container> decodeContainer(ByteView ticket) {
    const satchel_survey frame = satchel_survey_container(ticket);
    if (frame.fault) return malformed(*frame.fault);

    const ByteView block(frame.view.certificates, frame.view.certificates_length);
    const satchel_certificate_block certificates = satchel_survey_certificates(block);
    if (certificates.fault) return malformed(*certificates.fault, offsetIn(ticket, block.data()));

    Container container;
    container.version = frame.header->version;
    container.reserved = frame.header->reserved;
    container.signedBytes = ByteView(frame.view.signed_data, frame.view.signed_data_length);
    const auto found = std::span(certificates.elements).first(certificates.count);
    container.certificates.assign(found.begin(), found.end());
    container.payload = ByteView(frame.view.payload, frame.view.payload_length);
    container.signature = ByteView(frame.view.signature, frame.view.signature_length);
    return container;
}

Result<Payload> decodePayload(ByteView payload) {
    const tm_ticket_survey survey = tm_ticket_survey_payload(payload);
    if (survey.fault) return malformed(*survey.fault);
    return Payload{survey.header->version, survey.header->hash_length,    survey.header->count,
                   survey.header->flags,   survey.header->signature_time, payload};
}

std::optional<Entry> entryAt(const Payload& payload, std::uint64_t index) {
    const tm_ticket_survey survey = tm_ticket_survey_payload(payload.bytes);
    tm_cdhash cdhash;
    if (survey.fault || tm_ticket_survey_copy_cdhash(survey, index, &cdhash) != 0) return std::nullopt;
    return Entry{cdhash.algorithm, foundation::toData(ByteView(cdhash.hash).first(cdhash.length))};
}

}  // namespace v0
}  // namespace pinwell::ticket
