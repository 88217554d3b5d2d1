#include "seal.h"

#include <re2/re2.h>

#include <algorithm>
#include <cmath>
#include <utility>

#include "base/text.h"
#include "codesign/code_error.h"
#include "values/format.h"
#include "values/property_list.h"
#include "values/value.h"
#include "verify/page_digest.h"

namespace pinwell::verify {

using codesign::CodeError;
using codesign::refuse;
using values::format;
using values::Value;

struct Seal::Rule {
    std::unique_ptr<const RE2> pattern;
    double weight = 1;
    RuleEffect effect;
};

namespace {

constexpr std::size_t kSha1Length = 20;
constexpr std::size_t kMaximumRequirementLength = 65'536;

/// Large enough that no thread waits long for the others. Every job may hold a directory open.
constexpr std::size_t kBatchSize = 256;

bool isRelativePath(std::string_view path) {
    while (!path.empty()) {
        const std::size_t slash = path.find('/');
        const std::string_view name = path.substr(0, slash);
        if (name.empty() || name == "." || name == ".." || name.find('\0') != std::string_view::npos)
            return false;
        if (slash == std::string_view::npos) return true;
        path.remove_prefix(slash + 1);
    }
    return false;
}

bool flagIn(const Value& dictionary, std::string_view key, const std::string& path) {
    const Value& value = dictionary[key];
    if (value.isNil()) return false;
    if (value.boolean() == nullptr) refuse(format("the seal's \"%@\" of %@ is no boolean", key, path));
    return *value.boolean();
}

const Data* dataIn(const Value& dictionary, std::string_view key, std::size_t length,
                   const std::string& path) {
    const Value& value = dictionary[key];
    if (value.isNil()) return nullptr;
    if (value.data() == nullptr || (length != 0 && value.data()->size() != length))
        refuse(format("the seal's \"%@\" of %@ is no digest", key, path));
    return value.data();
}

const std::string* textIn(const Value& dictionary, std::string_view key, const std::string& path) {
    const Value& value = dictionary[key];
    if (value.isNil()) return nullptr;
    if (value.string() == nullptr || value.string()->size() > kMaximumRequirementLength)
        refuse(format("the seal's \"%@\" of %@ is no text", key, path));
    return value.string();
}

SealedEntry entryFrom(const std::string& path, const Value& value) {
    if (!isRelativePath(path)) refuse(format("the seal names \"%@\", which is no path in the bundle", path));
    SealedEntry entry{.path = path, .digest = {}, .text = {}};
    if (value.data() != nullptr) {
        if (value.data()->size() != kSha1Length) refuse(format("the seal's digest of %@ is none", path));
        entry.digest = *value.data();
        return entry;
    }
    if (value.dictionary() == nullptr) refuse(format("the seal says nothing of %@", path));
    entry.isOptional = flagIn(value, "optional", path);
    if (const std::string* const target = textIn(value, "symlink", path)) {
        entry.kind = SealedEntry::Kind::link;
        entry.text = *target;
        return entry;
    }
    const Data* const codeHash = dataIn(value, "cdhash", 0, path);
    const std::string* const requirement = textIn(value, "requirement", path);
    if (codeHash != nullptr || requirement != nullptr) {
        entry.kind = SealedEntry::Kind::nestedCode;
        if (codeHash != nullptr) entry.digest = *codeHash;
        if (requirement != nullptr) entry.text = *requirement;
        return entry;
    }
    const Data* const sha256 = dataIn(value, "hash2", kSha256Length, path);
    const Data* const sha1 = dataIn(value, "hash", kSha1Length, path);
    if (sha256 == nullptr && sha1 == nullptr) refuse(format("the seal has no digest of %@", path));
    entry.digest = sha256 != nullptr ? *sha256 : *sha1;
    return entry;
}

double weightOf(const Value& value) {
    if (!value.isNumber() || value.boolean() != nullptr) refuse("a weight of the seal's rules is no number");
    if (value.real() != nullptr) {
        if (std::isnan(*value.real())) refuse("a weight of the seal's rules is no number");
        return *value.real();
    }
    if (value.integer() != nullptr) return static_cast<double>(*value.integer());
    return static_cast<double>(value.unsignedIntegerValue());
}

std::unique_ptr<const RE2> compiled(const std::string& pattern) {
    if (pattern.size() > kMaximumPatternLength) refuse("a pattern of the seal is too long");
    // Patterns are extended regular expressions over the bytes of a path. The library's time is linear in
    // the path for all of them.
    RE2::Options options(RE2::Quiet);
    options.set_encoding(RE2::Options::EncodingLatin1);
    options.set_posix_syntax(true);
    options.set_one_line(true);  // "^" and "$" are the ends of the path
    options.set_dot_nl(true);
    options.set_never_capture(true);
    options.set_max_mem(kMaximumPatternMemory);
    auto expression = std::make_unique<const RE2>(pattern, options);
    if (!expression->ok()) refuse(format("the seal's pattern \"%@\" cannot be used", pattern));
    return expression;
}

}  // namespace

Seal::Seal() = default;
Seal::~Seal() = default;
Seal::Seal(Seal&&) noexcept = default;
Seal& Seal::operator=(Seal&&) noexcept = default;

Seal Seal::parse(ByteView document) {
    const base::Result<Value> list = values::parsePropertyList(document);
    if (!list) refuse("the seal is no property list: " + list.error().localizedFailureReason());
    if (list->dictionary() == nullptr) refuse("the seal is no dictionary");
    Seal seal;
    seal.version_ = (*list)["files2"].isNil() ? 1 : 2;
    const Value& files = (*list)[seal.version_ == 2 ? "files2" : "files"];
    const Value& rules = (*list)[seal.version_ == 2 ? "rules2" : "rules"];
    if (files.dictionary() == nullptr) refuse("the seal has no list of files");
    if (!rules.isNil() && rules.dictionary() == nullptr) refuse("the seal's rules are no dictionary");

    seal.entries_.reserve(files.dictionary()->size());
    for (const auto& [path, value] : *files.dictionary()) seal.entries_.push_back(entryFrom(path, value));
    if (rules.isNil()) return seal;
    if (rules.dictionary()->size() > kMaximumRules) refuse("the seal has too many rules");
    for (const auto& [pattern, value] : *rules.dictionary()) {
        Rule rule{.pattern = compiled(pattern), .weight = 1, .effect = {}};
        if (value.dictionary() != nullptr) {
            if (!value["weight"].isNil()) rule.weight = weightOf(value["weight"]);
            rule.effect = {flagIn(value, "omit", pattern), flagIn(value, "optional", pattern),
                           flagIn(value, "nested", pattern)};
        } else if (value.boolean() != nullptr) {
            if (!*value.boolean()) rule.effect.omits = true;
        } else if (value.isNumber()) {
            rule.weight = weightOf(value);
        } else {
            refuse(format("the seal's rule \"%@\" says nothing", pattern));
        }
        seal.rules_.push_back(std::move(rule));
    }
    // If two rules have one weight, the one that exempts nothing comes first.
    std::stable_sort(seal.rules_.begin(), seal.rules_.end(), [](const Rule& a, const Rule& b) {
        return a.weight != b.weight ? a.weight > b.weight : a.effect.omits < b.effect.omits;
    });
    return seal;
}

const SealedEntry* Seal::find(std::string_view path) const {
    const auto found = std::lower_bound(
        entries_.begin(), entries_.end(), path,
        [](const SealedEntry& entry, std::string_view wanted) { return entry.path < wanted; });
    return found != entries_.end() && found->path == path ? &*found : nullptr;
}

std::optional<RuleEffect> Seal::ruleFor(std::string_view path) const {
    const re2::StringPiece subject(path.data(), path.size());
    for (const Rule& rule : rules_)
        if (RE2::PartialMatch(subject, *rule.pattern)) return rule.effect;
    return std::nullopt;
}

SealedFiles::SealedFiles(Workers& workers, Section& section) : workers_(workers), section_(section) {
    batch_.reserve(kBatchSize);
}

void SealedFiles::add(DirectoryRef directory, std::string name, const SealedEntry& entry, std::string place) {
    batch_.push_back({std::move(directory), std::move(name), &entry, std::move(place)});
    if (batch_.size() == kBatchSize) hashBatch();
}

void SealedFiles::hashBatch() {
    workers_.forEach(batch_.size(), [this](std::size_t i) { hashOne(batch_[i]); });
    hashed_ += batch_.size();
    batch_.clear();
}

void SealedFiles::report(Outcome outcome, const Job& job, std::string found) {
    const std::lock_guard lock(mutex_);
    if (faults_.size() > kMaximumFailuresKept) {
        ++uncounted_;
        return;
    }
    faults_.push_back({outcome, job.place, base::toHex(job.entry->digest), std::move(found)});
}

void SealedFiles::hashOne(const Job& job) {
    const bool isSha256 = job.entry->digest.size() == kSha256Length;
    try {
        const auto file = job.directory->file(job.name);
        const ByteView found =
            digestOf(isSha256 ? crypto::Digest::sha256 : crypto::Digest::sha1, *file, {0, file->size()});
        const bool isSame =
            std::equal(found.begin(), found.end(), job.entry->digest.begin(), job.entry->digest.end());
        if (!isSame) report(Outcome::failed, job, base::toHex(found));
    } catch (const std::runtime_error& failure) {
        const CodeError error = codesign::asCodeError(failure);
        report(error.status() == codesign::kIOError ? Outcome::unreadable : Outcome::failed, job,
               error.what());
    }
}

void SealedFiles::finish() {
    hashBatch();
    std::sort(faults_.begin(), faults_.end(),
              [](const Fault& a, const Fault& b) { return a.place < b.place; });
    FailureList failures(section_, kSealedFile);
    for (Fault& fault : faults_)
        failures.add(fault.outcome, std::move(fault.place), std::move(fault.expected),
                     std::move(fault.found));
    if (uncounted_ > 0)
        section_.fail(kSealedFile, section_.place, {},
                      format("%zu more files that are not as sealed", uncounted_));
    if (failures.count() == 0)
        section_.pass(kSealedFile, section_.place, format("%zu files with their digests", hashed_));
}

}  // namespace pinwell::verify
