#include <sysexits.h>
#include <unistd.h>

#include "companion/command_line.h"
#include "retrieval/report.h"
#include "ticket/commands.h"

namespace pinwell::ticket_files {

Reporter::Reporter(const Settings& settings)
    : settings_(settings),
      output_(STDOUT_FILENO),
      inColor_(companion::wantsColor(settings.color, STDOUT_FILENO)) {}

void Reporter::report(const retrieval::Report& report) {
    worst_ = retrieval::worseStatus(worst_, report.exitStatus);
    if (settings_.asJson)
        output_.write(asJson(report) + "\n");
    else if (!settings_.isQuiet)
        output_.write(asText(report, settings_.isVerbose, inColor_) + "\n");
}

void Reporter::line(const std::string& text, int exitStatus) {
    worst_ = retrieval::worseStatus(worst_, exitStatus);
    output_.write(text + "\n");
}

void Reporter::complain(const std::string& text, int exitStatus) {
    worst_ = retrieval::worseStatus(worst_, exitStatus);
    companion::complain(kProgramName, text);
}

int Reporter::exitStatus() const {
    if (!output_.hasFailed()) return worst_;
    companion::complain(kProgramName, "cannot write to standard output");
    return worst_ == EX_OK ? EX_IOERR : worst_;
}

}  // namespace pinwell::ticket_files
