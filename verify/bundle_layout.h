// Where the parts of a bundle are. The main executable is found by foundation::mainExecutableOfBundle, which
// is what the ticketed hash is found by; the rest follows from where it is.
//
// | Layout      | Root of the seal    | Property list                      | Executable               |
// |-------------|---------------------|------------------------------------|--------------------------|
// | application | Contents            | Contents/Info.plist                | one directory below root |
// | framework   | Versions/NAME       | Versions/NAME/Resources/Info.plist | in the root              |
// | flat        | the bundle          | Info.plist, or Resources/Info.plist | in the root              |
//
// NAME is what the link Versions/Current says, one name. The seal is _CodeSignature/CodeResources below the
// root of the seal, and what it lists is named from there.
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
    std::string rootPath;    // of it, below the bundle; empty if it is the bundle
    std::string executable;  // path below the root of the seal
    std::string
        propertyList;  // where it must be, below the root of the seal; empty if a flat bundle has none
};

/// Throws codesign::CodeError: kStaticCodeNotFound if the directory has no main executable.
BundleLayout layoutOfBundle(const std::string& path);

inline const std::string kSignatureDirectory = "_CodeSignature";
inline const std::string kSealFile = "CodeResources";
inline const std::string kTicketFile = "CodeResources";

/// Two paths with a slash between, unless one is empty.
inline std::string joined(const std::string& a, const std::string& b) {
    return a.empty() || b.empty() ? a + b : a + "/" + b;
}

}  // namespace pinwell::verify
