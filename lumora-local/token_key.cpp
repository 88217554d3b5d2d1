#include <openssl/core_names.h>
#include <openssl/ecdsa.h>
#include <openssl/param_build.h>

#include <p11-kit/p11-kit.h>
#include <p11-kit/uri.h>
#include <algorithm>
#include <array>
#include <optional>
#include <vector>

#include "key_file.h"
#include "openssl.h"
#include "signing_key.h"

namespace pinwell::lumora {
namespace {

using base::ByteView;
using base::Data;
using values::format;

using UriHandle = base::Handle<P11KitUri, p11_kit_uri_free>;

constexpr std::size_t kCoordinate = 32;              // bytes of a number on P-256
constexpr std::size_t kPoint = 1 + 2 * kCoordinate;  // an uncompressed point: 4, x, y
constexpr std::size_t kMaximumSlots = 256;

constexpr std::string_view kFilePrefix = "file:";

[[noreturn]] void fail(const std::string& uri, std::string_view what) {
    // The query may have the place of the PIN, and messages are written to logs.
    throw Failure(EX_CONFIG, format("%@: %@", uri.substr(0, uri.find('?')), what));
}

UriHandle parseUri(const std::string& text) {
    UriHandle uri(p11_kit_uri_new());
    const int result = uri == nullptr ? P11_KIT_URI_UNEXPECTED
                                      : p11_kit_uri_parse(text.c_str(), P11_KIT_URI_FOR_ANY, uri.get());
    if (result != P11_KIT_URI_OK) fail(text, "is no URI of a key in a token");
    if (p11_kit_uri_any_unrecognized(uri.get()) != 0) fail(text, "holds an attribute that is not known");
    if (p11_kit_uri_get_pin_value(uri.get()) != nullptr) {
        fail(text, "holds a PIN; name a file that holds it by pin-source");
    }
    return uri;
}

/// The loaded libraries, during the life of this object.
class Modules {
  public:
    explicit Modules(const std::string& uri, const char* path) {
        if (path == nullptr) {
            list_ = p11_kit_modules_load_and_initialize(0);
            if (list_ == nullptr || *list_ == nullptr) {
                fail(uri, "p11-kit knows no module; name one by module-path");
            }
            for (CK_FUNCTION_LIST** module = list_; *module != nullptr; ++module) all_.push_back(*module);
            return;
        }
        single_ = p11_kit_module_load(path, 0);
        if (single_ == nullptr || p11_kit_module_initialize(single_) != CKR_OK) {
            fail(uri, format("cannot use the module %s", path));
        }
        all_.push_back(single_);
    }
    ~Modules() {
        if (list_ != nullptr) p11_kit_modules_finalize_and_release(list_);
        if (single_ == nullptr) return;
        p11_kit_module_finalize(single_);
        p11_kit_module_release(single_);
    }
    Modules(const Modules&) = delete;
    Modules& operator=(const Modules&) = delete;

    const std::vector<CK_FUNCTION_LIST*>& all() const noexcept { return all_; }

  private:
    CK_FUNCTION_LIST** list_ = nullptr;
    CK_FUNCTION_LIST* single_ = nullptr;
    std::vector<CK_FUNCTION_LIST*> all_;
};

struct Token {
    CK_FUNCTION_LIST* module;
    CK_SLOT_ID slot;
    bool needsLogin;
};

std::vector<Token> tokensThatFit(const Modules& modules, P11KitUri* uri) {
    std::vector<Token> tokens;
    for (CK_FUNCTION_LIST* module : modules.all()) {
        std::array<CK_SLOT_ID, kMaximumSlots> slots{};
        CK_ULONG count = slots.size();
        if (module->C_GetSlotList(CK_TRUE, slots.data(), &count) != CKR_OK) continue;
        for (CK_ULONG i = 0; i < count; ++i) {
            CK_TOKEN_INFO token{};
            if (module->C_GetTokenInfo(slots.at(i), &token) == CKR_OK &&
                p11_kit_uri_match_token_info(uri, &token) == 1) {
                tokens.push_back({module, slots.at(i), (token.flags & CKF_LOGIN_REQUIRED) != 0});
            }
        }
    }
    return tokens;
}

Data attributeOf(const Token& token, CK_SESSION_HANDLE session, CK_OBJECT_HANDLE object,
                 CK_ATTRIBUTE_TYPE type) {
    std::array<std::byte, 512> room{};
    CK_ATTRIBUTE attribute{type, room.data(), room.size()};
    if (token.module->C_GetAttributeValue(session, object, &attribute, 1) != CKR_OK ||
        attribute.ulValueLen > room.size()) {
        return {};
    }
    return base::toData(ByteView(room).first(attribute.ulValueLen));
}

/// CKA_EC_POINT is an OCTET STRING with the point; some libraries leave the header out.
Data publicKeyOf(const std::string& uri, Data point) {
    if (point.size() == kPoint + 2 && point[0] == std::byte{V_ASN1_OCTET_STRING}) {
        point.erase(point.begin(), point.begin() + 2);
    }
    const crypto::ParameterBuilderHandle builder(OSSL_PARAM_BLD_new());
    require(builder != nullptr && point.size() == kPoint &&
                OSSL_PARAM_BLD_push_utf8_string(builder.get(), OSSL_PKEY_PARAM_GROUP_NAME, "P-256", 0) == 1 &&
                OSSL_PARAM_BLD_push_octet_string(builder.get(), OSSL_PKEY_PARAM_PUB_KEY, point.data(),
                                                 point.size()) == 1,
            "use the public key of " + uri);
    const crypto::ParametersHandle parameters(OSSL_PARAM_BLD_to_param(builder.get()));
    const crypto::KeyContextHandle context(EVP_PKEY_CTX_new_from_name(nullptr, "EC", nullptr));
    EVP_PKEY* made = nullptr;
    require(parameters != nullptr && context != nullptr && EVP_PKEY_fromdata_init(context.get()) == 1 &&
                EVP_PKEY_fromdata(context.get(), &made, EVP_PKEY_PUBLIC_KEY, parameters.get()) == 1,
            "use the public key in the token");
    const KeyHandle key(made);
    return encodeDer<EVP_PKEY>(i2d_PUBKEY, key.get(), "encode a public key");
}

/// An open session with the token, and the place of the key in it.
struct Session {
    explicit Session(const std::string& text)
        : name(text.substr(0, text.find('?'))),
          uri(parseUri(text)),
          modules(text, p11_kit_uri_get_module_path(uri.get())) {
        const std::vector<Token> tokens = tokensThatFit(modules, uri.get());
        if (tokens.empty()) fail(text, "there is no such token");
        if (tokens.size() > 1) fail(text, "several tokens fit");
        token = tokens.front();
        const CK_RV opened =
            token.module->C_OpenSession(token.slot, CKF_SERIAL_SESSION, nullptr, nullptr, &session);
        if (opened != CKR_OK) fail(text, format("cannot be opened: %s", p11_kit_strerror(opened)));
        if (token.needsLogin) logIn(text);
        key = find(text, CKO_PRIVATE_KEY, "private");
        const CK_OBJECT_HANDLE publicObject = find(text, CKO_PUBLIC_KEY, "public");
        publicKey = publicKeyOf(name, attributeOf(token, session, publicObject, CKA_EC_POINT));
        const Data always = attributeOf(token, session, key, CKA_ALWAYS_AUTHENTICATE);
        asksEachTime = always.size() == sizeof(CK_BBOOL) && always.front() != std::byte{CK_FALSE};
    }

    CK_RV sayPin(CK_USER_TYPE user) const {
        // The interface takes bytes that it does not change.
        auto* bytes = reinterpret_cast<CK_UTF8CHAR*>(const_cast<char*>(pin.text().data()));
        return token.module->C_Login(session, user, bytes, pin.text().size());
    }

    void logIn(const std::string& text) {
        const char* source = p11_kit_uri_get_pin_source(uri.get());
        if (source == nullptr) fail(text, "needs a PIN; name a file that holds it by pin-source");
        std::string place = source;
        if (place.starts_with(kFilePrefix)) place.erase(0, kFilePrefix.size());
        pin.read(place);
        const CK_RV result = sayPin(CKU_USER);
        if (result != CKR_OK && result != CKR_USER_ALREADY_LOGGED_IN) {
            fail(text, format("refuses the PIN: %s", p11_kit_strerror(result)));
        }
    }

    CK_OBJECT_HANDLE find(const std::string& text, CK_OBJECT_CLASS objectClass,
                          std::string_view which) const {
        CK_KEY_TYPE type = CKK_EC;
        std::vector<CK_ATTRIBUTE> wanted{{CKA_CLASS, &objectClass, sizeof objectClass},
                                         {CKA_KEY_TYPE, &type, sizeof type}};
        for (const CK_ATTRIBUTE_TYPE named : {CKA_ID, CKA_LABEL}) {
            const CK_ATTRIBUTE* attribute = p11_kit_uri_get_attribute(uri.get(), named);
            if (attribute != nullptr) wanted.push_back(*attribute);
        }
        std::array<CK_OBJECT_HANDLE, 2> found{};
        CK_ULONG count = 0;
        CK_FUNCTION_LIST& calls = *token.module;
        if (calls.C_FindObjectsInit(session, wanted.data(), wanted.size()) != CKR_OK ||
            calls.C_FindObjects(session, found.data(), found.size(), &count) != CKR_OK ||
            calls.C_FindObjectsFinal(session) != CKR_OK) {
            fail(text, "the token cannot be searched");
        }
        if (count == 0) fail(text, format("the token has no such %@ EC key", which));
        if (count > 1) fail(text, format("several %@ EC keys fit", which));
        return found.front();
    }

    ~Session() {
        if (session != 0) token.module->C_CloseSession(session);
    }
    Session(const Session&) = delete;
    Session& operator=(const Session&) = delete;

    std::string name;
    UriHandle uri;
    Modules modules;
    Token token{};
    CK_SESSION_HANDLE session = 0;
    CK_OBJECT_HANDLE key = 0;
    Passphrase pin;
    bool asksEachTime = false;
    Data publicKey;
};

class TokenKey final : public DigestSigner {
  public:
    explicit TokenKey(const std::string& uri) : session_(std::make_unique<Session>(uri)) {}

    Data publicKey() const override { return session_->publicKey; }

    Data signDigest(ByteView digest) const override {
        CK_MECHANISM mechanism{CKM_ECDSA, nullptr, 0};
        CK_FUNCTION_LIST& calls = *session_->token.module;
        std::array<unsigned char, 2 * kCoordinate> numbers{};
        CK_ULONG length = numbers.size();
        CK_RV result = calls.C_SignInit(session_->session, &mechanism, session_->key);
        if (result == CKR_OK && session_->asksEachTime) result = session_->sayPin(CKU_CONTEXT_SPECIFIC);
        if (result == CKR_OK) {
            // The interface takes bytes that it does not change.
            auto* bytes = const_cast<unsigned char*>(unsignedBytes(digest));
            result = calls.C_Sign(session_->session, bytes, digest.size(), numbers.data(), &length);
        }
        if (result != CKR_OK || length != numbers.size()) {
            throw Failure(EX_IOERR, format("%@: cannot sign: %s", session_->name, p11_kit_strerror(result)));
        }
        crypto::EcdsaSignatureHandle signature(ECDSA_SIG_new());
        crypto::NumberHandle r(BN_bin2bn(numbers.data(), kCoordinate, nullptr));
        crypto::NumberHandle s(BN_bin2bn(numbers.data() + kCoordinate, kCoordinate, nullptr));
        require(signature != nullptr && r != nullptr && s != nullptr &&
                    ECDSA_SIG_set0(signature.get(), r.get(), s.get()) == 1,
                "encode a signature");
        static_cast<void>(r.release());  // the signature has them
        static_cast<void>(s.release());
        return encodeDer<ECDSA_SIG>(i2d_ECDSA_SIG, signature.get(), "encode a signature");
    }

  private:
    const std::unique_ptr<Session> session_;
};

}  // namespace

std::unique_ptr<DigestSigner> openTokenKey(const std::string& uri) {
    return std::make_unique<TokenKey>(uri);
}

}  // namespace pinwell::lumora
