#include "inspect/gather.h"

#include <algorithm>
#include <filesystem>
#include <system_error>
#include <utility>

#include "codesign/superblob.h"
#include "foundation/bytes.h"
#include "foundation/format.h"
#include "inspect/gather_ticket.h"
#include "src/PWHashedFile/PWHashedBundle.h"
#include "src/PWHashedFile/PWHashedDiskImage.h"
#include "src/PWHashedFile/PWHashedFlatPackage.h"
#include "src/PWHashedFile/file_kind.h"
#include "src/PWHashedFile/held_ticket.h"
#include "src/PWHashedFile/package_trailer.h"
#include "src/PWHashedFile/trailer_window.h"
#include "src/ticket_record.h"

namespace pinwell::inspect {
namespace {

using foundation::ByteView;
using foundation::URL;

std::optional<std::uint64_t> sizeOf(const std::string& path) {
    std::error_code error;
    const auto size = std::filesystem::file_size(path, error);
    return error ? std::nullopt : std::optional<std::uint64_t>(size);
}

std::string reasonOf(const foundation::Error& error) {
    const std::string& reason = error.localizedFailureReason();
    return reason.empty() ? error.localizedDescription() : reason;
}

void setHash(PWHashedFile& file, Report& report) {
    const std::optional<Data> hash = file.cdHash();
    if (!hash) return;
    report.codeHash = Hash{file.digestAlgorithm(), *hash};
    report.recordName = recordNameForHash(report.codeHash->algorithm, *hash);
}

/// The fault of a place, as the report shows it.
std::optional<Fault> faultOf(const std::optional<TicketPlaceFault>& fault) {
    if (!fault) return std::nullopt;
    return Fault{fault->rule, std::nullopt, fault->offset};
}

/// Walks a package's trailers, past the first ticket and past damaged records, to the terminator.
class TrailerWalk {
  public:
    TrailerWalk(files::FileHandle& file, TrailerPlace& into) : file_(file), window_(file), into_(into) {}

    void run() {
        std::uint64_t position = file_.seekToEnd();
        while (position >= kTrailerSize) {
            const std::optional<std::uint64_t> next = step(position);
            if (!next) return;
            position = *next;
        }
    }

    /// The first ticket from the end; only this one counts.
    const std::optional<Range>& ticket() const { return ticket_; }

    /// As explainTicketPlace() would find it, which collects the trailers too.
    std::optional<TicketPlaceFault> fault() const {
        if (fault_ || !ticket_) return fault_;
        const auto fault = faultOfTicketLength(ticket_->length, ticket_->offset);
        return fault ? std::optional(TicketPlaceFault{fault->rule, fault->offset}) : std::nullopt;
    }

  private:
    std::optional<std::uint64_t> step(std::uint64_t position) {
        const std::uint64_t recordOffset = position - kTrailerSize;
        const ByteView bytes = window_.readAt(recordOffset, kTrailerSize);
        if (bytes.size() != kTrailerSize) return std::nullopt;
        trailer_header record;
        std::copy(bytes.begin(), bytes.end(), record.bytes.begin());

        Trailer found{.recordOffset = recordOffset,
                      .version = record.version(),
                      .type = record.type(),
                      .data = {},
                      .problem = {}};
        if (const auto fault = faultOfTrailer(record, recordOffset)) {
            found.problem = fault->rule;
        } else if (!trailer_data_is_valid(bytes, nullptr)) {
            return std::nullopt;
        }
        if (trailer_is_terminator(record.firstWord(), record.length())) {
            into_.hasTerminator = true;
            found.data = {recordOffset, 0};
            keep(std::move(found));
            return std::nullopt;
        }
        if (record.length() > recordOffset) {
            keep(std::move(found));
            return std::nullopt;
        }
        found.data = {recordOffset - record.length(), record.length()};
        const bool isTicket = found.type == kTicketTrailerType;
        const Range data = found.data;
        keep(std::move(found));
        if (isTicket && !ticket_) ticket_ = data;
        return data.offset;
    }

    void keep(Trailer trailer) {
        // The tool stops at the ticket; faults beyond it are only shown.
        if (!trailer.problem.empty() && !fault_ && !ticket_)
            fault_ = TicketPlaceFault{trailer.problem, trailer.recordOffset};
        ++into_.trailerCount;
        if (into_.trailers.size() < kMaximumTrailersKept) into_.trailers.push_back(std::move(trailer));
    }

    files::FileHandle& file_;
    TrailerWindow window_;
    TrailerPlace& into_;
    std::optional<Range> ticket_;
    std::optional<TicketPlaceFault> fault_;
};

/// The ticket's bytes within a superblob: the last ticket counts, as in the tool.
std::optional<Range> ticketIn(ByteView superblob) {
    const auto blob = codesign::surveyLastBlobOf(kTicketSlotType, superblob);
    if (!blob || blob->bytes.size() < kBlobHeaderSize) return std::nullopt;
    return Range{blob->offset + std::uint64_t{kBlobHeaderSize}, blob->bytes.size() - kBlobHeaderSize};
}

void concludeWithoutTicket(const std::optional<TicketPlaceFault>& fault, Report& report) {
    report.fault = faultOf(fault);
    report.outcome = Outcome::noTicket;
    if (!fault) {
        report.conclusion = report.codeHash || report.kind == Kind::ticket
                                ? "No ticket is stapled to this file."
                                : "No ticket is stapled to this file, and it has no valid signature.";
    } else if (report.kind == Kind::executable) {
        report.conclusion = "An executable outside a bundle has no place for a ticket.";
    } else if (fault->isAbsence) {
        report.conclusion = "No ticket is stapled to this file: " + fault->rule + ".";
    } else {
        report.outcome = Outcome::refused;
        report.conclusion = "No ticket can be read: " + fault->rule + ".";
    }
}

/// The sentence about a ticket that its artefact is refused for.
std::string conclusionFor(const Refusal& refusal, bool isSigned) {
    switch (refusal.step) {
        case RefusalStep::revoked:
            return "The ticket is genuine, and it marks the software as revoked.";
        case RefusalStep::listing:
            return isSigned ? "The ticket is genuine, but it does not list this file."
                            : "The ticket is genuine, but the file has no valid signature for it to list.";
        default:
            return "The ticket is not acceptable: " + refusal.fault.rule + ".";
    }
}

void concludeWithTicket(Report& report) {
    if (const std::optional<Refusal>& refusal = report.ticket->refusal) {
        report.fault = refusal->fault;
        report.outcome = refusal->step == RefusalStep::revoked ? Outcome::revoked : Outcome::refused;
        report.conclusion = conclusionFor(*refusal, report.codeHash.has_value());
        return;
    }
    report.outcome = Outcome::good;
    report.conclusion = report.kind == Kind::ticket
                            ? "The ticket is genuine and is not marked revoked."
                            : "The ticket is genuine, lists this file, and is not marked revoked.";
}

Report& unreadable(Report& report, std::string reason) {
    report.outcome = Outcome::unreadable;
    report.conclusion = std::move(reason);
    return report;
}

}  // namespace

std::optional<TicketPlaceFault> Inspector::gatherBundle(const URL& url, Report& report) const {
    report.code = codesign::describeCode(url.path());
    PWHashedBundle bundle(url, platform_);
    setHash(bundle, report);
    const auto fault = explainTicketPlace(bundle, platform_.files);
    if (report.kind == Kind::executable) return fault;
    report.place = FilePlace{bundle.codeResourcesURL().path(), faultOf(fault)};
    if (const auto bytes = bundle.ticketData()) gatherHeldTicket(*bytes, 0, report);
    return fault;
}

std::optional<TicketPlaceFault> Inspector::gatherImage(const URL& url, Report& report) const {
    report.code = codesign::describeCode(url.path());
    PWHashedDiskImage image(url, platform_);
    if (image.appropriateExitCode() == kExitOK) {
        setHash(image, report);
        const codesign::SliceDescription* const code = report.code->preferredSlice();
        const bool isSigned = code != nullptr && code->signature && !code->signature->directories.empty();
        report.isMadeUpHash = report.codeHash && !isSigned;
    }

    const auto fault = explainTicketPlace(image, platform_.files);
    SuperblobPlace place;
    place.trailerOffset = image.origEOF() < kUDIFHeaderSize ? 0 : image.origEOF() - kUDIFHeaderSize;
    place.fault = faultOf(fault);
    const bool isSet = image.dmgHeader().codeSignOffset() != 0 && image.dmgHeader().codeSignLength() != 0;
    if (isSet && image.dmgHeader().hasMagic()) {
        place.superblob = Range{image.dmgHeader().codeSignOffset(), image.dmgHeader().codeSignLength()};
        // From the superblob that the tool has read, so that the judged ticket is shown.
        codesign::SignatureDescription table = codesign::describeSignature(image.superblob());
        place.blobs = std::move(table.blobs);
        place.blobCount = table.blobCount;
        if (const auto found = ticketIn(image.superblob()))
            gatherHeldTicket(image.superblob().view().subspan(found->offset, found->length),
                             image.csStart() + found->offset, report);
    }
    report.place = std::move(place);
    return fault;
}

std::optional<TicketPlaceFault> Inspector::gatherPackage(const URL& url, Report& report) const {
    PWHashedFlatPackage package(url, platform_);
    setHash(package, report);

    TrailerPlace place;
    std::optional<TicketPlaceFault> fault;
    const auto file = platform_.files.openForReading(url);
    if (file) {
        try {
            TrailerWalk walk(**file, place);
            walk.run();
            fault = walk.fault();
            if (const auto& ticket = walk.ticket(); ticket && ticket->length > 0) {
                (*file)->seek(ticket->offset);
                gatherHeldTicket(files::readShared(**file, ticket->length), ticket->offset, report);
            }
        } catch (const files::FileHandleError& failure) {
            fault = TicketPlaceFault{std::string("the package cannot be read: ") + failure.what(), {}};
        }
    } else {
        fault = TicketPlaceFault{"the package cannot be read: " + reasonOf(file.error()), {}};
    }
    place.fault = faultOf(fault);
    report.place = std::move(place);
    return fault;
}

void Inspector::gatherHeldTicket(ByteView bytes, std::uint64_t fileOffset, Report& report) const {
    if (bytes.empty()) return;  // the tool takes it for no ticket
    report.ticket = gatherTicket(bytes, fileOffset, Holder{report.codeHash}, platform_.trust);
}

bool Inspector::gatherBareTicket(const URL& url, bool mustLookLikeOne, Report& report) const {
    const auto bytes = platform_.files.contentsOfFile(url);
    if (!bytes) return false;
    if (mustLookLikeOne && !looksLikeTicket(*bytes)) return false;
    report.kind = Kind::ticket;
    report.place = FilePlace{url.path(), std::nullopt};
    report.ticket = gatherTicket(*bytes, 0, std::nullopt, platform_.trust);
    return true;
}

Report Inspector::inspect(const std::string& path) const {
    Report report;
    // A URL is made absolute with the working directory; a path is shown as given.
    report.path = path;
    report.platformDirectory = platform_.directory.path();
    const URL url = URL::fileURLWithPath(path);
    const auto properties = platform_.files.resourceProperties(url);
    if (!properties)
        return unreadable(report, "The path cannot be read: " + reasonOf(properties.error()) + ".");
    report.item = Item{properties->typeIdentifier, properties->localizedTypeDescription, std::nullopt};
    const auto regular = platform_.files.isRegularFile(url);
    const bool isFile = regular && *regular;
    if (isFile) {
        report.item->size = sizeOf(path);
        if (const auto opened = platform_.files.openForReading(url); !opened)
            return unreadable(report, "The file cannot be read: " + reasonOf(opened.error()) + ".");
    }

    const std::string extension = url.pathExtension();
    std::optional<TicketPlaceFault> fault;
    switch (assessmentClassForUTI(platform_.types, properties->typeIdentifier, extension)) {
        case AssessmentClass::bundle:
            // An executable file may still be a ticket.
            if (isFile && gatherBareTicket(url, true, report)) break;
            report.kind = isFile ? Kind::executable : Kind::bundle;
            fault = gatherBundle(url, report);
            break;
        case AssessmentClass::diskImage:
            report.kind = Kind::diskImage;
            fault = gatherImage(url, report);
            break;
        case AssessmentClass::package:
            report.kind = Kind::package;
            if (!isFile) return unreadable(report, "A package that is a directory carries no ticket.");
            fault = gatherPackage(url, report);
            break;
        case AssessmentClass::unknown:
            if (properties->isDirectory && platform_.files.mainExecutableOfBundle(url)) {
                report.kind = Kind::bundle;
                fault = gatherBundle(url, report);
            } else if (!isFile || !gatherBareTicket(url, extension != "ticket", report)) {
                return unreadable(report, "This is nothing that carries a ticket.");
            }
            break;
    }
    const auto* const image = std::get_if<SuperblobPlace>(&report.place);
    if (image != nullptr && image->fault && !image->superblob) {
        report.fault = image->fault;
        return unreadable(report, "This is no disk image that can be read: " + image->fault->rule + ".");
    }
    if (report.ticket && !fault) {
        concludeWithTicket(report);
    } else {
        concludeWithoutTicket(fault, report);
    }
    return report;
}

}  // namespace pinwell::inspect
