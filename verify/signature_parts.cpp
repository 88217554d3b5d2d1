#include "verify/signature_parts.h"

#include <algorithm>
#include <utility>

#include "base/byte_io.h"
#include "base/text.h"
#include "codesign/code_error.h"
#include "codesign/static_code.h"
#include "codesign/superblob.h"
#include "values/format.h"
#include "verify/check.h"

namespace pinwell::verify {

using base::ByteReader;
using codesign::CodeDirectory;
using codesign::refuse;
using values::format;

namespace {

constexpr std::uint32_t kEndOfComponentSlots = 0x1000;

bool isDirectorySlot(std::uint32_t slot) {
    return slot == kSlotCodeDirectory || isAlternateSlot(slot);
}

// CodeDirectory::parse has checked that these fields exist and refer to bytes in the blob.
Directory withFields(std::uint32_t slot, CodeDirectory content) {
    Directory directory{.slot = slot, .content = std::move(content)};
    ByteReader reader(directory.content.bytes());
    reader.seek(16, "hash offset");
    directory.hashOffset = reader.be32("hash offset");
    reader.skip(4, "identifier offset");
    directory.specialSlots = reader.be32("special slots");
    directory.codeSlots = reader.be32("code slots");
    directory.limit = reader.be32("limit");
    reader.skip(3, "digest size and type, platform");
    directory.pageShift = reader.u8("page size");
    reader.skip(4, "spare");
    if (directory.content.version() >= codesign::kVersionWithScatter)
        directory.hasScatter = reader.be32("scatter offset") != 0;
    if (directory.content.version() >= codesign::kVersionWithLimit64) {
        reader.seek(56, "limit as 64 bits");
        if (const std::uint64_t limit = reader.be64("limit as 64 bits"); limit != 0) directory.limit = limit;
    }
    return directory;
}

}  // namespace

std::string Directory::digestName() const {
    switch (content.digestType()) {
        case DigestType::sha1:
            return "SHA-1";
        case DigestType::sha256:
            return "SHA-256";
        case DigestType::sha256Truncated:
            return "SHA-256 cut";
        case DigestType::sha384:
            break;
    }
    return "SHA-384";
}

ByteView Directory::codeDigest(std::uint32_t index) const {
    const std::size_t size = codesign::digestSize(content.digestType());
    return content.bytes().view().subspan(hashOffset + std::size_t{index} * size, size);
}

void SignatureParts::addDirectory(std::uint32_t slot, const codesign::SharedBytes& blob) {
    const bool isKnown = codesign::digestTypeNumbered(CodeDirectory::digestTypeNumberOf(blob)).has_value();
    if (slot != kSlotCodeDirectory && !isKnown) return;
    Directory directory = withFields(slot, CodeDirectory::parse(blob));
    const auto sameType = [&](const Directory& other) {
        return other.content.digestType() == directory.content.digestType();
    };
    if (std::any_of(directories_.begin(), directories_.end(), sameType))
        refuse("two code directories of one digest type");
    directories_.push_back(std::move(directory));
}

std::optional<SignatureParts> SignatureParts::fromSuperBlob(codesign::SharedBytes superblob) {
    SignatureParts parts;
    std::map<std::uint32_t, codesign::SharedBytes> directories;
    for (const codesign::Blob& blob : codesign::parseSuperBlob(superblob)) {
        if (blob.slot == kSlotCms) {
            if (blob.magic != kWrapperMagic) refuse("the CMS blob has a wrong magic");
            parts.cms_ = blob.bytes.subspan(kBlobHeaderSize);
        } else if (isDirectorySlot(blob.slot)) {
            directories.emplace(blob.slot, superblob.share(blob.bytes));
        } else if (blob.slot < kEndOfComponentSlots && blob.slot != kSlotTrailer &&
                   !parts.components_.emplace(blob.slot, blob.bytes).second) {
            refuse(format("two components in slot %u", blob.slot));
        }
    }
    if (directories.empty()) return std::nullopt;
    if (directories.begin()->first != kSlotCodeDirectory)
        refuse("alternate code directories without a primary one");
    for (const auto& [slot, blob] : directories) parts.addDirectory(slot, blob);
    parts.storage_.push_back(std::move(superblob));
    return parts;
}

std::optional<SignatureParts> SignatureParts::fromSeparateFiles(
    const codesign::SharedBytes& directory, std::optional<codesign::SharedBytes> requirements,
    codesign::SharedBytes cms) {
    SignatureParts parts;
    parts.addDirectory(kSlotCodeDirectory, directory);
    if (requirements) {
        parts.components_.emplace(kSlotRequirements, requirements->view());
        parts.storage_.push_back(*std::move(requirements));
    }
    parts.cms_ = cms.view();
    parts.storage_.push_back(std::move(cms));
    return parts;
}

const Directory& SignatureParts::chosen() const {
    return *std::max_element(directories_.begin(), directories_.end(),
                             [](const Directory& a, const Directory& b) {
                                 return codesign::digestStrength(a.content.digestType()) <
                                        codesign::digestStrength(b.content.digestType());
                             });
}

std::vector<Data> SignatureParts::codeHashes() const {
    const Directory& first = chosen();
    std::vector<Data> hashes{first.content.codeHash()};
    for (const Directory& directory : directories_)
        if (&directory != &first) hashes.push_back(directory.content.codeHash());
    return hashes;
}

std::string specialSlotName(std::uint32_t slot) {
    const char* what = "component";
    switch (slot) {
        case kSlotPropertyList:
            what = "property list";
            break;
        case kSlotRequirements:
            what = "requirements";
            break;
        case kSlotResourceSeal:
            what = "sealed resources";
            break;
        case kSlotEntitlements:
            what = "entitlements";
            break;
        case kSlotTrailer:
            what = "trailer";
            break;
        case kSlotDerEntitlements:
            what = "entitlements in DER";
            break;
        default:
            break;
    }
    return format("special slot %u (%s)", slot, what);
}

void checkSpecialSlots(const SignatureParts& parts, const OutsideComponents& outside,
                       const std::string& place, Section& section) {
    for (const Directory& directory : parts.directories()) {
        const std::string at = format("%@, %@ code directory", place, directory.digestName());
        const auto component = [&](std::uint32_t slot) -> std::optional<ByteView> {
            if (const auto own = parts.components().find(slot); own != parts.components().end())
                return own->second;
            const auto other = outside.find(slot);
            if (other == outside.end() || other->second.bytes == nullptr) return std::nullopt;
            return ByteView(*other->second.bytes);
        };
        FailureList failures(section, kSpecialSlot);
        std::size_t covered = 0;
        for (std::uint32_t slot = 1; slot <= directory.specialSlots; ++slot) {
            const std::optional<Data> stated = directory.content.specialSlotDigest(slot);
            if (!stated) continue;
            const std::optional<ByteView> bytes = component(slot);
            const std::string where = at + ", " + specialSlotName(slot);
            if (!bytes) {
                failures.add(Outcome::failed, where, base::toHex(*stated), "there is nothing there");
                continue;
            }
            const Data actual = codesign::digest(directory.content.digestType(), *bytes);
            if (actual != *stated) {
                failures.add(Outcome::failed, where, base::toHex(*stated), base::toHex(actual));
            } else {
                ++covered;
            }
        }
        const auto requireCovered = [&](std::uint32_t slot) {
            if (directory.content.specialSlotDigest(slot)) return;
            failures.add(Outcome::failed, at + ", " + specialSlotName(slot), "a digest that covers it",
                         "the code directory does not cover it");
        };
        for (const auto& [slot, bytes] : parts.components()) requireCovered(slot);
        for (const auto& [slot, other] : outside)
            if (other.bytes != nullptr && other.mustBeCovered) requireCovered(slot);
        if (failures.count() == 0)
            section.pass(kSpecialSlot, at, format("%zu components with their digests", covered));
    }
}

void noteCertificates(const SignerMessage& message, const std::string& place, Section& section) {
    if (message.certificatesWithoutIssuer == 0) return;
    section.note(kSigner, place, "certificates with their issuers",
                 format("%zu certificates whose issuer the signer's message does not have",
                        message.certificatesWithoutIssuer));
}

void checkSigner(const SignatureParts& parts, const std::string& place, Section& section) {
    constexpr const char* kWanted = "a signer's message over the code directory, or none for ad hoc";
    if (parts.cms().empty()) {
        if ((parts.chosen().content.flags() & codesign::kFlagAdHoc) != 0) {
            section.pass(kSigner, place, "no signer: ad hoc");
        } else {
            section.fail(kSigner, place, kWanted, "no signer, and not ad hoc");
        }
        return;
    }
    try {
        const SignerMessage message =
            requireSignerMessage(parts.cms(), parts.directories().front().content.bytes());
        section.pass(kSigner, place, "a signature that verifies");
        noteCertificates(message, place, section);
    } catch (const codesign::CodeError& error) {
        section.fail(kSigner, place, kWanted, error.what());
    }
}

}  // namespace pinwell::verify
