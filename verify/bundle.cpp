#include "bundle.h"

#include <algorithm>
#include <utility>

#include "base/byte_io.h"
#include "base/bytes.h"
#include "codesign/code_error.h"
#include "codesign/executable_image.h"
#include "image_layout.h"
#include "page_hashes.h"
#include "values/bundle.h"
#include "values/format.h"
#include "values/property_list.h"

namespace pinwell::verify {

using codesign::CodeError;
using values::format;

namespace {

const std::string kInformation = "Info.plist";
const std::string kResources = "Resources";

// The path of the property list, whatever kind of entry is there. A system follows a link at this place, so
// a link is a fault: the search does not go on elsewhere.
std::string propertyListOf(const BundleLayout& layout) {
    switch (layout.kind) {
        case BundleLayout::Kind::application:
            return kInformation;
        case BundleLayout::Kind::framework:
            return joined(kResources, kInformation);
        case BundleLayout::Kind::flat:
            break;
    }
    if (layout.root->kindOf(kInformation)) return kInformation;
    const bool isBelow = layout.root->kindOf(kResources) == EntryKind::directory &&
                         layout.root->directory(kResources)->kindOf(kInformation);
    return isBelow ? joined(kResources, kInformation) : std::string();
}

/// Throws CodeError: kStaticCodeNotFound if the directory has no main executable.
BundleLayout layoutOfBundle(const std::string& path) {
    BundleLayout layout;
    layout.bundle = OpenDirectory::atPath(path);
    const std::optional<std::string> found = values::mainExecutableOfBundle(path);
    if (!found) throw CodeError(codesign::kStaticCodeNotFound, "the directory has no main executable");
    std::string executable = found->substr(path.size());
    executable.erase(0, executable.find_first_not_of('/'));

    const std::string versions = "Versions/Current/";
    const std::string contents = "Contents/";
    if (executable.starts_with(versions)) {
        layout.kind = BundleLayout::Kind::framework;
        const std::string current = layout.bundle->directory("Versions")->linkTarget("Current");
        layout.rootPath = "Versions/" + current;
        layout.executable = executable.substr(versions.size());
        // A single name: directory() refuses any other.
        layout.root = layout.bundle->directory("Versions")->directory(current);
    } else if (executable.starts_with(contents)) {
        layout.rootPath = "Contents";
        layout.executable = executable.substr(contents.size());
        layout.root = layout.bundle->directory("Contents");
    } else {
        layout.kind = BundleLayout::Kind::flat;
        layout.executable = executable;
        layout.root = layout.bundle;
    }
    layout.propertyList = propertyListOf(layout);
    return layout;
}

/// A property list, or a seal. Longer ones are refused.
constexpr std::uint64_t kMaximumComponent = values::kMaximumPropertyListSize;

/// The result of `read`; `nullopt` if the file does not exist.
template <class Read>
auto readIfThere(const DirectoryRef& root, const std::string& path, Read read)
    -> std::optional<decltype(read(*root->fileAt(path)))> {
    try {
        return read(*root->fileAt(path));
    } catch (const CodeError& error) {
        if (error.status() != codesign::kStaticCodeNotFound) throw;
        return std::nullopt;
    }
}

std::optional<Data> componentAt(const DirectoryRef& root, const std::string& path) {
    if (path.empty()) return std::nullopt;
    return readIfThere(root, path, [&](const base::ByteSource& file) {
        if (file.size() > kMaximumComponent) codesign::refuse(path + " is too long");
        return file.read(0, static_cast<std::size_t>(file.size()));
    });
}

/// A file of the separate form, of any length.
std::optional<codesign::SharedBytes> signatureFileAt(const DirectoryRef& root, const std::string& name) {
    return readIfThere(root, kSignatureDirectory + "/" + name,
                       [](const base::ByteSource& file) { return file.readShared(0, file.size()); });
}

const Data* addressOf(const std::optional<Data>& data) {
    return data ? &*data : nullptr;
}

/// Verifies a bundle's executable that is not an executable image, with its signature in separate files.
VerifiedCode verifySeparately(const base::ByteSource& executable, const BundleLayout& layout,
                              const OutsideComponents& outside, const std::string& place, Workers& workers,
                              Section& section) {
    const std::optional<codesign::SharedBytes> codeDirectory = signatureFileAt(layout.root, "CodeDirectory");
    if (!codeDirectory) return {};
    const std::optional<SignatureParts> parts = SignatureParts::fromSeparateFiles(
        *codeDirectory, signatureFileAt(layout.root, "CodeRequirements"),
        signatureFileAt(layout.root, "CodeSignature").value_or(codesign::SharedBytes()));
    section.pass(kSignature, place, "a well-formed signature");
    checkSigner(*parts, place, section);
    checkAgreement(*parts, place, section);
    checkSpecialSlots(*parts, outside, place, section);
    checkCodeLimit(*parts, executable.size(), "the end of the file", place, section);
    checkPageHashes(executable, {0, executable.size()}, *parts, place, workers, section);
    return {.isSigned = true, .identities = {identityOf(*parts, place)}};
}

/// Whether a directory without a main executable was a signed bundle.
bool hasSignatureFiles(const std::string& path) {
    const DirectoryRef bundle = OpenDirectory::atPath(path);
    if (bundle->kindOf(kSignatureDirectory)) return true;
    if (bundle->kindOf("Contents") != EntryKind::directory) return false;
    const DirectoryRef contents = bundle->directory("Contents");
    return contents->kindOf(kSignatureDirectory) || contents->kindOf(kTicketFile);
}

}  // namespace

void checkExecuteBit(const base::FileSource& file, const std::string& place, Section& section) {
    if (file.hasExecuteBit()) return;
    try {
        if (codesign::isExecutableImage(file) && !isProgram(file)) return;
    } catch (const CodeError&) {
        // The image is damaged; its own checks report that.
    } catch (const base::ShortRead&) {
    } catch (const base::ReadFailure&) {
    }
    section.fail(kBundleStructure, place, "a program that may be executed", "a file without an execute bit");
}

VerifiedCode verifyBundleAt(const std::string& path, const std::string& place, WalkState& state,
                            Section& section) {
    const BundleLayout layout = layoutOfBundle(path);
    const std::string rootPlace = joined(place, layout.rootPath);
    const std::string executablePlace = joined(rootPlace, layout.executable);
    section.place = place;

    const std::optional<Data> list = componentAt(layout.root, layout.propertyList);
    const std::optional<Data> document = componentAt(layout.root, kSignatureDirectory + "/" + kSealFile);
    const OutsideComponents outside{{kSlotPropertyList, {.bytes = addressOf(list)}},
                                    {kSlotResourceSeal, {.bytes = addressOf(document)}}};
    const auto executable = layout.root->fileAt(layout.executable);
    const bool isImage = codesign::isExecutableImage(*executable);
    checkExecuteBit(*executable, executablePlace, section);
    VerifiedCode code =
        isImage ? verifyExecutable(*executable, outside, executablePlace, state.workers, section)
                : verifySeparately(*executable, layout, outside, executablePlace, state.workers, section);

    const std::string sealPlace = joined(rootPlace, kSignatureDirectory + "/" + kSealFile);
    if (!code.isSigned && !document) return code;
    if (!code.isSigned) section.fail(kSignature, executablePlace, "a signature", "none");
    code.isSigned = true;
    if (!document) {
        section.fail(kSeal, sealPlace, "the seal of the bundle's resources", "none");
        return code;
    }
    try {
        const Seal seal = Seal::parse(*document);
        section.pass(kSeal, sealPlace,
                     format("a seal of version %d with %zu entries", seal.version(), seal.entries().size()));
        BundleWalk(layout, rootPlace, path, seal, isImage, state, section, code).run();
    } catch (const std::runtime_error& failure) {
        const CodeError error = codesign::asCodeError(failure);
        if (error.status() == codesign::kIOError) {
            section.cannotRead(kSeal, rootPlace, error.what());
        } else {
            section.fail(kSeal, sealPlace, "a well-formed seal", error.what());
        }
    }
    return code;
}

VerifiedCode verifyBundle(const std::string& path, Workers& workers, Section& section) {
    WalkState state{.workers = workers, .entries = 0, .depth = 0};
    try {
        return verifyBundleAt(path, {}, state, section);
    } catch (const CodeError& error) {
        if (error.status() != codesign::kStaticCodeNotFound || !hasSignatureFiles(path)) throw;
        section.fail(kBundleStructure, "Contents", "one main executable", error.what());
        return {.isSigned = true, .identities = {}};
    }
}

}  // namespace pinwell::verify
