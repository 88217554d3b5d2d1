// Reading private keys so that no copy of them stays in memory.
#pragma once

#include <string>

#include "lumora-local/openssl_handles.h"

namespace pinwell::lumora {

/// Has OpenSSL wipe all memory that it frees, for it wipes only some of what a key goes through. To be called
/// before it has allocated any, before everything else in main; returns false if it is too late.
bool wipeWhatOpenSSLFrees() noexcept;

/// Reads the PEM file of an unencrypted private key. Whatever buffers its text went through are wiped; the
/// key's own memory is wiped when its last reference goes. Throws Failure (EX_NOINPUT when the file cannot be
/// read).
KeyHandle readKeyFile(const std::string& path);

/// Overwrites the text, also where a copy of it was short enough to be in the object itself.
void wipe(std::string& text);

}  // namespace pinwell::lumora
