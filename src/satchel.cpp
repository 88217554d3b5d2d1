#include "src/satchel.h"

#include <algorithm>
#include <bit>
#include <limits>
#include <new>
#include <optional>
#include <utility>

#include "foundation/byte_reader.h"
#include "foundation/error.h"
#include "src/satchel_internal.h"
#include "trust/der.h"

namespace pinwell {
namespace {

namespace der = trust::der;
namespace option = trust::option;
namespace status = satchel_status;

using foundation::Array;
using foundation::asBytes;
using foundation::ByteReader;
using foundation::ByteView;
using foundation::Dictionary;
using foundation::Error;
using foundation::Value;

constexpr std::int32_t kAccepted = 0;
constexpr std::int32_t kRefused = -1;

// A caller's mistake rather than a file's fault: no buffer can lie there.
bool wrapsAddressSpace(const std::byte* start, std::uint64_t length) {
    return length > std::numeric_limits<std::uintptr_t>::max() - std::bit_cast<std::uintptr_t>(start);
}

// An object that cannot be made is a refusal like any other here.
template <class Step>
trust::Status guardMemory(Step step) {
    try {
        return step();
    } catch (const std::bad_alloc&) {
        return status::kNotAvailable;
    }
}

// The policy that the platform security library would have made, option by option.
trust::Status createLocalPolicy(trust::PolicyRef* policy) {
    Dictionary options;
    options.insert_or_assign(std::string(option::kCriticalExtensions), true);
    options.insert_or_assign(std::string(option::kIdLinkage), true);
    options.insert_or_assign(std::string(option::kBasicConstraints), true);
    options.insert_or_assign(std::string(option::kNonEmptySubject), true);
    options.insert_or_assign(std::string(option::kPlatformAnchor), Dictionary{});
    options.insert_or_assign(std::string(option::kChainLength), kTicketChainLength);

    const Dictionary keySizes{
        {std::string(trust::kKeyTypeRSA), kTicketMinimumRSABits},
        {std::string(trust::kKeyTypeEllipticCurve), kTicketMinimumEllipticCurveBits},
    };
    const std::pair<std::string_view, Value> fused[] = {
        {option::kIntermediateMarkerOid, kTicketIntermediateMarkerOid},
        {option::kLeafMarkerOid, kTicketLeafMarkerOid},
        {option::kKeySize, keySizes},
    };
    for (const auto& [key, value] : fused) {
        const trust::Status result = _satchel_fuse_option(options, key, value);
        if (result != status::kSuccess) return result;
    }

    const std::string oid(kTicketPolicyOid);
    *policy = satchel_make_policy(&oid, &oid, &options);
    return *policy != nullptr ? status::kSuccess : status::kNoPolicy;
}

trust::Status verify(const satchel_view& view, trust::TrustService& service) {
    const bool complete = view.signed_data != nullptr && view.signed_data_length != 0 &&
                          view.signature != nullptr && view.signature_length != 0 &&
                          view.certificates != nullptr && view.certificates_length != 0;
    if (!complete) return status::kNotAvailable;

    std::vector<trust::CertificateRef> certificates;
    const ByteView block(view.certificates, view.certificates_length);
    trust::Status result = _satchel_copy_certificates(block, &certificates, service);
    if (result != status::kSuccess) return result;

    trust::PolicyRef policy;
    result = _satchel_create_cert_policy(&policy, service);
    if (result != status::kSuccess) return result;

    std::shared_ptr<trust::Trust> evaluated;
    result = _satchel_create_trust(certificates, policy, &evaluated, service);
    if (result != status::kSuccess) return result;

    const trust::PublicKeyRef key = evaluated->copyPublicKey();
    if (key == nullptr) return status::kNotAvailable;

    return _satchel_validate_signature(*key, ByteView(view.signed_data, view.signed_data_length),
                                       ByteView(view.signature, view.signature_length), service);
}

}  // namespace

std::int32_t satchel_decode_header(const std::byte* container, std::uint64_t length, satchel_view* view) {
    if (view == nullptr) return kRefused;
    *view = {};
    if (container == nullptr || length < kSatchelHeaderSize || wrapsAddressSpace(container, length)) {
        return kRefused;
    }

    ByteReader reader(ByteView(container, length));
    if (!std::ranges::equal(reader.bytes(kSatchelMagic.size(), "satchel magic"), asBytes(kSatchelMagic))) {
        return kRefused;
    }
    const std::uint16_t version = reader.le16("satchel version");
    if (version != kSatchelVersion) return kRefused;
    reader.skip(2, "reserved");
    const std::uint64_t certificatesLength = reader.le32("certificate block length");
    const std::uint64_t payloadLength = reader.le32("payload length");
    if (payloadLength == 0) return kRefused;
    // Two 32-bit numbers and a small one: the sum fits 64 bits.
    const std::uint64_t signedLength = kSatchelHeaderSize + certificatesLength + payloadLength;
    if (signedLength + kSatchelSignatureSize != length) return kRefused;

    const ByteView certificates = reader.bytes(certificatesLength, "certificate block");
    const ByteView payload = reader.bytes(payloadLength, "payload");
    const ByteView signature = reader.bytes(kSatchelSignatureSize, "signature");
    *view = {.certificates = certificates.data(),
             .certificates_length = certificates.size(),
             .payload = payload.data(),
             .payload_length = payload.size(),
             .signature = signature.data(),
             .signature_length = signature.size(),
             .signed_data = container,
             .signed_data_length = signedLength,
             .version = version};
    return kAccepted;
}

std::int32_t satchel_verify_signature(const satchel_view* view, trust::TrustService& service) {
    return _satchel_verify(view, service) == status::kSuccess ? kAccepted : kRefused;
}

std::int32_t satchel_get_validated_payload(const std::byte* container, std::uint64_t length,
                                           const std::byte** payload, std::uint64_t* payload_length,
                                           trust::TrustService& service) {
    if (payload == nullptr || payload_length == nullptr) return kRefused;
    *payload = nullptr;
    *payload_length = 0;

    satchel_view view;
    if (satchel_decode_header(container, length, &view) != kAccepted) return kRefused;
    if (satchel_verify_signature(&view, service) != kAccepted) return kRefused;
    *payload = view.payload;
    *payload_length = view.payload_length;
    return kAccepted;
}

trust::Status _satchel_verify(const satchel_view* view, trust::TrustService& service) {
    if (view == nullptr) return status::kBadParameter;
    return guardMemory([&] { return verify(*view, service); });
}

trust::Status _satchel_copy_certificates(ByteView block, std::vector<trust::CertificateRef>* certificates,
                                         trust::TrustService& service) {
    if (certificates == nullptr) return status::kBadParameter;
    certificates->clear();

    const std::optional<der::Element> sequence = der::readElement(block);
    if (!sequence) return status::kNotAvailable;
    if (sequence->tag != der::kConstructedSequence || sequence->whole.size() != block.size()) {
        return status::kBadParameter;
    }

    std::vector<trust::CertificateRef> found;
    found.reserve(kSatchelMaximumCertificates);
    ByteView rest = sequence->contents;
    while (!rest.empty() && found.size() < kSatchelMaximumCertificates) {
        const std::optional<der::Element> element = der::readElement(rest);
        if (!element) return status::kNotAvailable;
        if (element->whole.size() > kSatchelMaximumCertificateSize) return status::kBadCertificates;
        trust::CertificateRef certificate = service.createCertificate(element->whole);
        if (certificate == nullptr) return status::kBadCertificates;
        found.push_back(std::move(certificate));
        rest = rest.subspan(element->whole.size());
    }
    if (!rest.empty() || found.empty()) return status::kBadCertificates;

    *certificates = std::move(found);
    return status::kSuccess;
}

trust::Status _satchel_create_cert_policy(trust::PolicyRef* policy, trust::TrustService& service) {
    if (policy == nullptr) return status::kBadParameter;
    policy->reset();
    switch (service.createNamedPolicy(kTicketPolicyConstructor, *policy)) {
        case trust::NamedPolicyOutcome::created:
            return *policy != nullptr ? status::kSuccess : status::kNoPolicy;
        case trust::NamedPolicyOutcome::refused:
            // The platform has an opinion, and it is no: nothing of ours takes its place.
            policy->reset();
            return status::kNoPolicy;
        case trust::NamedPolicyOutcome::unavailable:
            break;
    }
    return guardMemory([&] { return createLocalPolicy(policy); });
}

trust::Status _satchel_fuse_option(Dictionary& options, std::string_view key, Value value) {
    return guardMemory([&] {
        const auto present = options.find(key);
        if (present == options.end()) {
            options.emplace(key, std::move(value));
            return status::kSuccess;
        }
        Array fused;
        if (const Array* list = present->second.array(); list != nullptr) {
            fused.reserve(list->size() + 1);
            fused = *list;
        } else {
            fused.reserve(2);
            fused.push_back(present->second);
        }
        fused.push_back(std::move(value));
        present->second = Value(std::move(fused));
        return status::kSuccess;
    });
}

trust::Status _satchel_create_trust(const std::vector<trust::CertificateRef>& certificates,
                                    const trust::PolicyRef& policy, std::shared_ptr<trust::Trust>* evaluated,
                                    trust::TrustService& service) {
    if (evaluated == nullptr) return status::kBadParameter;
    evaluated->reset();

    std::shared_ptr<trust::Trust> object;
    trust::Status result = service.createTrust(certificates, policy, object);
    if (result != trust::kSuccess) return result;
    if (object == nullptr) return status::kNotAvailable;

    trust::Verdict verdict = trust::Verdict::invalid;
    result = object->evaluate(verdict);
    if (result != trust::kSuccess) return result;
    if (verdict != trust::Verdict::unspecified) return status::kNotTrusted;

    *evaluated = std::move(object);
    return status::kSuccess;
}

trust::Status _satchel_validate_signature(const trust::PublicKey& key, ByteView signed_data,
                                          ByteView signature, trust::TrustService& service) {
    const std::optional<Error> error = service.verifySignature(key, signed_data, signature);
    if (!error) return status::kSuccess;
    // A code of another domain is no status; one that does not fit a status could be cut down to success.
    const bool isStatus = error->domain() == foundation::kOSStatusErrorDomain && error->code() != 0 &&
                          std::in_range<trust::Status>(error->code());
    return isStatus ? static_cast<trust::Status>(error->code()) : status::kBadSignature;
}

trust::PolicyRef satchel_make_policy(const std::string* oid, const std::string* name,
                                     const Dictionary* options) {
    if (oid == nullptr || options == nullptr) return nullptr;
    auto policy = std::make_shared<trust::Policy>();
    policy->oid = *oid;
    if (name != nullptr) policy->name = *name;
    policy->options = *options;
    return policy;
}

}  // namespace pinwell
