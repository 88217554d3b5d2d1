// Deep verification of a bundle: its main executable, the seal of its resources, every file in it, and the
// code nested in it. For bundle.cpp, which verifies a bundle, and bundle_walk.cpp, which walks over its
// files.
//
// The contents of a bundle, and what covers each:
//
// | In the root of the seal             | Covered by                                                        |
// |-------------------------------------|-------------------------------------------------------------------|
// | the main executable                 | its own signature                                                 |
// | the property list                   | special slot 1                                                    |
// | _CodeSignature/CodeResources        | special slot 3                                                    |
// | the rest of _CodeSignature          | nothing; only files of known names are allowed                    |
// | CodeResources (not in a framework)  | it is the ticket, which has a signature of its own                |
// | CodeResources, a link               | nothing; it leads to _CodeSignature/CodeResources                 |
// | a path that the seal lists          | the seal: a digest, a target, or a hash of nested code            |
// | a path that a rule exempts          | nothing, as the signer chose                                      |
// | any other                           | a fault                                                           |
//
// Outside of that root a bundle has nothing, except the links of a framework that name its current version.
// Nested code is verified like a bundle or an image, with its own section.
//
// The places of a bundle's parts. values::mainExecutableOfBundle finds the main executable, as for the
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

#include <cstddef>
#include <string>
#include <vector>

#include "seal.h"
#include "verify/check.h"
#include "verify/code.h"
#include "verify/directory.h"
#include "verify/workers.h"

namespace pinwell::verify {

/// Maximum depth and number of directory entries of a bundle, with its nested bundles.
inline constexpr unsigned kMaximumWalkDepth = 64;
inline constexpr std::size_t kMaximumWalkEntries = 1'000'000;

struct BundleLayout {
    enum class Kind { application, framework, flat };

    Kind kind = Kind::application;
    DirectoryRef bundle;
    DirectoryRef root;       // of the seal
    std::string rootPath;    // of `root`, below the bundle; empty if it is the bundle
    std::string executable;  // path below the root of the seal

    /// Its required place, below the root of the seal. Empty if a flat bundle has none.
    std::string propertyList;
};

inline const std::string kSignatureDirectory = "_CodeSignature";
inline const std::string kSealFile = "CodeResources";
inline const std::string kTicketFile = "CodeResources";

/// Two paths joined by a slash, unless one is empty.
inline std::string joined(const std::string& a, const std::string& b) {
    return a.empty() || b.empty() ? a + b : a + "/" + b;
}

/// Shared by the walks over a bundle and over its nested bundles.
struct WalkState {
    Workers& workers;
    std::size_t entries = 0;  // directory entries so far
    unsigned depth = 0;       // directories and bundles around the current one
};

/// Verifies the bundle at `path`, which is at `place` in the artefact.
VerifiedCode verifyBundleAt(const std::string& path, const std::string& place, WalkState& state,
                            Section& section);

/// Checks that a program has an execute permission: without it, the program does not start.
void checkExecuteBit(const base::FileSource& file, const std::string& place, Section& section);

class BundleWalk {
  public:
    /// `rootPlace`: the place of the seal's root in the artefact. `bundlePath`: the bundle's path on disk.
    /// The identities of nested code go into `code`.
    BundleWalk(const BundleLayout& layout, std::string rootPlace, std::string bundlePath, const Seal& seal,
               bool isImage, WalkState& state, Section& section, VerifiedCode& code);

    /// Throws codesign::CodeError if a directory cannot be read, or exceeds the limits.
    void run();

  private:
    void checkAround();
    void checkFrameworkAround();
    void walk(const DirectoryRef& directory, const std::string& relative);
    void visit(const DirectoryRef& directory, const Entry& entry, const std::string& relative);
    bool visitSpecial(const DirectoryRef& directory, const Entry& entry, const std::string& relative);
    void visitSignatureDirectory(const DirectoryRef& directory);
    void visitSealed(const DirectoryRef& directory, const Entry& entry, const SealedEntry& sealed);
    void visitUnsealed(const DirectoryRef& directory, const Entry& entry, const std::string& relative);
    const char* faultOfOmitted(const DirectoryRef& directory, const Entry& entry,
                               const std::string& relative) const;
    void visitLink(const DirectoryRef& directory, const Entry& entry, const SealedEntry& sealed);
    void visitNested(const DirectoryRef& directory, const Entry& entry, const SealedEntry& sealed);
    void bindNested(VerifiedCode nested, const SealedEntry& sealed, Section& section);
    void reportMissing();

    std::string placeOf(const std::string& relative) const;
    std::vector<Entry> entriesOf(const DirectoryRef& directory);

    const BundleLayout& layout_;
    const std::string rootPlace_;
    const std::string bundlePath_;
    const Seal& seal_;
    const bool isImage_;
    WalkState& state_;
    Section& section_;
    VerifiedCode& code_;

    SealedFiles files_;
    FailureList unsealed_;
    FailureList omitted_;
    FailureList emptyDirectories_;
    FailureList links_;
    std::size_t goodLinks_ = 0;
};

}  // namespace pinwell::verify
