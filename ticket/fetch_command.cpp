#include <sysexits.h>

#include <atomic>
#include <optional>
#include <set>
#include <utility>

#include "command_parts.h"
#include "commands.h"
#include "companion/process.h"
#include "companion/streams.h"
#include "retrieval/ticket_fetch.h"
#include "ticket_files.h"

namespace pinwell::ticket_files {
namespace {

using retrieval::Report;

/// One run of the command.
class Fetching {
  public:
    Fetching(const Settings& settings, const Platform& platform)
        : settings_(settings), platform_(platform), reporter_(settings) {}

    int run() {
        if (!prepare()) return reporter_.exitStatus();
        if (!listNames()) return reporter_.exitStatus();
        retrieval::FetchOptions options;
        options.retry = settings_.retry;
        options.wait = settings_.wait;
        options.deadline = deadlineOf(settings_);
        {
            retrieval::Cancellation cancellation;
            const companion::SignalWatch watch(std::move(signals_), [&](int number) {
                signal_ = number;
                cancellation.cancel();
            });
            retrieval::fetchTickets(names_, options, platform_, cancellation,
                                    [this](std::size_t index, retrieval::FetchedTicket ticket) {
                                        take(index, std::move(ticket));
                                    });
        }
        if (const auto closed = directory_->close(); !closed)
            reporter_.complain(closed.error().localizedFailureReason(), kExitCannotCreate);
        const int status = reporter_.exitStatus();
        return signal_ != 0 ? companion::kSignalBase + signal_ : status;
    }

  private:
    bool prepare() {
        auto directory = TicketDirectory::open(*settings_.output);
        if (!directory) {
            reporter_.complain(directory.error().localizedFailureReason(), kExitCannotCreate);
            return false;
        }
        directory_ = *std::move(directory);
        signals_ = companion::takeEndingSignals();
        return true;
    }

    // Record names as they are; everything else is the path of an artefact.
    bool listNames() {
        auto list =
            companion::PathList::open(settings_.arguments, settings_.from, settings_.isZeroTerminated);
        if (!list) {
            reporter_.complain("the list cannot be read: " + list.error().localizedDescription(),
                               kExitNoInput);
            return false;
        }
        bool isEmpty = true;
        companion::PathList::Entry entry;
        while ((entry = list->nextOrWait()).state == companion::PathList::State::path) {
            isEmpty = false;
            const std::string& argument = entry.path;
            if (retrieval::hashInRecordName(argument)) {
                want({}, argument);
                continue;
            }
            OpenedArtefact artefact = openSignedArtefact(argument, "fetch", platform_);
            if (artefact.report.exitStatus != kExitOK) {
                reporter_.report(artefact.report);
                continue;
            }
            artefact.report.messages.clear();
            const std::string name = artefact.report.recordName;
            want(std::move(artefact.report), name);
        }
        if (entry.state == companion::PathList::State::broken) {
            reporter_.complain(
                "the list cannot be read any further: " + list->error()->localizedDescription(),
                kExitNoInput);
            return false;
        }
        if (isEmpty) {
            reporter_.complain("the list holds no name", EX_USAGE);
            return false;
        }
        return true;
    }

    // A record that is named twice is fetched once, and reported for the first of its names.
    void want(Report report, const std::string& recordName) {
        if (!known_.insert(recordName).second) return;
        report.operation = "fetch";
        report.recordName = recordName;
        names_.push_back(recordName);
        reports_.push_back(std::move(report));
    }

    void take(std::size_t number, retrieval::FetchedTicket ticket) {
        Report& report = reports_[number];
        moveResult(ticket, signal_, report);
        if (!ticket.ticket.empty()) directory_->keep(ticket, report);
        reporter_.report(report);
        report = {};
    }

    const Settings& settings_;
    const Platform platform_;
    Reporter reporter_;
    std::optional<TicketDirectory> directory_;
    base::FileDescriptor signals_;
    std::atomic<int> signal_ = 0;  // the signal that ended the run
    std::set<std::string> known_;
    std::vector<std::string> names_;
    std::vector<Report> reports_;  // one for each name
};

}  // namespace

int fetch(const Settings& settings, const Platform& platform) {
    return Fetching(settings, platform).run();
}

}  // namespace pinwell::ticket_files
