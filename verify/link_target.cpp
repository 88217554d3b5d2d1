#include "verify/link_target.h"

#include <string>
#include <vector>

namespace pinwell::verify {

namespace {

/// The kernel's limit.
constexpr unsigned kMaximumLinks = 40;

/// Adds the names of a path to the pending names, which are kept in reverse.
void pushNames(std::string_view path, std::vector<std::string>& pending) {
    while (!path.empty()) {
        const std::size_t slash = path.rfind('/');
        const std::string_view name = slash == std::string_view::npos ? path : path.substr(slash + 1);
        if (!name.empty() && name != ".") pending.emplace_back(name);
        path = slash == std::string_view::npos ? std::string_view() : path.substr(0, slash);
    }
}

/// Whether the pending names, after a missing one, stay inside: none leads above.
bool staysBelow(const std::vector<std::string>& pending) {
    for (const std::string& name : pending)
        if (name == "..") return false;
    return true;
}

}  // namespace

bool leadsInside(const DirectoryRef& root, std::string_view path) {
    std::vector<DirectoryRef> opened{root};
    std::vector<std::string> pending;
    pushNames(path, pending);
    unsigned links = 0;
    while (!pending.empty()) {
        const std::string name = std::move(pending.back());
        pending.pop_back();
        if (name == "..") {
            if (opened.size() == 1) return false;
            opened.pop_back();
            continue;
        }
        const auto kind = opened.back()->kindOf(name);
        if (kind == EntryKind::link) {
            const std::string target = opened.back()->linkTarget(name);
            if (++links > kMaximumLinks || target.starts_with('/')) return false;
            pushNames(target, pending);
        } else if (kind == EntryKind::directory) {
            opened.push_back(opened.back()->directory(name));
        } else {
            return staysBelow(pending);
        }
    }
    return true;
}

}  // namespace pinwell::verify
