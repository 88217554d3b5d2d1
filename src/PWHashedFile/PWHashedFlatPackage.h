// Signed flat installer packages.
//
// The ticket is a trailer behind the archive's last byte (package_trailer.h), which an archive reader never
// gets to; the cdhash is the digest that the archive's own signature signs. Trailers of types that we do not
// know are kept: those behind the old ticket move in front of the new one, all others stay where they are.
#pragma once

#include "src/PWHashedFile/PWHashedFile.h"

namespace pinwell {

/// Longest ticket that is read, in bytes. None comes near it, and a sparse file can claim any length.
inline constexpr std::uint64_t kMaximumTicket = files::kMaximumWholeFile;

/// Most that unknown trailers may come to together, in bytes: a million of them when they are all empty.
inline constexpr std::uint64_t kMaximumUnknownTrailers = 16ULL * 1024 * 1024;

/// What was found describes the file as it was when its trailers were read, which the first ticketData()
/// does; nothing is read again after a write.
class PWHashedFlatPackage : public PWHashedFile {
  public:
    /// No file access.
    using PWHashedFile::PWHashedFile;

    /// Size of the file; offset and length of the ticket, both 0 when there is none.
    std::uint64_t origEOL() const noexcept { return origEOL_; }
    std::uint64_t ticketStart() const noexcept { return ticketStart_; }
    std::uint64_t ticketLength() const noexcept { return ticketLength_; }

    /// There is a terminator, or a trailer of unknown type.
    bool hasTrailers() const noexcept { return hasTrailers_; }

    /// The unknown trailers behind the ticket, in file order; nothing when there are none.
    const std::optional<Data>& dataToAppend() const noexcept { return dataToAppend_; }

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
    bool readSize(files::FileHandle& file);
    std::optional<Data> walkTrailers(files::FileHandle& file);
    std::optional<Data> readTicket(files::FileHandle& file, std::uint64_t start, std::uint32_t length);
    Data tailWith(foundation::ByteView ticket) const;
    std::optional<URL> saveMovedTrailers(files::FileHandle& file, foundation::ByteView tail) const;
    void writeTail(files::FileHandle& file, foundation::ByteView tail, const std::string& targetName);

    std::uint64_t origEOL_ = 0;
    std::uint64_t ticketStart_ = 0;
    std::uint64_t ticketLength_ = 0;
    bool hasTrailers_ = false;
    std::optional<Data> dataToAppend_;
};

}  // namespace pinwell
