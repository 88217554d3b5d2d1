#include "companion/version.h"

#include <curl/curl.h>
#include <openssl/crypto.h>

#include "foundation/format.h"

namespace pinwell::companion {

std::string versionText(std::string_view program) {
    return foundation::format("%s %s (commit %s, OpenSSL %s, curl %s)", program, PINWELL_VERSION,
                              PINWELL_COMMIT, OpenSSL_version(OPENSSL_VERSION_STRING),
                              curl_version_info(CURLVERSION_NOW)->version);
}

std::string versionNumber() {
    return PINWELL_VERSION;
}

}  // namespace pinwell::companion
