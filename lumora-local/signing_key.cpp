#include "lumora-local/signing_key.h"

#include <openssl/ec.h>
#include <openssl/obj_mac.h>

#include "lumora-local/key_file.h"
#include "lumora-local/openssl_handles.h"
#include "lumora-local/service_settings.h"
#include "lumora-local/token_key.h"

namespace pinwell::lumora {
namespace {

using foundation::ByteView;
using foundation::Data;

// DER of two integers of 33 bytes with their headers.
constexpr std::size_t kMaximumSignature = 72;

class KeyFromFile final : public SigningKey {
  public:
    explicit KeyFromFile(KeyHandle key) : key_(std::move(key)) {}

    Data publicKey() const override {
        return encodeDer<const EVP_PKEY>(i2d_PUBKEY, key_.get(), "encode a public key");
    }

    Data sign(ByteView message) const override {
        const DigestContextHandle context(EVP_MD_CTX_new());
        Data signature(kMaximumSignature);
        std::size_t length = signature.size();
        require(context != nullptr &&
                    EVP_DigestSignInit(context.get(), nullptr, EVP_sha256(), nullptr, key_.get()) == 1 &&
                    EVP_DigestSign(context.get(), octets(signature), &length, octets(message),
                                   message.size()) == 1,
                "sign a ticket");
        signature.resize(length);
        return signature;
    }

  private:
    KeyHandle key_;
};

bool isOnP256(EVP_PKEY* key) {
    std::array<char, 64> group{};
    std::size_t length = 0;
    return EVP_PKEY_get_base_id(key) == EVP_PKEY_EC &&
           EVP_PKEY_get_group_name(key, group.data(), group.size(), &length) == 1 &&
           std::string_view(group.data()) == SN_X9_62_prime256v1;
}

}  // namespace

std::unique_ptr<SigningKey> openSigningKey(const std::string& key, const std::string& passphraseFile) {
    if (isTokenKey(key)) return startSigningProcess([&key] { return openTokenKey(key); });
    KeyHandle read = readKeyFile(key, passphraseFile);
    if (!isOnP256(read.get())) {
        throw Failure(EX_CONFIG,
                      foundation::format("the key in %@ is no EC key on P-256, as tickets need it", key));
    }
    return std::make_unique<KeyFromFile>(std::move(read));
}

}  // namespace pinwell::lumora
