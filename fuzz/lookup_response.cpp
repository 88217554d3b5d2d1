// The record service's response to a lookup, from its JSON to the ticket in it: in a run of `validate` and
// one of `staple`, on a platform that accepts any certificate and signature.
#include <algorithm>
#include <array>
#include <filesystem>

#include "support/controller_run.h"
#include "target.h"

namespace pinwell::fuzz {
namespace {

using test::ControllerRun;

bool isAnOutcome(int status) {
    constexpr std::array kOutcomes = {kExitOK, kExitDataError, kExitNoHost, kExitCannotCreate,
                                      kExitNoPermission};
    return std::ranges::find(kOutcomes, status) != kOutcomes.end();
}

// The exit code of the run; `nullopt` if it continues with a download.
std::optional<int> finish(ControllerRun& run, std::uint8_t operation, ByteView answer) {
    run.controller.setOperation(operation);
    require(run.controller.grabTicket(), "the lookup is under way");
    const auto status = run.answer(base::toString(answer));
    const auto& sessions = run.platform.https.sessions;
    require(status.has_value() || sessions.size() > 1, "an answer ends the run, or begins a download");
    require(!status || isAnOutcome(*status), "a run ends with one of its exit codes");
    return status;
}

}  // namespace

void examine(ByteView input) {
    discardMessages();
    {
        ControllerRun run;
        const Data ticket = test::unsignedTicket({ControllerRun::fileHash()});
        run.staple(ticket);
        finish(run, kOperationValidate, input);
        require(test::readFile(run.stapledPath()) == base::toString(ticket),
                "validating leaves the artefact alone");
    }
    ControllerRun run;
    const auto status = finish(run, kOperationStaple, input);
    require(std::filesystem::exists(run.stapledPath()) || status != kExitOK,
            "stapling succeeds with a ticket or not at all");
}

}  // namespace pinwell::fuzz
