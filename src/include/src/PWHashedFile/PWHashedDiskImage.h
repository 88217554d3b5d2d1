// UDIF disk images.
//
// The ticket is a blob of the code-signature superblob, which is between the image's data and its trailer
// (formats/disk_image.h). The data are never read or written here. An unsigned image gets its superblob with
// its first ticket. It is identified by a synthetic cdhash, which the ticket does not change.
#pragma once

#include "base/bytes.h"
#include "formats/disk_image.h"
#include "src/PWHashedFile/PWHashedFile.h"

namespace pinwell {

/// Describes the file at the time of construction; nothing is read again after a write.
class PWHashedDiskImage : public PWHashedFile {
  public:
    /// Reads trailer and superblob; sets exit code 66 if they are not valid.
    PWHashedDiskImage(const URL& fileURL, const Platform& platform);

    const UDIFFileHeader& dmgHeader() const noexcept { return signature_.trailer; }
    const base::SharedBytes& superblob() const noexcept { return signature_.superblob; }
    const BlobSet& blobs() const noexcept { return signature_.blobs; }

    /// For an image that was unsigned when it was read.
    const std::optional<Data>& syntheticCDHash() const noexcept { return syntheticCDHash_; }

    /// Offsets and lengths in bytes.
    std::uint64_t origEOF() const noexcept { return signature_.fileSize; }
    std::uint64_t csStart() const noexcept { return signature_.csStart; }
    std::uint64_t csLength() const noexcept { return signature_.csLength; }
    std::uint64_t endOfDMGData() const noexcept { return endOfDMGData_; }

    std::uint32_t numBlobs() const noexcept { return signature_.numBlobs; }

    std::optional<TicketPlaceFault> ticketPlaceFault() override { return explainTicketPlace(signature_); }

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

    void saveDebugCopy(base::ByteView signatureAndTrailer, std::optional<Error>& held) const;
    void writeAtEndOfData(files::FileHandle& file, base::ByteView signatureAndTrailer,
                          const std::string& name) const;
    bool writeSignature(base::SparseBuffer signatureAndTrailer, const URL& target, bool deleteExisting,
                        std::optional<Error>& held);

    DiskImageSignature signature_;  // for an unsigned image, an empty one
    std::optional<Data> syntheticCDHash_;
    std::uint64_t endOfDMGData_ = 0;
};

/// The cdhash of a disk image without a signature. The code-signing service signs the whole file ad hoc, as
/// opaque data, into memory; the cdhash of that signature is the image's. The same bytes always give the same
/// cdhash, so a ticket for it can be issued, found and checked.
///
/// Writes the digest type and the cdhash of `fileURL` to the out-parameters that are not null; returns the
/// platform's parameter error if both are null. Returns the status of the failed operation, or success. If
/// the signature has no cdhash, it returns success and leaves the out-parameters unchanged. Reads the whole
/// file, and never changes it.
codesign::Status syntheticCDHashForURL(const values::URL& fileURL, const Platform& platform,
                                       std::uint32_t* digestAlgorithm, std::optional<base::Data>* cdHash);

}  // namespace pinwell
