#include "support/signed_image.h"

#include <algorithm>

#include "base/byte_io.h"
#include "support/cms_signer.h"
#include "support/code_directory_builder.h"
#include "support/executable_image_builder.h"

namespace pinwell::test {
namespace {

constexpr std::size_t kPageSize = 4096;
constexpr std::uint32_t kAdHoc = 2;

void putNumber(Data& bytes, std::size_t at, std::uint32_t value) {
    const Data number = base::ByteWriter().be32(value).data();
    std::copy(number.begin(), number.end(), bytes.begin() + static_cast<std::ptrdiff_t>(at));
}

// The builder's directory, with the digests of these pages in place of its filler.
Data codeDirectoryOver(ByteView code, std::uint8_t digestType, const SignedImageParts& parts) {
    const auto pages = static_cast<std::uint32_t>((code.size() + kPageSize - 1) / kPageSize);
    CodeDirectoryBuilder builder;
    builder.digestType(digestType).codeSlots(pages).flags(parts.hasSigner ? 0 : kAdHoc);
    builder.covers(2, emptyRequirements());
    if (!parts.team.empty()) builder.team(parts.team);
    for (const auto& [slot, bytes] : parts.components) builder.covers(slot, bytes);
    for (const auto& [slot, bytes] : parts.outside) builder.covers(slot, bytes);
    Data directory = builder.build();
    putNumber(directory, 32, static_cast<std::uint32_t>(code.size()));
    const std::size_t size = codeDigest(digestType, {}).size();
    std::size_t at = directory.size() - pages * size;
    for (std::size_t begin = 0; begin < code.size(); begin += kPageSize, at += size) {
        const Data digest =
            codeDigest(digestType, code.subspan(begin, std::min(kPageSize, code.size() - begin)));
        std::copy_n(digest.begin(), size, directory.begin() + static_cast<std::ptrdiff_t>(at));
    }
    return directory;
}

Data superblobOver(ByteView code, const SignedImageParts& parts) {
    std::vector<Data> directories;
    for (const std::uint8_t type : parts.digestTypes)
        directories.push_back(codeDirectoryOver(code, type, parts));
    SuperBlobBuilder superblob;
    superblob.blob(0, directories.front()).blob(2, emptyRequirements());
    for (const auto& [slot, bytes] : parts.components) superblob.blob(slot, bytes);
    for (std::size_t i = 1; i < directories.size(); ++i)
        superblob.blob(0x1000 + static_cast<std::uint32_t>(i - 1), directories[i]);
    if (!parts.hasSigner) return superblob.cms({}).build();
    CmsBuilder message(directories.front());
    message.key(TestKey::rsa2048);
    if (parts.hasTimestamp) message.timestamp(TimestampBuilder());
    return superblob.cms(message.build()).build();
}

Data imageAround(const Data& superblob, const SignedImageParts& parts) {
    // An unused load command fills more than a page.
    return ExecutableImageBuilder()
        .cpuType(parts.cpuType)
        .loadCommand(0x1B, Data(kPageSize, std::byte{0x11}))
        .signature(superblob)
        .padding(parts.padding)
        .build();
}

}  // namespace

Data signedImageOf(const SignedImageParts& parts) {
    // The image states place and length of its signature, and the signature covers these fields. A message's
    // length depends on its signature value, so this may need a second try.
    Data superblob = superblobOver(Data(kPageSize + 1), parts);
    for (;;) {
        const Data image = imageAround(superblob, parts);
        const std::size_t end = image.size() - superblob.size() - parts.padding.size();
        Data next = superblobOver(ByteView(image).first(end), parts);
        if (next.size() == superblob.size()) return imageAround(next, parts);
        superblob = std::move(next);
    }
}

}  // namespace pinwell::test
