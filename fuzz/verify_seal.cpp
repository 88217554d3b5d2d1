// The seal of a bundle's resources: its list, its rules, and the requirements on nested code.
#include <algorithm>

#include "codesign/code_error.h"
#include "target.h"
#include "verify/requirement.h"
#include "verify/seal.h"

namespace pinwell::fuzz {
namespace {

using verify::Satisfied;
using verify::Seal;
using verify::SealedEntry;

std::optional<Seal> parsed(ByteView document) {
    try {
        return Seal::parse(document);
    } catch (const codesign::CodeError&) {
        return std::nullopt;
    }
}

bool staysInside(std::string_view path) {
    const std::string around = "/" + std::string(path) + "/";
    return around.find("//") == std::string::npos && around.find("/./") == std::string::npos &&
           around.find("/../") == std::string::npos && path.find('\0') == std::string_view::npos;
}

void examineEntry(const Seal& seal, const SealedEntry& entry) {
    require(staysInside(entry.path), "a sealed path is one in the bundle");
    require(seal.find(entry.path) == &entry, "a sealed path is found");
    require(seal.find(entry.path + "/") == nullptr, "no other path is");
    if (entry.kind == SealedEntry::Kind::file)
        require(entry.digest.size() == 20 || entry.digest.size() == verify::kSha256Length,
                "a sealed file has a digest");
}

bool isSame(const std::optional<verify::RuleEffect>& a, const std::optional<verify::RuleEffect>& b) {
    if (!a || !b) return a.has_value() == b.has_value();
    return a->omits == b->omits && a->isOptional == b->isOptional && a->isNested == b->isNested;
}

verify::CodeIdentity someCode() {
    verify::CodeIdentity code;
    code.identifier = "org.example.sample";
    code.codeHashes = {Data(20, std::byte{0xAB})};
    return code;
}

void examineRequirement(std::string_view text) {
    static const verify::CodeIdentity code = someCode();
    const Satisfied plain = verify::satisfies(code, text);
    const Satisfied negated = verify::satisfies(code, "!(" + std::string(text) + ")");
    if (negated == Satisfied::unknown || plain == Satisfied::unknown) return;
    require(negated != plain, "a requirement and its contrary are not both satisfied");
}

}  // namespace

void examine(ByteView input) {
    constexpr std::size_t kLongestRequirement = 4096;
    const std::string text = base::toString(input);
    if (text.size() <= kLongestRequirement) examineRequirement(text);
    const std::optional<Seal> seal = parsed(input);
    if (!seal) return;
    const std::optional<Seal> again = parsed(input);
    require(seal->version() == 1 || seal->version() == 2, "a seal is of a version that there is");
    const std::vector<SealedEntry>& entries = seal->entries();
    require(std::is_sorted(entries.begin(), entries.end(),
                           [](const SealedEntry& a, const SealedEntry& b) { return a.path < b.path; }),
            "sealed paths are in order");
    for (const SealedEntry& entry : entries) {
        examineEntry(*seal, entry);
        if (entry.kind == SealedEntry::Kind::nestedCode) examineRequirement(entry.text);
        require(isSame(seal->ruleFor(entry.path), again->ruleFor(entry.path)),
                "a path is decided by the same rule every time");
    }
    for (const char* const path : {"Info.plist", "Resources/en.lproj/text", "a\nb", "\xFF", ""})
        require(isSame(seal->ruleFor(path), again->ruleFor(path)),
                "any path is decided by the same rule every time");
}

}  // namespace pinwell::fuzz
