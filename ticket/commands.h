// The commands of pinwell-ticket. Each prints what came of its arguments and returns the exit status.
#pragma once

#include <functional>
#include <memory>
#include <string>

#include "companion/streams.h"
#include "https/client_identity.h"
#include "retrieval/report.h"
#include "src/platform.h"
#include "ticket/settings.h"

namespace pinwell::ticket_files {

inline constexpr const char* kProgramName = "pinwell-ticket";

/// Where a command prints, and what it ends with.
class Reporter {
  public:
    explicit Reporter(const Settings& settings);

    /// One artefact, or one record.
    void report(const retrieval::Report& report);

    /// A separate line, instead of the report of a success.
    void line(const std::string& text, int exitStatus);

    /// Something that is wrong with the whole run: said on standard error.
    void complain(const std::string& text, int exitStatus);

    /// The worst of all.
    int exitStatus() const;

  private:
    const Settings& settings_;
    companion::Output output_;
    const bool inColor_;
    int worst_ = 0;
};

/// Does `write` for each path and reports what came of it, with a temporary directory of the command's own.
/// It stays, and is named, if an artefact could not be written: with the copies in it, one that was cut short
/// can be put right.
int writeEach(const Settings& settings, Reporter& reporter,
              const std::function<retrieval::Report(const std::string& path)>& write);

/// Prints the record name of each artefact. No network.
int hash(const Settings& settings, const Platform& platform);

/// Fetches the tickets of records into a directory, with an index.
int fetch(const Settings& settings, const Platform& platform);

/// Has a record service issue tickets for artefacts and keeps them in a directory, with an index. `identity`
/// is who asks.
int request(const Settings& settings, const Platform& platform,
            std::shared_ptr<const https::ClientIdentity> identity);

/// Attaches tickets from files. No network.
int attach(const Settings& settings, const Platform& platform);

/// Writes the ticket of an artefact to a file.
int extract(const Settings& settings, const Platform& platform);

/// Removes the ticket of each artefact.
int remove(const Settings& settings, const Platform& platform);

}  // namespace pinwell::ticket_files
