// SHA-256 and SHA-1 (FIPS 180-4).
#pragma once

#include "foundation/bytes.h"

namespace pinwell::lumora {

/// 32 bytes. Throws std::bad_alloc if the cryptographic library fails.
foundation::Data sha256(foundation::ByteView bytes);

/// 20 bytes. Throws as sha256().
foundation::Data sha1(foundation::ByteView bytes);

}  // namespace pinwell::lumora
