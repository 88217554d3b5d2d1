// In the place of signing_process.cpp in a build without PKCS #11.
#include "foundation/format.h"
#include "lumora-local/failure.h"
#include "lumora-local/signing_process.h"

namespace pinwell::lumora {

std::unique_ptr<SigningKey> startSigningProcess(const std::string& uri) {
    throw Failure(EX_CONFIG, foundation::format("cannot use %@: this program was built without PKCS #11",
                                                uri.substr(0, uri.find('?'))));
}

}  // namespace pinwell::lumora
