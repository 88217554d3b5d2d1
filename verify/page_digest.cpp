#include "verify/page_digest.h"

#include <algorithm>
#include <memory>

namespace pinwell::verify {

std::span<std::byte> threadBuffer() {
    thread_local const auto buffer = std::make_unique_for_overwrite<std::byte[]>(kBufferSize);
    return {buffer.get(), kBufferSize};
}

ByteView digestOf(Algorithm algorithm, const codesign::ByteSource& source, const codesign::FileRange& range) {
    crypto::Hasher& digest = crypto::threadHasher(algorithm);
    digest.begin();
    for (std::uint64_t done = 0; done < range.length;) {
        const auto length =
            static_cast<std::size_t>(std::min<std::uint64_t>(kBufferSize, range.length - done));
        const std::span<std::byte> buffer = threadBuffer().first(length);
        source.read(range.offset + done, buffer);
        digest.update(buffer);
        done += length;
    }
    return digest.finish();
}

bool isZero(const codesign::ByteSource& source, const codesign::FileRange& range) {
    for (std::uint64_t done = 0; done < range.length;) {
        const auto length =
            static_cast<std::size_t>(std::min<std::uint64_t>(kBufferSize, range.length - done));
        const std::span<std::byte> buffer = threadBuffer().first(length);
        source.read(range.offset + done, buffer);
        if (std::any_of(buffer.begin(), buffer.end(), [](std::byte byte) { return byte != std::byte{0}; }))
            return false;
        done += length;
    }
    return true;
}

}  // namespace pinwell::verify
