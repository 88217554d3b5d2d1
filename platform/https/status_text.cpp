#include <algorithm>
#include <array>

#include "https/session.h"

namespace pinwell::https {
namespace {

struct StatusText {
    int status;
    std::string_view text;
};

// IANA HTTP Status Code Registry, in lower case; sorted. Numbers registered as unused have no row.
constexpr std::array kStatusTexts{
    StatusText{100, "continue"},
    StatusText{101, "switching protocols"},
    StatusText{102, "processing"},
    StatusText{103, "early hints"},
    StatusText{104, "upload resumption supported"},
    StatusText{200, "ok"},
    StatusText{201, "created"},
    StatusText{202, "accepted"},
    StatusText{203, "non-authoritative information"},
    StatusText{204, "no content"},
    StatusText{205, "reset content"},
    StatusText{206, "partial content"},
    StatusText{207, "multi-status"},
    StatusText{208, "already reported"},
    StatusText{226, "im used"},
    StatusText{300, "multiple choices"},
    StatusText{301, "moved permanently"},
    StatusText{302, "found"},
    StatusText{303, "see other"},
    StatusText{304, "not modified"},
    StatusText{305, "use proxy"},
    StatusText{307, "temporary redirect"},
    StatusText{308, "permanent redirect"},
    StatusText{400, "bad request"},
    StatusText{401, "unauthorized"},
    StatusText{402, "payment required"},
    StatusText{403, "forbidden"},
    StatusText{404, "not found"},
    StatusText{405, "method not allowed"},
    StatusText{406, "not acceptable"},
    StatusText{407, "proxy authentication required"},
    StatusText{408, "request timeout"},
    StatusText{409, "conflict"},
    StatusText{410, "gone"},
    StatusText{411, "length required"},
    StatusText{412, "precondition failed"},
    StatusText{413, "content too large"},
    StatusText{414, "uri too long"},
    StatusText{415, "unsupported media type"},
    StatusText{416, "range not satisfiable"},
    StatusText{417, "expectation failed"},
    StatusText{421, "misdirected request"},
    StatusText{422, "unprocessable content"},
    StatusText{423, "locked"},
    StatusText{424, "failed dependency"},
    StatusText{425, "too early"},
    StatusText{426, "upgrade required"},
    StatusText{428, "precondition required"},
    StatusText{429, "too many requests"},
    StatusText{431, "request header fields too large"},
    StatusText{451, "unavailable for legal reasons"},
    StatusText{500, "internal server error"},
    StatusText{501, "not implemented"},
    StatusText{502, "bad gateway"},
    StatusText{503, "service unavailable"},
    StatusText{504, "gateway timeout"},
    StatusText{505, "http version not supported"},
    StatusText{506, "variant also negotiates"},
    StatusText{507, "insufficient storage"},
    StatusText{508, "loop detected"},
    StatusText{510, "not extended"},
    StatusText{511, "network authentication required"},
};

// RFC 9110, section 15: the class is the first digit.
std::string_view classText(int status) {
    if (status < 100 || status > 599) return "unknown status";
    constexpr std::array<std::string_view, 5> kClasses{"informational", "success", "redirection",
                                                       "client error", "server error"};
    return kClasses[static_cast<std::size_t>(status / 100 - 1)];
}

}  // namespace

std::string localizedStringForStatusCode(int status) {
    const auto row =
        std::lower_bound(kStatusTexts.begin(), kStatusTexts.end(), status,
                         [](const StatusText& entry, int wanted) { return entry.status < wanted; });
    const bool registered = row != kStatusTexts.end() && row->status == status;
    return std::string(registered ? row->text : classText(status));
}

}  // namespace pinwell::https
