// Digests of parts of a source, without memory for each part.
#pragma once

#include <cstddef>
#include <functional>
#include <span>

#include "base/byte_source.h"
#include "base/bytes.h"
#include "codesign/executable_image.h"
#include "crypto/crypto.h"

namespace pinwell::verify {

using base::ByteView;
using base::Data;

/// The thread's own buffer of `kBufferSize` bytes. A function that uses it must not call another that does.
inline constexpr std::size_t kBufferSize = std::size_t{512} * 1024;
std::span<std::byte> threadBuffer();

/// Reads a range of a source piece by piece into the thread's buffer, until `take` returns false. Returns
/// false then. Throws base::ReadFailure.
bool readPieces(const base::ByteSource& source, const codesign::FileRange& range,
                const std::function<bool(ByteView)>& take);

/// The digest of a range of a source, with the thread's hasher and buffer; valid until that hasher is used
/// again. Throws base::ReadFailure.
ByteView digestOf(crypto::Digest algorithm, const base::ByteSource& source, const codesign::FileRange& range);

/// Whether a range of a source is all zero. Uses the thread's buffer. Throws base::ReadFailure.
bool isZero(const base::ByteSource& source, const codesign::FileRange& range);

}  // namespace pinwell::verify
