// The seal of a bundle's resources, and the check of files against it. The seal is the property list
// _CodeSignature/CodeResources, whose digest a code directory states in special slot 3.
//
// | Key    | Value                                                                                     |
// |--------|-------------------------------------------------------------------------------------------|
// | files2 | by path: the sealed items (below)                                                         |
// | rules2 | by pattern: the treatment of paths that match (below)                                     |
// | files  | the same of version 1, for readers that know no other: SHA-1, no links, no nested code    |
// | rules  | its rules                                                                                 |
//
// An entry of files2 is a dictionary, or bare data, which is the SHA-1:
//
// | Key         | Value                                                                                |
// |-------------|--------------------------------------------------------------------------------------|
// | hash2       | the file's SHA-256                                                                   |
// | hash        | the file's SHA-1                                                                     |
// | symlink     | the target of a symbolic link, instead of the hashes                                 |
// | cdhash      | a cdhash of nested code, a file or a bundle, instead of the hashes                   |
// | requirement | a condition on that code, in the requirement language (requirement.h)                |
// | optional    | true: it may be missing                                                              |
//
// A rule is a boolean, a number (its weight), or a dictionary of weight, omit, optional and nested. If
// several rules match a path, the heaviest counts; the default weight is 1.
//
// Paths are relative to the root of the seal, without "." and "..". Refused: any other shape, a duplicate
// path, and more than a limit below. If files2 exists, files is ignored: one digest covers both lists, and
// the stronger digests of files2 are sufficient.
#pragma once

#include <cstdint>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "base/bytes.h"
#include "verify/check.h"
#include "verify/directory.h"
#include "verify/workers.h"

namespace pinwell::verify {

using base::ByteView;
using base::Data;

/// Every path of a bundle is matched against every rule; a seal has about a dozen.
inline constexpr std::size_t kMaximumRules = 128;
inline constexpr std::size_t kMaximumPatternLength = 4096;

/// Length of a SHA-256 digest, in bytes.
inline constexpr std::size_t kSha256Length = 32;

/// Maximum memory of each pattern, in bytes.
inline constexpr std::size_t kMaximumPatternMemory = std::size_t{256} * 1024;

struct SealedEntry {
    enum class Kind { file, link, nestedCode };

    std::string path;
    Kind kind = Kind::file;
    bool isOptional = false;
    Data digest;       // for a file: 32 bytes SHA-256, 20 bytes SHA-1. For code: its cdhash, may be empty
    std::string text;  // for a link: its target. For code: its requirement, may be empty
    mutable bool isFound = false;
};

/// The effect of a rule on the paths that it decides.
struct RuleEffect {
    bool omits = false;
    bool isOptional = false;
    bool isNested = false;
};

/// Immutable except isFound. For one thread.
class Seal {
  public:
    /// Throws codesign::CodeError if it is not well formed.
    static Seal parse(ByteView document);

    ~Seal();
    Seal(Seal&&) noexcept;
    Seal& operator=(Seal&&) noexcept;

    /// 1 or 2.
    int version() const noexcept { return version_; }

    /// In byte order of their paths.
    const std::vector<SealedEntry>& entries() const noexcept { return entries_; }

    /// Returns null if the path is not sealed.
    const SealedEntry* find(std::string_view path) const;

    /// The effect of the rule that decides a path; `nullopt` if none matches. Time is linear in the length of
    /// the path, for any pattern.
    std::optional<RuleEffect> ruleFor(std::string_view path) const;

  private:
    struct Rule;

    Seal();

    int version_ = 2;
    std::vector<SealedEntry> entries_;
    std::vector<Rule> rules_;  // the heaviest first
};

/// Collects files and hashes them in batches on all threads. Memory and open directories are limited to one
/// batch.
class SealedFiles {
  public:
    /// The arguments must outlive the object.
    SealedFiles(Workers& workers, Section& section);

    /// `entry` must live until finish(). `place` is shown to people.
    void add(DirectoryRef directory, std::string name, const SealedEntry& entry, std::string place);

    /// Hashes the remaining files and adds the checks. Call it once, and last.
    void finish();

  private:
    struct Job {
        DirectoryRef directory;
        std::string name;
        const SealedEntry* entry;
        std::string place;
    };
    struct Fault {
        Outcome outcome;
        std::string place;
        std::string expected;
        std::string found;
    };

    void hashBatch();
    void hashOne(const Job& job);
    void report(Outcome outcome, const Job& job, std::string found);

    Workers& workers_;
    Section& section_;
    std::vector<Job> batch_;
    std::size_t hashed_ = 0;
    std::mutex mutex_;
    std::vector<Fault> faults_;
    std::size_t uncounted_ = 0;  // faults that are not kept
};

}  // namespace pinwell::verify
