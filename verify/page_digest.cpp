#include "verify/page_digest.h"

#include <algorithm>
#include <memory>

namespace pinwell::verify {

std::span<std::byte> threadBuffer() {
    thread_local const auto buffer = std::make_unique_for_overwrite<std::byte[]>(kBufferSize);
    return {buffer.get(), kBufferSize};
}

bool readPieces(const base::ByteSource& source, const codesign::FileRange& range,
                const std::function<bool(ByteView)>& take) {
    for (std::uint64_t done = 0; done < range.length;) {
        const auto length =
            static_cast<std::size_t>(std::min<std::uint64_t>(kBufferSize, range.length - done));
        const std::span<std::byte> buffer = threadBuffer().first(length);
        source.read(range.offset + done, buffer);
        if (!take(buffer)) return false;
        done += length;
    }
    return true;
}

ByteView digestOf(crypto::Digest algorithm, const base::ByteSource& source,
                  const codesign::FileRange& range) {
    crypto::Hasher& digest = crypto::threadHasher(algorithm);
    digest.begin();
    readPieces(source, range, [&](ByteView piece) {
        digest.update(piece);
        return true;
    });
    return digest.finish();
}

bool isZero(const base::ByteSource& source, const codesign::FileRange& range) {
    return readPieces(source, range, [](ByteView piece) {
        return std::all_of(piece.begin(), piece.end(), [](std::byte byte) { return byte == std::byte{0}; });
    });
}

}  // namespace pinwell::verify
