// Everything readable about the code at a path and its signature, for people. Damaged parts are described,
// and the parts after them are read too. The code-signing service, not this file, decides whether code is
// good; its verdict is quoted.
//
// Nothing throws; a `problem` describes a fault in one line without a full stop, empty if there is
// none.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "codesign/code_signing.h"
#include "codesign/executable_image.h"
#include "codesign/static_code.h"

namespace pinwell::codesign {

/// One entry of a superblob's index, and the blob at its offset.
struct BlobDescription {
    std::uint32_t slot = 0;
    std::uint32_t offset = 0;             // from the superblob's start, as stated
    std::optional<std::uint32_t> magic;   // `nullopt` if it points outside
    std::optional<std::uint32_t> length;  // with the header, as stated
    std::string problem;
};

struct CodeDirectoryDescription {
    std::uint32_t slot = 0;
    bool chosen = false;  // its hash is the code's cdhash
    std::string problem;  // why it cannot be read; then only the slot is filled in

    std::uint32_t version = 0;
    std::uint32_t flags = 0;
    DigestType digestType = DigestType::sha256;
    std::string identifier;
    std::optional<std::string> teamIdentifier;
    Data codeHash;
};

struct SignatureDescription {
    std::optional<FileRange> place;      // the superblob's area in the file; `nullopt` in the separate form
    std::vector<BlobDescription> blobs;  // in index order; at most kMaximumBlobsDescribed
    std::size_t blobCount = 0;           // of the index, as stated
    std::vector<CodeDirectoryDescription> directories;  // by slot

    std::size_t cmsLength = 0;  // of the signer's message; 0 if there is none
    std::optional<Date> secureTimestamp;

    /// The status of checkValidity for this signature alone, and the reason.
    Status validity = kSuccess;
    std::string problem;
};

/// One slice of a universal image; or the whole file if there are no slices.
struct SliceDescription {
    std::optional<std::uint32_t> cpuType;           // of executable images
    FileRange range;                                // in the file
    bool preferred = false;                         // represents the whole
    std::optional<SignatureDescription> signature;  // `nullopt` if unsigned
    std::string problem;                            // why its signature cannot be searched
};

struct CodeDescription {
    Status status = kSuccess;  // of finding the code
    std::string problem;

    CodeKind kind = CodeKind::opaqueFile;
    bool inBundle = false;
    std::string file;  // path of the file with the code; a bundle's main executable
    std::vector<SliceDescription> slices;

    /// The preferred slice; null if there is none.
    const SliceDescription* preferredSlice() const;
};

/// Only the first blobs of a longer index are described. The parser of a signature has its own limit.
inline constexpr std::size_t kMaximumBlobsDescribed = 1024;

/// The signature in the bytes of a superblob, or of the area reserved for one.
SignatureDescription describeSignature(const base::SharedBytes& area);

/// By default it handles bundles like the service of makeCodeSigningService().
CodeDescription describeCode(const std::string& path,
                             const CodeAccess& access = accessThrough(std::make_shared<base::Places>()));

}  // namespace pinwell::codesign
