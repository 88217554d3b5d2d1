// Signed flat installer packages.
//
// The ticket is a trailer behind the archive's last byte (package_trailer.h), which an archive reader never
// gets to; the cdhash is the digest that the archive's own signature signs. Trailers of types that we do not
// know are kept: those behind the old ticket move in front of the new one, all others stay where they are.
#pragma once

#include "foundation/bytes.h"
#include "src/PWHashedFile/PWHashedFile.h"
#include "src/PWHashedFile/package_trailer_walk.h"

namespace pinwell {

/// What was found describes the file as it was when its trailers were read, which the first ticketData()
/// does; nothing is read again after a write.
class PWHashedFlatPackage : public PWHashedFile {
  public:
    /// No file access.
    using PWHashedFile::PWHashedFile;

    /// Size of the file; offset and length of the ticket, both 0 when there is none.
    std::uint64_t origEOL() const noexcept { return trailers_.fileSize; }
    std::uint64_t ticketStart() const noexcept { return trailers_.ticketStart; }
    std::uint64_t ticketLength() const noexcept { return trailers_.ticketLength; }

    /// There is a terminator, or a trailer of unknown type.
    bool hasTrailers() const noexcept { return trailers_.hasTrailers; }

    /// The unknown trailers behind the ticket, in file order; nothing when there are none.
    const std::optional<foundation::SharedBytes>& dataToAppend() const noexcept {
        return trailers_.dataToAppend;
    }

    /// Walks the trailers from the last one to the first ticket or the terminator.
    std::optional<Data> _ticketData() override;

    /// The signed digest at its full length.
    std::optional<Data> _cdHash() override;

    /// A file with a terminator but no ticket is overwritten from its first byte on: known, and kept so.
    bool _writeNewTicketDataFromURL(const std::optional<URL>& source, const URL& target, bool deleteExisting,
                                    ErrorOut error) override;

  protected:
    std::string_view className() const override { return "PWHashedFlatPackage"; }

  private:
    std::string name() const { return fileURL()->lastPathComponent(); }
    foundation::SparseBuffer tailWith(foundation::ByteView ticket) const;
    std::optional<URL> saveMovedTrailers(files::FileHandle& file, foundation::SparseBuffer& tail) const;
    void writeTail(files::FileHandle& file, foundation::ByteView tail, const std::string& targetName);

    package_trailers trailers_;  // but for the ticket itself, which is handed out
};

}  // namespace pinwell
