// Flat packages: an archive, and the trailers after it, in the order of the calls. Without any call it is
// only a signed archive.
#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "base/bytes.h"

namespace pinwell::test {

using base::Data;

inline constexpr std::uint16_t kUnknownTrailerType = 7;

/// One record; valid by default, and of an unknown type.
struct TrailerFields {
    std::string magic = "t8lr";
    std::uint16_t version = 1;
    std::uint16_t type = kUnknownTrailerType;
    std::optional<std::uint32_t> length;  // without one: that of the data
    std::uint32_t upperLength = 0;
};

/// Data and the record after them.
Data makeTrailer(const TrailerFields& fields, const Data& data = {});

class PackageBuilder {
  public:
    PackageBuilder& archive(Data bytes);
    PackageBuilder& terminator();
    PackageBuilder& ticket(std::string_view bytes);
    PackageBuilder& unknown(std::string_view bytes, std::uint16_t type = kUnknownTrailerType);
    PackageBuilder& trailer(const TrailerFields& fields, const Data& data = {});

    /// Bytes that belong to no trailer.
    PackageBuilder& bytes(std::string_view text);

    std::string build() const;

    /// Length of the archive without trailers, in bytes.
    std::size_t archiveSize() const { return archive_.size(); }

  private:
    PackageBuilder& append(const Data& bytes);

    Data archive_ = defaultArchive();
    Data trailers_;

    static Data defaultArchive();
};

}  // namespace pinwell::test
