#include "base/byte_io.h"

#include <fmt/format.h>

namespace pinwell::base {

ShortRead::ShortRead(std::string_view what, std::size_t offset, std::size_t wanted, std::size_t remaining)
    : std::runtime_error(
          fmt::format("{}: {} bytes wanted at offset {}, {} remain", what, wanted, offset, remaining)),
      offset_(offset) {}

ByteView ByteReader::bytes(std::uint64_t length, std::string_view what) {
    if (length > remaining()) throw ShortRead(what, base_ + position_, length, remaining());
    const ByteView view = bytes_.subspan(position_, static_cast<std::size_t>(length));
    position_ += view.size();
    return view;
}

std::uint64_t ByteReader::bigEndian(std::size_t width, std::string_view what) {
    std::uint64_t value = 0;
    for (const std::byte byte : bytes(width, what))
        value = (value << 8U) | std::to_integer<std::uint64_t>(byte);
    return value;
}

std::uint64_t ByteReader::littleEndian(std::size_t width, std::string_view what) {
    std::uint64_t value = 0;
    unsigned shift = 0;
    for (const std::byte byte : bytes(width, what)) {
        value |= std::to_integer<std::uint64_t>(byte) << shift;
        shift += 8;
    }
    return value;
}

std::uint8_t ByteReader::u8(std::string_view what) {
    return static_cast<std::uint8_t>(bigEndian(1, what));
}
std::uint16_t ByteReader::be16(std::string_view what) {
    return static_cast<std::uint16_t>(bigEndian(2, what));
}
std::uint32_t ByteReader::be32(std::string_view what) {
    return static_cast<std::uint32_t>(bigEndian(4, what));
}
std::uint64_t ByteReader::be64(std::string_view what) {
    return bigEndian(8, what);
}
std::uint16_t ByteReader::le16(std::string_view what) {
    return static_cast<std::uint16_t>(littleEndian(2, what));
}
std::uint32_t ByteReader::le32(std::string_view what) {
    return static_cast<std::uint32_t>(littleEndian(4, what));
}
std::uint64_t ByteReader::le64(std::string_view what) {
    return littleEndian(8, what);
}

void ByteReader::seek(std::uint64_t position, std::string_view what) {
    if (position > bytes_.size()) throw ShortRead(what, base_, position, bytes_.size());
    position_ = static_cast<std::size_t>(position);
}

ByteReader ByteReader::sub(std::uint64_t offset, std::uint64_t length, std::string_view what) const {
    if (offset > bytes_.size()) throw ShortRead(what, base_, offset, bytes_.size());
    const std::size_t start = static_cast<std::size_t>(offset);
    const std::size_t available = bytes_.size() - start;
    if (length > available) throw ShortRead(what, base_ + start, length, available);
    return ByteReader(bytes_.subspan(start, static_cast<std::size_t>(length)), base_ + start);
}

}  // namespace pinwell::base
