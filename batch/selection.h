// Which paths of a list are worked on: those of one part of it, and each file once.
#pragma once

#include <cstdint>
#include <map>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

namespace pinwell::batch {

/// The part of a list, from 1 to `parts`, that a path belongs to: the same on every host, whatever else the
/// list holds.
std::uint64_t partOf(std::string_view path, std::uint64_t parts);

/// The path by which a file goes whichever way it was named: absolute, without links in the folders above it.
/// The last component's own link is not followed.
std::string canonicalPath(const std::string& path);

/// 16 bytes in the place of a text: SHA-256, cut.
using TextDigest = std::pair<std::uint64_t, std::uint64_t>;
TextDigest digestOf(std::string_view text);

/// A set of texts that keeps the digest of each.
class TextSet {
  public:
    /// False if it was there before.
    bool add(std::string_view text);
    std::size_t size() const noexcept { return count_; }

  private:
    void grow();
    bool place(const TextDigest& digest);

    std::vector<TextDigest> places_;  // a power of two; zeros: free
    std::size_t count_ = 0;
};

/// Remembers what was named. Memory grows by some 32 bytes a path.
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
    std::map<std::pair<std::uint64_t, std::uint64_t>, std::string> linked_;  // files of several names
};

}  // namespace pinwell::batch
