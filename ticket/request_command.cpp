#include <sysexits.h>

#include <atomic>
#include <optional>
#include <set>
#include <utility>

#include "base/text.h"
#include "command_parts.h"
#include "commands.h"
#include "companion/process.h"
#include "companion/streams.h"
#include "https/session.h"
#include "retrieval/ticket_request.h"
#include "src/PWHashedFile/PWHashedFile.h"
#include "src/cdhash_extract.h"
#include "ticket_files.h"
#include "values/format.h"

namespace pinwell::ticket_files {
namespace {

using retrieval::Cause;
using retrieval::Report;

// A ticket of 16 MiB and its certificates, in base64, and the JSON around them.
constexpr std::size_t kLargestAnswer = std::size_t{24} * 1024 * 1024;

constexpr std::string_view kOperation = "request";

Platform withSessions(const Platform& platform, https::SessionService& sessions) {
    return {platform.files,        platform.types,     platform.codeSigning, platform.trust,      sessions,
            platform.userDefaults, platform.systemLog, platform.directory,   platform.exitProcess};
}

/// One run of the command.
class Requesting {
  public:
    Requesting(const Settings& settings, const Platform& platform,
               std::shared_ptr<const https::ClientIdentity> identity)
        : settings_(settings),
          platform_(platform),
          // After a redirect the request could have another meaning, and another server would learn who asks.
          sessions_(https::makeSessionService(platform.trust, {.maximumResponseBody = kLargestAnswer,
                                                               .maximumRedirects = 0,
                                                               .keepsConnection = true,
                                                               .identity = std::move(identity)})),
          reporter_(settings) {}

    int run() {
        auto list =
            companion::PathList::open(settings_.arguments, settings_.from, settings_.isZeroTerminated);
        if (!list)
            return complain("the list cannot be read: " + list.error().localizedDescription(), EX_NOINPUT);
        auto directory = TicketDirectory::open(*settings_.output);
        if (!directory) return complain(directory.error().localizedFailureReason(), EX_CANTCREAT);
        directory_ = *std::move(directory);
        requestAll(*list);
        if (const auto closed = directory_->close(); !closed)
            reporter_.complain(closed.error().localizedFailureReason(), EX_CANTCREAT);
        const int status = reporter_.exitStatus();
        return signal_ != 0 ? companion::kSignalBase + signal_ : status;
    }

  private:
    int complain(const std::string& text, int status) {
        reporter_.complain(text, status);
        return reporter_.exitStatus();
    }

    void requestAll(companion::PathList& list) {
        retrieval::RequestOptions options{*retrieval::serviceURLOf(*settings_.url), settings_.retry,
                                          deadlineOf(settings_)};
        base::FileDescriptor signals = companion::takeEndingSignals();
        retrieval::Cancellation cancellation;
        const companion::SignalWatch watch(std::move(signals), [&](int number) {
            signal_ = number;
            cancellation.cancel();
        });
        retrieval::TicketRequests requests(withSessions(platform_, *sessions_), std::move(options),
                                           cancellation);
        bool isEmpty = true;
        companion::PathList::Entry entry;
        while ((entry = list.nextOrWait()).state == companion::PathList::State::path) {
            isEmpty = false;
            if (const auto why = requests.end())
                leaveOut(entry.path, *why);
            else
                requestFor(entry.path, requests);
        }
        if (entry.state == companion::PathList::State::broken)
            reporter_.complain("the list cannot be read any further: " + list.error()->localizedDescription(),
                               EX_NOINPUT);
        else if (isEmpty)
            reporter_.complain("the list holds no path", EX_USAGE);
    }

    // Reading an artefact can take long.
    void leaveOut(const std::string& path, Cause why) {
        Report report;
        report.path = path;
        report.operation = kOperation;
        report.cause = why;
        report.exitStatus = why == Cause::interrupted ? companion::kSignalBase + signal_ : kExitNoHost;
        reporter_.report(report);
    }

    void requestFor(const std::string& path, retrieval::TicketRequests& requests) {
        OpenedArtefact artefact = openSignedArtefact(path, kOperation, platform_);
        Report& report = artefact.report;
        if (report.exitStatus != EX_OK) return reporter_.report(report);
        // Two artefacts with one record have one ticket.
        if (!known_.insert(report.recordName).second) return;
        retrieval::RequestedTicket requested = requests.request(wishFor(artefact));
        take(requested, report);
        reporter_.report(report);
    }

    retrieval::TicketWish wishFor(const OpenedArtefact& artefact) const {
        const URL url = *artefact.file->fileURL();
        retrieval::TicketWish wish;
        wish.hashes = listableHashes({artefact.algorithm, artefact.hash}, url, platform_.codeSigning);
        wish.label = settings_.label.value_or(base::escapeForTerminal(url.lastPathComponent()));
        wish.reinstates = settings_.reinstates;
        wish.comment = settings_.comment.value_or("");
        return wish;
    }

    void take(retrieval::RequestedTicket& requested, Report& report) {
        retrieval::FetchedTicket& ticket = requested.fetched;
        moveResult(ticket, signal_, report);
        if (ticket.ticket.empty()) return;
        report.action = requested.action;
        report.event = requested.event;
        report.messages.push_back(
            values::format("The record service has %@ it: event %@.", requested.action, requested.event));
        directory_->keep(ticket, report);
    }

    const Settings& settings_;
    const Platform platform_;
    const std::unique_ptr<https::SessionService> sessions_;
    Reporter reporter_;
    std::optional<TicketDirectory> directory_;
    std::atomic<int> signal_ = 0;  // the signal that ended the run
    std::set<std::string> known_;  // the requested records
};

}  // namespace

int request(const Settings& settings, const Platform& platform,
            std::shared_ptr<const https::ClientIdentity> identity) {
    return Requesting(settings, platform, std::move(identity)).run();
}

}  // namespace pinwell::ticket_files
