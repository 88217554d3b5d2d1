// Faults of one certificate, put into each place of a chain in turn.
#include <algorithm>

#include "chain_vocabulary.h"
#include "support/key_forms.h"
#include "support/ticket_builder.h"

namespace pinwell::test {

using namespace faults;
using trust::kDay;
using trust::kNow;

// clang-format off
const std::vector<CertificateFault>& certificateFaults() {
    static const std::vector<CertificateFault> faults{
        // Validity.
        {"Expired", "expired a second ago; the ticket policy has no option on dates", "444 555 555", [](C& c, Chain&) { c.notAfter = {kNow.seconds - 1}; }},
        {"ExpiredLongAgo", "expired in 1999; the ticket policy has no option on dates", "444 555 555", [](C& c, Chain&) { c.notBefore = {800000000}; c.notAfter = {946684799}; }},
        {"NotValidYet", "valid from the next second; the ticket policy has no option on dates", "444 555 555", [](C& c, Chain&) { c.notBefore = {kNow.seconds + 1}; }},
        {"ValidityInverted", "ends before it begins; the ticket policy has no option on dates", "444 555 555", [](C& c, Chain&) { c.notBefore = {kNow.seconds + kDay}; c.notAfter = {kNow.seconds - kDay}; }},
        // Signatures. A root is an anchor byte for byte: its own signature is not checked.
        {"SignatureCorrupt", "the last bit of the signature is flipped; a root's own is not looked at", "664 664 664", [](C& c, Chain&) { c.corruptSignature = true; }},
        {"SignedByAnotherKey", "signed by a key that is not the issuer's; a root's own signature is not looked at", "664 664 664", [](C& c, Chain&) { c.signer = SigningKey::cached(KeyKind::p256, "another"); }},
        {"SignedByItself", "signed by its own key, under its issuer's name; a root is", "664 664 664", [](C& c, Chain&) { c.signer = c.key; }},
        {"SignedByTheLeaf", "signed by the leaf's key; a root's own signature is not looked at", "664 664 664", [](C& c, Chain& chain) { c.signer = chain.leaf.key; }},
        {"SignedOverSha1", "the signature rests on SHA-1; the root's own is aside", "554 554 554", [](C& c, Chain&) { c.digest = SignatureDigest::sha1; }},
        {"SignedOverMd5", "the signature rests on MD5; the root's own is aside", "554 554 554", [](C& c, Chain& chain) { everyKeyRsa(chain); c.digest = SignatureDigest::md5; }},
        {"SignedWithRsaOverSha1", "an RSA signature rests on SHA-1; the root's own is aside", "554 554 554", [](C& c, Chain& chain) { everyKeyRsa(chain); c.digest = SignatureDigest::sha1; }},
        {"OuterAlgorithmDiffers", "the algorithm outside is not the signed one; the anchor stands in for such a root", "664 664 664", nullptr, [](Data& der) { flipBehind(der, kEcdsaWithSha2, 0, true, std::byte{1}); }},
        {"InnerAlgorithmDiffers", "the signed algorithm is not the one outside; the anchor stands in for such a root", "664 664 664", nullptr, [](Data& der) { flipBehind(der, kEcdsaWithSha2, 0, false, std::byte{1}); }},
        {"PublicKeyChanged", "a bit of the public key is flipped; the anchor stands in for such a root", "664 664 664", nullptr, [](Data& der) { flipBehind(der, kPointBits, 9, false, std::byte{1}); }},
        // Names.
        {"IssuerNameDiffers", "names an issuer that is not there; a root that is an anchor needs none", "554 554 554", [](C& c, Chain&) { c.issuer = commonName("Somebody Else"); }},
        {"IssuerNameInAnotherOrder", "the issuer's name parts are in another order; a root that is an anchor needs none", "554 554 554", [](C& c, Chain& chain) { c.issuer = &c == &chain.leaf ? chain.intermediate.subject : chain.root.subject; std::reverse(c.issuer->begin(), c.issuer->end()); }},
        {"IssuerNameEmpty", "the issuer's name is empty; a root that is an anchor needs none", "554 554 554", [](C& c, Chain&) { c.issuer.emplace(); }},
        {"SubjectEmpty", "the subject is empty; server policies have no option on it", "555 444 444", [](C& c, Chain&) { c.subject.clear(); }},
        {"AuthorityKeyIdentifierDiffers", "names another key of its issuer; server policies have no option on linkage, a root has no issuer", "554 444 444", [](C& c, Chain&) { c.authorityKeyIdentifier = KeyIdentifier::given("another"); }},
        {"AuthorityKeyIdentifierEmpty", "names an empty key identifier; server policies have no option on linkage, a root has no issuer", "554 444 444", [](C& c, Chain&) { c.authorityKeyIdentifier = KeyIdentifier::given(""); }},
        // Keys.
        {"KeyP224", "a curve of 224 bits", "555 555 555", [](C& c, Chain&) { useKey(c, KeyKind::p224); }},
        {"KeyRsa1024", "an RSA key of 1024 bits", "555 555 555", [](C& c, Chain&) { useKey(c, KeyKind::rsa1024); }},
        {"KeyEd25519", "a kind of key that the policy does not admit", "555 555 555", [](C& c, Chain&) { useKey(c, KeyKind::ed25519); }},
        {"KeyWithACurveOfItsOwn", "the key describes its curve and names none, so it cannot be read", "566 566 566", [](C& c, Chain&) { useKey(c, KeyKind::p256Described); }},
        // Basic constraints and key usage: a matter of the issuers.
        {"NoBasicConstraints", "has no basic constraints; a leaf needs none", "455 455 455", [](C& c, Chain&) { c.basicConstraints.reset(); }},
        {"NotAnAuthority", "its basic constraints say CA:FALSE", "-55 -55 -55", [](C& c, Chain&) { c.basicConstraints = BasicConstraints{false}; }},
        {"ALeafThatIsAnAuthority", "a leaf that says CA:TRUE; basic constraints are a matter of the issuers", "4-- 4-- 4--", [](C& c, Chain&) { c.basicConstraints = BasicConstraints{true}; }},
        {"PathLengthZero", "the path length of 0 leaves no room for the intermediate below", "--5 --5 --5", [](C& c, Chain&) { c.basicConstraints = BasicConstraints{true, 0}; }},
        {"PathLengthZeroNotCritical", "a path length of 0 counts in an extension that is not critical", "--5 --5 --5", [](C& c, Chain&) { c.basicConstraints = BasicConstraints{true, 0, false}; }},
        {"PathLengthNegative", "a path length of -1", "666 666 666", [](C& c, Chain&) { c.basicConstraints.reset(); replace(c, kBasicConstraints, true, bytes({0x30, 6, 1, 1, 0xFF, 2, 1, 0xFF})); }},
        {"PathLengthOf9Bytes", "a path length of 2^64", "666 666 666", [](C& c, Chain&) { c.basicConstraints.reset(); replace(c, kBasicConstraints, true, bytes({0x30, 14, 1, 1, 0xFF, 2, 9, 1, 0, 0, 0, 0, 0, 0, 0, 0})); }},
        {"NoKeyCertSign", "the key usage lacks keyCertSign; a leaf signs no certificates", "455 455 455", [](C& c, Chain&) { c.keyUsage = "critical,digitalSignature,cRLSign"; }},
        {"NoKeyCertSignNotCritical", "the key usage counts in an extension that is not critical; a leaf signs no certificates", "455 455 455", [](C& c, Chain&) { c.keyUsage = "digitalSignature"; }},
        {"KeyUsageEmpty", "a key usage of no bit at all; a ticket's leaf signs no certificates", "455 555 555", [](C& c, Chain&) { c.keyUsage.clear(); replace(c, kKeyUsage, true, bytes({3, 1, 0})); }},
        // Extensions.
        {"UnknownCritical", "a critical extension that nobody knows", "666 666 666", [](C& c, Chain&) { replace(c, kUnknown, true); }},
        {"NameConstraintsMalformed", "a NULL in the place of critical name constraints", "666 666 666", [](C& c, Chain&) { replace(c, "2.5.29.30", true); }},
        {"PolicyConstraintsCritical", "critical policy constraints, which are not understood here", "666 666 666", [](C& c, Chain&) { replace(c, "2.5.29.36", true); }},
        {"PoliciesMalformed", "a NULL in the place of critical certificate policies", "666 666 666", [](C& c, Chain&) { replace(c, "2.5.29.32", true); }},
        {"UnknownTwice", "one extension twice", "666 666 666", [](C& c, Chain&) { replace(c, kUnknown, false); replace(c, kUnknown, false); }},
        {"BasicConstraintsTwice", "two basic constraints, the second says CA:FALSE", "666 666 666", [](C& c, Chain&) { replace(c, kBasicConstraints, true, bytes({0x30, 0})); }},
        {"BasicConstraintsMalformed", "a NULL in the place of basic constraints", "666 666 666", [](C& c, Chain&) { c.basicConstraints.reset(); replace(c, kBasicConstraints, true); }},
        {"BasicConstraintsMalformedNotCritical", "a NULL in the place of basic constraints that are not critical", "666 666 666", [](C& c, Chain&) { c.basicConstraints.reset(); replace(c, kBasicConstraints, false); }},
        {"KeyUsageMalformed", "a NULL in the place of the key usage", "666 666 666", [](C& c, Chain&) { c.keyUsage.clear(); replace(c, kKeyUsage, true); }},
        {"PurposesMalformed", "a NULL in the place of the purposes", "666 666 666", [](C& c, Chain&) { c.extendedKeyUsage.clear(); replace(c, kPurposes, false); }},
        {"AlternativeNamesMalformed", "a NULL in the place of the names", "666 666 666", [](C& c, Chain&) { c.subjectAlternativeNames.clear(); replace(c, kAlternativeNames, false); }},
        {"SubjectKeyIdentifierMalformed", "a NULL in the place of the key identifier", "666 666 666", [](C& c, Chain&) { c.subjectKeyIdentifier = KeyIdentifier::omitted(); replace(c, kSubjectKeyIdentifier, false); }},
        {"AuthorityKeyIdentifierMalformed", "a NULL in the place of the issuer's key identifier", "666 666 666", [](C& c, Chain&) { c.authorityKeyIdentifier = KeyIdentifier::omitted(); replace(c, kAuthorityKeyIdentifier, false); }},
        {"BytesBehindAnExtensionsValue", "a byte behind the value inside an extension", "666 666 666", [](C& c, Chain&) { c.keyUsage.clear(); replace(c, kKeyUsage, true, bytes({3, 2, 2, 4, 0})); }},
        // Markers.
        {"MarkersMissing", "carries no marker; only the ticket's leaf and intermediate and the pinned leaf need one", "554 544 444", [](C& c, Chain&) { c.markers.clear(); }},
        {"MarkerOneDigitOff", "the last number of the marker is one more; the compatibility policy asks for none", "55- 5-- 4--", [](C& c, Chain&) { c.markers.at(0).back() = static_cast<char>(c.markers.at(0).back() + 1); }},
        {"MarkerOfTheOtherKind", "carries the marker of the other sort of leaf; the compatibility policy asks for none", "5-- 5-- 4--", [](C& c, Chain&) { c.markers = {c.markers.at(0) == kTicketLeafMarker ? kPinnedServerMarker : kTicketLeafMarker}; }},
        {"LeafMarkerHereInstead", "the leaf's marker stands here instead of in the leaf; the compatibility policy asks for none", "-55 -55 -44", [](C& c, Chain& chain) { const auto moved = chain.leaf.markers; chain.leaf.markers.clear(); c.markers.push_back(moved.at(0)); }},
        {"IntermediateMarkerHereInstead", "the intermediate's marker stands here instead of in the intermediate", "5-5 --- ---", [](C& c, Chain& chain) { const auto moved = chain.intermediate.markers; chain.intermediate.markers.clear(); c.markers.push_back(moved.at(0)); }},
        {"MarkerAsPurpose", "the marker is listed among the purposes and is no extension; the compatibility policy asks for none", "55- 5-- 4--", [](C& c, Chain&) { c.extendedKeyUsage += (c.extendedKeyUsage.empty() ? "" : ",") + c.markers.at(0); c.markers.clear(); }},
        {"ForeignMarkerCritical", "the pinned marker is critical; only the pinned policy knows it", "6-- 4-- 6--", [](C& c, Chain&) { c.markers.erase(std::remove(c.markers.begin(), c.markers.end(), kPinnedServerMarker), c.markers.end()); replace(c, kPinnedServerMarker, true); }},
        // Purposes: of a server's whole chain, and no option of the ticket policy.
        {"PurposeOfAClient", "for clients alone; no option of the ticket policy", "444 555 555", [](C& c, Chain&) { c.extendedKeyUsage = "critical,clientAuth"; }},
        {"PurposeOfMail", "for mail alone; no option of the ticket policy", "444 555 555", [](C& c, Chain&) { c.extendedKeyUsage = "emailProtection"; }},
        {"AnyPurpose", "for any purpose, which is enough for an issuer; no option of the ticket policy", "444 544 544", [](C& c, Chain&) { c.extendedKeyUsage = "anyExtendedKeyUsage"; }},
        {"NoPurpose", "states no purpose, as an issuer may; no option of the ticket policy", "444 544 544", [](C& c, Chain&) { c.extendedKeyUsage.clear(); }},
        {"PurposesEmpty", "an empty list of purposes; no option of the ticket policy", "444 555 555", [](C& c, Chain&) { c.extendedKeyUsage.clear(); replace(c, kPurposes, false, bytes({0x30, 0})); }},
        {"PurposesOfClientsMailAndTheMarker", "for three purposes that are not a server's", "444 555 555", [](C& c, Chain&) { c.extendedKeyUsage = "critical,clientAuth,emailProtection,1.2.840.177245.100.6.27.2"; }},
        {"KeyUsageOfSignaturesThatLast", "the key usage is non-repudiation alone, which allows no TLS", "4-- 5-- 5--", [](C& c, Chain&) { c.keyUsage = "critical,nonRepudiation"; }},
        {"KeyUsageOfKeyAgreement", "the key usage is key agreement alone; servers sign in TLS", "4-- 5-- 5--", [](C& c, Chain&) { c.keyUsage = "critical,keyAgreement"; }},
        {"KeyUsageOfKeyEncipherment", "the key usage is key encipherment alone, and the key can only sign", "4-- 5-- 5--", [](C& c, Chain&) { c.keyUsage = "critical,keyEncipherment"; }},
        {"KeyUsageOfTheClientsPartOfAKeyAgreement", "the key usage is key agreement, for encipherment only", "4-- 5-- 5--", [](C& c, Chain&) { c.keyUsage = "critical,keyAgreement,encipherOnly"; }},
        {"KeyUsageOfAnAuthority", "a leaf's key usage is that of an authority, which allows no TLS", "4-- 5-- 5--", [](C& c, Chain&) { c.keyUsage = "critical,keyCertSign,cRLSign"; }},
        {"KeyUsageOfDataNotCritical", "a leaf's key usage is data encipherment, in an extension that is not critical", "4-- 5-- 5--", [](C& c, Chain&) { c.keyUsage = "dataEncipherment"; }},
        // Name constraints of a server's issuers, critical or not. The ticket policy does not apply them, so
        // a ticket's issuers must not have critical ones. A leaf constrains nobody.
        {"HostExcluded", "excludes the host's domain, and is not critical", "444 455 455", [](C& c, Chain&) { c.nameConstraints = "excluded;DNS:lumora.example"; }},
        {"HostExcludedCritical", "excludes the host's domain; the ticket policy does not know critical constraints", "666 455 455", [](C& c, Chain&) { c.nameConstraints = "critical,excluded;DNS:lumora.example"; }},
        {"HostItselfExcluded", "excludes the host itself", "444 455 455", [](C& c, Chain&) { c.nameConstraints = "excluded;DNS:api.lumora.example"; }},
        {"HostExcludedInCapitals", "excludes the host's domain in capitals", "444 455 455", [](C& c, Chain&) { c.nameConstraints = "excluded;DNS:LUMORA.Example"; }},
        {"HostExcludedWithADot", "excludes the names below the domain", "444 455 455", [](C& c, Chain&) { c.nameConstraints = "excluded;DNS:.lumora.example"; }},
        {"EveryNameExcluded", "excludes every DNS name", "444 455 455", [](C& c, Chain&) { c.nameConstraints.clear(); replace(c, kNameConstraints, false, bytes({0x30, 6, 0xA1, 4, 0x30, 2, 0x82, 0})); }},
        {"OtherHostsPermitted", "permits another domain alone", "444 455 455", [](C& c, Chain&) { c.nameConstraints = "permitted;DNS:other.example"; }},
        {"OtherHostsPermittedCritical", "permits another domain alone; the ticket policy does not know critical constraints", "666 455 455", [](C& c, Chain&) { c.nameConstraints = "critical,permitted;DNS:other.example"; }},
        {"SubdomainPermitted", "permits the names below the host alone", "444 455 455", [](C& c, Chain&) { c.nameConstraints = "permitted;DNS:.api.lumora.example"; }},
        {"EndOfALabelPermitted", "permits a domain that ends in the same letters", "444 455 455", [](C& c, Chain&) { c.nameConstraints = "permitted;DNS:umora.example"; }},
        {"PermittedAndExcluded", "permits the domain and excludes the host", "444 455 455", [](C& c, Chain&) { c.nameConstraints = "permitted;DNS:lumora.example,excluded;DNS:api.lumora.example"; }},
        {"MailConstrained", "constrains mail addresses, a form that is not handled", "444 455 455", [](C& c, Chain&) { c.nameConstraints = "permitted;email:lumora.example"; }},
        {"UrisConstrained", "excludes URIs, a form that is not handled", "444 455 455", [](C& c, Chain&) { c.nameConstraints = "excluded;URI:.lumora.example"; }},
        {"ConstraintsOfNothing", "name constraints that constrain nothing", "666 666 666", [](C& c, Chain&) { replace(c, kNameConstraints, false, bytes({0x30, 0})); }},
        {"ConstraintWithAMinimum", "a constraint from the first label down", "666 666 666", [](C& c, Chain&) { replace(c, kNameConstraints, false, bytes({0x30, 10, 0xA0, 8, 0x30, 6, 0x82, 1, 'a', 0x80, 1, 1})); }},
        {"ConstraintWithAHoleInItsMask", "an address range whose mask has a hole", "666 666 666", [](C& c, Chain&) { replace(c, kNameConstraints, false, bytes({0x30, 14, 0xA1, 12, 0x30, 10, 0x87, 8, 10, 0, 0, 0, 255, 0, 255, 0})); }},
        {"HostPermitted", "nothing: permits the host's domain", "444 444 444", [](C& c, Chain&) { c.nameConstraints = "permitted;DNS:other.example,permitted;DNS:Lumora.Example"; }},
        {"AddressesConstrained", "nothing: constrains addresses, and the host is a name", "444 444 444", [](C& c, Chain&) { c.nameConstraints = "permitted;IP:192.0.2.0/255.255.255.0"; }},
        // Forms of keys. A root is an anchor byte for byte, and its key is the first that verifies.
        {"KeyHybrid", "the point is in the hybrid form", "566 566 566", [](C& c, Chain&) { c.edit = [](E& e) { e.key = hybridPoint(e.key); }; }},
        {"KeyOffTheCurve", "the point is not on its curve", "566 566 566", [](C& c, Chain&) { c.edit = [](E& e) { e.key.back() ^= std::byte{1}; }; }},
        {"KeyOfNoCurve", "the key names no curve", "566 566 566", [](C& c, Chain&) { c.edit = [](E& e) { e.key = underAlgorithm(e.key, bytes({0x30, 9, 6, 7, 0x2A, 0x86, 0x48, 0xCE, 0x3D, 2, 1})); }; }},
        {"KeyForAgreementOnly", "the key is for Diffie-Hellman on its curve", "566 566 566", [](C& c, Chain&) { c.edit = [](E& e) { e.key = underAlgorithm(e.key, bytes({0x30, 17, 6, 5, 0x2B, 0x81, 4, 1, 0x0C, 6, 8, 0x2A, 0x86, 0x48, 0xCE, 0x3D, 3, 1, 7})); }; }},
        {"KeyRsaOf16384Bits", "an RSA key longer than 8192 bits", "566 566 566", [](C& c, Chain&) { c.edit = [](E& e) { e.key = rsaKey(number(2048, 0xFF), bytes({1, 0, 1})); }; }},
        {"KeyRsaOfAGiantExponent", "an RSA key whose exponent has 2040 bits", "566 566 566", [](C& c, Chain&) { c.edit = [](E& e) { e.key = rsaKey(number(256, 0xFF), number(255, 0xFF)); }; }},
        {"KeyRsaOfTheExponent1", "an RSA key whose exponent is 1: any signature would verify", "566 566 566", [](C& c, Chain&) { c.edit = [](E& e) { e.key = rsaKey(number(256, 0xFF), bytes({1})); }; }},
        {"KeyRsaOfAnEvenModulus", "an RSA key whose modulus is even", "566 566 566", [](C& c, Chain&) { c.edit = [](E& e) { e.key = rsaKey(number(256, 0xFE), bytes({1, 0, 1})); }; }},
        {"KeyDsa", "a DSA key", "566 566 566", [](C& c, Chain&) { c.edit = [](E& e) { e.key = underAlgorithm(e.key, bytes({0x30, 9, 6, 7, 0x2A, 0x86, 0x48, 0xCE, 0x38, 4, 1})); }; }},
        {"KeyCompressed", "nothing: the point is in the compressed form", "444 444 444", [](C& c, Chain&) { c.edit = [](E& e) { e.key = compressedPoint(e.key); }; }},
        // Signatures with superfluous parameters in their algorithm.
        {"EcdsaWithParameters", "ECDSA with parameters, of which it has none; a root's own signature is not looked at", "664 664 664", [](C& c, Chain&) { c.edit = [](E& e) { e.innerAlgorithm = e.outerAlgorithm = bytes({0x30, 12, 6, 8, 0x2A, 0x86, 0x48, 0xCE, 0x3D, 4, 3, 2, 5, 0}); }; }},
        {"AlgorithmUnknown", "an algorithm that nobody knows; a root's own signature is not looked at", "664 664 664", [](C& c, Chain&) { c.edit = [](E& e) { e.innerAlgorithm = e.outerAlgorithm = bytes({0x30, 4, 6, 2, 0x2A, 3}); }; }},
        {"SignatureEmpty", "a signature of no byte; a root's own signature is not looked at", "664 664 664", [](C& c, Chain&) { c.edit = [](E& e) { e.signature = bytes({3, 1, 0}); }; }},
        {"SignatureOfTwoZeros", "a signature of 0 and 0; a root's own signature is not looked at", "664 664 664", [](C& c, Chain&) { c.edit = [](E& e) { e.signature = bytes({3, 9, 0, 0x30, 6, 2, 1, 0, 2, 1, 0}); }; }},
        // Malformed certificates under a valid signature.
        {"Version1WithAUniqueIdentifier", "of version 1, and yet with a unique identifier", "xxx xxx xxx", [](C& c, Chain&) { c.version = 1; withoutExtensions(c); c.edit = [](E& e) { e.issuerUniqueIdentifier = bytes({0x81, 2, 0, 7}); }; }},
        {"Version1WithNoExtensions", "of version 1, and yet with an empty list of extensions", "xxx xxx xxx", [](C& c, Chain&) { c.version = 1; withoutExtensions(c); c.edit = [](E& e) { e.extensions = bytes({0xA3, 2, 0x30, 0}); }; }},
        {"Version1WrittenOut", "of version 1, which is written out", "xxx xxx xxx", [](C& c, Chain&) { c.version = 1; withoutExtensions(c); c.edit = [](E& e) { e.version = bytes({0xA0, 3, 2, 1, 0}); }; }},
        {"VersionOfTwoBytes", "a version with a zero in front", "xxx xxx xxx", [](C& c, Chain&) { c.edit = [](E& e) { e.version = bytes({0xA0, 4, 2, 2, 0, 2}); }; }},
        {"VersionNegative", "a version of -1", "xxx xxx xxx", [](C& c, Chain&) { c.edit = [](E& e) { e.version = bytes({0xA0, 3, 2, 1, 0xFF}); }; }},
        {"SerialWithAZeroInFront", "a serial number with a zero in front", "xxx xxx xxx", [](C& c, Chain&) { c.edit = [](E& e) { e.serialNumber = bytes({2, 2, 0, 1}); }; }},
        {"SerialOfNoByte", "a serial number of no byte", "xxx xxx xxx", [](C& c, Chain&) { c.edit = [](E& e) { e.serialNumber = bytes({2, 0}); }; }},
        {"DateWithoutSeconds", "a date without seconds", "xxx xxx xxx", [](C& c, Chain&) { c.edit = [](E& e) { e.validity = dates("2001010000Z", "491231235959Z"); }; }},
        {"DateWithAnOffset", "a date in another zone of time", "xxx xxx xxx", [](C& c, Chain&) { c.edit = [](E& e) { e.validity = dates("200101000000Z", "491231235959+0100"); }; }},
        {"DateThatThereIsNot", "the 31st of November", "xxx xxx xxx", [](C& c, Chain&) { c.edit = [](E& e) { e.validity = dates("200101000000Z", "491131235959Z"); }; }},
        {"NameNotInUtf8", "a name that is not in UTF-8", "xxx xxx xxx", [](C& c, Chain&) { c.edit = [](E& e) { e.subject = bytes({0x30, 12, 0x31, 10, 0x30, 8, 6, 3, 0x55, 4, 3, 0x0C, 1, 0xE9}); }; }},
        {"NameOfHalfACharacter", "a name of 16-bit characters and a half", "xxx xxx xxx", [](C& c, Chain&) { c.edit = [](E& e) { e.subject = bytes({0x30, 12, 0x31, 10, 0x30, 8, 6, 3, 0x55, 4, 3, 0x1E, 1, 'a'}); }; }},
        {"CriticalAsAOne", "an extension whose critical flag is 1 instead of 255", "xxx xxx xxx", [](C& c, Chain&) { c.edit = [](E& e) { e.extensions = bytes({0xA3, 13, 0x30, 11, 0x30, 9, 6, 2, 0x2A, 3, 1, 1, 1, 4, 0}); }; }},
        {"ExtensionsTwice", "two lists of extensions", "xxx xxx xxx", [](C& c, Chain&) { c.edit = [](E& e) { base::append(e.extensions, Data(e.extensions)); }; }},
        {"KeyWithUnusedBits", "a public key with unused bits", "xxx xxx xxx", [](C& c, Chain&) { c.edit = [](E& e) { e.key = bytes({0x30, 10, 0x30, 4, 6, 2, 0x2A, 3, 3, 2, 4, 0x70}); }; }},
        {"SignatureWithUnusedBits", "a signature with unused bits", "xxx xxx xxx", [](C& c, Chain&) { c.edit = [](E& e) { e.signature = bytes({3, 2, 4, 0xF0}); }; }},
        {"ElementBehindTheLast", "an element behind the extensions", "xxx xxx xxx", [](C& c, Chain&) { c.edit = [](E& e) { base::append(e.extensions, bytes({5, 0})); }; }},
        {"GiantIdentifier", "an extension whose identifier has 100,000 bytes", "xxx xxx xxx", [](C& c, Chain&) { c.edit = [](E& e) { e.extensions = derElement(0xA3, derElement(0x30, derElement(0x30, joined(derElement(6, Data(100000, std::byte{1})), bytes({4, 0}))))); }; }},
        {"TooManyExtensions", "an extension a thousand times", "xxx xxx xxx", [](C& c, Chain&) { for (int i = 0; i < 1000; ++i) replace(c, ("1.2.3." + std::to_string(i)).c_str(), false); }},
        // Versions and serial numbers.
        {"Version1", "of version 1, so without extensions", "555 555 555", [](C& c, Chain&) { c.version = 1; withoutExtensions(c); }},
        {"Version1WithExtensions", "of version 1, and yet with extensions", "xxx xxx xxx", [](C& c, Chain&) { c.version = 1; }},
        {"Version2WithExtensions", "of version 2, and yet with extensions", "xxx xxx xxx", [](C& c, Chain&) { c.version = 2; }},
        {"Version4", "of a version that there is not", "xxx xxx xxx", [](C& c, Chain&) { c.version = 4; }},
        {"SerialNegative", "a serial number of -1; no option asks for it", "444 444 444", [](C& c, Chain&) { c.serial = -1; }},
        {"SerialZero", "a serial number of 0; no option asks for it", "444 444 444", [](C& c, Chain&) { c.serial = 0; }},
        // Encodings of the certificate in the list.
        {"BytesBehindIt", "a byte behind the certificate", "xxx xxx xxx", nullptr, [](Data& der) { der.push_back(std::byte{0}); }},
        {"CutShort", "its last byte is missing", "xxx xxx xxx", nullptr, [](Data& der) { der.pop_back(); }},
        {"Empty", "no byte of it is there", "xxx xxx xxx", nullptr, [](Data& der) { der.clear(); }},
        {"ASetInsteadOfASequence", "its outer tag is that of a SET", "xxx xxx xxx", nullptr, [](Data& der) { der[0] = std::byte{0x31}; }},
        {"LengthNotMinimal", "its length is written with a zero in front", "xxx xxx xxx", nullptr, lengthenLength},
        {"LengthIndefinite", "its length is indefinite", "xxx xxx xxx", nullptr, makeIndefinite},
        {"Longer", "longer than 131072 bytes", "xxx xxx xxx", [](C& c, Chain&) { replace(c, kUnknown, false, derElementOfSize(131072)); }},
        // At the margin, and good.
        {"KeyRsa2048", "nothing: 2048 bits are enough", "444 444 444", [](C& c, Chain&) { useKey(c, KeyKind::rsa2048); }},
        {"KeyP384", "nothing: a longer curve", "444 444 444", [](C& c, Chain&) { useKey(c, KeyKind::p384); }},
        {"SubjectKeyIdentifierMissing", "nothing: linkage is compared where both sides carry one", "444 444 444", [](C& c, Chain&) { c.subjectKeyIdentifier = KeyIdentifier::omitted(); }},
        {"UnknownNotCritical", "nothing: an unknown extension that is not critical", "444 444 444", [](C& c, Chain&) { replace(c, kUnknown, false); }},
        {"PoliciesCritical", "nothing: critical certificate policies are understood", "444 444 444", [](C& c, Chain&) { replace(c, "2.5.29.32", true, bytes({0x30, 6, 0x30, 4, 6, 2, 0x2A, 3})); }},
        {"ServersAmongThePurposes", "nothing: servers are among the purposes", "444 444 444", [](C& c, Chain&) { c.extendedKeyUsage = "critical,clientAuth,serverAuth"; }},
        {"KeyUsageMissing", "nothing: a key usage that is not stated forbids nothing", "444 444 444", [](C& c, Chain&) { c.keyUsage.clear(); }},
    };
    return faults;
}
// clang-format on

}  // namespace pinwell::test
