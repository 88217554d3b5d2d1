#include "ad_hoc_signature.h"

#include <algorithm>
#include <array>
#include <utility>

#include "base/byte_io.h"
#include "base/text.h"
#include "crypto/crypto.h"
#include "failure.h"
#include "formats/superblob.h"
#include "values/format.h"
#include "values/property_list.h"

namespace pinwell::lumora {
namespace {

using base::ByteView;
using base::ByteWriter;
using base::Data;
using values::Dictionary;

}  // namespace

base::Data propertyListDocument(const values::Dictionary& dictionary) {
    base::Result<base::Data> document = values::serializePropertyList(dictionary);
    if (!document) throw Failure(EX_SOFTWARE, document.error().localizedDescription());
    return *std::move(document);
}

namespace {

constexpr std::uint32_t kCodeDirectoryMagic = 0xFADE0C02;
constexpr std::uint32_t kRequirementsMagic = 0xFADE0C01;
constexpr std::uint32_t kCodeDirectorySlot = 0;
constexpr std::uint32_t kRequirementsSlot = 2;
constexpr std::uint32_t kCmsSlot = 0x10000;
constexpr std::uint32_t kCodeDirectoryVersion = 0x20400;
constexpr std::size_t kCodeDirectoryHeaderSize = 88;
constexpr std::uint32_t kAdHoc = 2;
constexpr std::uint64_t kMainBinary = 1;
constexpr std::uint8_t kDigestSize = 32;
constexpr std::uint8_t kDigestTypeSha256 = 2;
constexpr unsigned kPageBits = 12;
constexpr std::size_t kPageSize = std::size_t{1} << kPageBits;

std::uint32_t narrow(std::size_t size) {
    return static_cast<std::uint32_t>(size);
}

Data requirementsBlob() {
    return ByteWriter().be32(kRequirementsMagic).be32(kBlobHeaderSize + 4).be32(0).data();
}

Data cmsBlob() {
    return ByteWriter().be32(kWrapperMagic).be32(kBlobHeaderSize).data();
}

}  // namespace

Data AdHocSignature::codeDirectory() const {
    std::map<std::uint32_t, Data> covered = components;
    covered[kRequirementsSlot] = requirementsBlob();
    const std::uint32_t specialSlots = covered.rbegin()->first;
    const std::size_t codeSlots = (code.size() + kPageSize - 1) / kPageSize;
    const std::size_t hashOffset =
        kCodeDirectoryHeaderSize + identifier.size() + 1 + std::size_t{kDigestSize} * specialSlots;

    ByteWriter directory;
    directory.be32(kCodeDirectoryMagic)
        .be32(narrow(hashOffset + kDigestSize * codeSlots))
        .be32(kCodeDirectoryVersion)
        .be32(kAdHoc)
        .be32(narrow(hashOffset))
        .be32(kCodeDirectoryHeaderSize)  // identifier offset
        .be32(specialSlots)
        .be32(narrow(codeSlots))
        .be32(narrow(code.size()))  // limit
        .u8(kDigestSize)
        .u8(kDigestTypeSha256)
        .u8(0)  // platform
        .u8(kPageBits)
        .be32(0)  // spare
        .be32(0)  // scatter offset
        .be32(0)  // team offset
        .be32(0)  // spare
        .be64(0)  // limit as 64 bits: unused
        .be64(0)  // executable segment: offset, length, flags
        .be64(isMainProgram ? code.size() : 0)
        .be64(isMainProgram ? kMainBinary : 0)
        .text(identifier)
        .u8(0);
    for (std::uint32_t slot = specialSlots; slot > 0; --slot) {
        const auto component = covered.find(slot);
        directory.bytes(component == covered.end() ? Data(kDigestSize) : crypto::sha256(component->second));
    }
    for (ByteView rest = code; !rest.empty(); rest = rest.subspan(std::min(kPageSize, rest.size()))) {
        directory.bytes(crypto::sha256(rest.first(std::min(kPageSize, rest.size()))));
    }
    return std::move(directory).take();
}

Data AdHocSignature::codeHash() const {
    constexpr std::size_t kCodeHashSize = 20;
    Data hash = crypto::sha256(codeDirectory());
    hash.resize(kCodeHashSize);
    return hash;
}

Data AdHocSignature::superblob() const {
    const std::array<std::pair<std::uint32_t, Data>, 3> blobs{{
        {kCodeDirectorySlot, codeDirectory()},
        {kRequirementsSlot, requirementsBlob()},
        {kCmsSlot, cmsBlob()},
    }};
    ByteWriter index;
    ByteWriter contents;
    const std::size_t start = kSuperblobHeaderSize + kBlobIndexEntrySize * blobs.size();
    for (const auto& [slot, blob] : blobs) {
        index.be32(slot).be32(narrow(start + contents.size()));
        contents.bytes(blob);
    }
    return ByteWriter()
        .be32(kSuperblobMagic)
        .be32(narrow(start + contents.size()))
        .be32(narrow(blobs.size()))
        .bytes(index.data())
        .bytes(contents.data())
        .data();
}

namespace {

Dictionary ruleOf(double weight, const char* flag = nullptr) {
    Dictionary rule{{"weight", weight}};
    if (flag != nullptr) rule.emplace(flag, true);
    return rule;
}

/// Everything is sealed, and nested code as code. Exceptions: the property list, which has its own slot, and
/// files of the desktop.
Dictionary rules2() {
    return {
        {"^.*", true},
        {"^[^/]+$", ruleOf(10, "nested")},
        {"^(Frameworks|Programs)/", ruleOf(10, "nested")},
        {"^Info\\.plist$", ruleOf(20, "omit")},
        {"^Resources/", ruleOf(20)},
        {"^Resources/.*\\.lproj/", ruleOf(1000, "optional")},
        {"^(.*/)?\\.DS_Store$", ruleOf(2000, "omit")},
    };
}

Dictionary rules() {
    return {{"^Resources/", true}, {"^Resources/.*\\.lproj/", ruleOf(1000, "optional")}};
}

}  // namespace

void ResourceSeal::addFile(const std::string& path, ByteView contents) {
    if (path.starts_with("Resources/")) files_[path] = crypto::sha1(contents);
    files2_[path] = Dictionary{{"hash", crypto::sha1(contents)}, {"hash2", crypto::sha256(contents)}};
}

void ResourceSeal::addOptionalFile(const std::string& path, ByteView contents) {
    files_[path] = Dictionary{{"hash", crypto::sha1(contents)}, {"optional", true}};
    files2_[path] =
        Dictionary{{"hash", crypto::sha1(contents)}, {"hash2", crypto::sha256(contents)}, {"optional", true}};
}

void ResourceSeal::addLink(const std::string& path, const std::string& target) {
    files2_[path] = Dictionary{{"symlink", target}};
}

void ResourceSeal::addNestedCode(const std::string& path, const std::vector<Data>& codeHashes) {
    std::string requirement;
    for (const Data& hash : codeHashes)
        requirement +=
            values::format("%@cdhash H\"%@\"", requirement.empty() ? "" : " or ", base::toHex(hash));
    files2_[path] = Dictionary{{"cdhash", codeHashes.front()}, {"requirement", requirement}};
}

Data ResourceSeal::document() const {
    return propertyListDocument(
        {{"files", files_}, {"files2", files2_}, {"rules", rules()}, {"rules2", rules2()}});
}

}  // namespace pinwell::lumora
