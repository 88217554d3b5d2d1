// Signed flat installer packages.
//
// The ticket is a trailer after the archive's last byte (formats/package_trailers.h), where no archive reader
// looks; the cdhash is the digest that the archive's own signature signs. Trailers of unknown types are kept:
// the ones after the old ticket move before the new one, all others keep their place.
#pragma once

#include "base/bytes.h"
#include "formats/package_trailers.h"
#include "src/PWHashedFile/PWHashedFile.h"

namespace pinwell {

/// Describes the file at the time of the first ticketData(), which reads its trailers; nothing is read again
/// after a write.
class PWHashedFlatPackage : public PWHashedFile {
  public:
    /// No file access.
    using PWHashedFile::PWHashedFile;

    /// Size of the file; offset and length of the ticket, both 0 if there is none.
    std::uint64_t origEOL() const noexcept { return trailers_.fileSize; }
    std::uint64_t ticketStart() const noexcept { return trailers_.ticketStart; }
    std::uint64_t ticketLength() const noexcept { return trailers_.ticketLength; }

    /// There is a terminator, or a trailer of unknown type.
    bool hasTrailers() const noexcept { return trailers_.hasTrailers; }

    /// The unknown trailers after the ticket, in file order; `nullopt` if there are none.
    const std::optional<base::SharedBytes>& dataToAppend() const noexcept { return trailers_.dataToAppend; }

    std::optional<TicketPlaceFault> ticketPlaceFault() override;

    /// Walks the trailers from the last one to the first ticket or the terminator.
    std::optional<Data> _ticketData() override;

    /// The signed digest at its full length.
    std::optional<Data> _cdHash() override;

    /// Overwrites a file with a terminator but no ticket from its first byte on: known, and required.
    bool _writeNewTicketDataFromURL(const std::optional<URL>& source, const URL& target, bool deleteExisting,
                                    ErrorOut error) override;

  protected:
    std::string_view className() const override { return "PWHashedFlatPackage"; }

  private:
    std::string name() const { return fileURL()->lastPathComponent(); }
    base::SparseBuffer tailWith(base::ByteView ticket) const;
    std::optional<URL> saveMovedTrailers(files::FileHandle& file, base::SparseBuffer& tail) const;
    void writeTail(files::FileHandle& file, base::ByteView tail, const std::string& targetName);

    PackageTrailers trailers_;  // without the ticket, which was moved out
};

}  // namespace pinwell
