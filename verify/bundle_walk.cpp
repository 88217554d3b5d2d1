// The walk over the files of one bundle.
#include <algorithm>
#include <array>
#include <utility>

#include "base/text.h"
#include "bundle.h"
#include "codesign/code_error.h"
#include "codesign/executable_image.h"
#include "requirement.h"
#include "values/format.h"

namespace pinwell::verify {

using codesign::CodeError;
using values::format;

namespace {

const std::string kCompatibilityTarget = kSignatureDirectory + "/" + kSealFile;

/// The files of the separate form, and files of older signers.
constexpr std::array<std::string_view, 4> kSignatureFiles{"CodeDirectory", "CodeRequirements",
                                                          "CodeSignature", "CodeEntitlements"};

const char* kindName(EntryKind kind) {
    switch (kind) {
        case EntryKind::file:
            return "a file";
        case EntryKind::directory:
            return "a directory";
        case EntryKind::link:
            return "a symbolic link";
        case EntryKind::other:
            break;
    }
    return "something special";
}

/// Counts a level of depth during its walk.
class Descent {
  public:
    explicit Descent(WalkState& state) : state_(state) {
        if (++state_.depth > kMaximumWalkDepth) {
            --state_.depth;
            throw CodeError(codesign::kUnimplemented, "the bundle is too deep");
        }
    }
    ~Descent() { --state_.depth; }
    Descent(const Descent&) = delete;
    Descent& operator=(const Descent&) = delete;

  private:
    WalkState& state_;
};

}  // namespace

BundleWalk::BundleWalk(const BundleLayout& layout, std::string rootPlace, std::string bundlePath,
                       const Seal& seal, bool isImage, WalkState& state, Section& section, VerifiedCode& code)
    : layout_(layout),
      rootPlace_(std::move(rootPlace)),
      bundlePath_(std::move(bundlePath)),
      seal_(seal),
      isImage_(isImage),
      state_(state),
      section_(section),
      code_(code),
      files_(state.workers, section),
      unsealed_(section, kUnsealed),
      omitted_(section, kUnsealed),
      emptyDirectories_(section, kUnsealed),
      links_(section, kSealedLink) {}

std::string BundleWalk::placeOf(const std::string& relative) const {
    return joined(rootPlace_, relative);
}

std::vector<Entry> BundleWalk::entriesOf(const DirectoryRef& directory) {
    std::vector<Entry> entries = directory->entries(kMaximumWalkEntries - state_.entries);
    state_.entries += entries.size();
    return entries;
}

void BundleWalk::run() {
    checkAround();
    walk(layout_.root, {});
    files_.finish();
    reportMissing();
    if (links_.count() == 0)
        section_.pass(kSealedLink, rootPlace_, format("%zu links with their targets", goodLinks_));
    if (unsealed_.count() == 0)
        section_.pass(kUnsealed, rootPlace_, "nothing that neither the seal nor a rule names");
}

// Checks the entries of the bundle outside of the seal's root.
void BundleWalk::checkAround() {
    if (layout_.kind == BundleLayout::Kind::flat) return;
    if (layout_.kind == BundleLayout::Kind::framework) return checkFrameworkAround();
    for (const Entry& entry : entriesOf(layout_.bundle))
        if (entry.name != layout_.rootPath)
            unsealed_.add(Outcome::failed, joined(section_.place, entry.name), "nothing beside Contents",
                          kindName(entry.kind));
}

void BundleWalk::checkFrameworkAround() {
    const std::string current = layout_.rootPath.substr(layout_.rootPath.rfind('/') + 1);
    for (const Entry& entry : entriesOf(layout_.bundle)) {
        if (entry.name == "Versions" && entry.kind == EntryKind::directory) continue;
        const std::string place = joined(section_.place, entry.name);
        if (entry.kind != EntryKind::link) {
            unsealed_.add(Outcome::failed, place, "links to the current version, and nothing else",
                          kindName(entry.kind));
            continue;
        }
        const std::string target = layout_.bundle->linkTarget(entry.name);
        const std::string wanted = "Versions/Current/" + entry.name;
        if (target == wanted || target == joined(layout_.rootPath, entry.name)) {
            ++goodLinks_;
        } else {
            links_.add(Outcome::failed, place, wanted, target);
        }
    }
    for (const Entry& entry : entriesOf(layout_.bundle->directory("Versions")))
        if (entry.name != "Current" && entry.name != current)
            unsealed_.add(Outcome::failed, joined(section_.place, "Versions/" + entry.name),
                          "no version but the current one", kindName(entry.kind));
}

void BundleWalk::walk(const DirectoryRef& directory, const std::string& relative) {
    const Descent descent(state_);
    const std::vector<Entry> entries = entriesOf(directory);
    // The seal lists no directories, so an empty one may have been added after signing.
    if (entries.empty())
        emptyDirectories_.add(Outcome::noted, placeOf(relative), "a directory that holds something",
                              "an empty directory, which no seal can list");
    for (const Entry& entry : entries) visit(directory, entry, joined(relative, entry.name));
}

void BundleWalk::visit(const DirectoryRef& directory, const Entry& entry, const std::string& relative) {
    if (visitSpecial(directory, entry, relative)) return;
    if (const SealedEntry* const sealed = seal_.find(relative)) return visitSealed(directory, entry, *sealed);
    if (entry.kind == EntryKind::directory) return walk(directory->directory(entry.name), relative);
    visitUnsealed(directory, entry, relative);
}

// Handles entries that something other than the seal covers.
bool BundleWalk::visitSpecial(const DirectoryRef& directory, const Entry& entry,
                              const std::string& relative) {
    if (relative == layout_.executable) return true;
    if (relative == kSignatureDirectory && entry.kind == EntryKind::directory) {
        visitSignatureDirectory(directory->directory(entry.name));
        return true;
    }
    if (relative == kTicketFile && entry.kind == EntryKind::file &&
        layout_.kind == BundleLayout::Kind::application) {
        // Only the artefact's own ticket is judged; a nested one has no effect.
        if (!section_.place.empty())
            section_.note(kUnsealed, placeOf(relative), "nothing",
                          "a ticket of nested code, which is not judged");
        return true;
    }
    if (relative == kTicketFile && entry.kind == EntryKind::link &&
        directory->linkTarget(entry.name) == kCompatibilityTarget)
        return true;
    // Special slot 1 covers it; if the seal lists it too, the seal is checked as well.
    return relative == layout_.propertyList && entry.kind == EntryKind::file &&
           seal_.find(relative) == nullptr;
}

void BundleWalk::visitSignatureDirectory(const DirectoryRef& directory) {
    for (const Entry& entry : entriesOf(directory)) {
        if (entry.name == kSealFile && entry.kind == EntryKind::file) continue;
        const std::string place = placeOf(kSignatureDirectory + "/" + entry.name);
        const bool isKnown =
            entry.kind == EntryKind::file &&
            std::find(kSignatureFiles.begin(), kSignatureFiles.end(), entry.name) != kSignatureFiles.end();
        if (isKnown && !isImage_) continue;
        if (isKnown) {
            section_.note(kUnsealed, place, "nothing", "a signature file that nothing reads");
        } else {
            unsealed_.add(Outcome::failed, place, "the files of a signature", kindName(entry.kind));
        }
    }
}

void BundleWalk::visitSealed(const DirectoryRef& directory, const Entry& entry, const SealedEntry& sealed) {
    sealed.isFound = true;
    const std::string place = placeOf(sealed.path);
    switch (sealed.kind) {
        case SealedEntry::Kind::link:
            if (entry.kind == EntryKind::link) return visitLink(directory, entry, sealed);
            links_.add(Outcome::failed, place, "a symbolic link to " + sealed.text, kindName(entry.kind));
            break;
        case SealedEntry::Kind::nestedCode:
            if (entry.kind == EntryKind::file || entry.kind == EntryKind::directory)
                return visitNested(directory, entry, sealed);
            section_.fail(kNestedCode, place, "nested code", kindName(entry.kind));
            break;
        case SealedEntry::Kind::file:
            if (entry.kind == EntryKind::file) return files_.add(directory, entry.name, sealed, place);
            section_.fail(kSealedFile, place, "a file", kindName(entry.kind));
            break;
    }
    // A directory instead of the sealed entry may contain anything.
    if (entry.kind == EntryKind::directory) walk(directory->directory(entry.name), sealed.path);
}

void BundleWalk::visitUnsealed(const DirectoryRef& directory, const Entry& entry,
                               const std::string& relative) {
    const std::optional<RuleEffect> rule = seal_.ruleFor(relative);
    if (!rule || !rule->omits) {
        unsealed_.add(
            Outcome::failed, placeOf(relative), "a file that the seal lists, or none",
            rule ? "a file that is not sealed" : "a file that is not sealed, and that no rule names");
    } else if (const char* const fault = faultOfOmitted(directory, entry, relative); fault != nullptr) {
        unsealed_.add(Outcome::failed, placeOf(relative), "a plain file where a rule lets it out", fault);
    } else {
        omitted_.add(Outcome::noted, placeOf(relative), "a file that the seal lists, or none",
                     "a file that a rule lets out");
    }
}

/// The fault of an entry that no rule may exempt; null if there is none.
const char* BundleWalk::faultOfOmitted(const DirectoryRef& directory, const Entry& entry,
                                       const std::string& relative) const {
    switch (entry.kind) {
        case EntryKind::file:
            return codesign::isExecutableImage(*directory->file(entry.name)) ? "code that nothing covers"
                                                                             : nullptr;
        case EntryKind::link:
            return leadsInside(layout_.bundle, joined(layout_.rootPath, relative))
                       ? nullptr
                       : "a link that leads out of the bundle";
        case EntryKind::directory:
        case EntryKind::other:
            break;
    }
    return "something special";
}

void BundleWalk::visitLink(const DirectoryRef& directory, const Entry& entry, const SealedEntry& sealed) {
    const std::string place = placeOf(sealed.path);
    const std::string target = directory->linkTarget(entry.name);
    if (target != sealed.text) {
        links_.add(Outcome::failed, place, sealed.text, target);
    } else if (!leadsInside(layout_.bundle, joined(layout_.rootPath, sealed.path))) {
        links_.add(Outcome::failed, place, "a link that stays inside the bundle", target);
    } else {
        ++goodLinks_;
    }
}

void BundleWalk::visitNested(const DirectoryRef& directory, const Entry& entry, const SealedEntry& sealed) {
    const Descent descent(state_);
    const std::string place = placeOf(sealed.path);
    Section nested{.place = place, .checks = {}, .sections = {}};
    VerifiedCode code;
    try {
        if (entry.kind == EntryKind::directory) {
            code = verifyBundleAt(joined(joined(bundlePath_, layout_.rootPath), sealed.path), place, state_,
                                  nested);
        } else if (const auto file = directory->file(entry.name); codesign::isExecutableImage(*file)) {
            checkExecuteBit(*file, place, nested);
            code = verifyExecutable(*file, {}, place, state_.workers, nested);
        }
    } catch (const std::runtime_error& failure) {
        nested.failWith(failure, kNestedCode, place, "signed code");
    }
    bindNested(std::move(code), sealed, nested);
    section_.sections.push_back(std::move(nested));
}

// Checks that nested code is the code that the seal names.
void BundleWalk::bindNested(VerifiedCode nested, const SealedEntry& sealed, Section& section) {
    std::string wanted = sealed.digest.empty() ? std::string() : "cdhash " + base::toHex(sealed.digest);
    if (!sealed.text.empty()) wanted += (wanted.empty() ? "" : ", ") + sealed.text;
    std::string found;
    bool isNamed = false;
    for (CodeIdentity& identity : nested.identities) {
        // Deeper nested code is already bound by its own bundle's seal.
        if (identity.isNested) continue;
        identity.isNested = true;
        const bool hasHash = std::find(identity.codeHashes.begin(), identity.codeHashes.end(),
                                       sealed.digest) != identity.codeHashes.end();
        const Satisfied satisfied =
            sealed.text.empty() ? Satisfied::unknown : satisfies(identity, sealed.text);
        identity.isSealed = hasHash ? satisfied != Satisfied::no : satisfied == Satisfied::yes;
        isNamed = isNamed || identity.isSealed;
        if (!identity.isSealed && satisfied == Satisfied::no)
            section.fail(kNestedCode, identity.place, wanted,
                         "cdhash " + base::toHex(identity.codeHashes.front()));
        found += (found.empty() ? "cdhash " : ", ") + base::toHex(identity.codeHashes.front());
    }
    if (isNamed) {
        section.pass(kNestedCode, section.place, wanted, found);
    } else {
        section.fail(kNestedCode, section.place, wanted.empty() ? "a cdhash in the seal" : wanted,
                     found.empty() ? "no signed code" : found);
    }
    std::move(nested.identities.begin(), nested.identities.end(), std::back_inserter(code_.identities));
}

void BundleWalk::reportMissing() {
    FailureList failures(section_, kMissing);
    std::size_t optional = 0;
    for (const SealedEntry& entry : seal_.entries()) {
        if (entry.isFound) continue;
        if (entry.isOptional) {
            ++optional;
        } else {
            failures.add(Outcome::failed, placeOf(entry.path), "what the seal lists",
                         "there is nothing there");
        }
    }
    if (failures.count() == 0)
        section_.pass(kMissing, rootPlace_, "everything that the seal lists",
                      optional == 0 ? "everything" : format("all but %zu that may be missing", optional));
}

}  // namespace pinwell::verify
