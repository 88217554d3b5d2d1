#include "render_json.h"

#include <nlohmann/json.hpp>
#include <utility>

#include "base/bytes.h"
#include "base/text.h"
#include "formats/superblob.h"

namespace pinwell::inspect {
namespace {

using Json = nlohmann::ordered_json;
using base::toHex;

template <class T, class Convert>
Json orNull(const std::optional<T>& value, Convert convert) {
    return value ? Json(convert(*value)) : Json(nullptr);
}
template <class T>
Json orNull(const std::optional<T>& value) {
    return value ? Json(*value) : Json(nullptr);
}

/// A text; null if it is empty.
Json orNull(const std::string& text) {
    return text.empty() ? Json(nullptr) : Json(text);
}

template <class List, class Convert>
Json listOf(const List& list, Convert convert) {
    Json array = Json::array();
    for (const auto& one : list) array.push_back(convert(one));
    return array;
}

Json rangeJson(const Range& range) {
    return {{"offset", range.offset}, {"length", range.length}};
}
Json rangeJson(const codesign::FileRange& range) {
    return rangeJson(Range{range.offset, range.length});
}

Json faultJson(const std::optional<Fault>& fault) {
    if (!fault) return nullptr;
    return {
        {"rule", fault->rule}, {"offset", orNull(fault->offset)}, {"fileOffset", orNull(fault->fileOffset)}};
}

Json hashJson(const Hash& hash) {
    return {{"algorithm", hash.algorithm},
            {"algorithmName", algorithmName(hash.algorithm)},
            {"hash", toHex(hash.bytes)}};
}

Json blobJson(const codesign::BlobDescription& blob) {
    return {
        {"slot", blob.slot},           {"slotName", slotName(blob.slot)}, {"offset", blob.offset},
        {"magic", orNull(blob.magic)}, {"length", orNull(blob.length)},   {"problem", orNull(blob.problem)}};
}

Json directoryJson(const codesign::CodeDirectoryDescription& directory) {
    Json json{{"slot", directory.slot}, {"chosen", directory.chosen}, {"problem", orNull(directory.problem)}};
    const bool read = directory.problem.empty();
    const Hash hash{static_cast<std::uint32_t>(directory.digestType), directory.codeHash};
    json["version"] = read ? Json(directory.version) : Json(nullptr);
    json["flags"] = read ? Json(directory.flags) : Json(nullptr);
    json["identifier"] = read ? Json(directory.identifier) : Json(nullptr);
    json["team"] = orNull(directory.teamIdentifier);
    json["codeHash"] = read ? hashJson(hash) : Json(nullptr);
    return json;
}

std::string_view validityName(codesign::Status status) {
    switch (status) {
        case codesign::kSuccess:
            return "valid";
        case codesign::kUnsigned:
            return "unsigned";
        default:
            return "invalid";
    }
}

Json signatureJson(const codesign::SignatureDescription& signature) {
    return {{"validity", validityName(signature.validity)},
            {"problem", orNull(signature.problem)},
            {"place", orNull(signature.place, [](const auto& place) { return rangeJson(place); })},
            {"codeDirectories", listOf(signature.directories, directoryJson)},
            {"signerMessageLength", signature.cmsLength},
            {"secureTimestamp", orNull(signature.secureTimestamp, [](auto date) { return date.seconds; })},
            {"blobCount", signature.blobCount},
            {"blobs", listOf(signature.blobs, blobJson)}};
}

std::string_view codeKindName(codesign::CodeKind kind) {
    switch (kind) {
        case codesign::CodeKind::executableImage:
            return "executableImage";
        case codesign::CodeKind::diskImage:
            return "diskImage";
        case codesign::CodeKind::separatelySigned:
            return "separatelySigned";
        case codesign::CodeKind::opaqueFile:
            break;
    }
    return "opaqueFile";
}

Json sliceJson(const codesign::SliceDescription& slice) {
    return {{"cpuType", orNull(slice.cpuType)}, {"cpuTypeName", orNull(slice.cpuType, cpuTypeName)},
            {"range", rangeJson(slice.range)},  {"preferred", slice.preferred},
            {"problem", orNull(slice.problem)}, {"signature", orNull(slice.signature, signatureJson)}};
}

Json codeJson(const codesign::CodeDescription& code) {
    return {{"kind", codeKindName(code.kind)},
            {"file", orNull(code.file)},
            {"problem", orNull(code.problem)},
            {"slices", listOf(code.slices, sliceJson)}};
}

Json trailerJson(const Trailer& trailer) {
    return {{"recordOffset", trailer.recordOffset},
            {"version", trailer.version},
            {"type", trailer.type},
            {"typeName", trailerTypeName(trailer.type)},
            {"data", rangeJson(trailer.data)},
            {"problem", orNull(trailer.problem)}};
}

Json placeJson(const Place& place) {
    if (const auto* const file = std::get_if<FilePlace>(&place))
        return {{"form", "file"}, {"path", file->path}, {"fault", faultJson(file->fault)}};
    if (const auto* const superblob = std::get_if<SuperblobPlace>(&place)) {
        return {
            {"form", "superblob"},
            {"trailerOffset", superblob->trailerOffset},
            {"superblob", orNull(superblob->superblob, [](const Range& range) { return rangeJson(range); })},
            {"blobCount", superblob->blobCount},
            {"blobs", listOf(superblob->blobs, blobJson)},
            {"fault", faultJson(superblob->fault)}};
    }
    if (const auto* const trailers = std::get_if<TrailerPlace>(&place)) {
        return {{"form", "trailers"},
                {"trailerCount", trailers->trailerCount},
                {"trailers", listOf(trailers->trailers, trailerJson)},
                {"hasTerminator", trailers->hasTerminator},
                {"fault", faultJson(trailers->fault)}};
    }
    return nullptr;
}

Json certificateJson(const Certificate& certificate) {
    const trust::CertificateDescription& one = certificate.description;
    const auto extension = [](const trust::CertificateDescription::Extension& item) -> Json {
        return {{"oid", item.oid}, {"critical", item.critical}, {"malformed", item.malformed}};
    };
    const auto hex = [](const Data& bytes) { return toHex(bytes); };
    return {{"range", rangeJson(certificate.range)},
            {"subject", one.subject},
            {"issuer", one.issuer},
            {"serialNumber", one.serialNumber},
            {"notBefore", one.notBefore.seconds},
            {"notAfter", one.notAfter.seconds},
            {"keyType", orNull(one.keyType)},
            {"keyBits", one.keyBits},
            {"curve", orNull(one.curve)},
            {"signatureAlgorithm", one.signatureAlgorithm},
            {"selfIssued", one.isSelfIssued},
            {"certificateAuthority", one.isCertificateAuthority},
            {"extensions", listOf(one.extensions, extension)},
            {"sha1", toHex(one.sha1Fingerprint)},
            {"sha256", toHex(one.sha256Fingerprint)},
            {"subjectKeyIdentifier", orNull(one.subjectKeyIdentifier, hex)},
            {"authorityKeyIdentifier", orNull(one.authorityKeyIdentifier, hex)}};
}

Json chainJson(const Chain& chain) {
    const auto link = [](const Link& one) -> Json {
        return {{"title", one.title}, {"error", orNull(one.error)}};
    };
    return {
        {"trusted", chain.trusted}, {"reason", orNull(chain.reason)}, {"links", listOf(chain.links, link)}};
}

Json entryJson(const Entry& entry) {
    return {{"index", entry.index},
            {"matches", entry.matches},
            {"codeHash", entry.isUsable ? hashJson(entry.hash) : Json(nullptr)}};
}

Json payloadJson(const Payload& payload) {
    const auto field = [&](auto value) { return payload.hasHeader ? Json(value) : Json(nullptr); };
    return {{"range", rangeJson(payload.range)},
            {"version", field(payload.version)},
            {"hashLength", field(payload.hashLength)},
            {"statedCount", field(payload.statedCount)},
            {"flags", field(payload.flags)},
            {"revoked", field(payload.isRevoked)},
            {"signatureTime", field(payload.signatureTime)},
            {"entryCount", payload.entryCount},
            {"entries", listOf(payload.entries, entryJson)},
            {"matchingEntry", orNull(payload.matchingEntry, entryJson)},
            {"fault", faultJson(payload.fault)}};
}

std::string_view signatureName(Signature signature) {
    switch (signature) {
        case Signature::verifies:
            return "verifies";
        case Signature::fails:
            return "fails";
        case Signature::unchecked:
            break;
    }
    return "unchecked";
}

Json ticketJson(const Ticket& ticket) {
    const auto range = [](const Range& one) { return rangeJson(one); };
    return {{"size", ticket.size},
            {"fileOffset", orNull(ticket.fileOffset)},
            {"version", orNull(ticket.version)},
            {"statedCertificatesLength", ticket.statedCertificatesLength},
            {"statedPayloadLength", ticket.statedPayloadLength},
            {"certificateBlock", orNull(ticket.certificateBlock, range)},
            {"signatureField", orNull(ticket.signatureField, range)},
            {"frameFault", faultJson(ticket.frameFault)},
            {"certificates", listOf(ticket.certificates, certificateJson)},
            {"unreadable", listOf(ticket.unreadable, range)},
            {"certificateFault", faultJson(ticket.certificateFault)},
            {"chain", chainJson(ticket.chain)},
            {"signature", signatureName(ticket.signature)},
            {"payload", orNull(ticket.payload, payloadJson)}};
}

std::string_view outcomeName(Outcome outcome) {
    switch (outcome) {
        case Outcome::good:
            return "good";
        case Outcome::noTicket:
            return "noTicket";
        case Outcome::refused:
            return "refused";
        case Outcome::revoked:
            return "revoked";
        case Outcome::unreadable:
            break;
    }
    return "unreadable";
}

std::string_view kindKey(Kind kind) {
    switch (kind) {
        case Kind::bundle:
            return "bundle";
        case Kind::executable:
            return "executable";
        case Kind::diskImage:
            return "diskImage";
        case Kind::package:
            return "package";
        case Kind::ticket:
            return "ticket";
        case Kind::other:
            break;
    }
    return "other";
}

}  // namespace

std::string renderJson(const Report& report) {
    Json json{{"format", "pinwell-inspect"},
              {"version", kJsonVersion},
              {"path", report.path},
              {"outcome", outcomeName(report.outcome)},
              {"exitStatus", exitStatusOf(report.outcome)},
              {"conclusion", report.conclusion},
              {"fault", faultJson(report.fault)},
              {"kind", kindKey(report.kind)}};
    json["type"] = orNull(report.item, [](const Item& item) -> Json {
        return {{"identifier", item.typeIdentifier}, {"description", item.typeDescription}};
    });
    json["size"] = report.item ? orNull(report.item->size) : Json(nullptr);
    json["code"] = orNull(report.code, codeJson);
    json["codeHash"] = orNull(report.codeHash, hashJson);
    json["codeHashIsMadeUp"] = report.isMadeUpHash;
    json["recordName"] = orNull(report.recordName);
    json["place"] = placeJson(report.place);
    json["ticket"] = orNull(report.ticket, ticketJson);
    json["platformDirectory"] = report.platformDirectory;
    return json.dump(-1, ' ', false, Json::error_handler_t::replace) + "\n";
}

}  // namespace pinwell::inspect
