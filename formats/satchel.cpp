#include "formats/satchel.h"

#include <algorithm>
#include <bit>
#include <limits>
#include <new>
#include <optional>
#include <span>
#include <utility>

#include "base/byte_io.h"
#include "base/error.h"
#include "trust/der.h"
#include "values/value.h"

namespace pinwell {
namespace {

namespace der = trust::der;
namespace option = trust::option;
namespace status = satchel_status;

using base::asBytes;
using base::ByteReader;
using base::ByteView;
using values::Array;
using values::Dictionary;
using values::Value;

// A caller's mistake, not a file's fault: no buffer can be there.
bool wrapsAddressSpace(const std::byte* start, std::uint64_t length) {
    return length > std::numeric_limits<std::uintptr_t>::max() - std::bit_cast<std::uintptr_t>(start);
}

std::optional<TicketFault> findFault(ByteView container, const SatchelFields& header, bool magic) {
    if (!magic) return TicketFault{0, "the container does not begin with its magic, \"s8ch\""};
    if (header.version != kSatchelVersion) return TicketFault{4, "the container's version is not 1"};
    if (header.payloadLength == 0) return TicketFault{12, "the payload's length is 0"};
    // Two 32-bit numbers and a small one: the sum fits 64 bits.
    const std::uint64_t stated = kSatchelHeaderSize + std::uint64_t{header.certificatesLength} +
                                 header.payloadLength + kSatchelSignatureSize;
    if (stated != container.size())
        return TicketFault{8, "the lengths of the parts do not add up to the container's"};
    return std::nullopt;
}

// The end of the certificate block if the lengths do not add up. The two lengths give two results, and the
// block itself a third.
std::uint64_t certificatesLengthIn(ByteView parts, const SatchelFields& header) {
    const std::optional<der::Element> block = der::readElement(parts);
    const std::uint64_t stated = header.certificatesLength;
    const std::uint64_t own = block ? block->whole.size() : stated;
    const bool payloadFits = header.payloadLength <= parts.size();
    const std::uint64_t fromPayload = payloadFits ? parts.size() - header.payloadLength : stated;
    const std::uint64_t chosen = own == fromPayload ? fromPayload : (own == stated || !block ? stated : own);
    return std::min<std::uint64_t>(chosen, parts.size());
}

void locateParts(ByteView container, SatchelSurvey& survey) {
    if (container.size() < kSatchelHeaderSize + kSatchelSignatureSize) return;
    const ByteView signedData = container.first(container.size() - kSatchelSignatureSize);
    const ByteView parts = signedData.subspan(kSatchelHeaderSize);
    const bool addsUp =
        survey.header->certificatesLength + std::uint64_t{survey.header->payloadLength} == parts.size();
    const std::uint64_t certificatesLength =
        addsUp ? survey.header->certificatesLength : certificatesLengthIn(parts, *survey.header);

    const ByteView certificates = parts.first(certificatesLength);
    const ByteView payload = parts.subspan(certificatesLength);
    survey.view = {.certificates = certificates.data(),
                   .certificatesLength = certificates.size(),
                   .payload = payload.data(),
                   .payloadLength = payload.size(),
                   .signature = signedData.data() + signedData.size(),
                   .signatureLength = kSatchelSignatureSize,
                   .signedData = signedData.data(),
                   .signedDataLength = signedData.size(),
                   .version = survey.header->version};
}

// A failure to make an object is a refusal like any other here.
template <class Step>
trust::Status guardMemory(Step step) {
    try {
        return step();
    } catch (const std::bad_alloc&) {
        return status::kNotAvailable;
    }
}

// The policy that the platform security library would make, option by option.
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
    const bool complete = view.signedData != nullptr && view.signedDataLength != 0 &&
                          view.signature != nullptr && view.signatureLength != 0 &&
                          view.certificates != nullptr && view.certificatesLength != 0;
    if (!complete) return status::kNotAvailable;

    std::vector<trust::CertificateRef> certificates;
    const ByteView block(view.certificates, view.certificatesLength);
    trust::Status result = readSatchelCertificates(block, &certificates, service);
    if (result != status::kSuccess) return result;

    trust::PolicyRef policy;
    result = _satchel_create_cert_policy(&policy, service);
    if (result != status::kSuccess) return result;

    std::shared_ptr<trust::Trust> evaluated;
    result = _satchel_create_trust(certificates, policy, &evaluated, service);
    if (result != status::kSuccess) return result;

    const trust::PublicKeyRef key = evaluated->publicKey();
    if (key == nullptr) return status::kNotAvailable;

    return _satchel_validate_signature(*key, ByteView(view.signedData, view.signedDataLength),
                                       ByteView(view.signature, view.signatureLength), service);
}

}  // namespace

SatchelSurvey surveySatchelContainer(ByteView container) {
    SatchelSurvey survey;
    if (container.size() < kSatchelHeaderSize) {
        survey.fault = {container.size(), "the container ends inside its header"};
        return survey;
    }
    ByteReader reader(container);
    const bool known =
        std::ranges::equal(reader.bytes(kSatchelMagic.size(), "satchel magic"), asBytes(kSatchelMagic));
    survey.header.emplace();
    survey.header->version = reader.le16("satchel version");
    survey.header->reserved = reader.le16("reserved");
    survey.header->certificatesLength = reader.le32("certificate block length");
    survey.header->payloadLength = reader.le32("payload length");

    survey.fault = findFault(container, *survey.header, known);
    locateParts(container, survey);
    return survey;
}

std::int32_t satchel_decode_header(const std::byte* container, std::uint64_t length, satchel_view* view) {
    if (view == nullptr) return kRefused;
    *view = {};
    if (container == nullptr || wrapsAddressSpace(container, length)) return kRefused;
    const SatchelSurvey survey = surveySatchelContainer(ByteView(container, length));
    if (survey.fault) return kRefused;
    *view = survey.view;
    return kAccepted;
}

std::int32_t satchel_verify_signature(const satchel_view* view, trust::TrustService& service) {
    return verifySatchel(view, service) == status::kSuccess ? kAccepted : kRefused;
}

std::int32_t satchel_get_validated_payload(const std::byte* container, std::uint64_t length,
                                           const std::byte** payload, std::uint64_t* payloadLength,
                                           trust::TrustService& service) {
    if (payload == nullptr || payloadLength == nullptr) return kRefused;
    *payload = nullptr;
    *payloadLength = 0;

    satchel_view view;
    if (satchel_decode_header(container, length, &view) != kAccepted) return kRefused;
    if (satchel_verify_signature(&view, service) != kAccepted) return kRefused;
    *payload = view.payload;
    *payloadLength = view.payloadLength;
    return kAccepted;
}

trust::Status verifySatchel(const satchel_view* view, trust::TrustService& service) {
    if (view == nullptr) return status::kBadParameter;
    return guardMemory([&] { return verify(*view, service); });
}

SatchelCertificateBlock surveySatchelCertificates(ByteView block) {
    SatchelCertificateBlock survey;
    const std::optional<der::Element> sequence = der::readElement(block);
    if (!sequence) {
        survey.refuse(status::kNotAvailable, 0, "the certificate block is no DER element");
        return survey;
    }
    if (sequence->tag != der::kConstructedSequence || sequence->whole.size() != block.size()) {
        survey.refuse(status::kBadParameter, 0, "the certificate block is not one SEQUENCE that fills it");
        return survey;
    }

    ByteView rest = sequence->contents;
    const auto position = [&] { return block.size() - rest.size(); };
    while (!rest.empty() && survey.count < kSatchelMaximumCertificates) {
        const std::optional<der::Element> element = der::readElement(rest);
        if (!element) {
            survey.refuse(status::kNotAvailable, position(), "a certificate is no DER element");
            return survey;
        }
        if (element->whole.size() > kSatchelMaximumCertificateSize) {
            survey.refuse(status::kBadCertificates, position(), "a certificate is too long");
            return survey;
        }
        survey.elements[survey.count++] = element->whole;
        rest = rest.subspan(element->whole.size());
    }
    if (!rest.empty()) {
        survey.refuse(status::kBadCertificates, position(), "there are more than three certificates");
    } else if (survey.count == 0) {
        survey.refuse(status::kBadCertificates, position(), "there is no certificate");
    }
    return survey;
}

trust::Status readSatchelCertificates(ByteView block, std::vector<trust::CertificateRef>* certificates,
                                      trust::TrustService& service) {
    if (certificates == nullptr) return status::kBadParameter;
    certificates->clear();

    const SatchelCertificateBlock survey = surveySatchelCertificates(block);
    std::vector<trust::CertificateRef> found;
    found.reserve(kSatchelMaximumCertificates);
    for (const ByteView element : std::span(survey.elements).first(survey.count)) {
        trust::CertificateRef certificate = service.parseCertificate(element);
        if (certificate == nullptr) return status::kBadCertificates;
        found.push_back(std::move(certificate));
    }
    if (survey.status != status::kSuccess) return survey.status;

    *certificates = std::move(found);
    return status::kSuccess;
}

trust::Status _satchel_create_cert_policy(trust::PolicyRef* policy, trust::TrustService& service) {
    if (policy == nullptr) return status::kBadParameter;
    policy->reset();
    if (std::optional<trust::PolicyRef> named = service.namedPolicy(kTicketPolicyConstructor)) {
        // Without a policy the platform refused: our own policy must not replace its decision.
        *policy = std::move(*named);
        return *policy != nullptr ? status::kSuccess : status::kNoPolicy;
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

    const auto object = service.makeTrust(certificates, policy);
    if (!object) return object.error().statusOr(status::kNotAvailable);
    if (*object == nullptr) return status::kNotAvailable;

    const auto verdict = (*object)->evaluate();
    if (!verdict) return verdict.error().statusOr(status::kNotAvailable);
    if (*verdict != trust::Verdict::unspecified) return status::kNotTrusted;

    *evaluated = *object;
    return status::kSuccess;
}

trust::Status _satchel_validate_signature(const trust::PublicKey& key, ByteView signedData,
                                          ByteView signature, trust::TrustService& service) {
    const auto verified = service.verifySignature(key, signedData, signature);
    return verified ? status::kSuccess : verified.error().statusOr(status::kBadSignature);
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
