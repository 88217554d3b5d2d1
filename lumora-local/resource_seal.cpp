#include "lumora-local/resource_seal.h"

#include "foundation/format.h"
#include "lumora-local/property_list_document.h"
#include "lumora-local/sha256.h"

namespace pinwell::lumora {

using foundation::ByteView;
using foundation::Data;
using foundation::Dictionary;

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
    if (path.starts_with("Resources/")) files_[path] = sha1(contents);
    files2_[path] = Dictionary{{"hash", sha1(contents)}, {"hash2", sha256(contents)}};
}

void ResourceSeal::addOptionalFile(const std::string& path, ByteView contents) {
    files_[path] = Dictionary{{"hash", sha1(contents)}, {"optional", true}};
    files2_[path] = Dictionary{{"hash", sha1(contents)}, {"hash2", sha256(contents)}, {"optional", true}};
}

void ResourceSeal::addLink(const std::string& path, const std::string& target) {
    files2_[path] = Dictionary{{"symlink", target}};
}

void ResourceSeal::addNestedCode(const std::string& path, const std::vector<Data>& codeHashes) {
    std::string requirement;
    for (const Data& hash : codeHashes)
        requirement += foundation::format("%@cdhash H\"%@\"", requirement.empty() ? "" : " or ",
                                          foundation::toHex(hash));
    files2_[path] = Dictionary{{"cdhash", codeHashes.front()}, {"requirement", requirement}};
}

Data ResourceSeal::document() const {
    return propertyListDocument(
        {{"files", files_}, {"files2", files2_}, {"rules", rules()}, {"rules2", rules2()}});
}

}  // namespace pinwell::lumora
