// One artefact taken through the controller's rules, in two halves with the lookup between them.
//
//   ArtefactRun run(path, kOperationStaple, platform);
//   auto outcome = run.begin();
//   if (!outcome) outcome = run.end(answerFor(run.recordName()));
//
// The controller judges, writes, reads back and says what it says in `pinwell`; here it neither prints nor
// ends the process. An exception ends the run of this artefact, and no other one. A staple holds the
// artefact's lock from before the write until after the read-back, and not while the lookup is under way:
// many runs wait for one answer.
#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "foundation/bytes.h"
#include "retrieval/answer.h"
#include "retrieval/cause.h"
#include "src/PWHashedFile/PWHashedFile.h"
#include "src/platform.h"

namespace pinwell::retrieval {

/// How an artefact ended.
struct Outcome {
    int exitStatus = 0;
    Cause cause = Cause::worked;
};

/// What an artefact is; `none` until that is known, and for what is unsupported.
enum class Kind : std::uint8_t { none, bundle, diskImage, package };

/// "bundle", "diskImage", "package"; empty for `none`.
std::string_view nameOf(Kind kind) noexcept;

Kind kindOf(const PWHashedFile& file);

/// Whether it is a package with trailers and no ticket among them. The core writes the next ticket over the
/// first bytes of such a file; here it is refused.
bool holdsTrailersWithoutTicket(PWHashedFile& file);

/// False if the text holds a zero byte: a call of the system would take what comes before it for the path.
bool isPath(const std::string& text) noexcept;

/// For one thread at a time, which may be another one for each half.
class ArtefactRun {
  public:
    /// `operation` is kOperationStaple or kOperationValidate. The platform's services must outlive the
    /// object.
    ArtefactRun(std::string path, std::uint8_t operation, const Platform& platform);
    ~ArtefactRun();
    ArtefactRun(const ArtefactRun&) = delete;
    ArtefactRun& operator=(const ArtefactRun&) = delete;

    /// Reads the artefact, and judges the stapled ticket of a validation. `nullopt` if a record is to be
    /// looked up: recordName(). May be called again, and then begins anew.
    std::optional<Outcome> begin();

    /// Goes on with the record's answer. If the artefact has changed since begin(), it is read again under
    /// its lock; `nullopt` if another record is to be looked up then.
    std::optional<Outcome> end(const Answer& answer);

    /// Staples a ticket that is at hand, in place of begin() and end(): locks, reads, judges, writes and
    /// reads back. `ticketFor` is called with the record's name; its error ends the run as notIssued if there
    /// is no such file (ENOENT), and else as notReadable.
    Outcome attach(
        const std::function<foundation::Result<foundation::Data>(const std::string& recordName)>& ticketFor);

    /// Empty until begin() has found a hash.
    const std::string& recordName() const noexcept { return recordName_; }
    Kind kind() const noexcept { return kind_; }

    /// What tells the files that the outcome is of, the artefact's executable and the one that carries the
    /// ticket, from what is there later: a text without blanks (file_state.h). As they were before they were
    /// read, and of a staple that worked as they were left. Empty if it is not known.
    const std::string& filesState() const noexcept { return filesState_; }

    /// What `pinwell` would have printed, line by line.
    const std::vector<std::string>& messages() const noexcept { return messages_; }

    /// Forgets what was read, and keeps the answers to the questions above.
    void release();

  private:
    struct Reading;
    std::optional<Outcome> open(const PWHashedFile::BeforeReading& beforeReading = {});
    std::optional<Outcome> read();
    std::optional<Outcome> write(const Answer& answer);
    std::optional<Outcome> finish(const Answer& answer);
    std::optional<Outcome> guarded(Outcome ifThrown, const std::function<std::optional<Outcome>()>& work);
    Outcome attachUnderLock(
        const std::function<foundation::Result<foundation::Data>(const std::string& recordName)>& ticketFor);
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
