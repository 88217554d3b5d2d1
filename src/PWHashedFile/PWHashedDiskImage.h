// UDIF disk images.
//
// The ticket is a blob of the code-signature superblob, which is between the image's data and its trailer
// (disk_image_signature.h, blob_set.h). The data are never read or written here. An unsigned image gets its
// superblob with its first ticket. It is identified by a synthetic cdhash (synthetic_cdhash.h), which the
// ticket does not change.
#pragma once

#include "foundation/bytes.h"
#include "src/PWHashedFile/PWHashedFile.h"
#include "src/PWHashedFile/disk_image_signature.h"

namespace pinwell {

/// Describes the file at the time of construction; nothing is read again after a write.
class PWHashedDiskImage : public PWHashedFile {
  public:
    /// Reads trailer and superblob; sets exit code 66 if they are not valid.
    PWHashedDiskImage(const URL& fileURL, const Platform& platform);

    const UDIFFileHeader& dmgHeader() const noexcept { return signature_.trailer; }
    const foundation::SharedBytes& superblob() const noexcept { return signature_.superblob; }
    const BlobSet& blobs() const noexcept { return signature_.blobs; }

    /// For an image that was unsigned when it was read.
    const std::optional<Data>& syntheticCDHash() const noexcept { return syntheticCDHash_; }

    /// Offsets and lengths in bytes.
    std::uint64_t origEOF() const noexcept { return signature_.fileSize; }
    std::uint64_t csStart() const noexcept { return signature_.csStart; }
    std::uint64_t csLength() const noexcept { return signature_.csLength; }
    std::uint64_t endOfDMGData() const noexcept { return endOfDMGData_; }

    std::uint32_t numBlobs() const noexcept { return signature_.numBlobs; }

    /// Why trailer or superblob is invalid, with the offset in the file; `nullopt` if both are valid.
    const std::optional<ticket_fault>& fault() const noexcept { return signature_.fault; }

    std::optional<Data> _ticketData() override;
    std::optional<Data> _cdHash() override;

    /// Leaves a copy of the written bytes in the temporary directory. Succeeds without an effect if the
    /// ticket to delete is the only blob.
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

    disk_image_signature signature_;  // for an unsigned image, an empty one
    std::optional<Data> syntheticCDHash_;
    std::uint64_t endOfDMGData_ = 0;
};

}  // namespace pinwell
