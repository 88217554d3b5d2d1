#include "verify/bundle_layout.h"

#include "codesign/code_error.h"
#include "foundation/bundle.h"

namespace pinwell::verify {

using codesign::CodeError;

namespace {

constexpr std::string_view kInformation = "Info.plist";
constexpr std::string_view kResourcesInformation = "Resources/Info.plist";

bool isFile(const DirectoryRef& root, std::string_view path) {
    try {
        root->fileAt(path);
        return true;
    } catch (const CodeError& error) {
        if (error.status() != codesign::kStaticCodeNotFound) throw;
        return false;
    }
}

}  // namespace

BundleLayout layoutOfBundle(const std::string& path) {
    BundleLayout layout;
    layout.bundle = OpenDirectory::atPath(path);
    const std::optional<std::string> found = foundation::mainExecutableOfBundle(path);
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
        // A name alone: directory() refuses any other.
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
    const bool isFramework = layout.kind == BundleLayout::Kind::framework;
    for (const std::string_view candidate : {isFramework ? kResourcesInformation : kInformation,
                                             isFramework ? std::string_view() : kResourcesInformation}) {
        if (candidate.empty() || !isFile(layout.root, candidate)) continue;
        layout.propertyList = candidate;
        break;
    }
    return layout;
}

}  // namespace pinwell::verify
