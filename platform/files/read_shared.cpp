#include <algorithm>
#include <new>

#include "files/file_reader.h"
#include "values/format.h"

namespace pinwell::files {
namespace {

using base::SharedBytes;
using base::SparseBuffer;

/// Read at once: large enough for usual signatures and tickets.
constexpr std::uint64_t kPiece = 1024 * 1024;

}  // namespace

SparseBuffer makeBuffer(std::uint64_t length) {
    try {
        return SparseBuffer(length);
    } catch (const std::bad_alloc&) {
        throw FileHandleError(values::format("Cannot hold %llu bytes", length));
    }
}

SharedBytes readShared(FileReader& file, std::uint64_t length) {
    if (length <= kPiece) return file.read(length);
    const std::uint64_t start = file.position();
    SparseBuffer buffer = makeBuffer(length);
    for (std::uint64_t done = 0; done < length;) {
        const std::uint64_t data = std::min(file.nextData(start + done) - start, length);
        if (data > done) file.seek(start + data);
        done = data;
        const std::uint64_t wanted = std::min(kPiece, length - done);
        const base::Data piece = file.read(wanted);
        buffer.put(done, piece);
        done += piece.size();
        if (piece.size() < wanted) {
            const SharedBytes whole = std::move(buffer);
            return whole.share(whole.view().first(done));
        }
    }
    return buffer;
}

}  // namespace pinwell::files
