// Unpacks a zlib stream (RFC 1950), piece by piece.
#pragma once

#include <cstdint>
#include <functional>
#include <memory>

#include "base/bytes.h"

namespace pinwell::xar {

class Inflater {
  public:
    /// Takes a piece of the contents, valid during the call; returns false to stop.
    using Sink = std::function<bool(base::ByteView)>;

    /// `limit` is the maximum length of the contents, in bytes. Throws std::bad_alloc.
    Inflater(std::uint64_t limit, Sink sink);
    ~Inflater();
    Inflater(const Inflater&) = delete;
    Inflater& operator=(const Inflater&) = delete;

    /// Returns false if the stream is malformed, its contents exceed the limit, or the sink stops it; then
    /// feed no more. Bytes after the stream's end are skipped.
    bool feed(base::ByteView compressed);

    /// Whether the stream has ended, with a correct checksum.
    bool complete() const noexcept { return complete_; }

  private:
    struct Stream;

    std::unique_ptr<Stream> stream_;
    std::uint64_t remaining_;
    Sink sink_;
    bool complete_ = false;
};

}  // namespace pinwell::xar
