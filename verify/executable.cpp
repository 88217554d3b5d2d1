#include "verify/code.h"

#include <algorithm>
#include <utility>

#include "base/bytes.h"
#include "codesign/cms_signature.h"
#include "codesign/code_error.h"
#include "codesign/executable_image.h"
#include "codesign/superblob.h"
#include "image_layout.h"
#include "page_hashes.h"
#include "values/format.h"
#include "verify/check.h"
#include "verify/page_digest.h"

namespace pinwell::verify {

using base::ByteSource;
using codesign::FileRange;
using codesign::ImageSlice;
using values::format;

namespace {

/// An embedded property list is read whole.
constexpr std::uint64_t kMaximumEmbeddedList = std::uint64_t{16} * 1024 * 1024;

std::optional<Data> embeddedPropertyList(const ByteSource& source, const ImageSlice& slice,
                                         const ImageLayout& layout) {
    if (!layout.propertyList) return std::nullopt;
    const FileRange& range = *layout.propertyList;
    if (range.offset > slice.range.length || range.length > slice.range.length - range.offset ||
        range.length > kMaximumEmbeddedList)
        codesign::refuse("the embedded property list lies outside its place");
    return source.read(slice.range.offset + range.offset, static_cast<std::size_t>(range.length));
}

class ImageCheck {
  public:
    ImageCheck(const ByteSource& source, const OutsideComponents& outside, std::string place,
               Workers& workers, Section& section)
        : source_(source),
          outside_(outside),
          place_(std::move(place)),
          workers_(workers),
          section_(section) {}

    VerifiedCode run() && {
        const std::vector<ImageSlice> slices = codesign::readSlices(source_);
        checkUniversalHeader(source_, slices, place_, section_);
        const ImageSlice* const preferred = &codesign::preferredSlice(slices);
        std::vector<std::string> unsignedSlices;
        for (const ImageSlice& slice : slices) {
            const std::string at = slices.size() == 1 ? place_ : place_ + ", " + sliceName(slice.cpuType);
            CheckedSlice checked = checkSlice(slice, at);
            if (!checked.isSigned) unsignedSlices.push_back(at);
            if (!checked.identity) continue;
            const auto where = &slice == preferred ? code_.identities.begin() : code_.identities.end();
            code_.identities.insert(where, *std::move(checked.identity));
        }
        code_.isSigned = unsignedSlices.size() < slices.size();
        for (const std::string& at : unsignedSlices) section_.fail(kSignature, at, "a signature", "none");
        return std::move(code_);
    }

  private:
    struct CheckedSlice {
        bool isSigned = false;
        std::optional<CodeIdentity> identity;  // `nullopt` for a damaged signature
    };

    CheckedSlice checkSlice(const ImageSlice& slice, const std::string& at) {
        const std::optional<FileRange> area = codesign::findImageSignature(source_, slice);
        if (!area) return {};
        try {
            const codesign::SharedBytes superblob =
                codesign::readSuperBlob(source_, area->offset, area->length);
            const std::optional<SignatureParts> parts = SignatureParts::fromSuperBlob(superblob);
            if (!parts) return {};
            section_.pass(kSignature, at, "a well-formed signature");
            checkBlobs(superblob, SignatureHost::executable, at, section_);
            notePadding({area->offset + superblob.size(), area->length - superblob.size()}, at);
            checkContents(slice, *area, *parts, at);
            return {true, identityOf(*parts, at)};
        } catch (const std::runtime_error& failure) {
            section_.failWith(failure, kSignature, at, "a well-formed signature");
        }
        return {true, std::nullopt};
    }

    /// Signers reserve space for a signature and leave old bytes in it.
    void notePadding(const FileRange& padding, const std::string& at) {
        if (isZero(source_, padding)) return;
        section_.note(kBehindSignature,
                      format("%@, after the superblob (bytes %llu to %llu)", at, padding.offset,
                             padding.offset + padding.length - 1),
                      "padding of zeros", format("%llu bytes that nothing covers", padding.length));
    }

    void checkContents(const ImageSlice& slice, const FileRange& area, const SignatureParts& parts,
                       const std::string& at) {
        const ImageLayout layout = readImageLayout(source_, slice);
        OutsideComponents outside = outside_;
        std::optional<Data> embedded;
        if (!outside.contains(kSlotPropertyList)) {
            embedded = embeddedPropertyList(source_, slice, layout);
            // It is in the code, so the page hashes cover it.
            if (embedded) outside[kSlotPropertyList] = {.bytes = &*embedded, .mustBeCovered = false};
        }
        const FileRange code{slice.range.offset, area.offset - slice.range.offset};
        checkSigner(parts, at, section_);
        checkAgreement(parts, at, section_);
        checkSpecialSlots(parts, outside, at, section_);
        checkCodeLimit(parts, code.length, "the signature", at, section_);
        checkBehindSignature(source_, slice, layout, area, at, section_);
        checkPageHashes(source_, code, parts, at, workers_, section_);
    }

    const ByteSource& source_;
    const OutsideComponents& outside_;
    const std::string place_;
    Workers& workers_;
    Section& section_;
    VerifiedCode code_;
};

}  // namespace

CodeIdentity identityOf(const SignatureParts& parts, std::string place) {
    const codesign::CodeDirectory& chosen = parts.chosen().content;
    CodeIdentity identity;
    identity.place = std::move(place);
    identity.codeHashes = parts.codeHashes();
    identity.digestType = static_cast<std::uint32_t>(chosen.digestType());
    identity.identifier = chosen.identifier();
    identity.team = chosen.teamIdentifier();
    identity.hasSecureTimestamp = codesign::secureTimestamp(parts.cms()).has_value();
    return identity;
}

VerifiedCode verifyExecutable(const ByteSource& source, const OutsideComponents& outside,
                              const std::string& place, Workers& workers, Section& section) {
    try {
        return ImageCheck(source, outside, place, workers, section).run();
    } catch (const std::runtime_error& failure) {
        // The headers are broken, so the signed part cannot be found.
        section.failWith(failure, kImageStructure, place, "a well-formed executable image");
    }
    return {.isSigned = true, .identities = {}};
}

}  // namespace pinwell::verify
