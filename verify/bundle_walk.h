// The walk over the files of one bundle, to check them against its seal. For bundle.cpp.
#pragma once

#include <string>

#include "verify/bundle_layout.h"
#include "verify/executable.h"
#include "verify/seal.h"
#include "verify/sealed_files.h"

namespace pinwell::verify {

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
void checkExecuteBit(const OpenFile& file, const std::string& place, Section& section);

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
