// A zlib stream (RFC 1950) in, its contents out, piece by piece. For this folder only.
#pragma once

#include <cstdint>
#include <functional>
#include <memory>

#include "foundation/bytes.h"

namespace pinwell::xar {

class Inflater {
  public:
    /// Takes a piece of the contents, valid during the call; false ends it all.
    using Sink = std::function<bool(foundation::ByteView)>;

    /// `limit` is the most that the contents may come to, in bytes. Throws std::bad_alloc.
    Inflater(std::uint64_t limit, Sink sink);
    ~Inflater();
    Inflater(const Inflater&) = delete;
    Inflater& operator=(const Inflater&) = delete;

    /// False when the stream is malformed, its contents pass the limit, or the sink is done with it: then no
    /// more must be fed. What follows the stream's end is passed over.
    bool feed(foundation::ByteView compressed);

    /// Whether the stream came to its end, with its own checksum right.
    bool complete() const noexcept { return complete_; }

  private:
    struct Stream;

    std::unique_ptr<Stream> stream_;
    std::uint64_t remaining_;
    Sink sink_;
    bool complete_ = false;
};

}  // namespace pinwell::xar
