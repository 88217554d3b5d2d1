#include "lumora-local/problem.h"

#include "foundation/format.h"
#include "foundation/json.h"
#include "foundation/markup.h"
#include "foundation/value.h"

namespace pinwell::lumora {

using foundation::Dictionary;

std::string_view titleOf(int status) {
    switch (status) {
        case 400:
            return "Bad Request";
        case 403:
            return "Forbidden";
        case 404:
            return "Not Found";
        case 405:
            return "Method Not Allowed";
        case 408:
            return "Request Timeout";
        case 409:
            return "Conflict";
        case 411:
            return "Length Required";
        case 413:
            return "Content Too Large";
        case 414:
            return "URI Too Long";
        case 415:
            return "Unsupported Media Type";
        case 422:
            return "Unprocessable Content";
        case 429:
            return "Too Many Requests";
        case 431:
            return "Request Header Fields Too Large";
        case 503:
            return "Service Unavailable";
        default:
            return "Internal Server Error";
    }
}

Answer problem(int status, std::string_view detail) {
    Answer answer;
    answer.status = status;
    answer.contentType = "application/problem+json";
    // The detail may repeat the client's text: without control characters, and in UTF-8.
    const auto document =
        foundation::serializeJSON(Dictionary{{"type", "about:blank"},
                                             {"title", titleOf(status)},
                                             {"status", status},
                                             {"detail", foundation::escapeForDisplay(detail)}});
    answer.body = document ? foundation::toString(*document) : std::string("{}");
    return answer;
}

Answer problemForNow(int status, std::string_view detail, std::int64_t seconds) {
    Answer answer = problem(status, detail);
    answer.headers.emplace_back("Retry-After", std::to_string(seconds));
    return answer;
}

}  // namespace pinwell::lumora
