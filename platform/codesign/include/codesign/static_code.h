// Code at a path: the file that represents it and the place of its signature.
//
// | At the path                            | Stands for it       | Signature                             |
// |----------------------------------------|---------------------|---------------------------------------|
// | a file that ends in an image's trailer | the file            | superblob that the trailer gives      |
// | a file that begins as executable image | the file            | superblob that its best slice gives   |
// | any other file                         | the file            | none of its own                       |
// | a directory, its executable an image   | the main executable | superblob that its best slice gives   |
// | a directory, its executable no image   | the main executable | three files in Contents/_CodeSignature |
//
// The files of that separate form are `CodeDirectory` and `CodeRequirements`, blobs as in a superblob, and
// `CodeSignature`, the bare CMS message. A file that ends in a trailer is not an executable image. A link in
// the last component is not followed, here and for the files of the separate form.
#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "base/byte_source.h"
#include "base/places.h"
#include "codesign/code_signature.h"
#include "codesign/executable_image.h"
#include "formats/disk_image.h"

namespace pinwell::codesign {

/// A disk image's trailer (formats/disk_image.h), as far as its signature needs it. A value.
class DiskImageTrailer {
  public:
    /// The trailer at the end of `source`; `nullopt` if there is none. Throws CodeError only if the bytes
    /// cannot be read.
    static std::optional<DiskImageTrailer> read(const ByteSource& source);

    /// The fields, as stored.
    const UDIFFileHeader& header() const noexcept { return header_; }

    /// The offset of the trailer itself.
    std::uint64_t offset() const noexcept { return offset_; }

    /// The signature's place according to the trailer, unchecked; `nullopt` if offset or length is
    /// zero.
    std::optional<FileRange> signature() const;

    /// The end of the image's signed part: the start of a signature that ends at the trailer, otherwise the
    /// trailer. So inserting a signature before the trailer does not change the signed part.
    std::uint64_t signedLimit() const;

    /// The bytes that a signature covers: the trailer with both of its signature fields zeroed.
    Data canonicalBytes() const;

  private:
    DiskImageTrailer(const UDIFFileHeader& header, std::uint64_t offset) : header_(header), offset_(offset) {}

    UDIFFileHeader header_;
    std::uint64_t offset_;
};

/// The path of the main executable of a directory opened as a bundle; `nullopt` if it has none.
using MainExecutableFinder =
    std::function<std::optional<std::string>(base::Places&, const std::string& bundlePath)>;

/// Access to code. Copies share the places.
struct CodeAccess {
    std::shared_ptr<base::Places> places;
    MainExecutableFinder finder;
};

/// Access through `places`, with the bundles' main executables.
CodeAccess accessThrough(std::shared_ptr<base::Places> places);

enum class CodeKind { executableImage, diskImage, opaqueFile, separatelySigned };

/// The components of a signature in separate files, from their directory; `nullopt` if there is no code
/// directory. Throws CodeError.
std::optional<SignatureComponents> componentsOfSeparateFiles(const base::Places& places,
                                                             const std::string& directory);

/// The StaticCode of this service. Keeps the file and its bundle open, so that all results are about one file
/// even if its path changes; keeps the signature after reading it. Links that lead out of the bundle are not
/// followed.
class FileCode final : public StaticCode {
  public:
    /// Throws CodeError: kStaticCodeNotFound if nothing there could be code, kIOError if it cannot be
    /// read.
    static std::shared_ptr<FileCode> atPath(const std::string& path, const CodeAccess& access);

    CodeKind kind() const noexcept { return kind_; }
    bool inBundle() const noexcept { return !signatureDirectory_.empty(); }
    const std::string& file() const noexcept { return file_; }

    /// The components of its signature in separate files, like componentsOfSeparateFiles().
    std::optional<SignatureComponents> separateComponents() const {
        return componentsOfSeparateFiles(*places_, signatureDirectory_);
    }

    const ByteSource& source() const noexcept { return *source_; }
    const std::optional<DiskImageTrailer>& trailer() const noexcept { return trailer_; }

    /// The superblob's place according to a disk image's trailer; `nullopt` if unsigned, or not a disk image.
    /// Throws CodeError if it reaches into the trailer.
    std::optional<FileRange> diskImageSignature() const;

    /// Adds the components in the file itself to the components of a superblob.
    SignatureComponents completed(SignatureComponents components) const;

    /// The signature; `nullopt` if the code is not signed. Throws CodeError or base::ShortRead.
    const std::optional<CodeSignature>& signature() const;

    /// The signatures of all slices, in the order of the slices; the code's only signature if there are no
    /// slices. Unsigned slices have no entry. Throws CodeError or base::ShortRead.
    std::vector<CodeSignature> allSignatures() const;

    /// Uses the signature in `superblob` from now on. Throws CodeError or base::ShortRead.
    void setDetachedSignature(const SharedBytes& superblob);

  private:
    FileCode(CodeKind kind, std::string file, std::unique_ptr<ByteSource> source,
             std::optional<DiskImageTrailer> trailer, std::string signatureDirectory,
             std::shared_ptr<base::Places> places, base::Anchor anchor);

    std::optional<CodeSignature> readSignature() const;
    std::optional<CodeSignature> signatureFrom(const SharedBytes& superblob) const;

    CodeKind kind_;
    std::string file_;  // a bundle's main executable, or the file itself
    std::unique_ptr<ByteSource> source_;
    std::optional<DiskImageTrailer> trailer_;
    std::string signatureDirectory_;  // of a bundle; empty for a plain file
    std::shared_ptr<base::Places> places_;
    base::Anchor anchor_;  // of the code's path

    // Read on first use; the inner one is empty for unsigned code.
    mutable std::optional<std::optional<CodeSignature>> signature_;
};

}  // namespace pinwell::codesign
