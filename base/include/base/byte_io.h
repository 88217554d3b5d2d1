// The only bounds-checked cursor over bytes from outside, and its mirror, which appends fields to a buffer.
//
// Nothing else in the tree indexes raw input. Every check compares the wanted length with the bytes that
// remain, so two numbers from a file are never added. Every read names its field, so that a refusal can name
// the field and its offset.
#pragma once

#include <cstdint>
#include <stdexcept>
#include <string>
#include <string_view>
#include <utility>

#include "base/bytes.h"

namespace pinwell::base {

/// Fewer bytes remained than a read asked for. Parsers catch it at their public boundary.
class ShortRead : public std::runtime_error {
  public:
    ShortRead(std::string_view what, std::size_t offset, std::size_t wanted, std::size_t remaining);

    /// Offset of the read in the outermost buffer; for a position outside the reader's bytes, the offset of
    /// those bytes.
    std::size_t offset() const noexcept { return offset_; }

  private:
    std::size_t offset_;
};

/// A forward cursor. It owns nothing: the bytes must outlive it and every view that it returns. The
/// multi-byte reads assemble their value from single bytes, so alignment and host order do not matter. Throws
/// ShortRead; then it has not moved.
class ByteReader {
  public:
    /// `base` is the offset of `bytes` in the buffer that messages refer to.
    explicit ByteReader(ByteView bytes, std::size_t base = 0) noexcept : bytes_(bytes), base_(base) {}

    std::size_t position() const noexcept { return position_; }
    std::size_t remaining() const noexcept { return bytes_.size() - position_; }
    bool atEnd() const noexcept { return remaining() == 0; }

    std::uint8_t u8(std::string_view what);
    std::uint16_t be16(std::string_view what);
    std::uint32_t be32(std::string_view what);
    std::uint64_t be64(std::string_view what);
    std::uint16_t le16(std::string_view what);
    std::uint32_t le32(std::string_view what);
    std::uint64_t le64(std::string_view what);

    /// The next `length` bytes, not copied.
    ByteView bytes(std::uint64_t length, std::string_view what);

    void skip(std::uint64_t length, std::string_view what) { bytes(length, what); }

    /// Moves to `position`, counted from the start of this reader's bytes.
    void seek(std::uint64_t position, std::string_view what);

    /// A reader over `length` bytes at `offset` of this reader's bytes; this reader does not move.
    ByteReader sub(std::uint64_t offset, std::uint64_t length, std::string_view what) const;

  private:
    std::uint64_t bigEndian(std::size_t width, std::string_view what);
    std::uint64_t littleEndian(std::size_t width, std::string_view what);

    ByteView bytes_;
    std::size_t base_;
    std::size_t position_ = 0;
};

/// Builds a buffer field by field. Each call appends and returns the writer, so that a layout reads like a
/// list.
class ByteWriter {
  public:
    ByteWriter& u8(std::uint8_t value) { return bigEndian(value, 1); }
    ByteWriter& be16(std::uint16_t value) { return bigEndian(value, 2); }
    ByteWriter& be32(std::uint32_t value) { return bigEndian(value, 4); }
    ByteWriter& be64(std::uint64_t value) { return bigEndian(value, 8); }
    ByteWriter& le16(std::uint16_t value) { return littleEndian(value, 2); }
    ByteWriter& le32(std::uint32_t value) { return littleEndian(value, 4); }
    ByteWriter& le64(std::uint64_t value) { return littleEndian(value, 8); }
    ByteWriter& bytes(ByteView view) {
        append(data_, view);
        return *this;
    }
    ByteWriter& text(std::string_view characters) { return bytes(asBytes(characters)); }
    ByteWriter& zeros(std::size_t count) {
        data_.resize(data_.size() + count);
        return *this;
    }

    std::size_t size() const noexcept { return data_.size(); }
    const Data& data() const& noexcept { return data_; }
    Data take() && noexcept { return std::move(data_); }

  private:
    ByteWriter& bigEndian(std::uint64_t value, unsigned width) {
        for (unsigned i = width; i-- > 0;) data_.push_back(static_cast<std::byte>(value >> (8U * i)));
        return *this;
    }
    ByteWriter& littleEndian(std::uint64_t value, unsigned width) {
        for (unsigned i = 0; i < width; ++i) data_.push_back(static_cast<std::byte>(value >> (8U * i)));
        return *this;
    }

    Data data_;
};

}  // namespace pinwell::base
