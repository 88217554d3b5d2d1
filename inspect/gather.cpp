#include "gather.h"

#include <algorithm>
#include <filesystem>
#include <system_error>
#include <utility>

#include "base/bytes.h"
#include "formats/package_trailers.h"
#include "formats/tm_ticket.h"
#include "gather_ticket.h"
#include "src/PWHashedFile/PWHashedBundle.h"
#include "src/PWHashedFile/PWHashedDiskImage.h"
#include "src/PWHashedFile/PWHashedFlatPackage.h"
#include "src/PWHashedFile/file_kind.h"
#include "src/ticket_record.h"
#include "values/format.h"

namespace pinwell::inspect {
namespace {

using base::ByteView;
using values::URL;

std::optional<std::uint64_t> sizeOf(const std::string& path) {
    std::error_code error;
    const auto size = std::filesystem::file_size(path, error);
    return error ? std::nullopt : std::optional<std::uint64_t>(size);
}

std::string reasonOf(const base::Error& error) {
    const std::string& reason = error.localizedFailureReason();
    return reason.empty() ? error.localizedDescription() : reason;
}

void setHash(PWHashedFile& file, Report& report) {
    const std::optional<CodeHash> hash = codeHashOf(file);
    if (!hash) return;
    report.codeHash = Hash{hash->algorithm, hash->hash};
    report.recordName = recordNameForHash(*hash);
}

/// The fault of a place, as the report shows it.
std::optional<Fault> faultOf(const std::optional<TicketPlaceFault>& fault) {
    if (!fault) return std::nullopt;
    return Fault{fault->rule, std::nullopt, fault->offset};
}

Trailer shown(const SurveyedTrailer& trailer) {
    Trailer made{.recordOffset = trailer.recordOffset,
                 .version = trailer.record.version(),
                 .type = trailer.record.type(),
                 .data = {},
                 .problem = trailer.fault ? trailer.fault->rule : ""};
    if (trailer.dataOffset) made.data = {*trailer.dataOffset, trailer.record.length()};
    return made;
}

/// The trailers, past the first ticket and past damaged records.
PackageTrailerSurvey gatherTrailers(const base::ByteSource& file, TrailerPlace& into) {
    const PackageTrailerSurvey survey = surveyPackageTrailers(file, [&](const SurveyedTrailer& trailer) {
        ++into.trailerCount;
        if (into.trailers.size() < kMaximumTrailersKept) into.trailers.push_back(shown(trailer));
    });
    into.hasTerminator = survey.hasTerminator;
    return survey;
}

/// The ticket's bytes within a superblob: the last ticket counts, as in the tool.
std::optional<Range> ticketIn(ByteView superblob) {
    const auto blob = surveyLastBlobOf(kTicketSlotType, superblob);
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
    auto fault = bundle.ticketPlaceFault();
    if (report.kind == Kind::executable) return fault;
    report.place = FilePlace{bundle.codeResourcesURL().path(), faultOf(fault)};
    if (const auto bytes = bundle.ticketData()) gatherHeldTicket(*bytes, 0, report);
    return fault;
}

std::optional<TicketPlaceFault> Inspector::gatherImage(const URL& url, Report& report) const {
    report.code = codesign::describeCode(url.path());
    PWHashedDiskImage image(url, platform_);
    SuperblobPlace place;
    setHash(image, report);
    if (report.codeHash) {
        const codesign::SliceDescription* const code = report.code->preferredSlice();
        const bool isSigned = code != nullptr && code->signature && !code->signature->directories.empty();
        report.isMadeUpHash = !isSigned;
    }

    auto fault = image.ticketPlaceFault();
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
            const PackageTrailerSurvey survey = gatherTrailers(**file, place);
            fault = placeFault(survey.fault);
            if (survey.ticketStart && survey.ticketLength > 0) {
                gatherHeldTicket((*file)->readSharedUpTo(*survey.ticketStart, survey.ticketLength),
                                 *survey.ticketStart, report);
            }
        } catch (const base::ReadFailure& failure) {
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
    // The conclusion says more than the tool, which does not read the ticket of such an artefact.
    if (report.kind != Kind::ticket && !report.codeHash) report.outcome = Outcome::unreadable;
    return report;
}

}  // namespace pinwell::inspect
