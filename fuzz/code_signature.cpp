// A signature: the superblob, its code directories and components, and the result of judging them.
#include "codesign/code_signature.h"

#include <algorithm>

#include "base/byte_io.h"
#include "codesign/code_error.h"
#include "codesign/superblob.h"
#include "target.h"

namespace pinwell::fuzz {
namespace {

using codesign::CodeError;
using codesign::CodeSignature;

bool liesWithin(ByteView part, ByteView whole) {
    return part.data() >= whole.data() && part.data() + part.size() <= whole.data() + whole.size();
}

void examineBlobs(ByteView superblob) {
    const auto blobs = codesign::parseSuperBlob(superblob);
    require(blobs.size() <= superblob.size() / 16, "every blob takes its entry and its header");
    std::vector<std::pair<std::uint32_t, Data>> list;
    for (const auto& blob : blobs) {
        require(liesWithin(blob.bytes, superblob), "a blob lies within the superblob");
        list.emplace_back(blob.slot, base::toData(blob.bytes));
    }
    const Data rebuilt = codesign::buildSuperBlob(list);
    const auto again = codesign::parseSuperBlob(rebuilt);
    const auto same = [](const codesign::Blob& a, const codesign::Blob& b) {
        return a.slot == b.slot && std::ranges::equal(a.bytes, b.bytes);
    };
    require(std::ranges::equal(again, blobs, same), "a superblob reads back as it was written");
}

void examineDirectory(ByteView bytes) {
    const auto directory = codesign::CodeDirectory::parse(base::toData(bytes));
    require(std::ranges::equal(directory.bytes(), bytes), "a code directory keeps its bytes");
    const std::size_t size = codesign::digestSize(directory.digestType());
    for (std::uint32_t slot = 0; slot <= 16; ++slot) {
        const auto digest = directory.specialSlotDigest(slot);
        require(!digest || digest->size() == size, "a digest is as long as its type says");
    }
    require(directory.codeHash().size() == codesign::codeHashSize(directory.digestType()),
            "a cdhash is as long as its type says");
    require(directory.identifier().find('\0') == std::string::npos, "an identifier ends at its zero");
}

void examineSignature(ByteView superblob) {
    const auto signature = CodeSignature::parse(codesign::componentsOfSuperBlob(base::toData(superblob)));
    if (!signature) return;
    const auto information = signature->information(codesign::kSigningInformation);
    require(information.unique && information.cdHashes.front() == *information.unique,
            "the cdhash is the first one");
    require(information.cdHashes.size() == information.digestAlgorithms.size() &&
                information.cdHashes.size() <= codesign::kMaximumCodeDirectories,
            "there is a hash for each code directory");
    signature->requireValid();
}

template <class Step>
void attempt(Step step) {
    try {
        step();
    } catch (const CodeError&) {
    } catch (const base::ShortRead&) {
    }
}

}  // namespace

void examine(ByteView input) {
    attempt([&] { examineDirectory(input); });
    attempt([&] { examineBlobs(input); });
    attempt([&] { examineSignature(input); });
}

}  // namespace pinwell::fuzz
