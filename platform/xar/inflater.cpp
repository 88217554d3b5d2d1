#include "xar/inflater.h"

#include <zlib.h>

#include <algorithm>
#include <array>
#include <new>
#include <utility>

namespace pinwell::xar {
namespace {

constexpr std::size_t kInflatedAtOnce = std::size_t{32} * 1024;

}  // namespace

struct Inflater::Stream {
    Stream() {
        if (inflateInit(&state) != Z_OK) throw std::bad_alloc();
    }
    ~Stream() { inflateEnd(&state); }
    Stream(const Stream&) = delete;
    Stream& operator=(const Stream&) = delete;

    z_stream state{};
    std::array<Bytef, kInflatedAtOnce> in{};
    std::array<Bytef, kInflatedAtOnce> out{};
};

Inflater::Inflater(std::uint64_t limit, Sink sink)
    : stream_(std::make_unique<Stream>()), remaining_(limit), sink_(std::move(sink)) {}

Inflater::~Inflater() = default;

bool Inflater::feed(base::ByteView compressed) {
    z_stream& state = stream_->state;
    while (!compressed.empty() && !complete_) {
        const auto piece = compressed.first(std::min(compressed.size(), kInflatedAtOnce));
        compressed = compressed.subspan(piece.size());
        std::transform(piece.begin(), piece.end(), stream_->in.begin(),
                       [](std::byte byte) { return std::to_integer<Bytef>(byte); });
        state.next_in = stream_->in.data();
        state.avail_in = static_cast<uInt>(piece.size());
        do {
            state.next_out = stream_->out.data();
            state.avail_out = kInflatedAtOnce;
            const int status = inflate(&state, Z_NO_FLUSH);
            if (status != Z_OK && status != Z_STREAM_END && status != Z_BUF_ERROR) return false;
            complete_ = status == Z_STREAM_END;

            const auto contents =
                std::as_bytes(std::span(stream_->out)).first(kInflatedAtOnce - state.avail_out);
            if (contents.size() > remaining_) return false;
            remaining_ -= contents.size();
            if (!contents.empty() && !sink_(contents)) return false;
        } while (!complete_ && state.avail_out == 0);
    }
    return true;
}

}  // namespace pinwell::xar
