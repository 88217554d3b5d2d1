// UDIF disk images.
//
// The ticket is a blob of the code-signature superblob, which stands between the image's data and its trailer
// (disk_image_signature.h, blob_set.h). The data are never read and never written here. An unsigned image
// gets its superblob with its first ticket, and is known by a synthetic cdhash (synthetic_cdhash.h), which
// the ticket does not change.
#pragma once

#include "foundation/bytes.h"
#include "src/PWHashedFile/PWHashedFile.h"
#include "src/PWHashedFile/disk_image_signature.h"

namespace pinwell {

/// What was read describes the file as it was when the object was made; nothing is read again after a write.
class PWHashedDiskImage : public PWHashedFile {
  public:
    /// Reads trailer and superblob; exit code 66 when they are not those of a disk image.
    PWHashedDiskImage(const URL& fileURL, const Platform& platform);

    const UDIFFileHeader& dmgHeader() const noexcept { return signature_.trailer; }
    const foundation::SharedBytes& superblob() const noexcept { return signature_.superblob; }
    const BlobSet& blobs() const noexcept { return signature_.blobs; }

    /// Of an image that was unsigned when it was read.
    const std::optional<Data>& syntheticCDHash() const noexcept { return syntheticCDHash_; }

    /// Offsets and lengths in bytes.
    std::uint64_t origEOF() const noexcept { return signature_.fileSize; }
    std::uint64_t csStart() const noexcept { return signature_.csStart; }
    std::uint64_t csLength() const noexcept { return signature_.csLength; }
    std::uint64_t endOfDMGData() const noexcept { return endOfDMGData_; }

    std::uint32_t numBlobs() const noexcept { return signature_.numBlobs; }

    /// Why trailer and superblob are not those of a disk image, and where in the file; nothing when they are.
    const std::optional<ticket_fault>& fault() const noexcept { return signature_.fault; }

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
    bool makeUpForMissingSignature(const std::string& name);

    void saveDebugCopy(foundation::ByteView signatureAndTrailer, std::optional<Error>& held) const;
    void writeAtEndOfData(files::FileHandle& file, foundation::ByteView signatureAndTrailer,
                          const std::string& name) const;
    bool writeSignature(foundation::SparseBuffer signatureAndTrailer, const URL& target, bool deleteExisting,
                        std::optional<Error>& held);

    disk_image_signature signature_;  // of an unsigned image, the empty one that was made up
    std::optional<Data> syntheticCDHash_;
    std::uint64_t endOfDMGData_ = 0;
};

}  // namespace pinwell
