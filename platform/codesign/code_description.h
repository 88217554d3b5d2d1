// Everything that can be read of the code at a path and of its signature, for showing it to people: damaged
// parts are described, and what is behind them is read all the same. Whether code is good is not said here
// but by the code-signing service, whose verdict is quoted.
//
// Nothing throws; what went wrong stands in a `problem`, one line without a full stop, empty when all is
// well.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "codesign/code_signing.h"
#include "codesign/executable_image.h"
#include "codesign/static_code.h"

namespace pinwell::codesign {

/// One entry of a superblob's index and what stands where it points.
struct BlobDescription {
    std::uint32_t slot = 0;
    std::uint32_t offset = 0;             // from the superblob's start, as stated
    std::optional<std::uint32_t> magic;   // nothing when it points outside
    std::optional<std::uint32_t> length;  // header included, as stated
    std::string problem;
};

struct CodeDirectoryDescription {
    std::uint32_t slot = 0;
    bool chosen = false;  // its hash is the code's cdhash
    std::string problem;  // why it cannot be read; nothing but the slot is then filled in

    std::uint32_t version = 0;
    std::uint32_t flags = 0;
    DigestType digestType = DigestType::sha256;
    std::string identifier;
    std::optional<std::string> teamIdentifier;
    Data codeHash;
};

struct SignatureDescription {
    std::optional<FileRange> place;      // the superblob's area in the file; nothing in the separate form
    std::vector<BlobDescription> blobs;  // in index order; at most kMaximumBlobsDescribed
    std::size_t blobCount = 0;           // of the index, as stated
    std::vector<CodeDirectoryDescription> directories;  // by slot

    std::size_t cmsLength = 0;  // of the signer's message; 0 when there is none
    std::optional<Date> secureTimestamp;

    /// What checkValidity answers for this signature alone, and why.
    Status validity = kSuccess;
    std::string problem;
};

/// One slice of a universal image; or all there is, where there are no slices.
struct SliceDescription {
    std::optional<std::uint32_t> cpuType;           // of executable images
    FileRange range;                                // in the file
    bool preferred = false;                         // stands for the whole
    std::optional<SignatureDescription> signature;  // nothing when unsigned
    std::string problem;                            // why its signature cannot be looked for
};

struct CodeDescription {
    Status status = kSuccess;  // of finding the code
    std::string problem;

    CodeKind kind = CodeKind::opaqueFile;
    bool inBundle = false;
    std::string file;  // path of what carries the code; a bundle's main executable
    std::vector<SliceDescription> slices;

    /// The preferred slice; null when there is none.
    const SliceDescription* preferredSlice() const;
};

/// Of an index that is longer, the first are described. The parse of a signature has a limit of its own.
inline constexpr std::size_t kMaximumBlobsDescribed = 1024;

/// The signature in the bytes of a superblob, or of the area set aside for one.
SignatureDescription describeSignature(const foundation::SharedBytes& area);

CodeDescription describeCode(const std::string& path, const CodeAccess& access);

/// With bundles as the service of makeCodeSigningService() sees them.
CodeDescription describeCode(const std::string& path);

}  // namespace pinwell::codesign
