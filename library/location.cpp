// The place of an artefact's ticket, and the name of its record.
#include <utility>

#include "library/assessment.h"
#include "library/failure.h"
#include "library/local_platform.h"
#include "src/PWHashedFile/PWHashedBundle.h"
#include "src/PWHashedFile/ticket_place.h"
#include "src/record_name.h"
#include "verify/artefact_kind.h"

namespace pinwell::library {

using foundation::URL;
using verify::Kind;

namespace {

const char* const kNoTicket = "no ticket is attached";

/// The artefact, or the reason why it cannot be opened.
verify::OpenedArtefact opened(const URL& url, const Platform& platform) {
    if (const auto properties = platform.files.resourceProperties(url); !properties)
        throw failureOf(properties.error());
    if (const auto regular = platform.files.isRegularFile(url); regular && *regular) {
        if (const auto file = platform.files.openForReading(url); !file) throw failureOf(file.error());
    }
    verify::OpenedArtefact artefact = verify::openArtefact(url, platform);
    if (artefact.file == nullptr) throw Failure{PINWELL_ERROR_UNSUPPORTED, artefact.problem};
    return artefact;
}

LocatedTicket ticketOfBundle(PWHashedBundle& bundle, files::FileManager& files) {
    const auto fault = explainTicketPlace(bundle, files);
    if (fault && fault->isAbsence) throw Failure{PINWELL_ERROR_NO_TICKET, fault->rule};
    const URL url = bundle.codeResourcesURL();
    if (!files.isRegularFile(url)) throw Failure{PINWELL_ERROR_NO_TICKET, kNoTicket};
    auto bytes = files.contentsOfFile(url);
    if (!bytes) throw failureOf(bytes.error());
    if (bytes->empty()) throw Failure{PINWELL_ERROR_NO_TICKET, kNoTicket};
    return {*std::move(bytes), url.path(), 0};
}

template <class Artefact>
LocatedTicket ticketOfFile(ticket::Result<Artefact> read, const std::string& path) {
    if (const auto* const error = std::get_if<ticket::Error>(&read)) throw failureOf(*error);
    auto& found = std::get<Artefact>(read).ticket;
    if (!found || found->bytes.empty()) throw Failure{PINWELL_ERROR_NO_TICKET, kNoTicket};
    return {std::move(found->bytes), path, found->range.offset};
}

}  // namespace

LocatedTicket findTicket(const std::string& path) {
    const LocalPlatform platform(nullptr, 0);
    const Platform services = platform.services();
    const URL url = URL::fileURLWithPath(path);
    const verify::OpenedArtefact artefact = opened(url, services);
    switch (artefact.kind) {
        case Kind::bundle:
        case Kind::executable:
            break;
        case Kind::diskImage:
            return ticketOfFile(ticket::readDiskImage(url.path()), url.path());
        case Kind::package:
            return ticketOfFile(ticket::readFlatPackage(url.path()), url.path());
    }
    return ticketOfBundle(dynamic_cast<PWHashedBundle&>(*artefact.file), services.files);
}

std::string recordNameOfFile(const std::string& path) {
    const LocalPlatform platform(nullptr, 0);
    const verify::OpenedArtefact artefact = opened(URL::fileURLWithPath(path), platform.services());
    const auto hash =
        artefact.file->appropriateExitCode() == kExitOK ? artefact.file->cdHash() : std::nullopt;
    if (!hash) throw Failure{PINWELL_ERROR_NOT_SIGNED, "there is no valid signature"};
    return recordNameForHash(artefact.file->digestAlgorithm(), *hash);
}

}  // namespace pinwell::library
