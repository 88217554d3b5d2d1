// pinwell-batch: many artefacts in one process.
#include <malloc.h>
#include <sys/ioctl.h>
#include <sysexits.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <optional>
#include <string>
#include <utility>

#include "companion/process.h"
#include "companion/streams.h"
#include "coordinator.h"
#include "journal.h"
#include "report.h"
#include "sandbox/sandbox.h"
#include "selection.h"
#include "settings.h"
#include "src/DownloadDelegate.h"
#include "src/confinement.h"
#include "src/host_platform.h"
#include "src/messages.h"
#include "values/format.h"

namespace {

using namespace pinwell;
using namespace pinwell::batch;

constexpr int kMostArenas = 2;

void complain(const std::string& text) {
    companion::complain(kProgramName, text);
}

/// Rewrites one line of standard error, ten times a second at most.
class Progress {
  public:
    /// Shows nothing unless `isShown`.
    explicit Progress(bool isShown) : isShown_(isShown) {}
    ~Progress() { clear(); }
    Progress(const Progress&) = delete;
    Progress& operator=(const Progress&) = delete;

    void show(std::uint64_t done, std::uint64_t failed, std::size_t inWork) {
        if (!isShown_) return;
        const auto now = Clock::now();
        if (now - last_ < kInterval) return;
        last_ = now;
        isOnScreen_ = true;
        std::string line =
            values::format("%llu done, %llu of them failed, %zu in work", done, failed, inWork);
        line.resize(std::min(line.size(), columns() - 1));  // a second line could not be cleared
        errors_.write(kEraseLine + line);
    }

    /// Removes the line, so that another line can be printed.
    void clear() {
        if (!isOnScreen_) return;
        isOnScreen_ = false;
        errors_.write(kEraseLine);
    }

  private:
    // The width of the terminal, which may change at any time.
    static std::size_t columns() {
        winsize size{};
        if (::ioctl(STDERR_FILENO, TIOCGWINSZ, &size) != 0 || size.ws_col == 0) return kUsualColumns;
        return size.ws_col;
    }

    static constexpr std::chrono::milliseconds kInterval{100};
    static constexpr const char* kEraseLine = "\r\x1b[K";
    static constexpr std::size_t kUsualColumns = 80;

    const bool isShown_;
    companion::Output errors_{STDERR_FILENO};
    bool isOnScreen_ = false;
    Clock::time_point last_;
};

class Run {
  public:
    Run(const Settings& settings, std::optional<Journal> journal, std::optional<JUnitReport> junit)
        : settings_(settings),
          journal_(std::move(journal)),
          junit_(std::move(junit)),
          selection_(settings.shard, settings.shards),
          inColor_(companion::wantsColor(settings.color, STDOUT_FILENO)),
          progress_(!settings.isQuiet && ::isatty(STDERR_FILENO) == 1) {
        summary_.operation = nameOfOperation(settings.operation);
    }

    int work(const Platform& platform, companion::PathList& paths, const base::FileDescriptor& signals) {
        const auto begun = retrieval::Clock::now();
        Coordinator coordinator(settings_, platform, paths, signals, events());
        const std::optional<int> signal = coordinator.run();
        summary_.seconds = std::chrono::duration<double>(retrieval::Clock::now() - begun).count();
        progress_.clear();
        if (const auto& error = coordinator.listError()) {
            complain("the list cannot be read any further: " + error->localizedDescription());
            summary_.exitStatus = retrieval::worseStatus(summary_.exitStatus, EX_NOINPUT);
        } else if (!coordinator.hasSeenPaths() && !signal) {
            complain("the list holds no path");
            return EX_USAGE;
        }
        if (signal) summary_.exitStatus = companion::kSignalBase + *signal;
        if (journal_ && !signal && !coordinator.listError()) endJournal();
        return finish();
    }

    /// Whether all artefacts worked, even if the journal or the report failed.
    bool wentWell() const { return summary_.exitStatus == EX_OK; }

  private:
    Coordinator::Events events() {
        return {.isWanted = [this](const std::string& path) { return isWanted(path); },
                .ended = [this](const Report& report,
                                const std::string& filesState) { take(report, filesState); },
                .isDoneBefore = [this](const std::string& path,
                                       const retrieval::ArtefactRun& run) { return isDoneBefore(path, run); },
                .wasDoneBefore = [this] { ++summary_.resumed; },
                .turned =
                    [this](std::size_t inWork) {
                        progress_.show(summary_.total,
                                       summary_.total - summary_.numberOf(retrieval::Cause::worked), inWork);
                    }};
    }

    bool isWanted(const std::string& path) {
        const auto choice = selection_.choose(path);
        if (choice == Selection::Choice::namedBefore) ++summary_.duplicates;
        return choice == Selection::Choice::wanted;
    }

    bool isDoneBefore(const std::string& path, const retrieval::ArtefactRun& run) const {
        return journal_ && journal_->hasDone({canonicalPath(path), settings_.operation, run.filesState(),
                                              run.recordName()});
    }

    void take(const Report& report, const std::string& filesState) {
        summary_.count(report);
        if (journal_ && report.attempts > 0)
            keep(journal_->add(
                {canonicalPath(report.path), settings_.operation, filesState, report.recordName},
                report.exitStatus, report.cause));
        if (junit_) junit_->add(report);
        if (settings_.asJson) return print(asJson(report));
        if (!settings_.isQuiet) print(asText(report, settings_.isVerbose, inColor_));
    }

    // A ticket may be revoked at any time, so a complete validation does not count for the next one. But a
    // run with unjudged artefacts is not complete, and a staple stays done.
    void endJournal() {
        if (settings_.operation == kOperationValidate && summary_.holdsVerdictsOnly())
            keep(journal_->end(settings_.operation));
    }

    void print(const std::string& line) {
        progress_.clear();
        output_.write(line + "\n");
    }

    // Only the first failure to write a file of ours is reported; the artefacts matter more.
    void keep(const base::Result<void>& result) {
        if (result || hasComplained_) return;
        hasComplained_ = true;
        progress_.clear();
        complain(result.error().localizedDescription());
    }

    int finish() {
        if (journal_) keep(journal_->synchronize());
        if (junit_) keep(junit_->finish(summary_));
        if (settings_.asJson)
            print(asJson(summary_));
        else if (!settings_.isQuiet)
            print(asText(summary_));
        if (output_.hasFailed()) complain("cannot write to standard output");
        const bool hasLostSomething = hasComplained_ || output_.hasFailed();
        return hasLostSomething && wentWell() ? EX_IOERR : summary_.exitStatus;
    }

    const Settings& settings_;
    std::optional<Journal> journal_;
    std::optional<JUnitReport> junit_;
    Selection selection_;
    companion::Output output_{STDOUT_FILENO};
    const bool inColor_;
    Progress progress_;
    Summary summary_;
    bool hasComplained_ = false;
};

// Call it before there is a second thread. The paths of a list are not known yet.
void giveUpRights(const Settings& settings, const Platform& platform, const std::string& temporary,
                  const std::optional<JUnitReport>& junit) {
    using sandbox::Access;
    keepSecurityLibrary();
    sandbox::Confinement rights = confinementOfRuns(settings.operation, settings.paths, platform.directory);
    const auto access = settings.operation == kOperationStaple ? Access::write : Access::read;
    if (settings.from) rights.files.push_back({"/", access});
    // At the end the report gets its name, and the temporary directory is removed.
    const auto writeBeside = [&](const std::string& path) {
        rights.files.push_back(
            {URL::fileURLWithPath(path).deletingLastPathComponent().path(), Access::write});
    };
    writeBeside(temporary);
    if (junit) writeBeside(junit->path());
    for (const std::string& missing : sandbox::confine(rights))
        if (settings.isVerbose) complain(missing);
}

int runBatch(const Settings& settings, const base::FileDescriptor& signals) {
    // Lines are collected for each artefact: other threads print nothing.
    verboseLevel = settings.isVerbose ? kVerbosityVerbose : kVerbosityQuiet;

    auto paths = companion::PathList::open(settings.paths, settings.from, settings.isZeroTerminated);
    if (!paths) {
        complain("the list cannot be read: " + paths.error().localizedDescription());
        return EX_NOINPUT;
    }
    std::optional<Journal> journal;
    if (settings.journal) {
        auto opened = Journal::open(*settings.journal);
        if (!opened) {
            complain("the journal cannot be used: " + opened.error().localizedDescription());
            return EX_CANTCREAT;
        }
        journal = *std::move(opened);
    }
    std::optional<JUnitReport> junit;
    if (settings.junit) {
        auto begun = JUnitReport::begin(*settings.junit);
        if (!begun) {
            complain("the report cannot be written: " + begun.error().localizedDescription());
            return EX_CANTCREAT;
        }
        junit.emplace(*std::move(begun));
    }
    auto temporary = companion::OwnTemporaryDirectory::make(kProgramName);
    if (!temporary) {
        complain("no temporary directory can be made: " + temporary.error().localizedDescription());
        return EX_CANTCREAT;
    }
    const HostPlatform host([](int) {}, HostPlatform::Connections::kept);
    giveUpRights(settings, host.services(), temporary->path(), junit);
    Run run(settings, std::move(journal), std::move(junit));
    const int status = run.work(host.services(), *paths, signals);
    if (run.wentWell() && !settings.keepsTemporaryFiles)
        temporary->remove();
    else if (temporary->holdsFiles() && !settings.isQuiet)
        complain("tickets and copies are kept in " + temporary->path());
    return status;
}

}  // namespace

int main(int argc, char** argv) {
    // With a heap for each thread, memory would grow with --jobs.
    mallopt(M_ARENA_MAX, kMostArenas);
    return companion::runMain(kProgramName, [&] {
        const CommandLine line = readCommandLine(argc, argv);
        if (line.exitStatus) return *line.exitStatus;
        const base::FileDescriptor signals = companion::takeEndingSignals();
        return runBatch(line.settings, signals);
    });
}
