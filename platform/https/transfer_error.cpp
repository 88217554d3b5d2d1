#include "transfer_error.h"

#include <curl/curl.h>

#include <algorithm>
#include <array>

#include "base/text.h"

namespace pinwell::https {
namespace {

using Code = URLErrorCode;

constexpr TransferFailure kUnknown{CURLE_OK, Code::unknown, "the transfer failed"};

// CURLE_TOO_LARGE, which headers before 8.6 do not have.
constexpr int kTooLarge = 100;

// Results that our https exchanges cannot have map to kUnknown.
constexpr std::array kFailures{
    // About the response: the URL's scheme was checked before.
    TransferFailure{CURLE_UNSUPPORTED_PROTOCOL, Code::badServerResponse, "the answer is not HTTP"},
    TransferFailure{CURLE_URL_MALFORMAT, Code::unsupportedURL, "the URL is malformed"},
    TransferFailure{CURLE_LOGIN_DENIED, Code::unsupportedURL, "the URL holds a user name"},
    TransferFailure{CURLE_NOT_BUILT_IN, Code::invalidConfiguration,
                    "the transfer library lacks what is needed"},
    TransferFailure{CURLE_UNKNOWN_OPTION, Code::invalidConfiguration,
                    "the transfer library lacks what is needed"},
    // A field without a colon; the request's own fields were checked before.
    TransferFailure{CURLE_BAD_FUNCTION_ARGUMENT, Code::badServerResponse, "the answer's header is malformed"},
    TransferFailure{CURLE_COULDNT_RESOLVE_HOST, Code::cannotFindHost, "the host name could not be resolved"},
    TransferFailure{CURLE_COULDNT_RESOLVE_PROXY, Code::proxyFailed, "the proxy's name could not be resolved"},
    TransferFailure{CURLE_PROXY, Code::proxyFailed, "the proxy refused"},
    // The only cipher list that is ever set is the empty one for https proxies.
    TransferFailure{CURLE_SSL_CIPHER, Code::proxyFailed,
                    "a proxy that is itself reached by https is not used"},
    TransferFailure{CURLE_COULDNT_CONNECT, Code::cannotConnect, "the connection could not be made"},
    TransferFailure{CURLE_OPERATION_TIMEDOUT, Code::timedOut, "no answer in time"},
    TransferFailure{CURLE_SSL_CONNECT_ERROR, Code::secureConnectionFailed, "the TLS handshake failed"},
    TransferFailure{CURLE_PEER_FAILED_VERIFICATION, Code::secureConnectionFailed,
                    "the server's certificate was refused"},
    TransferFailure{CURLE_SSL_CERTPROBLEM, Code::secureConnectionFailed, "the server asks for a certificate"},
    TransferFailure{CURLE_WEIRD_SERVER_REPLY, Code::badServerResponse, "the answer is not HTTP"},
    TransferFailure{CURLE_BAD_CONTENT_ENCODING, Code::badServerResponse, "the answer's encoding is broken"},
    TransferFailure{CURLE_HTTP2, Code::badServerResponse, "the server broke the HTTP/2 protocol"},
    TransferFailure{CURLE_HTTP2_STREAM, Code::badServerResponse, "the server broke off the HTTP/2 stream"},
    TransferFailure{CURLE_GOT_NOTHING, Code::connectionLost, "the connection was closed without an answer"},
    TransferFailure{CURLE_PARTIAL_FILE, Code::connectionLost, "the connection was closed within the answer"},
    TransferFailure{CURLE_SEND_ERROR, Code::connectionLost, "the connection was lost while sending"},
    TransferFailure{CURLE_RECV_ERROR, Code::connectionLost, "the connection was lost while receiving"},
    // The library's results for a header line beyond its own limit, before and since 8.6.
    TransferFailure{CURLE_OUT_OF_MEMORY, Code::tooLarge, "the answer is larger than can be kept"},
    TransferFailure{kTooLarge, Code::tooLarge, "the answer is larger than can be kept"},
};

}  // namespace

Error makeError(URLErrorCode code, const std::string& text) {
    return {base::kURLErrorDomain, static_cast<std::int64_t>(code), base::escapeForTerminal(text)};
}

const TransferFailure& failureOf(int result) noexcept {
    const auto found = std::find_if(kFailures.begin(), kFailures.end(),
                                    [result](const TransferFailure& row) { return row.result == result; });
    return found == kFailures.end() ? kUnknown : *found;
}

}  // namespace pinwell::https
