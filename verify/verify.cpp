#include "verify/verify.h"

#include <optional>
#include <utility>

#include "base/byte_source.h"
#include "base/error.h"
#include "base/places.h"
#include "codesign/code_error.h"
#include "codesign/executable_image.h"
#include "src/PWHashedFile/PWHashedBundle.h"
#include "src/PWHashedFile/PWHashedDiskImage.h"
#include "src/PWHashedFile/PWHashedFlatPackage.h"

namespace pinwell::verify {

namespace {

std::string reasonOf(const base::Error& error) {
    const std::string& reason = error.localizedFailureReason();
    return reason.empty() ? error.localizedDescription() : reason;
}

bool isExecutableImage(const std::string& path) {
    try {
        return codesign::isExecutableImage(codesign::openCode(base::Places(), path));
    } catch (const codesign::CodeError&) {
        return false;
    } catch (const base::ReadFailure&) {
        return false;
    }
}

/// The tool's kind; `none` for a path that it refuses, or accepts only as a fallback.
Kind kindOf(const PWHashedFile& file, bool isFile, const std::string& path) {
    if (dynamic_cast<const PWHashedDiskImage*>(&file) != nullptr && isFile) return Kind::diskImage;
    if (dynamic_cast<const PWHashedFlatPackage*>(&file) != nullptr && isFile) return Kind::package;
    if (dynamic_cast<const PWHashedBundle*>(&file) == nullptr) return Kind::none;
    if (!isFile) return Kind::bundle;
    return isExecutableImage(path) ? Kind::executable : Kind::none;
}

OpenedArtefact refused(std::string problem) {
    return {nullptr, Kind::none, std::move(problem)};
}

VerifiedCode verified(const Subject& subject, Workers& workers, Section& root) {
    switch (subject.kind) {
        case Kind::bundle:
            return verifyBundle(subject.path, workers, root);
        case Kind::executable:
            return verifyExecutable(codesign::openCode(base::Places(), subject.path), {}, "executable",
                                    workers, root);
        case Kind::diskImage:
            return verifyDiskImage(codesign::openCode(base::Places(), subject.path), workers, root);
        case Kind::none:
        case Kind::package:
            break;
    }
    return verifyPackage(codesign::openCode(base::Places(), subject.path), workers, root);
}

}  // namespace

OpenedArtefact openArtefact(const values::URL& url, const Platform& platform) {
    const auto properties = platform.files.resourceProperties(url);
    if (!properties) return refused("The path cannot be read: " + reasonOf(properties.error()) + ".");
    const auto regular = platform.files.isRegularFile(url);
    const bool isFile = regular && *regular;
    if (isFile) {
        if (const auto opened = platform.files.openForReading(url); !opened)
            return refused("The file cannot be read: " + reasonOf(opened.error()) + ".");
    }
    std::shared_ptr<PWHashedFile> file = PWHashedFile::initWithFileURL(url, platform);
    const Kind kind = file ? kindOf(*file, isFile, url.path()) : Kind::none;
    if (kind == Kind::none && properties->isSymbolicLink)
        return refused("This is a symbolic link; what it leads to must be named.");
    if (kind == Kind::none) return refused("This is of no kind that carries a ticket.");
    return {std::move(file), kind, {}};
}

Report verifyArtefact(const Subject& subject, Workers& workers) {
    Report report;
    try {
        report.code = verified(subject, workers, report.root);
    } catch (const std::runtime_error& failure) {
        const codesign::CodeError error = codesign::asCodeError(failure);
        if (error.status() == codesign::kInvalidSignature) {
            report.code.isSigned = true;
            report.root.fail(kSignature, {}, "a well-formed signature", error.what());
        } else {
            report.root.cannotRead(kArtefact, {}, error.what());
        }
    }
    return report;
}

}  // namespace pinwell::verify
