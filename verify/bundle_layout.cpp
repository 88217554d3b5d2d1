#include "verify/bundle_layout.h"

#include "codesign/code_error.h"
#include "foundation/bundle.h"

namespace pinwell::verify {

using codesign::CodeError;

namespace {

const std::string kInformation = "Info.plist";
const std::string kResources = "Resources";

// An entry of any kind. The system that runs the software follows a link here, so a link is a fault, not a
// reason to search for the list elsewhere.
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

}  // namespace pinwell::verify
