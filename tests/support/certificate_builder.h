// Certificates made field by field, for tests of chains, tickets, signatures and TLS servers.
//
//   TicketChain chain;                              // root, intermediate and leaf, all valid
//   chain.leaf.markers.clear();                     // one wrong field is one visible line
//   const IssuedChain issued = chain.issue();
//   issued.leaf.der, issued.root.pem(), issued.leaf.key.sign(message) ...
//
// A single certificate is `issueCertificate(fields, &issuer)`, or with a null issuer for a self-signed one.
// Every function throws std::runtime_error when OpenSSL refuses; a test needs no check of its own.
#pragma once

#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "base/bytes.h"
#include "values/date.h"

struct evp_pkey_st;  // OpenSSL's EVP_PKEY

namespace pinwell::test {

enum class KeyKind {
    p224,
    p256,
    p256Described,  // the same curve, described by its numbers instead of named
    p384,
    p521,
    rsa1024,
    rsa2048,
    rsa3072,
    ed25519,
};

/// A key pair. Copies share it.
class SigningKey {
  public:
    /// A new key pair.
    static SigningKey generate(KeyKind kind);

    /// The same key pair for the same kind and name, made once in each process. It is the
    /// default of chains. Use it for RSA keys too, because making one takes long. For any
    /// thread.
    static SigningKey cached(KeyKind kind, const std::string& name);

    /// A new key pair on the curve with OpenSSL's name.
    static SigningKey onCurve(const char* curve);

    /// PKCS #8, unencrypted.
    std::string pem() const;

    /// The DER SubjectPublicKeyInfo.
    base::Data publicKeyInfo() const;

    /// A signature over SHA-256 of the message: DER (X9.62) from an elliptic-curve key, PKCS #1 v1.5 from
    /// RSA.
    base::Data sign(base::ByteView message) const;

    evp_pkey_st* native() const noexcept { return pair_.get(); }

  private:
    explicit SigningKey(std::shared_ptr<evp_pkey_st> pair) : pair_(std::move(pair)) {}

    std::shared_ptr<evp_pkey_st> pair_;
};

/// Attribute short name and value, in order: {{"O", "Ostrel"}, {"CN", "Root"}}. May be empty.
using DistinguishedName = std::vector<std::pair<std::string, std::string>>;

inline DistinguishedName commonName(std::string name) {
    return {{"CN", std::move(name)}};
}

struct BasicConstraints {
    bool isCertificateAuthority = false;
    std::optional<int> pathLength = std::nullopt;
    bool critical = true;
};

struct ExtensionField {
    std::string oid;  // dotted
    bool critical = false;
    base::Data value{std::byte{0x05}, std::byte{0x00}};  // DER; the default is a NULL
};

/// MD5 needs an RSA issuer: ECDSA has no identifier for it.
enum class SignatureDigest { md5, sha1, sha256, sha384 };

/// Of an RSASSA-PSS signature.
struct PssDigests {
    SignatureDigest digest = SignatureDigest::sha256;
    SignatureDigest mask = SignatureDigest::sha256;
};

/// The form of a key identifier extension.
struct KeyIdentifier {
    enum class Kind { computed, omitted, given };
    Kind kind = Kind::computed;
    base::Data value = {};  // when given

    static KeyIdentifier omitted() { return {Kind::omitted}; }
    static KeyIdentifier given(std::string_view bytes) { return {Kind::given, base::toData(bytes)}; }
};

/// The parts of a certificate, each an encoded element; an empty one is left out. Tests edit these for forms
/// that OpenSSL does not write.
struct CertificateElements {
    base::Data version;  // [0] and its contents
    base::Data serialNumber;
    base::Data innerAlgorithm;
    base::Data issuer;
    base::Data validity;
    base::Data subject;
    base::Data key;
    base::Data issuerUniqueIdentifier;   // [1]
    base::Data subjectUniqueIdentifier;  // [2]
    base::Data extensions;               // [3] and its contents
    base::Data outerAlgorithm;
    std::optional<base::Data> signature = std::nullopt;  // a BIT STRING; a new signature if absent
};

/// Takes an issued certificate apart; its signature is left out.
CertificateElements takeApart(base::ByteView certificate);

/// The contents of a certificate, except its issuer. Extensions are in the order of the members.
struct CertificateFields {
    int version = 3;
    std::int64_t serial = 1;
    DistinguishedName subject = {{"O", "Pinwell Tests"}, {"CN", "Certificate"}};
    std::optional<DistinguishedName> issuer =
        std::nullopt;  // the default is the issuing certificate's subject
    SigningKey key = SigningKey::cached(KeyKind::p256, "default");
    values::Date notBefore = {1577836800};  // 2020-01-01 00:00:00 UTC
    values::Date notAfter = {2524607999};   // 2049-12-31 23:59:59 UTC

    std::optional<BasicConstraints> basicConstraints = BasicConstraints{};
    std::string keyUsage = {};          // as in openssl.cnf: "critical,keyCertSign,cRLSign"; empty: none
    std::string extendedKeyUsage = {};  // as in openssl.cnf: "serverAuth,1.2.3.4"; empty: none
    std::string subjectAlternativeNames = {};  // as in openssl.cnf: "DNS:a.example,IP:127.0.0.1"; empty: none
    std::string nameConstraints = {};          // as in openssl.cnf: "permitted;DNS:a.example"; empty: none
    KeyIdentifier subjectKeyIdentifier = {};   // computed: SHA-1 of the public key
    KeyIdentifier authorityKeyIdentifier =
        {};                                 // computed: the issuer's subject key identifier, when it has one
    std::vector<std::string> markers = {};  // dotted OIDs, each an extension with a NULL, not critical
    std::vector<ExtensionField> extensions = {};

    SignatureDigest digest = SignatureDigest::sha256;
    std::optional<SigningKey> signer = std::nullopt;  // the default is the issuing certificate's key
    bool corruptSignature = false;                    // flips the last bit of the finished certificate
    std::function<void(CertificateElements&)> edit = nullptr;  // before it is signed; any result is allowed
    std::optional<PssDigests> pss = std::nullopt;              // an RSA signer signs by RSASSA-PSS
};

/// A certificate with its key, to issue others.
struct IssuedCertificate {
    base::Data der;
    SigningKey key;
    DistinguishedName subject;
    std::optional<base::Data> subjectKeyIdentifier = std::nullopt;

    std::string pem() const;
};

/// Null `issuer`: signed with its own key, under its own name.
IssuedCertificate issueCertificate(const CertificateFields& fields, const IssuedCertificate* issuer);

/// The certificate with the signature that anyone can derive: if (r, s) verifies, so does (r, n - s), where n
/// is the order of the curve. The issuer's elliptic-curve key gives the curve.
base::Data underOtherSignature(base::ByteView certificate, const SigningKey& issuer);

/// A PEM block of that label around the bytes.
std::string toPem(std::string_view label, base::ByteView der);

struct IssuedChain {
    IssuedCertificate root;
    IssuedCertificate intermediate;
    IssuedCertificate leaf;

    /// Leaf first, the root last or left out.
    std::vector<base::Data> list(bool withRoot = true) const;

    /// The same in PEM, as a server is configured with it: leaf and intermediate.
    std::string serverPem() const { return leaf.pem() + intermediate.pem(); }
};

/// Three certificates with changeable fields, each issued by the one above it.
struct ChainFields {
    CertificateFields root;
    CertificateFields intermediate;
    CertificateFields leaf;

    IssuedChain issue() const;
};

inline constexpr const char* kTicketIntermediateMarker = "1.2.840.177245.100.6.2.17";
inline constexpr const char* kTicketLeafMarker = "1.2.840.177245.100.6.1.30";
inline constexpr const char* kPinnedServerMarker = "1.2.840.177245.100.6.27.2";

/// A chain that the ticket-signing policy accepts once its root is in roots/.
struct TicketChain : ChainFields {
    TicketChain();
};

/// A chain that both TLS policies accept for that host once its root is in roots/ (the compatibility policy:
/// or in compat-roots/). The host is a DNS name or an IP address.
struct ServerChain : ChainFields {
    explicit ServerChain(const std::string& host = "localhost");
};

}  // namespace pinwell::test
