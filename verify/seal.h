// The seal of a bundle's resources: the property list _CodeSignature/CodeResources, whose digest a code
// directory states in special slot 3.
//
// | Key    | Value                                                                                     |
// |--------|-------------------------------------------------------------------------------------------|
// | files2 | by path: what is sealed (below)                                                           |
// | rules2 | by pattern: what happens to paths that it matches (below)                                 |
// | files  | the same of version 1, for readers that know no other: SHA-1, no links, no nested code    |
// | rules  | its rules                                                                                 |
//
// An entry of files2 is a dictionary, or bare data, which is the SHA-1:
//
// | Key         | Value                                                                                |
// |-------------|--------------------------------------------------------------------------------------|
// | hash2       | the file's SHA-256                                                                   |
// | hash        | the file's SHA-1                                                                     |
// | symlink     | the target of a symbolic link, in place of the hashes                                |
// | cdhash      | a cdhash of nested code, a file or a bundle, in place of the hashes                  |
// | requirement | what that code must satisfy, in the requirement language (requirement.h)             |
// | optional    | true: it may be missing                                                              |
//
// A rule is a boolean, a number (its weight), or a dictionary of weight, omit, optional and nested. Of the
// rules that match a path the heaviest counts; the weight is 1 where none is stated.
//
// Paths are relative to the root of the seal, without "." and "..". Refused: whatever has another shape, a
// path twice, and what passes a limit below. Where files2 is there, files is not looked at: both are under
// one digest, and what the stronger digests cover is covered.
#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "foundation/bytes.h"

namespace pinwell::verify {

using foundation::ByteView;
using foundation::Data;

/// Every path of a bundle is held against every rule; a seal has about a dozen.
inline constexpr std::size_t kMaximumRules = 128;
inline constexpr std::size_t kMaximumPatternLength = 4096;

/// Of a digest that is a file's SHA-256, in bytes.
inline constexpr std::size_t kSha256Length = 32;

/// What each pattern may take of memory, in bytes.
inline constexpr std::size_t kMaximumPatternMemory = std::size_t{256} * 1024;

struct SealedEntry {
    enum class Kind { file, link, nestedCode };

    std::string path;
    Kind kind = Kind::file;
    bool isOptional = false;
    Data digest;       // of a file: 32 bytes SHA-256, 20 bytes SHA-1. Of code: its cdhash, may be empty
    std::string text;  // of a link: its target. Of code: its requirement, may be empty
    mutable bool isFound = false;
};

/// What a rule does to the paths that it decides.
struct RuleEffect {
    bool omits = false;
    bool isOptional = false;
    bool isNested = false;
};

/// Immutable but for isFound. For one thread.
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

    /// Null if it is not sealed.
    const SealedEntry* find(std::string_view path) const;

    /// The effect of the rule that decides a path; `nullopt` if none matches. Time is linear in the length of
    /// the path, whatever the patterns are.
    std::optional<RuleEffect> ruleFor(std::string_view path) const;

  private:
    struct Rule;

    Seal();

    int version_ = 2;
    std::vector<SealedEntry> entries_;
    std::vector<Rule> rules_;  // the heaviest first
};

}  // namespace pinwell::verify
