// Appending integers of either byte order to a buffer: the mirror of ByteReader.
#pragma once

#include <string_view>

#include "foundation/bytes.h"

namespace pinwell::foundation {

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

}  // namespace pinwell::foundation
