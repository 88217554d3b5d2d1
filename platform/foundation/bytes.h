// Byte buffers, for reading and writing every format.
#pragma once

#include <cstddef>
#include <cstdint>
#include <span>
#include <string>
#include <string_view>
#include <vector>

namespace pinwell::foundation {

/// An owned byte buffer. A buffer that may be missing is a `std::optional<Data>`.
using Data = std::vector<std::byte>;

/// Bytes with another owner; valid as long as the owner.
using ByteView = std::span<const std::byte>;

/// The bytes of a text, not copied.
inline ByteView asBytes(std::string_view text) {
    return std::as_bytes(std::span<const char>(text.data(), text.size()));
}

/// The bytes of a text, copied.
inline Data toData(std::string_view text) {
    const ByteView view = asBytes(text);
    return {view.begin(), view.end()};
}

inline Data toData(ByteView bytes) {
    return {bytes.begin(), bytes.end()};
}

/// The bytes as text, not copied; no encoding is assumed.
inline std::string_view asText(ByteView bytes) {
    return {static_cast<const char*>(static_cast<const void*>(bytes.data())), bytes.size()};
}

/// The bytes as text, copied; no encoding is assumed.
inline std::string toString(ByteView bytes) {
    std::string text(bytes.size(), '\0');
    for (std::size_t i = 0; i < bytes.size(); ++i) text[i] = static_cast<char>(bytes[i]);
    return text;
}

/// Two lower-case hexadecimal digits for each byte, no separators.
std::string toHex(ByteView bytes);

/// `bytes` must not lie in `data` itself, which may move.
inline void append(Data& data, ByteView bytes) {
    data.insert(data.end(), bytes.begin(), bytes.end());
}

}  // namespace pinwell::foundation
