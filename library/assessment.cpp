#include "assessment.h"

#include <pthread.h>

#include <csignal>
#include <memory>
#include <utility>

#include "c_calls.h"
#include "formats/code_hashes.h"
#include "formats/explain_ticket.h"
#include "local_platform.h"
#include "src/PWHashedFile/PWHashedBundle.h"
#include "verify/check.h"
#include "verify/judged_ticket.h"
#include "verify/verify.h"

namespace pinwell::library {

using values::URL;
using verify::Kind;
using verify::Outcome;

namespace {

const char* const kStapledPlace = "stapled ticket";

pinwell_kind numberOf(Kind kind) {
    switch (kind) {
        case Kind::none:
            return PINWELL_KIND_NONE;
        case Kind::bundle:
            return PINWELL_KIND_BUNDLE;
        case Kind::executable:
            return PINWELL_KIND_EXECUTABLE;
        case Kind::diskImage:
            return PINWELL_KIND_DISK_IMAGE;
        case Kind::package:
            break;
    }
    return PINWELL_KIND_PACKAGE;
}

/// While it lives, threads that this one starts get no signals: the host handles them.
class SignalsBlocked {
  public:
    SignalsBlocked() noexcept {
        sigset_t all;
        sigfillset(&all);
        pthread_sigmask(SIG_SETMASK, &all, &before_);
    }
    ~SignalsBlocked() { pthread_sigmask(SIG_SETMASK, &before_, nullptr); }
    SignalsBlocked(const SignalsBlocked&) = delete;
    SignalsBlocked& operator=(const SignalsBlocked&) = delete;

  private:
    sigset_t before_{};
};

verify::Report verifyWithThreads(const verify::Subject& subject, unsigned threads) {
    std::optional<verify::Workers> workers;
    {
        const SignalsBlocked blocked;
        workers.emplace(threads);
    }
    return verify::verifyArtefact(subject, *workers);
}

void flattenInto(verify::Section& section, std::uint32_t depth, std::vector<PlacedCheck>& all) {
    for (verify::Check& check : section.checks) all.push_back({std::move(check), depth});
    for (verify::Section& part : section.sections) flattenInto(part, depth + 1, all);
}

/// One artefact on its way to a verdict. The verdict is the gravest of all findings.
class Assessor {
  public:
    Assessor(const std::string& path, Depth depth, const ticket::TrustedRoots& roots,
             const Settings& settings)
        : url_(URL::fileURLWithPath(path)),
          depth_(depth),
          settings_(settings),
          platform_(&roots, settings.evaluationTime),
          services_(platform_.services()) {}

    Assessment run() && {
        found_.reason = depth_ == Depth::ticket ? "Its ticket is good."
                                                : "It is what was signed, and its ticket is good.";
        if (open()) {
            if (depth_ == Depth::ticket) {
                judgeTicketAlone();
            } else {
                judgeEverything();
            }
        }
        flattenInto(checks_, 0, found_.checks);
        return std::move(found_);
    }

  private:
    void atLeast(pinwell_verdict verdict, std::string reason) {
        if (verdict <= found_.verdict) return;
        found_.verdict = verdict;
        found_.reason = std::move(reason);
    }

    bool open() {
        verify::OpenedArtefact opened = verify::openArtefact(url_, services_);
        if (opened.file == nullptr) {
            atLeast(PINWELL_VERDICT_UNREADABLE, opened.problem);
            checks_.cannotRead(verify::kArtefact, {}, opened.problem);
            return false;
        }
        file_ = std::move(opened.file);
        placeFault_ = file_->ticketPlaceFault();
        kind_ = opened.kind;
        found_.kind = numberOf(kind_);
        return true;
    }

    void readHashAndTicket() {
        // The tool stops here: such a file has no hash and no ticket.
        if (file_->appropriateExitCode() != kExitOK) return;
        if (auto hash = codeHashOf(*file_)) {
            found_.recordName = recordNameForHash(*hash);
            found_.digestType = hash->algorithm;
            found_.codeHash = std::move(hash->hash);
        }
        found_.ticket = file_->ticketData();
    }

    void withoutSignature() {
        const bool isDamaged = isPlaceDamaged();
        atLeast(PINWELL_VERDICT_UNREADABLE,
                isDamaged ? verify::conclusionWithoutTicket(placeFault_) : "It has no valid signature.");
        checks_.cannotRead(verify::kSignature, {},
                           isDamaged ? placeFault_->rule : "there is no valid signature");
    }

    bool isPlaceDamaged() const { return placeFault_ && !placeFault_->isAbsence; }

    // As in the tool: without a hash, the ticket is not read.
    void judgeTicketAlone() {
        readHashAndTicket();
        if (!found_.codeHash) return withoutSignature();
        judgeTicket();
    }

    void judgeEverything() {
        readHashAndTicket();
        const bool isAcceptable = found_.ticket && judgeTicket();
        verify::Report report = verifyWithThreads({kind_, url_.path()}, settings_.threads);
        // The tool found the hash, these checks found the code: each opened the path by itself.
        if (!verify::checkOneArtefact(report.code, found_.codeHash, checks_))
            atLeast(PINWELL_VERDICT_ALTERED, "It changed while it was read.");
        if (!report.code.isSigned && !found_.codeHash && !found_.ticket) return withoutSignature();
        if (!found_.ticket) judgeTicket();
        takeOutcome(verify::worstOutcome(report.root));
        if (isAcceptable && !verify::checkListing(
                                report.code, [&](const auto& hash) { return judged_->lists(hash); }, checks_))
            atLeast(PINWELL_VERDICT_ALTERED, "There is code in it that nobody vouches for.");
        checks_.sections.push_back(std::move(report.root));
    }

    bool judgeTicket() {
        if (!found_.ticket || placeFault_) {
            verify::checkMissingTicket(placeFault_, kStapledPlace, checks_);
            atLeast(isPlaceDamaged() ? PINWELL_VERDICT_REFUSED : PINWELL_VERDICT_NO_TICKET,
                    verify::conclusionWithoutTicket(placeFault_));
            return false;
        }
        checks_.pass(verify::kTicketStapled, kStapledPlace, "a ticket");
        judged_.emplace(*found_.ticket, services_.trust);
        if (verify::checkTicket(*judged_, found_.codeHash, kStapledPlace, checks_)) return true;
        if (judged_->isGenuine() && judged_->isRevoked())
            atLeast(PINWELL_VERDICT_REVOKED, "Its ticket revokes it: it must not run.");
        else
            atLeast(PINWELL_VERDICT_REFUSED, "Its ticket is not acceptable: " + faultOfTicket() + ".");
        return false;
    }

    std::string faultOfTicket() const {
        if (!judged_->isGenuine()) return judged_->fault();
        return found_.codeHash ? kNotListed : kNothingToList;
    }

    void takeOutcome(Outcome worst) {
        if (worst == Outcome::failed) atLeast(PINWELL_VERDICT_ALTERED, "It is not what was signed.");
        if (worst == Outcome::unreadable) atLeast(PINWELL_VERDICT_UNREADABLE, "Not all of it can be read.");
    }

    const URL url_;
    const Depth depth_;
    const Settings settings_;
    const LocalPlatform platform_;
    const Platform services_;
    std::shared_ptr<PWHashedFile> file_;
    Kind kind_ = Kind::none;
    std::optional<TicketPlaceFault> placeFault_;
    std::optional<verify::JudgedTicket> judged_;
    verify::Section checks_;
    Assessment found_;
};

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
    const auto fault = bundle.ticketPlaceFault();
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
    if (!read) throw failureOf(read.error());
    auto& found = read->ticket;
    if (!found || found->bytes.empty()) throw Failure{PINWELL_ERROR_NO_TICKET, kNoTicket};
    return {std::move(found->bytes), path, found->range.offset};
}

}  // namespace

Assessment assess(const std::string& path, Depth depth, const ticket::TrustedRoots& roots,
                  const Settings& settings) {
    return Assessor(path, depth, roots, settings).run();
}

LocatedTicket findTicket(const std::string& path) {
    const LocalPlatform platform(nullptr, 0);
    const Platform services = platform.services();
    const URL url = URL::fileURLWithPath(path);
    const verify::OpenedArtefact artefact = opened(url, services);
    switch (artefact.kind) {
        case Kind::none:
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
    const auto hash = codeHashOf(*artefact.file);
    if (!hash) throw Failure{PINWELL_ERROR_NOT_SIGNED, "there is no valid signature"};
    return recordNameForHash(*hash);
}

}  // namespace pinwell::library
