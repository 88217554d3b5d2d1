// What OpenSSL leaves in memory, in a process that holds a private key.
#pragma once

namespace pinwell::trust {

/// Has OpenSSL wipe all memory that it frees, for it wipes only some of what a key goes through. To be called
/// before it has allocated any, before everything else in main; returns false if it is too late.
bool wipeWhatOpenSSLFrees() noexcept;

}  // namespace pinwell::trust
