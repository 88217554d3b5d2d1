// The parts that the commands share: reading an artefact, reporting, and writing artefacts one after another.
#pragma once

#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

#include "base/bytes.h"
#include "commands.h"
#include "companion/streams.h"
#include "retrieval/report.h"
#include "retrieval/retry_policy.h"
#include "retrieval/ticket_fetch.h"
#include "src/PWHashedFile/PWHashedFile.h"
#include "src/platform.h"

namespace pinwell::ticket_files {

/// Prints the results of a command, and collects its exit status.
class Reporter {
  public:
    explicit Reporter(const Settings& settings);

    /// One artefact, or one record.
    void report(const retrieval::Report& report);

    /// A separate line, instead of the report of a success.
    void line(const std::string& text, int exitStatus);

    /// A fault of the whole run, on standard error.
    void complain(const std::string& text, int exitStatus);

    /// The worst status of all.
    int exitStatus() const;

  private:
    const Settings& settings_;
    companion::Output output_;
    const bool inColor_;
    int worst_ = 0;
};

/// Calls `write` for each path and reports the result. The command has a temporary directory of its own. It
/// stays, and is named, if an artefact could not be written: the copies in it can repair an incomplete write.
int writeEach(const Settings& settings, Reporter& reporter,
              const std::function<retrieval::Report(const std::string& path)>& write);

/// An opened artefact, and a report with its messages so far. The file is null if it cannot be read, or its
/// kind carries no ticket; the report says which.
struct OpenedArtefact {
    retrieval::Report report;
    std::shared_ptr<PWHashedFile> file;
    std::uint32_t algorithm = 0;
    base::Data hash;  // empty if it has none
};

/// `operation` is the command's name. `beforeReading`, if given, is called when the kind is known and nothing
/// has been read; if it returns false, the artefact ends as notWritable.
OpenedArtefact openArtefact(const std::string& path, std::string_view operation, const Platform& platform,
                            const PWHashedFile::BeforeReading& beforeReading = {});

/// The same. An artefact without a hash ends as notSigned.
OpenedArtefact openSignedArtefact(const std::string& path, std::string_view operation,
                                  const Platform& platform);

/// The end of the whole run, if the settings have one.
std::optional<retrieval::Clock::time_point> deadlineOf(const Settings& settings);

/// Moves the result of a lookup or a request, except the ticket, into the report. `signal` is the number of
/// the signal that ended the run, or 0.
void moveResult(retrieval::FetchedTicket& ticket, int signal, retrieval::Report& report);

}  // namespace pinwell::ticket_files
