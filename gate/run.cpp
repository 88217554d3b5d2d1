#include "run.h"

#include <sysexits.h>

#include <algorithm>
#include <chrono>
#include <memory>
#include <utility>

#include "case.h"
#include "codesign/code_error.h"

namespace pinwell::gate {

using codesign::CodeError;

namespace {

/// Somebody waits for the verdict, so there are only two retries: after half a second, and after a second.
retrieval::FetchOptions fetchOptions() {
    retrieval::FetchOptions options;
    options.retry.retries = 2;
    options.retry.firstDelay = std::chrono::milliseconds(500);
    return options;
}

void askService(std::vector<Case>& cases, const Platform& platform) {
    std::vector<std::string> names;
    std::vector<Case*> asking;
    for (Case& one : cases) {
        if (!one.asksService()) continue;
        names.push_back(one.recordName());
        asking.push_back(&one);
    }
    if (names.empty()) return;
    retrieval::Cancellation cancellation;
    retrieval::fetchTickets(names, fetchOptions(), platform, cancellation,
                            [&](std::size_t index, const retrieval::FetchedTicket& fetched) {
                                asking[index]->takeFetched(fetched);
                            });
}

}  // namespace

base::Result<TicketDirectory> TicketDirectory::open(const std::string& path) {
    try {
        // The slash makes a link followed.
        return TicketDirectory(path, verify::OpenDirectory::atPath(path + "/"));
    } catch (const CodeError& error) {
        return base::Error(base::kOSStatusErrorDomain, error.status(), error.what());
    }
}

TicketDirectory::Found TicketDirectory::find(const std::string& recordName) const {
    std::string name = recordName + ".ticket";
    std::replace(name.begin(), name.end(), '/', '-');
    Found found{.file = path_ + "/" + name, .ticket = std::nullopt, .problem = {}};
    try {
        if (!directory_->kindOf(name)) return found;
        const auto file = directory_->file(name);
        if (file->size() > kMaximumTicketFile) {
            found.problem = "it is too long to be a ticket";
        } else {
            found.ticket = file->read(0, static_cast<std::size_t>(file->size()));
        }
    } catch (const std::runtime_error& failure) {
        found.problem = codesign::asCodeError(failure).what();
    }
    return found;
}

std::string_view verdictName(Verdict verdict) {
    switch (verdict) {
        case Verdict::good:
            return "good";
        case Verdict::unreachable:
            return "unreachable";
        case Verdict::unreadable:
            return "unreadable";
        case Verdict::noTicket:
            return "noTicket";
        case Verdict::refused:
            return "refused";
        case Verdict::altered:
            return "altered";
        case Verdict::revoked:
            break;
    }
    return "revoked";
}

int exitStatusOf(Verdict verdict) {
    switch (verdict) {
        case Verdict::good:
            return EX_OK;
        case Verdict::unreachable:
            return EX_NOHOST;
        case Verdict::unreadable:
            return EX_NOINPUT;
        case Verdict::noTicket:
        case Verdict::refused:
        case Verdict::altered:
            return EX_DATAERR;
        case Verdict::revoked:
            break;
    }
    return EX_NOPERM;
}

std::vector<Result> judgeAll(const std::vector<std::string>& paths, const Options& options,
                             const TicketDirectory* tickets, const Platform& platform) {
    verify::Workers workers;
    const auto now = std::chrono::system_clock::now().time_since_epoch();
    const Judgement judgement{.platform = platform,
                              .options = options,
                              .workers = workers,
                              .tickets = tickets,
                              .now = std::chrono::duration_cast<std::chrono::seconds>(now).count()};
    std::vector<Case> cases;
    cases.reserve(paths.size());
    for (const std::string& path : paths) cases.emplace_back(path, judgement);
    workers.forEach(cases.size(), [&](std::size_t i) { cases[i].examine(); });
    askService(cases, platform);
    std::vector<Result> results;
    results.reserve(cases.size());
    for (Case& one : cases) results.push_back(std::move(one).conclude());
    return results;
}

int exitStatusOf(const std::vector<Result>& results) {
    const auto worst = std::max_element(results.begin(), results.end(), [](const Result& a, const Result& b) {
        return a.verdict < b.verdict;
    });
    return worst == results.end() ? 0 : exitStatusOf(worst->verdict);
}

}  // namespace pinwell::gate
