// Replaces token_key.cpp in a build without PKCS #11.
#include "foundation/format.h"
#include "lumora-local/failure.h"
#include "lumora-local/token_key.h"

namespace pinwell::lumora {

std::unique_ptr<DigestSigner> openTokenKey(const std::string& uri) {
    throw Failure(EX_CONFIG, foundation::format("cannot use %@: this program was built without PKCS #11",
                                                uri.substr(0, uri.find('?'))));
}

}  // namespace pinwell::lumora
