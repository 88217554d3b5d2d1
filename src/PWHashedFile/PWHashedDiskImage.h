// UDIF disk images.
//
// | From         | To           | What                                                                  |
// |--------------|--------------|-----------------------------------------------------------------------|
// | 0            | endOfDMGData | the image's data, never read and never written here                   |
// | endOfDMGData | size - 512   | the code-signature superblob (blob_set.h); nothing in unsigned images |
// | size - 512   | size         | the trailer (udif_header.h), which says where the superblob stands    |
//
// The ticket is a blob of the superblob. An unsigned image gets its superblob with its first ticket, between
// its data and its trailer, and is known by a synthetic cdhash (synthetic_cdhash.h), which the ticket does
// not change.
#pragma once

#include "src/PWHashedFile/PWHashedFile.h"
#include "src/PWHashedFile/blob_set.h"
#include "src/PWHashedFile/udif_header.h"
#include "src/ticket_fault.h"

namespace pinwell {

/// What was read describes the file as it was when the object was made; nothing is read again after a write.
class PWHashedDiskImage : public PWHashedFile {
  public:
    /// Reads trailer and superblob; exit code 66 when they are not those of a disk image.
    PWHashedDiskImage(const URL& fileURL, const Platform& platform);

    const UDIFFileHeader& dmgHeader() const noexcept { return dmgHeader_; }
    const Data& superblob() const noexcept { return superblob_; }
    const BlobSet& blobs() const noexcept { return blobs_; }

    /// Of an image that was unsigned when it was read.
    const std::optional<Data>& syntheticCDHash() const noexcept { return syntheticCDHash_; }

    /// Offsets and lengths in bytes.
    std::uint64_t origEOF() const noexcept { return origEOF_; }
    std::uint64_t csStart() const noexcept { return csStart_; }
    std::uint64_t csLength() const noexcept { return csLength_; }
    std::uint64_t endOfDMGData() const noexcept { return endOfDMGData_; }

    std::uint32_t numBlobs() const noexcept { return numBlobs_; }

    /// Why trailer and superblob are not those of a disk image, and where in the file; nothing when they are.
    const std::optional<ticket_fault>& fault() const noexcept { return fault_; }

    std::optional<Data> _ticketData() override;
    std::optional<Data> _cdHash() override;

    /// Leaves a copy of what it writes in the temporary directory. Without an effect, and successful, when
    /// the ticket to delete is the only blob there is.
    bool _writeNewTicketDataFromURL(const std::optional<URL>& source, const URL& target, bool deleteExisting,
                                    ErrorOut error) override;

  protected:
    std::string_view className() const override { return "PWHashedDiskImage"; }

  private:
    bool populateHeader();
    bool readTrailer(files::FileHandle& file);
    bool readSignature(files::FileHandle& file);
    bool makeUpForMissingSignature();
    bool readBlobs();
    bool refuse(std::uint64_t offset, const char* rule);

    void saveDebugCopy(foundation::ByteView signatureAndTrailer, std::optional<Error>& held) const;
    void writeAtEndOfData(files::FileHandle& file, foundation::ByteView signatureAndTrailer,
                          const std::string& name) const;
    bool writeSignature(Data superblob, const URL& target, bool deleteExisting, std::optional<Error>& held);

    UDIFFileHeader dmgHeader_;
    Data superblob_;
    BlobSet blobs_;
    std::optional<Data> syntheticCDHash_;
    std::uint64_t origEOF_ = 0;
    std::uint64_t csStart_ = 0;
    std::uint64_t csLength_ = 0;
    std::uint64_t endOfDMGData_ = 0;
    std::uint32_t numBlobs_ = 0;
    std::optional<ticket_fault> fault_;
};

}  // namespace pinwell
