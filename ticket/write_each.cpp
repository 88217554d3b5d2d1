#include "companion/process.h"
#include "src/DownloadDelegate.h"
#include "ticket/commands.h"

namespace pinwell::ticket_files {

int writeEach(const Settings& settings, Reporter& reporter,
              const std::function<retrieval::Report(const std::string& path)>& write) {
    auto temporary = companion::OwnTemporaryDirectory::make(kProgramName);
    if (!temporary) {
        reporter.complain("no temporary directory can be made: " + temporary.error().localizedDescription(),
                          kExitCannotCreate);
        return reporter.exitStatus();
    }
    bool wroteAll = true;
    for (const std::string& path : settings.arguments) {
        const auto begun = retrieval::Clock::now();
        retrieval::Report report = write(path);
        report.attempts = 1;
        report.seconds = std::chrono::duration<double>(retrieval::Clock::now() - begun).count();
        wroteAll = wroteAll && report.exitStatus != kExitCannotCreate;
        reporter.report(report);
    }
    if (wroteAll || !temporary->holdsFiles())
        temporary->remove();
    else if (!settings.isQuiet)
        reporter.complain("tickets and copies are kept in " + temporary->path(), kExitOK);
    return reporter.exitStatus();
}

}  // namespace pinwell::ticket_files
