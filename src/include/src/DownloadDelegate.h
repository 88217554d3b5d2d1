// The controller of one run: looks the ticket up, judges the server and the ticket, staples it, and reports.
//
// Made once by runOperation and kept for the whole run. grabTicket runs on the main thread; the callbacks run
// on the serial queue of the session they belong to, one at a time, while the main thread waits. Every run
// that reaches the network ends in notifyResult, with one exception: after a failed large download the
// process waits.
#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>

#include "https/session.h"
#include "src/PWHashedFile/PWHashedFile.h"
#include "src/platform.h"
#include "values/value.h"

namespace pinwell {

inline constexpr std::uint8_t kOperationNone = 0;
inline constexpr std::uint8_t kOperationStaple = 1;
inline constexpr std::uint8_t kOperationValidate = 2;

/// Judges the server of a challenge by the two server policies, one after the other, and completes the
/// challenge. Prints why a server is refused.
void answerServerChallenge(const https::AuthenticationChallenge& challenge,
                           const https::ChallengeCompletion& completion);

class DownloadDelegate : public https::SessionDelegate {
  public:
    DownloadDelegate(std::shared_ptr<PWHashedFile> hashedFile, const Platform& platform);

    /// Only compared with staple: every other value means validate.
    std::uint8_t operation() const noexcept { return operation_; }
    void setOperation(std::uint8_t operation) noexcept { operation_ = operation; }

    /// Part of the interface; they have no effect.
    bool dryrun() const noexcept { return dryrun_; }
    void setDryrun(bool dryrun) noexcept { dryrun_ = dryrun; }
    bool force() const noexcept { return force_; }
    void setForce(bool force) noexcept { force_ = force; }

    /// The artefact; a fresh object for the same URL after a staple.
    const std::shared_ptr<PWHashedFile>& hashedFile() const noexcept { return hashedFile_; }
    void setHashedFile(std::shared_ptr<PWHashedFile> file) { hashedFile_ = std::move(file); }

    /// The file of the downloaded ticket.
    const std::optional<URL>& tempFileURL() const noexcept { return tempFileURL_; }
    void setTempFileURL(std::optional<URL> url) { tempFileURL_ = std::move(url); }

    /// The announced size of a large ticket, as in the response; nil before it.
    const values::Value& largeTicketSize() const noexcept { return largeTicketSize_; }
    void setLargeTicketSize(values::Value size) { largeTicketSize_ = std::move(size); }

    /// Keeps the artefact's lock, which may be null, until the process ends or the run is parked for good.
    void keepLock(std::unique_ptr<files::ItemLock> lock) noexcept { lock_ = std::move(lock); }

    // Lookup.

    /// Returns true if asynchronous work has started that will end the process. If false, the caller ends it
    /// with the hashed file's exit code, or 1 if that is 0.
    bool grabTicket();

    /// The lookup's completion handler.
    void lookupDidComplete(const std::optional<Data>& data,
                           const std::optional<https::HTTPResponse>& response,
                           const std::optional<Error>& error);

    // Large tickets.

    /// Returns true if the download is running.
    bool asynchronouslyDownloadLargeTicketFromURLString(const std::string& urlTemplate);

    void didFinishDownloading(https::Session& session, https::Task& task, const URL& location) override;
    void didComplete(https::Session& session, https::Task& task, const std::optional<Error>& error) override;

    // Server trust.

    void didReceiveChallenge(https::Session& session, const https::AuthenticationChallenge& challenge,
                             const https::ChallengeCompletion& completion) override;

    // Acceptance and report.

    /// Whether the ticket is genuine, not revoked, and lists the file's cdhash. Records the exit code; prints
    /// nothing.
    bool isValidTicketData(const std::optional<Data>& data);
    bool isExistingTicketValid();

    /// Keeps the ticket in the temporary directory, judges it, and staples it if the operation is staple. The
    /// outcome is the exit code on the hashed file; `error` receives the last step's error.
    void writeDownloadedData(const std::optional<Data>& data, ErrorOut error);

    /// The file's hash in messages: "2/0a1b...".
    std::string prettyHashString();

    /// Checks the written ticket, prints the outcome and ends the process.
    void notifyResult();

  private:
    std::string recordName();
    std::optional<Data> ticketFromResponse(const values::Value& response, bool& downloading);
    std::string fileName() const;

    std::uint8_t operation_ = kOperationNone;
    bool dryrun_ = false;
    bool force_ = false;
    std::shared_ptr<PWHashedFile> hashedFile_;
    std::optional<URL> tempFileURL_;
    values::Value largeTicketSize_;

    std::unique_ptr<files::ItemLock> lock_;

    Platform platform_;
    std::shared_ptr<https::Session> lookupSession_;  // kept for the life of the process: never invalidated
    std::shared_ptr<https::Session> downloadSession_;
    std::shared_ptr<https::Task> downloadTask_;
};

}  // namespace pinwell
