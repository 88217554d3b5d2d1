// Wipes OpenSSL's memory in a process that holds a private key.
#pragma once

namespace pinwell::trust {

/// Makes OpenSSL wipe all memory that it frees; by default it wipes only some copies of a key. Call it before
/// OpenSSL allocates, first in main; returns false if it is too late.
bool wipeWhatOpenSSLFrees() noexcept;

}  // namespace pinwell::trust
