#include "codesign/static_code.h"

#include "codesign/code_error.h"
#include "codesign/executable_image.h"
#include "codesign/superblob.h"
#include "values/bundle.h"

namespace pinwell::codesign {

std::optional<DiskImageTrailer> DiskImageTrailer::read(const ByteSource& source) {
    if (source.size() < kUDIFHeaderSize) return std::nullopt;
    const std::uint64_t offset = source.size() - kUDIFHeaderSize;
    UDIFFileHeader header;
    const bool isWhole = header.assign(source.read(offset, kUDIFHeaderSize));
    if (!isWhole || !header.hasMagic() || header.version() != kUDIFVersion) return std::nullopt;
    return DiskImageTrailer(header, offset);
}

std::optional<FileRange> DiskImageTrailer::signature() const {
    const FileRange range{header_.codeSignOffset(), header_.codeSignLength()};
    if (range.offset == 0 || range.length == 0) return std::nullopt;
    return range;
}

std::uint64_t DiskImageTrailer::signedLimit() const {
    const std::optional<FileRange> area = signature();
    const bool endsAtTrailer = area && area->offset <= offset_ && area->length == offset_ - area->offset;
    return endsAtTrailer ? area->offset : offset_;
}

Data DiskImageTrailer::canonicalBytes() const {
    UDIFFileHeader canonical = header_;
    canonical.setCodeSign(0, 0);
    return base::toData(canonical.bytes());
}

CodeAccess accessThrough(std::shared_ptr<base::Places> places) {
    return {std::move(places), [](base::Places& all, const std::string& path) {
                return values::mainExecutableOfBundle(all, path);
            }};
}

namespace {

/// A whole file of the separate form; `nullopt` if it does not exist.
std::optional<SharedBytes> readSignatureFile(const base::Places& places, const std::string& path) {
    try {
        const base::FileSource file = openCode(places, path);
        return file.readShared(0, file.size());
    } catch (const CodeError& error) {
        if (error.status() == kStaticCodeNotFound) return std::nullopt;
        throw;
    }
}

}  // namespace

std::optional<SignatureComponents> componentsOfSeparateFiles(const base::Places& places,
                                                             const std::string& directory) {
    std::optional<SharedBytes> codeDirectory = readSignatureFile(places, directory + "/CodeDirectory");
    if (!codeDirectory) return std::nullopt;
    SignatureComponents components;
    components.blobs.emplace(kSlotCodeDirectory, std::move(*codeDirectory));
    if (std::optional<SharedBytes> requirements =
            readSignatureFile(places, directory + "/CodeRequirements")) {
        components.blobs.emplace(kSlotRequirements, std::move(*requirements));
    }
    components.cms = readSignatureFile(places, directory + "/CodeSignature").value_or(SharedBytes());
    return components;
}

FileCode::FileCode(CodeKind kind, std::string file, std::unique_ptr<ByteSource> source,
                   std::optional<DiskImageTrailer> trailer, std::string signatureDirectory,
                   std::shared_ptr<base::Places> places, base::Anchor anchor)
    : kind_(kind),
      file_(std::move(file)),
      source_(std::move(source)),
      trailer_(trailer),
      signatureDirectory_(std::move(signatureDirectory)),
      places_(std::move(places)),
      anchor_(std::move(anchor)) {}

std::shared_ptr<FileCode> FileCode::atPath(const std::string& path, const CodeAccess& access) {
    base::Result<base::Anchor> anchor = access.places->hold(path);
    if (!anchor) throw CodeError(statusOfLookup(anchor.error().code()), "cannot examine the path");
    const bool bundle = (*anchor)->isTree();
    const std::optional<std::string> file = bundle ? access.finder(*access.places, path) : path;
    if (!file) throw CodeError(kStaticCodeNotFound, "the directory has no main executable");

    auto source = std::make_unique<base::FileSource>(openCode(*access.places, *file));
    std::optional<DiskImageTrailer> trailer = DiskImageTrailer::read(*source);
    CodeKind kind = CodeKind::opaqueFile;
    if (trailer) {
        kind = CodeKind::diskImage;
    } else if (isExecutableImage(*source)) {
        kind = CodeKind::executableImage;
    }
    if (bundle && kind != CodeKind::executableImage) {
        kind = CodeKind::separatelySigned;
        trailer.reset();
    }
    std::string signatureDirectory = bundle ? path + "/Contents/_CodeSignature" : std::string();
    return std::shared_ptr<FileCode>(new FileCode(kind, *file, std::move(source), trailer,
                                                  std::move(signatureDirectory), access.places,
                                                  *std::move(anchor)));
}

SignatureComponents FileCode::completed(SignatureComponents components) const {
    if (trailer_) components.blobs.emplace(kSlotTrailer, trailer_->canonicalBytes());
    return components;
}

std::optional<CodeSignature> FileCode::signatureFrom(const SharedBytes& superblob) const {
    return CodeSignature::parse(completed(componentsOfSuperBlob(superblob)));
}

std::optional<FileRange> FileCode::diskImageSignature() const {
    const std::optional<FileRange> area = trailer_ ? trailer_->signature() : std::nullopt;
    if (area && (area->offset > trailer_->offset() || area->length > trailer_->offset() - area->offset)) {
        refuse("the signature reaches into the disk image's trailer");
    }
    return area;
}

std::optional<CodeSignature> FileCode::readSignature() const {
    std::optional<FileRange> area;
    switch (kind_) {
        case CodeKind::opaqueFile:
            return std::nullopt;
        case CodeKind::separatelySigned: {
            std::optional<SignatureComponents> components = separateComponents();
            return components ? CodeSignature::parse(*std::move(components)) : std::nullopt;
        }
        case CodeKind::diskImage:
            area = diskImageSignature();
            break;
        case CodeKind::executableImage:
            area = findImageSignature(*source_, preferredSlice(readSlices(*source_)));
            break;
    }
    if (!area) return std::nullopt;
    return signatureFrom(readSuperBlob(*source_, area->offset, area->length));
}

const std::optional<CodeSignature>& FileCode::signature() const {
    if (!signature_) signature_ = std::make_optional(readSignature());
    return *signature_;
}

std::vector<CodeSignature> FileCode::allSignatures() const {
    std::vector<CodeSignature> all;
    if (kind_ != CodeKind::executableImage) {
        if (signature()) all.push_back(*signature());
        return all;
    }
    for (const ImageSlice& slice : readSlices(*source_)) {
        const std::optional<FileRange> area = findImageSignature(*source_, slice);
        if (!area) continue;
        std::optional<CodeSignature> found =
            signatureFrom(readSuperBlob(*source_, area->offset, area->length));
        if (found) all.push_back(std::move(*found));
    }
    return all;
}

void FileCode::setDetachedSignature(const SharedBytes& superblob) {
    std::optional<CodeSignature> detached = signatureFrom(superblob);
    if (!detached) refuse("the detached signature has no code directory");
    signature_ = std::make_optional(std::move(detached));
}

}  // namespace pinwell::codesign
