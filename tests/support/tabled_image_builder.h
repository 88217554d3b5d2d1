// Disk images that list their blocks in a table with checksums, for verify/block_table.h. Sectors have 512
// bytes.
#pragma once

#include <cstdint>
#include <optional>

#include "base/byte_io.h"
#include "base/bytes.h"

namespace pinwell::test {

using base::ByteView;
using base::Data;

/// CRC-32 (ISO 3309).
std::uint32_t crcOf(ByteView bytes);

/// The checksums in the trailer of an image.
struct TrailerChecksums {
    std::uint32_t data = 0;
    std::uint32_t master = 0;
};

/// An unsigned image of one table: data, property list, trailer.
Data imageOfTable(ByteView table, ByteView data, const TrailerChecksums& checksums);

/// An image of one table with blocks added one by one; valid by default.
class TabledImageBuilder {
  public:
    TabledImageBuilder& block(std::uint32_t type, std::uint64_t sectors, const Data& packed,
                              const Data& contents);
    TabledImageBuilder& plain(const Data& contents);
    TabledImageBuilder& zlib(const Data& contents);
    TabledImageBuilder& zeros(std::uint64_t sectors);

    /// The image's first bytes once more, as another block.
    TabledImageBuilder& again(std::uint64_t sectors, std::uint64_t length);

    TabledImageBuilder& gapBeforeNext() { return skew_ = 1, *this; }
    TabledImageBuilder& tableChecksum(std::uint32_t value) { return tableChecksum_ = value, *this; }
    TabledImageBuilder& tableChecksumType(std::uint32_t value) { return tableChecksumType_ = value, *this; }
    TabledImageBuilder& masterChecksum(std::uint32_t value) { return masterChecksum_ = value, *this; }
    TabledImageBuilder& dataChecksum(std::uint32_t value) { return dataChecksum_ = value, *this; }
    TabledImageBuilder& sectorCount(std::uint64_t value) { return sectorCount_ = value, *this; }

    Data table() const;
    const Data& data() const { return data_.data(); }
    Data build() const;

  private:
    std::uint32_t ownChecksum() const;

    base::ByteWriter data_;
    base::ByteWriter contents_;
    base::ByteWriter blocks_;
    std::uint64_t sectors_ = 0;
    std::uint64_t skew_ = 0;
    std::uint32_t count_ = 0;
    std::uint32_t tableChecksumType_ = 2;
    std::optional<std::uint32_t> tableChecksum_;
    std::optional<std::uint32_t> masterChecksum_;
    std::optional<std::uint32_t> dataChecksum_;
    std::optional<std::uint64_t> sectorCount_;
};

}  // namespace pinwell::test
