// Selects paths from a list: the paths of one part, and each file once.
#pragma once

#include <cstdint>
#include <map>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

namespace pinwell::batch {

/// The part of a list, from 1 to `parts`, that a path belongs to. The same on every host, with any
/// list.
std::uint64_t partOf(std::string_view path, std::uint64_t parts);

/// The same path for every way to name a file: absolute, without links in the folders above it. A link in the
/// last component is not followed.
std::string canonicalPath(const std::string& path);

/// 16 bytes of a text's SHA-256, to replace the text.
using TextDigest = std::pair<std::uint64_t, std::uint64_t>;
TextDigest digestOf(std::string_view text);

/// A set of texts that keeps the digest of each.
class TextSet {
  public:
    /// Returns false if it was already in the set.
    bool add(std::string_view text);
    std::size_t size() const noexcept { return count_; }

  private:
    void grow();
    bool place(const TextDigest& digest);

    std::vector<TextDigest> places_;  // a power of two; zeros: free
    std::size_t count_ = 0;
};

/// Remembers the named paths. Memory grows by some 32 bytes for each path.
class Selection {
  public:
    Selection(std::uint64_t part, std::uint64_t parts) : part_(part), parts_(parts) {}

    enum class Choice : std::uint8_t { wanted, otherPart, namedBefore };
    Choice choose(const std::string& path);

  private:
    bool isLinkToKnownFile(const std::string& path);

    const std::uint64_t part_;
    const std::uint64_t parts_;
    TextSet paths_;
    std::map<std::pair<std::uint64_t, std::uint64_t>, std::string> linked_;  // files with several names
};

}  // namespace pinwell::batch
