// One artefact of the command line: its place, the cdhash that identifies it, its stapled ticket, and the
// run's current exit code.
#pragma once

#include <atomic>
#include <cstdint>
#include <functional>
#include <memory>
#include <mutex>
#include <optional>
#include <stdexcept>
#include <string>
#include <string_view>

#include "base/bytes.h"
#include "base/error.h"
#include "formats/code_hashes.h"
#include "formats/explain_ticket.h"
#include "src/PWHashedFile/file_kind.h"
#include "src/platform.h"
#include "values/url.h"

namespace pinwell {

using base::Data;
using base::Error;
using values::URL;

/// Exit codes of the tool, the BSD sysexits(3) numbers.
inline constexpr std::int32_t kExitOK = 0;
inline constexpr std::int32_t kExitUsage = 64;
inline constexpr std::int32_t kExitDataError = 65;
inline constexpr std::int32_t kExitNoInput = 66;
inline constexpr std::int32_t kExitNoHost = 68;
inline constexpr std::int32_t kExitCannotCreate = 73;
inline constexpr std::int32_t kExitNoPermission = 77;

/// Receives the error of the failed step; null if the caller does not need it.
using ErrorOut = std::optional<Error>*;

/// The last non-zero exit code recorded on any hashed file of the process; 66 before the first. Every step
/// records its failure before it begins, so a run that cannot finish its step ends with this code.
const std::atomic<std::int32_t>& lastRecordedFailure() noexcept;

/// A hook was called on a kind that did not override it: a programming error.
class InternalInconsistency : public std::logic_error {
  public:
    using std::logic_error::logic_error;
};

/// The common model of an artefact, and the factory of the concrete kinds. Kinds override the three hooks.
///
/// An object keeps its artefact open (files::FileManager::holdItem). All its calls of `files` start from one
/// descriptor, also those of a later object of the path. The code hash is of the code now at the path.
///
/// Any thread may call the two lazy accessors; one step of the run at a time uses the
/// rest.
class PWHashedFile {
  public:
    /// A hashed file of the right kind; the base object with exit code 66 if the file cannot be read;
    /// null if its kind is unsupported. `platform`'s services must outlive the object. `beforeReading`, if
    /// given, is called when the kind is known and before anything is read. If it returns false, the exit
    /// code is 73.
    using BeforeReading = std::function<bool()>;
    static std::shared_ptr<PWHashedFile> initWithFileURL(const URL& fileURL, const Platform& platform,
                                                         const BeforeReading& beforeReading = {});

    PWHashedFile(std::optional<URL> fileURL, const Platform& platform);
    virtual ~PWHashedFile() = default;
    PWHashedFile(const PWHashedFile&) = delete;
    PWHashedFile& operator=(const PWHashedFile&) = delete;

    /// Whether the ticket marks the software as revoked.
    bool revoked() const noexcept { return revoked_; }
    void setRevoked(bool revoked) noexcept { revoked_ = revoked; }

    /// The last setter wins.
    std::int32_t appropriateExitCode() const noexcept { return appropriateExitCode_; }
    void setAppropriateExitCode(std::int32_t code) noexcept;

    /// Digest type of the cdhash; 0 until a kind sets it.
    std::uint32_t digestAlgorithm() const noexcept { return digestAlgorithm_; }
    void setDigestAlgorithm(std::uint32_t algorithm) noexcept { digestAlgorithm_ = algorithm; }

    const std::optional<URL>& fileURL() const noexcept { return fileURL_; }

    /// Whether the file is unchanged since noteState(). True if no state was noted.
    bool isAsRead() const;

    /// A write was refused because the file had changed since it was read.
    bool wasRefusedAsChanged() const noexcept { return refusedAsChanged_; }

    /// The stapled ticket, and the cdhash; `nullopt` if there is none. Computed once, on first use.
    std::optional<Data> ticketData();
    std::optional<Data> cdHash();

    /// The fault of the place of the ticket. `nullopt` if the place is sound, with a ticket or without. Reads
    /// the ticket, and a bundle's ticket again if that fails.
    virtual std::optional<TicketPlaceFault> ticketPlaceFault() { return std::nullopt; }

    /// Staples the ticket in the file at `source`.
    virtual bool writeNewTicketDataFromURL(const URL& source, ErrorOut error);

    /// Removes the stapled ticket.
    virtual bool _deleteExistingTicket(ErrorOut error);

    /// The safe-replacement driver of both. Where the volume can clone, it works on a clone beside the file
    /// and swaps the two; elsewhere it works in place. A failed swap returns true, with the error in `error`:
    /// callers that need to know must check it.
    ///
    /// A file that has changed since noteState() is not written: returns false, with exit code 73.
    /// SIGHUP, SIGINT and SIGTERM take effect at the end; earlier they would leave a half-written file or
    /// a clone.
    bool common_writeNewTicketDataFromURL(const std::optional<URL>& source, bool deleteExisting,
                                          ErrorOut error);

    // Hooks.

    /// Reads the stapled ticket.
    virtual std::optional<Data> _ticketData();

    /// Computes the cdhash; sets digestAlgorithm on the way.
    virtual std::optional<Data> _cdHash();

    /// Writes the ticket at `source` into `target`, or removes the ticket there. Sets the exit code to 0. On
    /// failure sets it to 73, returns false and sets `error`.
    virtual bool _writeNewTicketDataFromURL(const std::optional<URL>& source, const URL& target,
                                            bool deleteExisting, ErrorOut error);

  protected:
    virtual std::string_view className() const { return "PWHashedFile"; }
    const Platform& platform() const noexcept { return platform_; }

    /// The ticket in that file; empty if there is none. If reading failed, `held` has the
    /// reason.
    Data readTicket(const std::optional<URL>& source, std::optional<Error>& held) const;

    /// Reports that the target gets no new ticket, with the reason if known; then like failedToWrite.
    bool refuseNewTicket(const URL& target, std::optional<Error> reason, ErrorOut error);

    /// Ends a failed write: sets exit code 73, and `error` if there is a reason. Returns false.
    bool failedToWrite(std::optional<Error> reason, ErrorOut error);

    /// Notes the file's state, the first time only. A kind calls it before it reads the data that its write
    /// depends on. Without a noted state, every file may be written to.
    void noteState();

  private:
    static std::shared_ptr<PWHashedFile> ofKind(AssessmentClass kind, const URL& fileURL,
                                                const Platform& platform);
    [[noreturn]] void mustOverride(std::string_view operation) const;
    std::optional<Data> cached(std::optional<Data>& cache, std::optional<Data> (PWHashedFile::*hook)());
    std::optional<URL> makeWorkingCopy();
    bool refuseChangedFile(const std::optional<URL>& workingCopy);

    bool revoked_ = false;
    bool refusedAsChanged_ = false;
    std::int32_t appropriateExitCode_ = kExitOK;
    std::uint32_t digestAlgorithm_ = 0;
    std::optional<URL> fileURL_;
    Platform platform_;
    base::Anchor held_;
    std::optional<base::Result<files::ItemState>> stateWhenRead_;

    std::recursive_mutex mutex_;
    std::optional<Data> internalTicketData_;  // empty: read, and none found
    std::optional<Data> internalCDHash_;      // the same
};

/// The hash that a ticket for the artefact must list. `nullopt` if the artefact cannot be read or has no
/// valid signature. Then no ticket can be judged, whatever is stapled to it: every program ends with
/// kExitNoInput.
std::optional<CodeHash> codeHashOf(PWHashedFile& file);

}  // namespace pinwell
