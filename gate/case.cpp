#include "case.h"

#include <utility>

#include "base/byte_source.h"
#include "base/bytes.h"
#include "base/places.h"
#include "codesign/code_error.h"
#include "policy.h"
#include "src/ticket_record.h"
#include "values/format.h"
#include "values/url.h"
#include "verify/check.h"
#include "verify/page_digest.h"
#include "verify/verify.h"

namespace pinwell::gate {

using values::format;
using values::URL;
using verify::JudgedTicket;
using verify::Kind;
using verify::Outcome;

namespace {

const std::string kStapledPlace = "stapled ticket";
const std::string kServicePlace = "ticket of the record service";

}  // namespace

Case::Case(std::string path, const Judgement& judgement) : judgement_(judgement) {
    result_.path = std::move(path);
    result_.verdict = Verdict::good;
    result_.conclusion = judgement.options.isShallow ? "Its ticket is good."
                                                     : "It is what was signed, and its ticket is good.";
}

Case::~Case() = default;
Case::Case(Case&&) noexcept = default;

void Case::atLeast(Verdict verdict, std::string conclusion) {
    if (verdict <= result_.verdict) return;
    result_.verdict = verdict;
    result_.conclusion = std::move(conclusion);
}

void Case::unreadable(const std::string& why) {
    atLeast(Verdict::unreadable, why);
    result_.checks.cannotRead(verify::kArtefact, {}, why);
}

void Case::examine() {
    if (!open()) return;
    isStapledAcceptable_ = judgeStapled();
    const bool knowsNothing = !codeHash_ && !stapled_;
    // Without a hash and a ticket, only one check remains: whether there is a signature at all.
    if (!judgement_.options.isShallow || knowsNothing) verifyBytes();
    if (judgement_.tickets != nullptr && codeHash_) lookInDirectory();
    if (!judgement_.options.attestation.empty() && kind_ != Kind::bundle) digestFile();
    file_.reset();
}

bool Case::open() {
    // A URL is made absolute with the working directory; a path is shown as given.
    const URL url = URL::fileURLWithPath(result_.path);
    verify::OpenedArtefact opened = verify::openArtefact(url, judgement_.platform);
    if (opened.file == nullptr) {
        unreadable(opened.problem);
        return false;
    }
    file_ = std::move(opened.file);
    kind_ = opened.kind;
    absolutePath_ = url.path();
    result_.kind = nameOf(kind_);
    return true;
}

bool Case::judgeStapled() {
    placeFault_ = file_->ticketPlaceFault();
    // The tool stops here: such a file has no hash and no ticket.
    if (file_->appropriateExitCode() != kExitOK) return false;
    if (auto hash = codeHashOf(*file_)) {
        result_.recordName = recordNameForHash(*hash);
        result_.digestType = hash->algorithm;
        result_.codeHash = hash->hash;
        codeHash_ = std::move(hash->hash);
    }
    const std::optional<base::Data> bytes = file_->ticketData();
    if (!bytes || placeFault_) return false;
    result_.checks.pass(verify::kTicketStapled, kStapledPlace, "a ticket");
    stapled_.emplace(*bytes, judgement_.platform.trust);
    const bool isAcceptable = checkTicket(*stapled_, codeHash_, kStapledPlace, result_.checks);
    if (stapled_->isGenuine() && stapled_->isRevoked())
        atLeast(Verdict::revoked, "Its ticket revokes it: it must not run.");
    else if (!isAcceptable)
        atLeast(Verdict::refused, "Its ticket is not acceptable.");
    return isAcceptable;
}

void Case::verifyBytes() {
    verify::Report report = verify::verifyArtefact({kind_, absolutePath_}, judgement_.workers);
    code_ = std::move(report.code);
    hasCode_ = true;
    // The tool found the hash, these checks found the code: each opened the path by itself.
    if (!verify::checkOneArtefact(code_, codeHash_, result_.checks))
        atLeast(Verdict::altered, "It changed while it was read.");
    const bool isSigned = code_.isSigned || codeHash_ || stapled_;
    if (!isSigned) {
        atLeast(Verdict::unreadable, "It has no signature.");
        // Without one there is nothing to compare the bytes with.
        result_.checks.cannotRead(verify::kSignature, {}, "there is no signature");
        return;
    }
    if (judgement_.options.isShallow) return;
    result_.checks.sections.push_back(std::move(report.root));
    switch (verify::worstOutcome(result_.checks.sections.back())) {
        case Outcome::failed:
            atLeast(Verdict::altered, "It is not what was signed.");
            break;
        case Outcome::unreadable:
            atLeast(Verdict::unreadable, "Not all of it can be read.");
            break;
        case Outcome::passed:
        case Outcome::skipped:
        case Outcome::noted:
            break;
    }
}

// The verified file, unless somebody changes it meanwhile.
void Case::digestFile() {
    try {
        const base::FileSource file = codesign::openCode(base::Places(), absolutePath_);
        result_.fileDigest = base::toData(verify::digestOf(crypto::Digest::sha256, file, {0, file.size()}));
    } catch (const std::runtime_error& failure) {
        unreadable(std::string("The file cannot be read: ") + codesign::asCodeError(failure).what() + ".");
    }
}

bool Case::asksService() const {
    return judgement_.options.tickets == Options::Tickets::online && isStapledAcceptable_;
}

void Case::lookInDirectory() {
    const TicketDirectory::Found found = judgement_.tickets->find(result_.recordName);
    if (!found.problem.empty()) {
        result_.checks.fail(verify::kTicketCurrent, found.file, "a ticket", found.problem);
        atLeast(Verdict::refused, "The ticket that was fetched for it cannot be read.");
    } else if (!found.ticket) {
        result_.checks.note(verify::kTicketCurrent, found.file, "a ticket",
                            "none was fetched for it, so the stapled one decides");
    } else {
        takeCurrent(*found.ticket, found.file);
    }
}

void Case::takeFetched(const retrieval::FetchedTicket& fetched) {
    using retrieval::Cause;
    if (!fetched.ticket.empty()) return takeCurrent(fetched.ticket, kServicePlace);
    std::string why(retrieval::nameOf(fetched.cause));
    if (!fetched.messages.empty()) why += ": " + fetched.messages.back();
    switch (fetched.cause) {
        case Cause::notIssued:
        case Cause::notAcceptable:
            result_.checks.fail(verify::kTicketCurrent, kServicePlace, "a ticket", why);
            atLeast(Verdict::refused, fetched.cause == Cause::notIssued
                                          ? "The record service has no ticket for it."
                                          : "The record service's ticket is not acceptable.");
            break;
        default:
            result_.checks.cannotRead(verify::kTicketCurrent, kServicePlace, why);
            atLeast(Verdict::unreachable, fetched.cause == Cause::untrusted
                                              ? "The server that answered is not the record service."
                                              : "The record service cannot be reached.");
    }
}

void Case::takeCurrent(base::ByteView bytes, const std::string& place) {
    current_.emplace(bytes, judgement_.platform.trust);
    const bool isAcceptable = checkTicket(*current_, codeHash_, place, result_.checks);
    if (isAcceptable) {
        result_.checks.pass(verify::kTicketCurrent, place, "a ticket that accepts the artefact");
    } else if (current_->isGenuine() && current_->isRevoked()) {
        atLeast(Verdict::revoked, "Its ticket has been revoked: it must not run.");
    } else {
        atLeast(Verdict::refused, "The ticket that was fetched for it is not acceptable.");
    }
}

// Checks that the ticket, or the seal of listed code, vouches for each piece of code.
void Case::checkListing() {
    if (!isStapledAcceptable_ || judgement_.options.isShallow) return;
    const auto lists = [&](base::ByteView hash) {
        return stapled_->lists(hash) || (current_ && current_->lists(hash));
    };
    if (!verify::checkListing(code_, lists, result_.checks))
        atLeast(Verdict::altered, "There is code in it that nobody vouches for.");
}

void Case::checkPolicy() {
    const Policy& policy = judgement_.options.policy;
    const JudgedTicket* const deciding = current_ && current_->isGenuine()   ? &*current_
                                         : stapled_ && stapled_->isGenuine() ? &*stapled_
                                                                             : nullptr;
    if (!checkAgainst(policy, deciding, code_, judgement_.now, result_.checks))
        atLeast(Verdict::refused, "The policy does not admit it.");
}

Result Case::conclude() && {
    if (result_.kind.empty() || (!codeHash_ && !stapled_ && hasCode_ && !code_.isSigned))
        return std::move(result_);
    if (!stapled_) {
        verify::Section missing;
        verify::checkMissingTicket(placeFault_, kStapledPlace, missing);
        result_.checks.checks.insert(result_.checks.checks.begin(), std::move(missing.checks.front()));
        const bool isDamaged = placeFault_ && !placeFault_->isAbsence;
        atLeast(isDamaged ? Verdict::refused : Verdict::noTicket,
                verify::conclusionWithoutTicket(placeFault_));
    }
    if (!isStapledAcceptable_ && judgement_.options.tickets == Options::Tickets::online)
        result_.checks.skip(verify::kTicketCurrent, kServicePlace,
                            "not asked for, since the stapled ticket is not acceptable");
    checkListing();
    checkPolicy();
    return std::move(result_);
}

}  // namespace pinwell::gate
