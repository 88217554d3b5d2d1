// Signing ad hoc, for the samples: code signatures, the seal of a bundle's resources, and the property lists
// of both.
//
// A code signature is a superblob (formats/superblob.h) of three blobs: a SHA-256 code directory
// (version 0x20400, one hash per page of 4096 bytes), an empty requirements blob, an empty CMS blob.
//
// A seal has the form of code signers: Contents/_CodeSignature/CodeResources. It is a property list of four
// dictionaries: `files2` has the contents of each path, `rules2` determines the sealed paths. `files` and
// `rules` are the same for readers that know only SHA-1 and plain files.
#pragma once

#include <cstdint>
#include <map>
#include <string>
#include <string_view>
#include <vector>

#include "base/bytes.h"
#include "values/value.h"

namespace pinwell::lumora {

/// A property list in XML. Throws Failure when it cannot be made.
base::Data propertyListDocument(const values::Dictionary& dictionary);

struct AdHocSignature {
    std::string identifier;

    /// The bytes under the page hashes: the file from its start to the signature. Borrowed.
    base::ByteView code;

    /// The contents for the special slots, by slot number from 1. The requirements, slot 2, are added; slots
    /// that are not named are zero.
    std::map<std::uint32_t, base::Data> components{};

    /// The code is a program's own image, and not data.
    bool isMainProgram = false;

    /// Its length depends only on the identifier, the length of the code and the highest slot.
    base::Data superblob() const;

    /// The code hash: 20 bytes.
    base::Data codeHash() const;

  private:
    base::Data codeDirectory() const;
};

/// The seal of a bundle. Paths are relative to the directory that the seal's own directory is in.
class ResourceSeal {
  public:
    void addFile(const std::string& path, base::ByteView contents);

    /// A file that may be missing, such as localized resources.
    void addOptionalFile(const std::string& path, base::ByteView contents);

    void addLink(const std::string& path, const std::string& target);

    /// Nested code, a file or a bundle: with any of these code hashes. Readers use the first
    /// one.
    void addNestedCode(const std::string& path, const std::vector<base::Data>& codeHashes);

    base::Data document() const;

  private:
    values::Dictionary files_;
    values::Dictionary files2_;
};

}  // namespace pinwell::lumora
