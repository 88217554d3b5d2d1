// One artefact of the command line: where it is, the cdhash that identifies it, the ticket stapled to it, and
// the exit code that the run has reached so far.
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

#include "foundation/bytes.h"
#include "foundation/error.h"
#include "foundation/url.h"
#include "src/PWHashedFile/file_kind.h"
#include "src/platform.h"

namespace pinwell {

using foundation::Data;
using foundation::Error;
using foundation::URL;

/// Exit codes of the tool, the BSD sysexits(3) numbers.
inline constexpr std::int32_t kExitOK = 0;
inline constexpr std::int32_t kExitUsage = 64;
inline constexpr std::int32_t kExitDataError = 65;
inline constexpr std::int32_t kExitNoInput = 66;
inline constexpr std::int32_t kExitNoHost = 68;
inline constexpr std::int32_t kExitCannotCreate = 73;
inline constexpr std::int32_t kExitNoPermission = 77;

/// Where an operation may leave the error of the step that failed; null when the caller does not care.
using ErrorOut = std::optional<Error>*;

/// The last exit code but 0 that was recorded on any hashed file of the process; 66 before the first. Every
/// step records its failure before it begins, so this is what a run ends with that cannot finish its step.
const std::atomic<std::int32_t>& lastRecordedFailure() noexcept;

/// A hook was called on a kind that did not override it: a programming error.
class InternalInconsistency : public std::logic_error {
  public:
    using std::logic_error::logic_error;
};

/// The common model of an artefact, and the factory of the concrete kinds. Kinds override the three hooks.
///
/// An object holds its artefact (files::FileManager::holdItem): all that is read and written for it, by it
/// and by a later object of the same path that is made while it lives, is found from one descriptor.
///
/// The two lazy accessors may be called from any thread; everything else belongs to the run's single flow.
class PWHashedFile {
  public:
    /// A hashed file of the right kind; the base object with exit code 66 when the file cannot be read; null
    /// when its kind is unsupported. `platform`'s services must outlive the object.
    /// `beforeReading`, if given, is
    /// called when the kind is known and nothing has been read; false ends it with exit code 73.
    using BeforeReading = std::function<bool()>;
    static std::shared_ptr<PWHashedFile> initWithFileURL(const URL& fileURL, const Platform& platform,
                                                         const BeforeReading& beforeReading = {});

    PWHashedFile(std::optional<URL> fileURL, const Platform& platform);
    virtual ~PWHashedFile() = default;
    PWHashedFile(const PWHashedFile&) = delete;
    PWHashedFile& operator=(const PWHashedFile&) = delete;

    /// Set when the ticket marks the software as revoked.
    bool revoked() const noexcept { return revoked_; }
    void setRevoked(bool revoked) noexcept { revoked_ = revoked; }

    /// The last setter wins.
    std::int32_t appropriateExitCode() const noexcept { return appropriateExitCode_; }
    void setAppropriateExitCode(std::int32_t code) noexcept;

    /// Digest type of the cdhash; 0 until a kind sets it.
    std::uint32_t digestAlgorithm() const noexcept { return digestAlgorithm_; }
    void setDigestAlgorithm(std::uint32_t algorithm) noexcept { digestAlgorithm_ = algorithm; }

    const std::optional<URL>& fileURL() const noexcept { return fileURL_; }

    /// Whether the file still is what was read (noteState). True if no state was noted.
    bool isAsRead() const;

    /// A write was refused because the file had changed since it was read.
    bool wasRefusedAsChanged() const noexcept { return refusedAsChanged_; }

    /// The stapled ticket, and the cdhash; nothing when there is none. Computed once, on first use.
    std::optional<Data> ticketData();
    std::optional<Data> cdHash();

    /// Staples the ticket whose bytes stand in the file at `source`.
    virtual bool writeNewTicketDataFromURL(const URL& source, ErrorOut error);

    /// Removes the stapled ticket.
    virtual bool _deleteExistingTicket(ErrorOut error);

    /// The safe-replacement driver under both: works on a clone beside the file and swaps it into place where
    /// the volume can clone, else in place. A failed swap still answers true, with the error handed out:
    /// callers that need to know must look at it.
    ///
    /// A file that is no longer what was read (noteState) is not written: false, and exit code 73. SIGHUP,
    /// SIGINT and SIGTERM take effect when all is done; they would leave a file half written, or a clone
    /// lying about.
    bool common_writeNewTicketDataFromURL(const std::optional<URL>& source, bool deleteExisting,
                                          ErrorOut error);

    // Hooks.

    /// Reads the stapled ticket.
    virtual std::optional<Data> _ticketData();

    /// Computes the cdhash; sets digestAlgorithm on the way.
    virtual std::optional<Data> _cdHash();

    /// Writes the ticket found at `source` into `target`, or removes the one that is there. Sets the exit
    /// code: 0, or 73 on failure, which also answers false and hands out the error.
    virtual bool _writeNewTicketDataFromURL(const std::optional<URL>& source, const URL& target,
                                            bool deleteExisting, ErrorOut error);

  protected:
    virtual std::string_view className() const { return "PWHashedFile"; }
    const Platform& platform() const noexcept { return platform_; }

    /// The ticket in that file; empty when there is none to be had, with the reason in `held` when reading
    /// failed.
    Data readTicket(const std::optional<URL>& source, std::optional<Error>& held) const;

    /// Says that the target gets no new ticket, and why where that is known; then as failedToWrite.
    bool refuseNewTicket(const URL& target, std::optional<Error> reason, ErrorOut error);

    /// How a failed write ends: exit code 73, and the reason handed out, where there is one. Always false.
    bool failedToWrite(std::optional<Error> reason, ErrorOut error);

    /// Remembers what state the file is in, the first time only. A kind calls it before it reads what its
    /// write will go by; without it, every state is good enough to be written to.
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
    foundation::Anchor held_;
    std::optional<foundation::Result<files::ItemState>> stateWhenRead_;

    std::recursive_mutex mutex_;
    std::optional<Data> internalTicketData_;  // empty: asked, and none found
    std::optional<Data> internalCDHash_;      // the same
};

}  // namespace pinwell
