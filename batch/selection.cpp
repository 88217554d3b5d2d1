#include "selection.h"

#include <sys/stat.h>

#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <memory>

#include "base/bytes.h"
#include "codesign/code_directory.h"

namespace pinwell::batch {
namespace {

constexpr std::size_t kFirstPlaces = 1024;

struct Free {
    void operator()(char* text) const noexcept { std::free(text); }  // NOLINT(*-no-malloc)
};

}  // namespace

// FNV-1a over the normal form of the path; then the low bits are mixed with the high bits.
std::uint64_t partOf(std::string_view path, std::uint64_t parts) {
    std::uint64_t hash = 0xCBF29CE484222325;
    // A named value: a loop over native() of a temporary would read freed memory.
    const std::filesystem::path normal = std::filesystem::path(path).lexically_normal();
    for (const char c : normal.native()) {
        hash ^= static_cast<unsigned char>(c);
        hash *= 0x100000001B3;
    }
    hash ^= hash >> 32U;
    return hash % parts + 1;
}

std::string canonicalPath(const std::string& path) {
    std::string trimmed = path;
    while (trimmed.size() > 1 && trimmed.ends_with('/')) trimmed.pop_back();
    const std::size_t slash = trimmed.rfind('/');
    const std::string name = slash == std::string::npos ? trimmed : trimmed.substr(slash + 1);
    std::string folder = slash == std::string::npos ? "." : trimmed.substr(0, slash + 1);
    // "." and ".." mean the folder itself.
    const bool isFolder = name.empty() || name == "." || name == "..";
    const std::unique_ptr<char, Free> resolved(::realpath((isFolder ? trimmed : folder).c_str(), nullptr));
    if (!resolved) return path;
    std::string canonical = resolved.get();
    if (isFolder) return canonical;
    if (!canonical.ends_with('/')) canonical += '/';
    return canonical + name;
}

TextDigest digestOf(std::string_view text) {
    const base::Data bytes = codesign::digest(codesign::DigestType::sha256, base::asBytes(text));
    TextDigest digest;
    std::memcpy(&digest.first, bytes.data(), sizeof digest.first);
    std::memcpy(&digest.second, bytes.data() + sizeof digest.first, sizeof digest.second);
    return digest;
}

bool TextSet::add(std::string_view text) {
    TextDigest digest = digestOf(text);
    if (digest == TextDigest{}) digest.second = 1;  // zeros mark a free place
    if ((count_ + 1) * 4 > places_.size() * 3) grow();
    if (!place(digest)) return false;
    ++count_;
    return true;
}

bool TextSet::place(const TextDigest& digest) {
    const std::size_t mask = places_.size() - 1;
    for (std::size_t at = digest.first & mask;; at = (at + 1) & mask) {
        if (places_[at] == digest) return false;
        if (places_[at] != TextDigest{}) continue;
        places_[at] = digest;
        return true;
    }
}

void TextSet::grow() {
    const std::vector<TextDigest> before =
        std::exchange(places_, std::vector<TextDigest>(places_.empty() ? kFirstPlaces : places_.size() * 2));
    for (const TextDigest& digest : before)
        if (digest != TextDigest{}) place(digest);
}

Selection::Choice Selection::choose(const std::string& path) {
    if (parts_ > 1 && partOf(path, parts_) != part_) return Choice::otherPart;
    const std::string canonical = canonicalPath(path);
    if (!paths_.add(canonical) || isLinkToKnownFile(canonical)) return Choice::namedBefore;
    return Choice::wanted;
}

// A staple may have replaced the file that had both names. Then the second name leads to another
// file.
bool Selection::isLinkToKnownFile(const std::string& path) {
    struct stat status {};
    if (::lstat(path.c_str(), &status) != 0 || !S_ISREG(status.st_mode) || status.st_nlink < 2) return false;
    const auto [known, isNew] = linked_.try_emplace({status.st_dev, status.st_ino}, path);
    if (isNew) return false;
    struct stat first {};
    return ::lstat(known->second.c_str(), &first) == 0 && first.st_dev == status.st_dev &&
           first.st_ino == status.st_ino;
}

}  // namespace pinwell::batch
