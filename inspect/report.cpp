#include "report.h"

#include <sysexits.h>

#include "formats/package_trailers.h"
#include "values/date.h"
#include "values/format.h"

namespace pinwell::inspect {

int exitStatusOf(Outcome outcome) {
    switch (outcome) {
        case Outcome::good:
            return EX_OK;
        case Outcome::unreadable:
            return EX_NOINPUT;
        case Outcome::noTicket:
        case Outcome::refused:
        case Outcome::revoked:
            break;
    }
    return EX_DATAERR;
}

std::string_view algorithmName(std::uint32_t algorithm) {
    switch (algorithm) {
        case 0:
            return "unnamed";
        case static_cast<std::uint32_t>(codesign::DigestType::sha1):
            return "SHA-1";
        case static_cast<std::uint32_t>(codesign::DigestType::sha256):
            return "SHA-256";
        case static_cast<std::uint32_t>(codesign::DigestType::sha256Truncated):
            return "SHA-256 cut";
        case static_cast<std::uint32_t>(codesign::DigestType::sha384):
            return "SHA-384";
        default:
            return "unknown";
    }
}

std::string_view kindName(Kind kind) {
    switch (kind) {
        case Kind::bundle:
            return "bundle";
        case Kind::executable:
            return "executable";
        case Kind::diskImage:
            return "disk image";
        case Kind::package:
            return "flat package";
        case Kind::ticket:
            return "ticket";
        case Kind::other:
            break;
    }
    return "nothing that carries a ticket";
}

std::string_view trailerTypeName(std::uint16_t type) {
    switch (type) {
        case kTerminatorTrailerType:
            return "terminator";
        case kTicketTrailerType:
            return "ticket";
        default:
            return "unknown";
    }
}

std::string cpuTypeName(std::uint32_t cpuType) {
    switch (cpuType) {
        case kCpuType64Arm:
            return "64-bit ARM";
        case kCpuType64X86:
            return "64-bit x86";
        default:
            return values::format("CPU type 0x%08x", cpuType);
    }
}

std::optional<std::string> timeText(std::uint64_t seconds) {
    constexpr std::uint64_t kEndOfYear9999 = 253'402'300'799;
    if (seconds > kEndOfYear9999) return std::nullopt;
    return values::describe(values::Date{static_cast<std::int64_t>(seconds)});
}

}  // namespace pinwell::inspect
