// Takes one artefact through the controller's rules, in two halves with the lookup between them.
//
//   ArtefactRun run(path, kOperationStaple, platform);
//   auto outcome = run.begin();
//   if (!outcome) outcome = run.end(answerFor(run.recordName()));
//
// The controller judges, writes, reads back and makes the messages as in `pinwell`, but here it neither
// prints nor ends the process. An exception ends only this artefact's run. A staple holds the artefact's lock
// from before the write until after the read-back. It does not hold it during the lookup, because many runs
// wait for one response.
#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "base/bytes.h"
#include "retrieval/record_service.h"
#include "retrieval/report.h"
#include "src/PWHashedFile/PWHashedFile.h"
#include "src/platform.h"

namespace pinwell::retrieval {

Kind kindOf(const PWHashedFile& file);

/// Whether it is a package with trailers but without a ticket. The core would write a ticket over the first
/// bytes of such a file; here the file is refused.
bool holdsTrailersWithoutTicket(PWHashedFile& file);

/// Returns false if the text holds a zero byte: a system call would use the part before it as the path.
bool isPath(const std::string& text) noexcept;

/// For one thread at a time; the two halves may run on different threads.
class ArtefactRun {
  public:
    /// `operation` is kOperationStaple or kOperationValidate. The platform's services must outlive the
    /// object.
    ArtefactRun(std::string path, std::uint8_t operation, const Platform& platform);
    ~ArtefactRun();
    ArtefactRun(const ArtefactRun&) = delete;
    ArtefactRun& operator=(const ArtefactRun&) = delete;

    /// Reads the artefact, and judges the stapled ticket of a validation. Returns `nullopt` if a record must
    /// be looked up: recordName(). A second call starts again.
    std::optional<Outcome> begin();

    /// Goes on with the record's answer. If the artefact has changed since begin(), it is read again under
    /// its lock; then returns `nullopt` if another record must be looked up.
    std::optional<Outcome> end(const Answer& answer);

    /// Staples a ticket from a file, instead of begin() and end(): locks, reads, judges, writes and reads
    /// back. `ticketFor` is called with the record's name. Its error ENOENT ends the run as notIssued, every
    /// other error as notReadable.
    Outcome attach(const std::function<base::Result<base::Data>(const std::string& recordName)>& ticketFor);

    /// Empty before begin() has found a hash.
    const std::string& recordName() const noexcept { return recordName_; }
    Kind kind() const noexcept { return kind_; }

    /// The state of the artefact's executable and of the file that carries the ticket, to detect later
    /// changes: a text without blanks. The state before reading; after a successful staple, the state after
    /// writing. Empty if unknown.
    const std::string& filesState() const noexcept { return filesState_; }

    /// The lines that `pinwell` would print.
    const std::vector<std::string>& messages() const noexcept { return messages_; }

    /// Frees the read data, and keeps the results of the functions above.
    void release();

  private:
    struct Reading;
    std::optional<Outcome> open(const PWHashedFile::BeforeReading& beforeReading = {});
    std::optional<Outcome> read();
    std::optional<Outcome> write(const Answer& answer);
    std::optional<Outcome> finish(const Answer& answer);
    std::optional<Outcome> guarded(Outcome ifThrown, const std::function<std::optional<Outcome>()>& work);
    Outcome attachUnderLock(
        const std::function<base::Result<base::Data>(const std::string& recordName)>& ticketFor);
    bool isAsRead() const;
    std::string stateOfFiles() const;

    const std::string path_;
    const std::uint8_t operation_;
    const Platform platform_;
    std::string recordName_;
    std::string filesState_;
    Kind kind_ = Kind::none;
    std::vector<std::string> messages_;
    std::unique_ptr<Reading> reading_;
};

}  // namespace pinwell::retrieval
