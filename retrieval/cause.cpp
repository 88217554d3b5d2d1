#include "retrieval/cause.h"

#include <algorithm>

#include "src/PWHashedFile/PWHashedFile.h"

namespace pinwell::retrieval {
namespace {

struct Row {
    Cause cause;
    std::string_view name;
};

constexpr std::array kRows{
    Row{Cause::worked, "worked"},
    Row{Cause::unreachable, "unreachable"},
    Row{Cause::untrusted, "untrusted"},
    Row{Cause::notIssued, "notIssued"},
    Row{Cause::notAcceptable, "notAcceptable"},
    Row{Cause::revoked, "revoked"},
    Row{Cause::notReadable, "notReadable"},
    Row{Cause::notSigned, "notSigned"},
    Row{Cause::notWritable, "notWritable"},
    Row{Cause::changed, "changed"},
    Row{Cause::notStapled, "notStapled"},
    Row{Cause::unsupported, "unsupported"},
    Row{Cause::timedOut, "timedOut"},
    Row{Cause::interrupted, "interrupted"},
};

constexpr std::array<Cause, kRows.size()> causesOfRows() {
    std::array<Cause, kRows.size()> causes{};
    for (std::size_t i = 0; i < kRows.size(); ++i) causes.at(i) = kRows.at(i).cause;
    return causes;
}
constexpr auto kCauses = causesOfRows();

// From the best to the worst.
constexpr std::array kByWeight{
    kExitOK, -1, kExitNoHost, kExitNoInput, kExitDataError, kExitCannotCreate, kExitNoPermission};

std::size_t weightOf(int status) {
    const auto found = std::find(kByWeight.begin(), kByWeight.end(), status);
    return found == kByWeight.end() ? 1 : static_cast<std::size_t>(found - kByWeight.begin());
}

}  // namespace

std::span<const Cause> allCauses() noexcept {
    return kCauses;
}

std::string_view nameOf(Cause cause) noexcept {
    const auto found =
        std::find_if(kRows.begin(), kRows.end(), [cause](const Row& row) { return row.cause == cause; });
    return found == kRows.end() ? std::string_view() : found->name;
}

bool isCurable(Cause cause) noexcept {
    return cause == Cause::unreachable;
}

bool isVerdict(Cause cause) noexcept {
    return cause != Cause::unreachable && cause != Cause::untrusted && cause != Cause::timedOut &&
           cause != Cause::interrupted;
}

int worseStatus(int first, int second) noexcept {
    return weightOf(second) > weightOf(first) ? second : first;
}

}  // namespace pinwell::retrieval
