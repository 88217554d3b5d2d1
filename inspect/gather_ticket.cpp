#include "gather_ticket.h"

#include <algorithm>
#include <utility>

#include "formats/explain_ticket.h"
#include "formats/satchel.h"
#include "formats/tm_ticket.h"
#include "trust/der.h"
#include "values/value.h"

namespace pinwell::inspect {
namespace {

using base::ByteView;

/// Maximum positions in a damaged certificate block where a certificate is searched.
constexpr std::size_t kMaximumSearches = 4096;

/// No certificate is shorter, so shorter ranges are not searched.
constexpr std::size_t kShortestCertificate = 100;

/// Makes faults with both offsets.
class Offsets {
  public:
    explicit Offsets(std::optional<std::uint64_t> fileOffset) : fileOffset_(fileOffset) {}

    Fault fault(std::string rule, std::uint64_t offset) const {
        Fault made{std::move(rule), offset, std::nullopt};
        if (fileOffset_) made.fileOffset = *fileOffset_ + offset;
        return made;
    }

    /// A fault of a part that begins at `base`.
    std::optional<Fault> fault(const std::optional<TicketFault>& found, std::uint64_t base) const {
        if (!found) return std::nullopt;
        return fault(found->rule, base + found->offset);
    }

  private:
    std::optional<std::uint64_t> fileOffset_;
};

std::optional<trust::CertificateDescription> certificateAt(ByteView rest, std::size_t& size,
                                                           std::size_t& searches) {
    const auto element = trust::der::readElement(rest);
    const bool likely = element && element->tag == trust::der::kConstructedSequence &&
                        element->whole.size() >= kShortestCertificate &&
                        element->whole.size() <= kSatchelMaximumCertificateSize;
    if (!likely || searches >= kMaximumSearches) return std::nullopt;
    ++searches;
    auto description = trust::describeCertificate(element->whole);
    if (description) size = element->whole.size();
    return description;
}

/// Every certificate in the block, at any position: only the framing may be damaged.
void gatherCertificates(ByteView block, Ticket& into) {
    const std::uint64_t base = into.certificateBlock->offset;
    const auto sequence = trust::der::readElement(block);
    const bool whole = sequence && sequence->whole.size() == block.size();
    std::size_t at = whole ? block.size() - sequence->contents.size() : 0;
    std::size_t unreadableFrom = at;
    std::size_t searches = 0;
    const auto closeGap = [&](std::size_t end) {
        if (end > unreadableFrom) into.unreadable.push_back({base + unreadableFrom, end - unreadableFrom});
    };
    while (at < block.size() && into.certificates.size() < kMaximumCertificatesKept) {
        std::size_t size = 0;
        auto description = certificateAt(block.subspan(at), size, searches);
        if (!description) {
            ++at;
            continue;
        }
        closeGap(at);
        into.certificates.push_back({{base + at, size}, *std::move(description)});
        at += size;
        unreadableFrom = at;
    }
    closeGap(block.size());
}

std::optional<Fault> certificateFaultOf(ByteView block, std::uint64_t base, const Offsets& offsets,
                                        trust::TrustService& service) {
    const auto fault = explainCertificates(block, surveySatchelCertificates(block), service);
    return fault ? std::optional(offsets.fault(fault->reason, base + fault->offset)) : std::nullopt;
}

/// The chain of all certificates that can be read, even if the block is damaged.
void judgeChain(ByteView bytes, const satchel_view& view, trust::TrustService& service, Ticket& into) {
    std::vector<trust::CertificateRef> list;
    for (const Certificate& one : into.certificates)
        if (auto certificate = service.parseCertificate(bytes.subspan(one.range.offset, one.range.length)))
            list.push_back(std::move(certificate));
    if (list.empty()) {
        into.chain.reason = "there is no certificate that can be read";
        return;
    }
    const JudgedChain chain = judgeTicketChain(list, service);
    into.chain.trusted = chain.isTrusted();
    into.chain.reason = chain.problem;
    if (chain.evaluated == nullptr) return;
    for (const values::Value& one : chain.evaluated->properties()) {
        const std::string* const title = one[trust::kPropertyTitle].string();
        const std::string* const error = one[trust::kPropertyError].string();
        into.chain.links.push_back({title == nullptr ? "" : *title, error == nullptr ? "" : *error});
    }

    // Without the signer's own certificate the list begins with another, whose key proves nothing.
    const bool signerIsReadable =
        into.unreadable.empty() || into.certificates.front().range.offset < into.unreadable.front().offset;
    const trust::PublicKeyRef key = chain.evaluated->publicKey();
    if (key == nullptr || !signerIsReadable) return;
    const auto status = _satchel_validate_signature(*key, ByteView(view.signedData, view.signedDataLength),
                                                    ByteView(view.signature, view.signatureLength), service);
    into.signature = status == satchel_status::kSuccess ? Signature::verifies : Signature::fails;
}

Entry entryAt(const TicketSurvey& survey, std::uint64_t index, const std::optional<Hash>& artefact) {
    Entry entry;
    entry.index = index;
    tm_cdhash record;
    if (readSurveyedHash(survey, index, &record) != 0) return entry;
    entry.isUsable = true;
    entry.hash = {record.algorithm, base::toData(ByteView(record.hash).first(record.length))};
    entry.matches = artefact && artefact->bytes == entry.hash.bytes;
    return entry;
}

Payload gatherPayload(const TicketSurvey& survey, Range range, const std::optional<Hash>& artefact) {
    Payload payload;
    payload.range = range;
    if (!survey.header) return payload;
    payload.hasHeader = true;
    payload.version = survey.header->version;
    payload.hashLength = survey.header->hashLength;
    payload.statedCount = survey.header->count;
    payload.flags = survey.header->flags;
    payload.signatureTime = survey.header->signatureTime;
    payload.isRevoked = (payload.flags & kTicketRevoked) != 0;
    payload.entryCount = survey.count;
    for (std::uint64_t i = 0; i < survey.count; ++i) {
        const bool kept = payload.entries.size() < kMaximumEntriesKept;
        if (!kept && (payload.matchingEntry || !artefact)) break;
        Entry entry = entryAt(survey, i, artefact);
        if (entry.matches && !payload.matchingEntry) payload.matchingEntry = entry;
        if (kept) payload.entries.push_back(std::move(entry));
    }
    return payload;
}

std::optional<Refusal> refusalOf(ByteView bytes, const std::optional<Holder>& holder, const Offsets& offsets,
                                 trust::TrustService& service) {
    const auto hash = holder && holder->hash ? std::optional(holder->hash->bytes) : std::nullopt;
    const auto refusal = holder ? explainTicket(bytes, hash, service) : explainTicket(bytes, service);
    if (!refusal) return std::nullopt;
    return Refusal{refusal->step, offsets.fault(refusal->reason, refusal->offset)};
}

Range rangeIn(ByteView bytes, const std::byte* start, std::uint64_t length) {
    return {static_cast<std::uint64_t>(start - bytes.data()), length};
}

}  // namespace

Ticket gatherTicket(ByteView bytes, std::optional<std::uint64_t> fileOffset,
                    const std::optional<Holder>& holder, trust::TrustService& service) {
    const Offsets offsets(fileOffset);
    Ticket ticket;
    ticket.size = bytes.size();
    ticket.fileOffset = fileOffset;
    ticket.refusal = refusalOf(bytes, holder, offsets, service);

    const SatchelSurvey frame = surveySatchelContainer(bytes);
    ticket.frameFault = offsets.fault(frame.fault, 0);
    if (frame.header) {
        ticket.version = frame.header->version;
        ticket.statedCertificatesLength = frame.header->certificatesLength;
        ticket.statedPayloadLength = frame.header->payloadLength;
    }
    if (frame.view.signedData == nullptr) {
        ticket.chain.reason = "there is no certificate that can be read";
        return ticket;
    }
    const ByteView block(frame.view.certificates, frame.view.certificatesLength);
    ticket.certificateBlock = rangeIn(bytes, block.data(), block.size());
    ticket.signatureField = rangeIn(bytes, frame.view.signature, frame.view.signatureLength);
    gatherCertificates(block, ticket);
    ticket.certificateFault = certificateFaultOf(block, ticket.certificateBlock->offset, offsets, service);
    judgeChain(bytes, frame.view, service, ticket);

    const ByteView payload(frame.view.payload, frame.view.payloadLength);
    const TicketSurvey survey = surveyTicketPayload(payload);
    ticket.payload = gatherPayload(survey, rangeIn(bytes, payload.data(), payload.size()),
                                   holder ? holder->hash : std::nullopt);
    ticket.payload->fault = offsets.fault(survey.fault, ticket.payload->range.offset);
    return ticket;
}

bool looksLikeTicket(ByteView bytes) {
    const auto beginsWith = [](ByteView part, std::string_view magic) {
        return part.size() >= magic.size() &&
               std::ranges::equal(part.first(magic.size()), base::asBytes(magic));
    };
    if (beginsWith(bytes, kSatchelMagic)) return true;
    const SatchelSurvey survey = surveySatchelContainer(bytes);
    return survey.view.payload != nullptr &&
           beginsWith(ByteView(survey.view.payload, survey.view.payloadLength), kTicketMagic);
}

}  // namespace pinwell::inspect
