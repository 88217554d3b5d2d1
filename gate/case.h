// One artefact on its way to a verdict: its ticket, its bytes, the current ticket, and the policy.
//
//   Case one(path, judgement);
//   one.examine();                         // reads the artefact; on any thread
//   if (one.asksService()) one.takeFetched(...);
//   Result result = std::move(one).conclude();
#pragma once

#include <memory>
#include <optional>
#include <string>

#include "base/bytes.h"
#include "formats/explain_ticket.h"
#include "retrieval/ticket_fetch.h"
#include "run.h"
#include "src/PWHashedFile/PWHashedFile.h"
#include "src/platform.h"
#include "verify/judged_ticket.h"
#include "verify/verify.h"
#include "verify/workers.h"

namespace pinwell::gate {

/// Shared by all cases of a run.
struct Judgement {
    const Platform& platform;
    const Options& options;
    verify::Workers& workers;
    const TicketDirectory* tickets;  // null without --tickets
    std::int64_t now;                // seconds since 1970-01-01 00:00:00 UTC
};

/// Used by one thread at a time. Never throws for a fault of the artefact; throws std::bad_alloc. The tool's
/// message functions must be silent.
class Case {
  public:
    Case(std::string path, const Judgement& judgement);
    ~Case();
    Case(Case&&) noexcept;
    Case& operator=(Case&&) = delete;

    /// Reads everything from the disk.
    void examine();

    /// Whether the service's ticket matters: only if the stapled ticket is acceptable, as in the tool.
    bool asksService() const;
    const std::string& recordName() const noexcept { return result_.recordName; }

    void takeFetched(const retrieval::FetchedTicket& fetched);

    /// The verdict. Call it once, and last.
    Result conclude() &&;

  private:
    bool open();
    bool judgeStapled();
    void verifyBytes();
    void digestFile();
    void lookInDirectory();
    void takeCurrent(base::ByteView bytes, const std::string& place);
    void checkListing();
    void checkPolicy();
    void atLeast(Verdict verdict, std::string conclusion);
    void unreadable(const std::string& why);

    const Judgement& judgement_;
    Result result_;
    std::shared_ptr<PWHashedFile> file_;
    verify::Kind kind_ = verify::Kind::none;
    std::string absolutePath_;
    std::optional<base::Data> codeHash_;
    std::optional<TicketPlaceFault> placeFault_;
    std::optional<verify::JudgedTicket> stapled_;
    std::optional<verify::JudgedTicket> current_;  // from the service, or from the directory
    bool isStapledAcceptable_ = false;
    verify::VerifiedCode code_;
    bool hasCode_ = false;  // the bytes were checked
};

}  // namespace pinwell::gate
