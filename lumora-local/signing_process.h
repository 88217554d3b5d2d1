// The process that speaks to a token, seen from the one that makes tickets.
#pragma once

#include <memory>
#include <string>

#include "lumora-local/signing_key.h"

namespace pinwell::lumora {

/// Starts a child that opens the key and signs until the result is destroyed. Throws Failure: EX_CONFIG if
/// the URI names no key that can be used, or if this program was built without PKCS #11.
std::unique_ptr<SigningKey> startSigningProcess(const std::string& uri);

}  // namespace pinwell::lumora
