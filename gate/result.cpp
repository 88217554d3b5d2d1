#include "gate/result.h"

#include <sysexits.h>

namespace pinwell::gate {

std::string_view verdictName(Verdict verdict) {
    switch (verdict) {
        case Verdict::good:
            return "good";
        case Verdict::unreachable:
            return "unreachable";
        case Verdict::unreadable:
            return "unreadable";
        case Verdict::noTicket:
            return "noTicket";
        case Verdict::refused:
            return "refused";
        case Verdict::altered:
            return "altered";
        case Verdict::revoked:
            break;
    }
    return "revoked";
}

int exitStatusOf(Verdict verdict) {
    switch (verdict) {
        case Verdict::good:
            return EX_OK;
        case Verdict::unreachable:
            return EX_NOHOST;
        case Verdict::unreadable:
            return EX_NOINPUT;
        case Verdict::noTicket:
        case Verdict::refused:
        case Verdict::altered:
            return EX_DATAERR;
        case Verdict::revoked:
            break;
    }
    return EX_NOPERM;
}

}  // namespace pinwell::gate
