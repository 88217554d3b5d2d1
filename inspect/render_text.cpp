#include "render_text.h"

#include <algorithm>
#include <utility>

#include "base/text.h"
#include "formats/superblob.h"
#include "values/format.h"

namespace pinwell::inspect {
namespace {

using base::toHex;
using values::format;

constexpr const char* kBold = "1";
constexpr const char* kGreen = "1;32";
constexpr const char* kRed = "1;31";
constexpr const char* kYellow = "1;33";

/// The column of the values; labels are shorter.
constexpr std::size_t kValueColumn = 16;

std::string padded(std::string text, std::size_t width) {
    if (text.size() < width) text.append(width - text.size(), ' ');
    return text;
}

std::string counted(std::uint64_t count, const char* one, const char* many) {
    return format("%llu %s", count, count == 1 ? one : many);
}

std::string bytesText(std::uint64_t count) {
    return counted(count, "byte", "bytes");
}

std::string rangeText(const Range& range) {
    return format("%s at offset %llu", bytesText(range.length), range.offset);
}

std::string hashText(const Hash& hash) {
    return padded(std::string(algorithmName(hash.algorithm)), 12) + toHex(hash.bytes);
}

/// Collects the lines of a page.
class Page {
  public:
    explicit Page(bool colour) : colour_(colour) {}

    std::string coloured(const char* colour, const std::string& text) const {
        return colour_ ? "\x1b[" + std::string(colour) + "m" + text + "\x1b[0m" : text;
    }

    void plain(const std::string& text) { text_ += text + "\n"; }
    void gap() { text_ += "\n"; }

    /// A labelled value; without a label, a continuation of the line above.
    void line(const std::string& label, const std::string& value) {
        plain(padded("  " + label, kValueColumn) + value);
    }

    void fault(const std::string& what) { line("", coloured(kRed, "! " + base::escapeForTerminal(what))); }
    void fault(const std::optional<Fault>& fault) {
        if (fault) this->fault(fault->rule + placeOf(*fault));
    }

    /// ", at offset 4 of the ticket (file offset 1028)"
    static std::string placeOf(const Fault& fault) {
        std::string text;
        if (fault.offset) text += format(", at offset %llu of the ticket", *fault.offset);
        if (!fault.fileOffset || fault.fileOffset == fault.offset) return text;
        return text + (fault.offset ? format(" (%llu of the file)", *fault.fileOffset)
                                    : format(", at offset %llu of the file", *fault.fileOffset));
    }

    /// A row for each element, and the number of further ones in `total`.
    template <class List, class Row>
    void rows(const std::string& label, const List& list, std::uint64_t total, Row row) {
        std::string shownLabel = label;
        const std::size_t shown = std::min(list.size(), kMaximumRowsShown);
        for (std::size_t i = 0; i < shown; ++i) {
            line(shownLabel, row(list[i]));
            shownLabel.clear();
        }
        if (total > shown) line(shownLabel, format("... and %llu more", total - shown));
    }

    std::string take() && { return std::move(text_); }

  private:
    bool colour_;
    std::string text_;
};

std::string flagsText(std::uint32_t flags) {
    return format("0x%x", flags) + ((flags & codesign::kFlagAdHoc) != 0 ? " (ad hoc)" : "");
}

void showItem(const Report& report, Page& page) {
    if (!report.item) return;
    const Item& item = *report.item;
    const std::string kind =
        report.kind == Kind::other ? format("%@", item.typeDescription) : std::string(kindName(report.kind));
    const bool says = item.typeDescription != kind;
    page.line("Kind", kind + (says ? format(" (%@, %@)", item.typeDescription, item.typeIdentifier)
                                   : format(" (%@)", item.typeIdentifier)));
    if (item.size) page.line("Size", bytesText(*item.size));
}

void showDirectory(const codesign::CodeDirectoryDescription& directory, Page& page) {
    const std::string slot = directory.slot == 0 ? "" : format(", slot 0x%x", directory.slot);
    if (!directory.problem.empty()) {
        page.fault(format("code directory%s: %s", slot, directory.problem));
        return;
    }
    const Hash hash{static_cast<std::uint32_t>(directory.digestType), directory.codeHash};
    page.line("", (directory.chosen ? "* " : "  ") + hashText(hash) +
                      format("  (version 0x%x%s)", directory.version, slot));
}

void showSignature(const codesign::SignatureDescription& signature, Page& page) {
    std::string verdict = "valid";
    if (signature.validity == codesign::kUnsigned) verdict = "none";
    if (signature.validity == codesign::kInvalidSignature) verdict = "not valid";
    std::string text = verdict;
    if (signature.place && verdict != "none")
        text += format(", %s", rangeText({signature.place->offset, signature.place->length}));
    page.line("Signature", text);
    if (!signature.problem.empty() && verdict == "not valid") page.fault(signature.problem);
    auto chosen = std::find_if(signature.directories.begin(), signature.directories.end(),
                               [](const auto& one) { return one.chosen; });
    if (chosen == signature.directories.end()) {
        chosen = std::find_if(signature.directories.begin(), signature.directories.end(),
                              [](const auto& one) { return one.problem.empty(); });
    }
    if (chosen != signature.directories.end()) {
        page.line("Identifier", format("%@", chosen->identifier));
        page.line("Team", chosen->teamIdentifier ? format("%@", *chosen->teamIdentifier) : "none");
        page.line("Flags", flagsText(chosen->flags));
    }
    if (signature.secureTimestamp) page.line("Time stamp", format("%@", *signature.secureTimestamp));
    for (const auto& directory : signature.directories) showDirectory(directory, page);
}

void showCode(const Report& report, Page& page) {
    if (!report.code) return;
    const codesign::CodeDescription& code = *report.code;
    if (!code.problem.empty()) page.fault("no code: " + code.problem);
    if (code.inBundle) page.line("Executable", format("%@", code.file));
    for (const codesign::SliceDescription& slice : code.slices) {
        if (slice.cpuType && code.slices.size() > 1) {
            page.line("Slice", cpuTypeName(*slice.cpuType) +
                                   format(", %s", rangeText({slice.range.offset, slice.range.length})) +
                                   (slice.preferred ? ", stands for the whole" : ""));
        }
        if (!slice.problem.empty()) page.fault(slice.problem);
        if (slice.signature) {
            showSignature(*slice.signature, page);
        } else if (slice.problem.empty()) {
            page.line("Signature", "none");
        }
    }
}

void showHash(const Report& report, Page& page) {
    if (report.kind == Kind::ticket || report.kind == Kind::other) return;
    if (!report.codeHash) {
        page.line("Code hash", "none");
        return;
    }
    page.line("Code hash", hashText(*report.codeHash) + (report.isMadeUpHash ? "  (of the contents)" : ""));
    page.line("Record", report.recordName);
}

void showBlobs(const SuperblobPlace& place, Page& page) {
    page.line("Trailer", format("at offset %llu", place.trailerOffset));
    if (place.superblob) page.line("Superblob", rangeText(*place.superblob));
    page.rows("", place.blobs, place.blobCount, [](const codesign::BlobDescription& blob) {
        std::string row =
            padded(format("slot 0x%x", blob.slot), 14) + padded(std::string(slotName(blob.slot)), 26);
        if (blob.length) row += format("%s at +%u", bytesText(*blob.length), blob.offset);
        return blob.problem.empty() ? row : row + "  ! " + blob.problem;
    });
    page.fault(place.fault);
}

void showTrailers(const TrailerPlace& place, Page& page) {
    if (place.trailerCount == 0 && !place.fault) page.line("Trailers", "none");
    page.rows("Trailers", place.trailers, place.trailerCount, [](const Trailer& trailer) {
        std::string row = padded(format("type %u", trailer.type), 14) +
                          padded(std::string(trailerTypeName(trailer.type)), 26);
        row += trailer.data.length == 0
                   ? format("record at %llu", trailer.recordOffset)
                   : format("%s, record at %llu", rangeText(trailer.data), trailer.recordOffset);
        return trailer.problem.empty() ? row : row + "  ! " + trailer.problem;
    });
    if (place.trailerCount > 0 && !place.hasTerminator) page.line("", "no terminator was found");
    page.fault(place.fault);
}

void showPlace(const Report& report, Page& page) {
    if (const auto* const file = std::get_if<FilePlace>(&report.place)) {
        if (report.kind != Kind::ticket && (report.ticket || file->fault))
            page.line("Ticket file", format("%@", file->path));
        page.fault(file->fault);
    }
    if (const auto* const superblob = std::get_if<SuperblobPlace>(&report.place)) showBlobs(*superblob, page);
    if (const auto* const trailers = std::get_if<TrailerPlace>(&report.place)) showTrailers(*trailers, page);
}

void showCertificate(std::size_t number, const Certificate& certificate, Page& page) {
    const trust::CertificateDescription& one = certificate.description;
    page.line(number == 1 ? "Certificates" : "", format("%zu  %s", number, one.subject));
    std::string key =
        one.keyType.empty() ? "a key that cannot be used" : format("%s %d", one.keyType, one.keyBits);
    if (!one.curve.empty()) key += format(" (%s)", one.curve);
    const std::string valid =
        format("%@", one.notBefore).substr(0, 10) + " to " + format("%@", one.notAfter).substr(0, 10);
    page.line("", format("   %s, valid %s, %s", key, valid, rangeText(certificate.range)));
    page.line("", format("   issued by %s", one.isSelfIssued ? "itself" : one.issuer));
    for (const auto& extension : one.extensions) {
        // This system recognises certificates by their markers; the JSON has the other extensions.
        if (!extension.oid.starts_with("1.2.840.177245.")) continue;
        page.line("", format("   marker %s", extension.oid));
    }
    page.line("", "   SHA-256 " + toHex(one.sha256Fingerprint));
}

void showCertificates(const Ticket& ticket, Page& page) {
    std::size_t number = 0;
    for (const Certificate& certificate : ticket.certificates) showCertificate(++number, certificate, page);
    for (const Range& range : ticket.unreadable) page.fault(format("unreadable: %s", rangeText(range)));
    page.fault(ticket.certificateFault);
}

void showVerdict(const Report& report, Page& page) {
    const Ticket& ticket = *report.ticket;
    page.line("Chain", ticket.chain.trusted ? "trusted" : "not trusted");
    if (!ticket.chain.trusted) {
        page.fault(ticket.chain.reason);
        page.line("", format("   trusted roots are those in %@/roots", report.platformDirectory));
    }
    const std::string place =
        ticket.signatureField ? format(", %s", rangeText(*ticket.signatureField)) : std::string();
    switch (ticket.signature) {
        case Signature::verifies:
            page.line("Signature", "verifies" + place);
            break;
        case Signature::fails:
            page.line("Signature", "does not verify" + place);
            break;
        case Signature::unchecked:
            page.line("Signature", "could not be checked" + place);
            break;
    }
}

void showEntries(const Payload& payload, Page& page) {
    page.rows("Lists", payload.entries, payload.entryCount, [](const Entry& entry) {
        if (!entry.isUsable) return format("! entry %llu is not usable", entry.index);
        return (entry.matches ? "* " : "  ") + hashText(entry.hash) + (entry.matches ? "  (this file)" : "");
    });
    const auto& match = payload.matchingEntry;
    if (match && match->index >= kMaximumRowsShown)
        page.line("", "* " + hashText(match->hash) + format("  (this file, entry %llu)", match->index));
}

void showPayload(const Payload& payload, Page& page) {
    page.line("Payload", payload.hasHeader ? format("version %u, hash length %u, %s", payload.version,
                                                    payload.hashLength, rangeText(payload.range))
                                           : rangeText(payload.range));
    page.fault(payload.fault);
    if (!payload.hasHeader) return;
    page.line("Flags", format("0x%x", payload.flags) + (payload.isRevoked ? " (revoked)" : ""));
    page.line("Signed on", timeText(payload.signatureTime).value_or(format("%llu", payload.signatureTime)));
    showEntries(payload, page);
}

void showTicket(const Report& report, Page& page) {
    if (!report.ticket) return;
    const Ticket& ticket = *report.ticket;
    page.gap();
    std::string size = bytesText(ticket.size);
    if (ticket.fileOffset && *ticket.fileOffset != 0) size += format(" at offset %llu", *ticket.fileOffset);
    if (ticket.version) size += format(", container version %u", *ticket.version);
    page.line("Ticket", size + "; offsets below count from its start");
    page.fault(ticket.frameFault);
    showCertificates(ticket, page);
    showVerdict(report, page);
    if (ticket.payload) showPayload(*ticket.payload, page);
}

const char* colourOf(Outcome outcome) {
    switch (outcome) {
        case Outcome::good:
            return kGreen;
        case Outcome::noTicket:
            return kYellow;
        default:
            return kRed;
    }
}

}  // namespace

std::string renderText(const Report& report, bool colour) {
    Page page(colour);
    page.plain(page.coloured(kBold, base::escapeForTerminal(report.path)));
    showItem(report, page);
    showCode(report, page);
    showHash(report, page);
    showPlace(report, page);
    showTicket(report, page);
    page.gap();
    page.plain("  " + page.coloured(colourOf(report.outcome), base::escapeForTerminal(report.conclusion)));
    if (report.fault) {
        const std::string where = Page::placeOf(*report.fault);
        if (!where.empty()) page.plain("  The first fault is" + where.substr(1) + ".");
    }
    return std::move(page).take();
}

}  // namespace pinwell::inspect
