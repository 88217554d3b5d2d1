// The places of a bundle's parts. foundation::mainExecutableOfBundle finds the main executable, as for the
// ticketed hash; the other places follow from it.
//
// | Layout      | Root of the seal    | Property list                      | Executable               |
// |-------------|---------------------|------------------------------------|--------------------------|
// | application | Contents            | Contents/Info.plist                | one directory below root |
// | framework   | Versions/NAME       | Versions/NAME/Resources/Info.plist | in the root              |
// | flat        | the bundle          | Info.plist, or Resources/Info.plist | in the root              |
//
// NAME is the target of the link Versions/Current: a single name. The seal is _CodeSignature/CodeResources
// below the root of the seal; its paths are relative to that root.
#pragma once

#include <optional>
#include <string>

#include "verify/directory.h"

namespace pinwell::verify {

struct BundleLayout {
    enum class Kind { application, framework, flat };

    Kind kind = Kind::application;
    DirectoryRef bundle;
    DirectoryRef root;       // of the seal
    std::string rootPath;    // of `root`, below the bundle; empty if it is the bundle
    std::string executable;  // path below the root of the seal
    std::string
        propertyList;  // its required place, below the root of the seal; empty if a flat bundle has none
};

/// Throws codesign::CodeError: kStaticCodeNotFound if the directory has no main executable.
BundleLayout layoutOfBundle(const std::string& path);

inline const std::string kSignatureDirectory = "_CodeSignature";
inline const std::string kSealFile = "CodeResources";
inline const std::string kTicketFile = "CodeResources";

/// Two paths joined by a slash, unless one is empty.
inline std::string joined(const std::string& a, const std::string& b) {
    return a.empty() || b.empty() ? a + b : a + "/" + b;
}

}  // namespace pinwell::verify
