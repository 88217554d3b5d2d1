// An executable image, thin or universal, up to the signatures of its slices.
#include "codesign/executable_image.h"

#include <algorithm>

#include "base/byte_io.h"
#include "codesign/code_error.h"
#include "codesign/code_signature.h"
#include "codesign/superblob.h"
#include "target.h"

namespace pinwell::fuzz {
namespace {

using codesign::FileRange;

bool liesWithin(const FileRange& part, const FileRange& whole) {
    return part.offset >= whole.offset && part.length <= whole.length &&
           part.offset - whole.offset <= whole.length - part.length;
}

void examineSlice(const base::ByteSource& source, const codesign::ImageSlice& slice) {
    require(liesWithin(slice.range, {0, source.size()}), "a slice lies within the file");
    const auto range = codesign::findImageSignature(source, slice);
    if (!range) return;
    require(liesWithin(*range, slice.range), "a signature lies within its slice");
    const base::SharedBytes superblob = codesign::readSuperBlob(source, range->offset, range->length);
    require(superblob.size() <= range->length, "a superblob lies within its area");
    const auto signature = codesign::CodeSignature::parse(codesign::componentsOfSuperBlob(superblob));
    if (signature) signature->requireValid();
}

}  // namespace

void examine(ByteView input) {
    const base::MemorySource source(base::toData(input));
    try {
        const bool isImage = codesign::isExecutableImage(source);
        const auto slices = codesign::readSlices(source);
        require(isImage, "only an image has slices");
        require(!slices.empty(), "an image has a slice");
        require(slices.size() <= input.size(), "a slice takes room");
        const auto& preferred = codesign::preferredSlice(slices);
        require(std::ranges::any_of(slices, [&](const auto& slice) { return &slice == &preferred; }),
                "the preferred slice is one of them");
        for (const auto& slice : slices) {
            try {
                examineSlice(source, slice);
            } catch (const codesign::CodeError&) {
            } catch (const base::ShortRead&) {
            } catch (const base::ReadFailure&) {
            }
        }
    } catch (const codesign::CodeError&) {
    } catch (const base::ReadFailure&) {
    }
}

}  // namespace pinwell::fuzz
