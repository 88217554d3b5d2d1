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

/// Whether an invalid record looks like a damaged one.
bool isDamagedRecord(const trailer_header& record) {
    const bool knownType = record.type() == kTerminatorTrailerType || record.type() == kTicketTrailerType;
    return record.magic() == kTerminatorTrailer.magic() || (record.version() == kTrailerVersion && knownType);
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
        if (!trailer_data_is_valid(bytes, nullptr)) {
            if (!isDamagedRecord(record)) return std::nullopt;
            found.problem = record.version() != kTrailerVersion
                                ? "its version is not 1"
                                : "it does not begin with its magic, \"t8lr\"";
        }
        if (trailer_is_terminator(record.firstWord(), record.length())) {
            into_.hasTerminator = true;
            found.data = {recordOffset, 0};
            keep(std::move(found));
            return std::nullopt;
        }
        if (record.length() > recordOffset) {
            found.problem = "its data would begin before the file";
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
        if (!trailer.problem.empty() && !into_.fault && !ticket_)
            into_.fault = Fault{"a trailer record is damaged (" + trailer.problem + ")", std::nullopt,
                                trailer.recordOffset};
        ++into_.trailerCount;
        if (into_.trailers.size() < kMaximumTrailersKept) into_.trailers.push_back(std::move(trailer));
    }

    files::FileHandle& file_;
    TrailerWindow window_;
    TrailerPlace& into_;
    std::optional<Range> ticket_;
};

/// The ticket's bytes within a superblob: the last ticket counts, as in the tool.
std::optional<Range> ticketIn(ByteView superblob) {
    const auto blob = codesign::surveyLastBlobOf(kTicketSlotType, superblob);
    if (!blob || blob->bytes.size() < kBlobHeaderSize) return std::nullopt;
    return Range{blob->offset + std::uint64_t{kBlobHeaderSize}, blob->bytes.size() - kBlobHeaderSize};
}

std::optional<Fault> placeFaultOf(const Place& place) {
    if (const auto* const file = std::get_if<FilePlace>(&place)) return file->fault;
    if (const auto* const superblob = std::get_if<SuperblobPlace>(&place)) return superblob->fault;
    if (const auto* const trailers = std::get_if<TrailerPlace>(&place)) return trailers->fault;
    return std::nullopt;
}

/// The fault of a genuine ticket that does not accept the artefact.
std::optional<Fault> listingFaultOf(const Report& report) {
    const Payload& payload = *report.ticket->payload;
    if (report.kind == Kind::ticket || payload.matchingEntry) return std::nullopt;
    Fault fault{report.codeHash ? "the ticket does not list this file"
                                : "the file has no valid signature, so no ticket can list it",
                payload.range.offset + 24, std::nullopt};
    if (report.ticket->fileOffset) fault.fileOffset = *report.ticket->fileOffset + *fault.offset;
    return fault;
}

void concludeWithoutTicket(Report& report) {
    report.fault = placeFaultOf(report.place);
    report.outcome = report.fault ? Outcome::refused : Outcome::noTicket;
    if (report.fault) {
        report.conclusion = "No ticket can be read: " + report.fault->rule + ".";
    } else if (report.kind == Kind::executable) {
        report.conclusion = "An executable outside a bundle has no place for a ticket.";
    } else {
        report.conclusion = report.codeHash || report.kind == Kind::ticket
                                ? "No ticket is stapled to this file."
                                : "No ticket is stapled to this file, and it has no valid signature.";
    }
}

void concludeWithTicket(Report& report) {
    const Ticket& ticket = *report.ticket;
    report.fault = placeFaultOf(report.place);
    if (!report.fault) report.fault = firstFaultOf(ticket);
    if (!report.fault && ticket.payload->isRevoked) {
        report.outcome = Outcome::revoked;
        report.conclusion = "The ticket is genuine, and it marks the software as revoked.";
        return;
    }
    if (report.fault) {
        report.outcome = Outcome::refused;
        report.conclusion = "The ticket is not acceptable: " + report.fault->rule + ".";
        return;
    }
    report.fault = listingFaultOf(report);
    if (report.fault) {
        report.outcome = Outcome::refused;
        report.conclusion =
            report.codeHash ? "The ticket is genuine, but it does not list this file."
                            : "The ticket is genuine, but the file has no valid signature for it to list.";
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

void Inspector::gatherBundle(const URL& url, Report& report) const {
    report.code = codesign::describeCode(url.path());
    PWHashedBundle bundle(url, platform_);
    setHash(bundle, report);
    if (report.kind == Kind::executable) return;

    FilePlace place{bundle.codeResourcesURL().path(), std::nullopt};
    const auto regular = platform_.files.isRegularFile(bundle.codeResourcesURL());
    if (regular && *regular) {
        const auto bytes = platform_.files.contentsOfFile(bundle.codeResourcesURL());
        if (bytes) {
            report.ticket = gatherTicket(*bytes, 0, report.codeHash, platform_.trust);
        } else {
            place.fault = Fault{"the ticket file cannot be read: " + reasonOf(bytes.error()), {}, {}};
        }
    } else if (regular) {
        place.fault = Fault{"Contents/CodeResources is not a regular file", {}, {}};
    }
    report.place = std::move(place);
}

void Inspector::gatherImage(const URL& url, Report& report) const {
    report.code = codesign::describeCode(url.path());
    PWHashedDiskImage image(url, platform_);
    if (image.appropriateExitCode() == kExitOK) {
        setHash(image, report);
        const codesign::SliceDescription* const code = report.code->preferredSlice();
        const bool isSigned = code != nullptr && code->signature && !code->signature->directories.empty();
        report.isMadeUpHash = report.codeHash && !isSigned;
    }

    SuperblobPlace place;
    place.trailerOffset = image.origEOF() < kUDIFHeaderSize ? 0 : image.origEOF() - kUDIFHeaderSize;
    if (image.fault()) place.fault = Fault{image.fault()->rule, std::nullopt, image.fault()->offset};
    const bool isSet = image.dmgHeader().codeSignOffset() != 0 && image.dmgHeader().codeSignLength() != 0;
    if (isSet && image.dmgHeader().hasMagic()) {
        place.superblob = Range{image.dmgHeader().codeSignOffset(), image.dmgHeader().codeSignLength()};
        // From the superblob that the tool has read, so that the judged ticket is shown.
        codesign::SignatureDescription table = codesign::describeSignature(image.superblob());
        place.blobs = std::move(table.blobs);
        place.blobCount = table.blobCount;
        if (const auto found = ticketIn(image.superblob())) {
            const ByteView bytes = image.superblob().view().subspan(found->offset, found->length);
            report.ticket =
                gatherTicket(bytes, image.csStart() + found->offset, report.codeHash, platform_.trust);
        }
    }
    report.place = std::move(place);
}

void Inspector::gatherPackage(const URL& url, Report& report) const {
    PWHashedFlatPackage package(url, platform_);
    setHash(package, report);

    TrailerPlace place;
    const auto file = platform_.files.openForReading(url);
    if (!file) {
        place.fault = Fault{"the package cannot be read: " + reasonOf(file.error()), {}, {}};
        report.place = std::move(place);
        return;
    }
    try {
        TrailerWalk walk(**file, place);
        walk.run();
        if (walk.ticket()) {
            (*file)->seek(walk.ticket()->offset);
            const foundation::SharedBytes bytes = files::readShared(**file, walk.ticket()->length);
            report.ticket = gatherTicket(bytes, walk.ticket()->offset, report.codeHash, platform_.trust);
        }
    } catch (const files::FileHandleError& failure) {
        place.fault = Fault{std::string("the package cannot be read: ") + failure.what(), {}, {}};
    }
    report.place = std::move(place);
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
    switch (assessmentClassForUTI(platform_.types, properties->typeIdentifier, extension)) {
        case AssessmentClass::bundle:
            // An executable file may still be a ticket.
            if (isFile && gatherBareTicket(url, true, report)) break;
            report.kind = isFile ? Kind::executable : Kind::bundle;
            gatherBundle(url, report);
            break;
        case AssessmentClass::diskImage:
            report.kind = Kind::diskImage;
            gatherImage(url, report);
            break;
        case AssessmentClass::package:
            report.kind = Kind::package;
            if (!isFile) return unreadable(report, "A package that is a directory carries no ticket.");
            gatherPackage(url, report);
            break;
        case AssessmentClass::unknown:
            if (properties->isDirectory && platform_.files.mainExecutableOfBundle(url)) {
                report.kind = Kind::bundle;
                gatherBundle(url, report);
            } else if (!isFile || !gatherBareTicket(url, extension != "ticket", report)) {
                return unreadable(report, "This is nothing that carries a ticket.");
            }
            break;
    }
    const auto* const image = std::get_if<SuperblobPlace>(&report.place);
    if (image != nullptr && image->fault && !image->superblob)
        return unreadable(report, "This is no disk image that can be read: " + image->fault->rule + ".");
    if (report.ticket) {
        concludeWithTicket(report);
    } else {
        concludeWithoutTicket(report);
    }
    return report;
}

}  // namespace pinwell::inspect
