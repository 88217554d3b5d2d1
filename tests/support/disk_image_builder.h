// Disk images, field by field. Without any call: an unsigned image of 1000 bytes of data. A pattern fills all
// meaningless bytes of the trailer, so a lost byte is visible.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "support/code_directory_builder.h"

namespace pinwell::test {

inline constexpr std::uint32_t kSampleTicketSlot = 0x10002;

/// A stapled ticket in the form of a superblob's blob.
Data ticketBlob(std::string_view ticket);

class DiskImageBuilder {
  public:
    /// The image's own data.
    DiskImageBuilder& data(Data bytes) { return set(data_, std::move(bytes)); }

    /// The signature area, between data and trailer; the trailer's two fields follow it.
    DiskImageBuilder& superblob(Data bytes) { return set(superblob_, std::move(bytes)); }
    DiskImageBuilder& superblob(const SuperBlobBuilder& builder) { return superblob(builder.build()); }

    /// Four characters instead of "koly".
    DiskImageBuilder& magic(std::string value) { return set(magic_, std::move(value)); }
    DiskImageBuilder& version(std::uint32_t value) { return set(version_, value); }
    DiskImageBuilder& codeSignOffset(std::uint64_t value) { return set(codeSignOffset_, value); }
    DiskImageBuilder& codeSignLength(std::uint64_t value) { return set(codeSignLength_, value); }

    /// The 512 bytes.
    Data trailer() const;

    /// Data, superblob, trailer.
    Data build() const;

    /// Three blobs, the first a code directory that covers the second and the trailer: a valid ad-hoc
    /// signature of the default image.
    static SuperBlobBuilder signature();
    static Data codeDirectory();

  private:
    template <class Field, class Value>
    DiskImageBuilder& set(Field& field, Value&& value) {
        field = std::forward<Value>(value);
        return *this;
    }

    Data data_ = Data(1000, std::byte{0xDA});
    Data superblob_;
    std::string magic_ = "koly";
    std::uint32_t version_ = 4;
    std::optional<std::uint64_t> codeSignOffset_;
    std::optional<std::uint64_t> codeSignLength_;
};

}  // namespace pinwell::test
