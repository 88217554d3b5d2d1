// The seal of a bundle's resources, in the form of code signers: Contents/_CodeSignature/CodeResources.
//
// A property list of four dictionaries: `files2` has the contents of each path, `rules2` determines the
// sealed paths. `files` and `rules` are the same for readers that know only SHA-1 and plain files.
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

    /// A file that may be missing, such as localized resources.
    void addOptionalFile(const std::string& path, foundation::ByteView contents);

    void addLink(const std::string& path, const std::string& target);

    /// Nested code, a file or a bundle: with any of these code hashes. Readers use the first
    /// one.
    void addNestedCode(const std::string& path, const std::vector<foundation::Data>& codeHashes);

    foundation::Data document() const;

  private:
    foundation::Dictionary files_;
    foundation::Dictionary files2_;
};

}  // namespace pinwell::lumora
