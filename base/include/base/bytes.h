// Byte buffers, for reading and writing every format: owned, borrowed, shared, and long ones that are mostly
// zeros.
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <span>
#include <string>
#include <string_view>
#include <vector>

namespace pinwell::base {

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

/// `bytes` must not lie in `data` itself, which may move.
inline void append(Data& data, ByteView bytes) {
    data.insert(data.end(), bytes.begin(), bytes.end());
}

/// Unmaps the pages of a buffer.
struct Unmapping {
    std::size_t length = 0;
    void operator()(std::byte* start) const noexcept;
};

/// A long buffer that is mostly zeros: of fixed length, all zeros at first. A length in a file is only a
/// claim: a sparse file has gibibytes of zeros and uses no disk space. A buffer of that length takes address
/// space, and memory only for pages with non-zero bytes. Movable; a buffer that was moved from is empty.
class SparseBuffer {
  public:
    SparseBuffer() = default;

    /// Throws std::bad_alloc if there is no address space for it.
    explicit SparseBuffer(std::size_t length);

    std::size_t size() const noexcept { return start_ ? start_.get_deleter().length : 0; }
    ByteView view() const noexcept { return {start_.get(), size()}; }

    /// Copies `bytes` to `offset`, where nothing was put before. Skips whole pages of zeros. Throws
    /// std::out_of_range if the bytes do not fit.
    void put(std::size_t offset, ByteView bytes);

  private:
    std::unique_ptr<std::byte, Unmapping> start_;
};

/// Immutable bytes with a shared owner: copies and parts are cheap, and keep the whole alive.
class SharedBytes {
  public:
    SharedBytes() = default;

    // Implicit: a buffer may be passed wherever shared bytes are expected.
    SharedBytes(Data bytes);             // NOLINT(google-explicit-constructor)
    SharedBytes(SparseBuffer&& buffer);  // NOLINT(google-explicit-constructor)

    const std::byte* data() const noexcept { return view_.data(); }
    std::size_t size() const noexcept { return view_.size(); }
    bool empty() const noexcept { return view_.empty(); }
    const std::byte* begin() const noexcept { return data(); }
    const std::byte* end() const noexcept { return data() + size(); }
    ByteView view() const noexcept { return view_; }

    /// `part`, which must be a view of these bytes.
    SharedBytes share(ByteView part) const { return {owner_, part}; }

    friend bool operator==(const SharedBytes& a, ByteView b);

  private:
    SharedBytes(std::shared_ptr<const void> owner, ByteView view) : owner_(std::move(owner)), view_(view) {}

    std::shared_ptr<const void> owner_;
    ByteView view_;
};

}  // namespace pinwell::base
