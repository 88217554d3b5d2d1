#include "lumora-local/deflate.h"

#include <zlib.h>

#include "lumora-local/failure.h"

namespace pinwell::lumora {
namespace {

using foundation::ByteView;
using foundation::Data;

const Bytef* zlibBytes(ByteView bytes) {
    return reinterpret_cast<const Bytef*>(bytes.data());
}

}  // namespace

Data deflated(ByteView contents) {
    uLongf length = compressBound(contents.size());
    Data stream(length);
    const int status = compress2(reinterpret_cast<Bytef*>(stream.data()), &length, zlibBytes(contents),
                                 contents.size(), Z_BEST_COMPRESSION);
    if (status != Z_OK) throw Failure(EX_SOFTWARE, "cannot compress");
    stream.resize(length);
    return stream;
}

std::uint32_t crc32(ByteView bytes) {
    return static_cast<std::uint32_t>(::crc32_z(0, zlibBytes(bytes), bytes.size()));
}

}  // namespace pinwell::lumora
