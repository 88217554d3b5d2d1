// RSA keys for tests that make samples again and again: a new key takes longer than all the rest.
#pragma once

namespace pinwell::lumora {

/// While one exists, OpenSSL's key generator (EVP_PKEY_Q_keygen) returns two RSA keys of each length in turn,
/// which it makes once a process. Without it, and for other keys, each key is new. For one thread. The
/// program is linked with --wrap=EVP_PKEY_Q_keygen.
class KeptRsaKeys {
  public:
    KeptRsaKeys();
    ~KeptRsaKeys();
    KeptRsaKeys(const KeptRsaKeys&) = delete;
    KeptRsaKeys& operator=(const KeptRsaKeys&) = delete;
};

}  // namespace pinwell::lumora
