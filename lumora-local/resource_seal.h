// The seal of a bundle's resources, as signers write it: Contents/_CodeSignature/CodeResources.
//
// A property list of four dictionaries: `files2` says of each path what it holds, `rules2` which paths are to
// be sealed at all; `files` and `rules` say the same to readers that know SHA-1 and plain files alone.
#pragma once

#include <string>
#include <string_view>
#include <vector>

#include "foundation/bytes.h"
#include "foundation/value.h"

namespace pinwell::lumora {

/// Paths are relative to the directory that the seal's own directory is in.
class ResourceSeal {
  public:
    void addFile(const std::string& path, foundation::ByteView contents);

    /// One that may be missing, as localized resources may.
    void addOptionalFile(const std::string& path, foundation::ByteView contents);

    void addLink(const std::string& path, const std::string& target);

    /// Nested code, a file or a bundle: any of these code hashes, of which the first is the one that readers
    /// look at.
    void addNestedCode(const std::string& path, const std::vector<foundation::Data>& codeHashes);

    foundation::Data document() const;

  private:
    foundation::Dictionary files_;
    foundation::Dictionary files2_;
};

}  // namespace pinwell::lumora
