// The certificate-trust service: certificates, policies that are lists of options, trust objects and their
// verdict.
//
// A policy is only its options: a rule outside the list is not checked. All calls block and may be made from
// any thread; one trust object serves one thread at a time.
#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "base/bytes.h"
#include "base/error.h"
#include "config/platform_directory.h"
#include "values/date.h"
#include "values/value.h"

namespace pinwell::trust {

using base::ByteView;
using base::Data;
using base::Error;
using base::Result;
using values::Array;
using values::Date;
using values::Dictionary;

/// A platform status; 0 is success.
using Status = std::int32_t;
inline constexpr Status kSuccess = 0;
using base::kParameterError;                       // -50
inline constexpr Status kSignatureError = -67688;  // a signature did not verify

/// Verdict numbers of an evaluation.
enum class Verdict : std::uint32_t {
    invalid = 0,             // not evaluated
    proceed = 1,             // anchored only through certificates that the user trusts
    deny = 3,                // the user distrusts a certificate of the chain
    unspecified = 4,         // trusted by the platform's own anchors, without a user setting
    recoverableFailure = 5,  // a policy check failed
    fatalFailure = 6,        // bad signature, malformed, unhandled critical extension
    otherError = 7,
};

/// One parsed X.509 certificate (RFC 5280). Immutable, shared.
class Certificate {
  public:
    virtual ~Certificate() = default;

    virtual const Data& der() const = 0;

    /// Its name for people: the subject's common name, otherwise its last named part, otherwise its key
    /// identifier.
    virtual std::string subjectSummary() const = 0;
};
using CertificateRef = std::shared_ptr<const Certificate>;

/// A public key. Immutable, shared.
class PublicKey {
  public:
    virtual ~PublicKey() = default;
};
using PublicKeyRef = std::shared_ptr<const PublicKey>;

/// Option keys. The value's type follows each; `true` enables a check. An unknown option, or a
/// value of another type, makes the verdict otherError. Without an anchor option the anchors are
/// those of kPlatformAnchor. The root is checked too; every OID in a list of markers must be
/// present.
///
/// kServerAuthentication: the leaf's purposes name it. If an issuer or the anchor has purposes, they name it
/// or "any". The leaf's key usage, if present, allows TLS. kNameConstraints: the constraints of every issuer
/// and of the anchor, critical or not, apply to the host and to all names of the certificates below. Without
/// the option, critical name constraints count as unknown.
namespace option {
inline constexpr std::string_view kCriticalExtensions = "CriticalExtensions";  // true
inline constexpr std::string_view kIdLinkage = "IdLinkage";                    // true
inline constexpr std::string_view kBasicConstraints = "BasicConstraints";      // true
inline constexpr std::string_view kNonEmptySubject = "NonEmptySubject";        // true
inline constexpr std::string_view kPlatformAnchor =
    "PlatformAnchor";  // dictionary of sub-options, may be empty
inline constexpr std::string_view kCompatibilityAnchor =
    "CompatibilityAnchor";                                       // the same, and compat-roots/
inline constexpr std::string_view kChainLength = "ChainLength";  // number, with leaf and root
inline constexpr std::string_view kIntermediateMarkerOid =
    "IntermediateMarkerOid";                                         // dotted OID, or a list of them
inline constexpr std::string_view kLeafMarkerOid = "LeafMarkerOid";  // dotted OID, or a list of them
inline constexpr std::string_view kKeySize = "KeySize";              // key type -> minimum bits
inline constexpr std::string_view kValidityDates = "ValidityDates";  // true
inline constexpr std::string_view kHostName = "HostName";            // DNS name or IP address
inline constexpr std::string_view kServerAuthentication = "ServerAuthentication";  // true
inline constexpr std::string_view kNameConstraints = "NameConstraints";            // true
}  // namespace option

/// Key types, the keys of the kKeySize dictionary.
inline constexpr std::string_view kKeyTypeRSA = "RSA";
inline constexpr std::string_view kKeyTypeEllipticCurve = "EC";

/// A certificate policy. It has only these three fields.
struct Policy {
    std::string oid;
    std::optional<std::string> name;
    Dictionary options;
};
using PolicyRef = std::shared_ptr<const Policy>;

/// Extension that marks the TLS leaf of the pinned policy.
inline constexpr std::string_view kPinnedServerMarkerOid = "1.2.840.177245.100.6.27.2";

/// The two TLS server policies, bound to a host; null for an empty host.
PolicyRef pinnedServerPolicy(std::string_view host);
PolicyRef compatibilityServerPolicy(std::string_view host);

/// Keys of the property dictionaries.
inline constexpr std::string_view kPropertyTitle = "title";
inline constexpr std::string_view kPropertyError = "error";

/// A certificate list under evaluation. An error has the domain kOSStatusErrorDomain.
class Trust {
  public:
    virtual ~Trust() = default;

    /// Replaces the policies by this one and drops an earlier verdict.
    virtual Result<void> setPolicy(PolicyRef policy) = 0;

    /// Judges the list. An error means that no judgement was possible.
    virtual Result<Verdict> evaluate() = 0;

    /// One dictionary for each certificate of the chain, leaf first: a title, and an error if it is faulty.
    virtual Array properties() const = 0;

    /// One line that names the failure and the faulty certificate; `nullopt` after success.
    virtual std::optional<std::string> failureDescription() const = 0;

    /// The key of the evaluated leaf; null if there is none.
    virtual PublicKeyRef publicKey() const = 0;
};

/// An error has the domain kOSStatusErrorDomain.
class TrustService {
  public:
    virtual ~TrustService() = default;

    /// Null if `der` is not exactly one well-formed certificate.
    virtual CertificateRef parseCertificate(ByteView der) const = 0;

    /// A policy from the platform security library's argument-less constructor of that name. `nullopt` if
    /// there is no library, or it does not know the name; null if the constructor returns nothing.
    virtual std::optional<PolicyRef> namedPolicy(const std::string& constructorName) const = 0;

    /// Leaf first. The certificates after the leaf are candidates for its chain, in any order; useless ones
    /// are skipped. Returns kParameterError for an empty list, one of more than 64, and certificates of
    /// another service.
    virtual Result<std::shared_ptr<Trust>> makeTrust(std::vector<CertificateRef> certificates,
                                                     PolicyRef policy) const = 0;

    /// Returns kSignatureError unless the signature verifies: ECDSA in X9.62 form over SHA-256 of `message`.
    /// The signature is the DER element at the start of `signature`; all bytes after it must be zero.
    virtual Result<void> verifySignature(const PublicKey& key, ByteView message,
                                         ByteView signature) const = 0;
};

/// The service over the platform directory's anchors, read once on first need. `now` is the evaluation time.
/// An unreadable PEM file is ignored; `logError` is called once, with one line that names it.
std::unique_ptr<TrustService> makeTrustService(config::PlatformDirectory directory,
                                               std::function<void(std::string_view)> logError,
                                               std::function<Date()> now = Date::now);

}  // namespace pinwell::trust
