#include "codesign/code_description.h"

#include <algorithm>
#include <limits>
#include <map>

#include "base/byte_io.h"
#include "codesign/cms_signature.h"
#include "codesign/code_error.h"
#include "codesign/superblob.h"

namespace pinwell::codesign {
namespace {

bool isCodeDirectorySlot(std::uint32_t slot) {
    return slot == kSlotCodeDirectory || (slot >= kSlotFirstAlternate && slot <= kSlotLastAlternate);
}

/// Runs `body`; passes the status and the reason of an exception to `failed`.
template <class Body, class Failed>
void guarded(Body body, Failed failed) {
    try {
        body();
    } catch (const std::runtime_error& failure) {
        const CodeError error = asCodeError(failure);
        failed(error.status(), error.what());
    }
}

CodeDirectoryDescription describeDirectory(std::uint32_t slot, const SharedBytes& blob) {
    CodeDirectoryDescription description;
    description.slot = slot;
    guarded(
        [&] {
            const CodeDirectory directory = CodeDirectory::parse(blob);
            description.version = directory.version();
            description.flags = directory.flags();
            description.digestType = directory.digestType();
            description.identifier = directory.identifier();
            description.teamIdentifier = directory.teamIdentifier();
            description.codeHash = directory.codeHash();
        },
        [&](Status, const char* reason) { description.problem = reason; });
    return description;
}

/// Directories, message, validity; `parsed` returns the components and may throw.
template <class Parsed>
void describeComponents(const std::map<std::uint32_t, SharedBytes>& directories, ByteView cms, Parsed parsed,
                        SignatureDescription& into) {
    for (const auto& [slot, blob] : directories) into.directories.push_back(describeDirectory(slot, blob));
    into.cmsLength = cms.size();
    into.secureTimestamp = cms.empty() ? std::nullopt : secureTimestamp(cms);
    guarded(
        [&] {
            const std::optional<CodeSignature> signature = CodeSignature::parse(parsed());
            if (!signature) throw CodeError(kUnsigned, "there is no code directory");
            const Data chosen = *signature->information(0).unique;
            for (CodeDirectoryDescription& directory : into.directories)
                directory.chosen = directory.problem.empty() && directory.codeHash == chosen;
            signature->requireValid();
        },
        [&](Status status, const char* reason) {
            into.validity = status;
            into.problem = reason;
        });
}

template <class Completion>
SignatureDescription describeSuperBlob(const SharedBytes& area, Completion completed) {
    SignatureDescription description;
    std::uint32_t count = 0;
    std::map<std::uint32_t, SharedBytes> directories;
    ByteView cms;
    for (const SurveyedBlob& blob : surveySuperBlob(area, kMaximumBlobsDescribed, count)) {
        BlobDescription& shown = description.blobs.emplace_back();
        shown.slot = blob.slot;
        shown.offset = blob.offset;
        shown.magic = blob.magic;
        shown.length = blob.length;
        if (!blob.length) {
            shown.problem = "points outside the superblob";
        } else if (*blob.length < kBlobHeaderSize) {
            shown.problem = "is shorter than its header";
        } else if (*blob.length > blob.bytes.size()) {
            shown.problem = "reaches past the superblob";
        }
        if (isCodeDirectorySlot(blob.slot)) directories.emplace(blob.slot, area.share(blob.bytes));
        if (blob.slot == kSlotCms && blob.bytes.size() > kBlobHeaderSize && blob.magic == kWrapperMagic)
            cms = blob.bytes.subspan(kBlobHeaderSize);
    }
    description.blobCount = count;
    describeComponents(
        directories, cms, [&] { return completed(componentsOfSuperBlob(area)); }, description);
    return description;
}

/// The superblob without its padding; the whole area if the header is wrong.
SharedBytes readArea(const ByteSource& source, const FileRange& place) {
    SharedBytes area;
    guarded([&] { area = readSuperBlob(source, place.offset, place.length); }, [](Status, const char*) {});
    if (!area.empty()) return area;
    // An offset in an index has 32 bits, so it cannot lead further.
    return source.readShared(
        place.offset, std::min<std::uint64_t>(place.length, std::numeric_limits<std::uint32_t>::max()));
}

SignatureDescription describeSeparateFiles(const SignatureComponents& components) {
    SignatureDescription description;
    std::map<std::uint32_t, SharedBytes> directories;
    for (const auto& [slot, blob] : components.blobs)
        if (isCodeDirectorySlot(slot)) directories.emplace(slot, blob);
    describeComponents(
        directories, components.cms, [&] { return components; }, description);
    return description;
}

void describeSlice(const FileCode& code, std::optional<FileRange> place, SliceDescription& into) {
    if (!place) return;
    const SharedBytes area = readArea(code.source(), *place);
    into.signature = describeSuperBlob(
        area, [&](SignatureComponents components) { return code.completed(std::move(components)); });
    into.signature->place = place;
}

void describeImage(const FileCode& code, CodeDescription& into) {
    const std::vector<ImageSlice> slices = readSlices(code.source());
    const ImageSlice& preferred = preferredSlice(slices);
    for (const ImageSlice& slice : slices) {
        SliceDescription& shown = into.slices.emplace_back();
        shown.cpuType = slice.cpuType;
        shown.range = slice.range;
        shown.preferred = &slice == &preferred;
        guarded([&] { describeSlice(code, findImageSignature(code.source(), slice), shown); },
                [&](Status, const char* reason) { shown.problem = reason; });
    }
}

void describeWhole(const FileCode& code, CodeDescription& into) {
    SliceDescription& shown = into.slices.emplace_back();
    shown.range = {0, code.source().size()};
    shown.preferred = true;
    guarded(
        [&] {
            if (code.kind() == CodeKind::diskImage) describeSlice(code, code.diskImageSignature(), shown);
            if (code.kind() != CodeKind::separatelySigned) return;
            if (const auto components = code.separateComponents())
                shown.signature = describeSeparateFiles(*components);
        },
        [&](Status, const char* reason) { shown.problem = reason; });
}

}  // namespace

const SliceDescription* CodeDescription::preferredSlice() const {
    const auto found =
        std::find_if(slices.begin(), slices.end(), [](const auto& one) { return one.preferred; });
    return found == slices.end() ? nullptr : &*found;
}

SignatureDescription describeSignature(const base::SharedBytes& area) {
    return describeSuperBlob(area, [](SignatureComponents components) { return components; });
}

CodeDescription describeCode(const std::string& path, const CodeAccess& access) {
    CodeDescription description;
    guarded(
        [&] {
            const std::shared_ptr<FileCode> code = FileCode::atPath(path, access);
            description.kind = code->kind();
            description.inBundle = code->inBundle();
            description.file = code->file();
            if (code->kind() == CodeKind::executableImage) {
                describeImage(*code, description);
            } else {
                describeWhole(*code, description);
            }
        },
        [&](Status status, const char* reason) {
            description.status = status;
            description.problem = reason;
        });
    return description;
}

}  // namespace pinwell::codesign
