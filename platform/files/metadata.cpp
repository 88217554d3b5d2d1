// The metadata of a file: owner, mode, extended attributes, access control list, times.
#include <sys/xattr.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <string_view>
#include <vector>

#include "operations.h"

namespace pinwell::files {
namespace {

// XATTR_LIST_MAX and XATTR_SIZE_MAX of the kernel (linux/limits.h): no list and no value is longer.
constexpr std::size_t kMaximumAttributeBytes = 65536;

// The access control list, in the kernel's own form: acl(5) is stored as this attribute.
constexpr std::string_view kAccessControlList = "system.posix_acl_access";

// Attributes that vouch for one file's contents on one inode, and are wrong on any other file.
constexpr std::array<std::string_view, 2> kBoundToTheFile{"security.ima", "security.evm"};

using AttributeNames = std::vector<std::string>;

bool cannotBeKept(int reason) {
    return reason == EOPNOTSUPP || reason == ENOSYS;
}

Result<AttributeNames> attributeNames(const OpenFile& file) {
    std::string list(kMaximumAttributeBytes, '\0');
    const ssize_t length = uninterrupted([&] { return flistxattr(file.number(), list.data(), list.size()); });
    if (length < 0) {
        if (cannotBeKept(errno)) return AttributeNames{};
        return lastError(file.path());
    }
    AttributeNames names;
    for (std::size_t at = 0; at < static_cast<std::size_t>(length);) {
        names.emplace_back(list.c_str() + at);
        at += names.back().size() + 1;
    }
    return names;
}

// Whether every owner of a file may set this attribute. If so, a refusal is a real failure.
bool isOwners(std::string_view name) {
    return name.starts_with("user.") || name == kAccessControlList;
}

bool contains(const AttributeNames& names, std::string_view name) {
    return std::find(names.begin(), names.end(), name) != names.end();
}

Result<void> carryAttribute(const OpenFile& from, const OpenFile& to, const std::string& name,
                            std::string& value) {
    const ssize_t length =
        uninterrupted([&] { return fgetxattr(from.number(), name.c_str(), value.data(), value.size()); });
    if (length < 0) {
        // Removed after the list was made, or not readable for us.
        if (errno == ENODATA || !isOwners(name)) return {};
        return lastError(from.path());
    }
    const auto size = static_cast<std::size_t>(length);
    if (uninterrupted([&] { return fsetxattr(to.number(), name.c_str(), value.data(), size, 0); }) != 0) {
        const bool notOurs = !isOwners(name) && (errno == EPERM || errno == EACCES || errno == EINVAL);
        if (!notOurs && !cannotBeKept(errno)) return lastError(to.path());
    }
    return {};
}

Result<void> dropForeignAttributes(const OpenFile& to, const AttributeNames& wanted) {
    const auto present = attributeNames(to);
    if (!present) return present.error();
    for (const std::string& name : *present) {
        if (!isOwners(name) || contains(wanted, name)) continue;
        if (uninterrupted([&] { return fremovexattr(to.number(), name.c_str()); }) != 0 && errno != ENODATA)
            return lastError(to.path());
    }
    return {};
}

Result<void> carryAttributes(const OpenFile& from, const OpenFile& to, const AttributeNames& names) {
    std::string value(kMaximumAttributeBytes, '\0');
    for (const std::string& name : names) {
        if (std::find(kBoundToTheFile.begin(), kBoundToTheFile.end(), name) != kBoundToTheFile.end())
            continue;
        if (auto done = carryAttribute(from, to, name, value); !done) return done;
    }
    // For example, a directory's default access control list has already given the new file a list.
    return dropForeignAttributes(to, names);
}

// Owner and group, or the group alone, or neither: only the superuser may change a file's owner.
Result<void> carryOwner(const struct stat& wanted, const OpenFile& to) {
    constexpr auto kUnchanged = static_cast<uid_t>(-1);
    for (const uid_t owner : {wanted.st_uid, kUnchanged}) {
        if (uninterrupted([&] { return fchown(to.number(), owner, wanted.st_gid); }) == 0) return {};
        // EINVAL: the identity has no meaning in this user namespace.
        if (errno != EPERM && errno != EINVAL && !cannotBeKept(errno)) return lastError(to.path());
    }
    return {};
}

// The mode for a file whose owner, group and access control list may not all have been copied.
Result<mode_t> permittedMode(const struct stat& wanted, const OpenFile& to, bool wantsAccessControlList) {
    struct stat got {};
    if (fstat(to.number(), &got) != 0) return lastError(to.path());
    mode_t mode = wanted.st_mode & 07777U;
    if (got.st_uid != wanted.st_uid) mode &= ~static_cast<mode_t>(S_ISUID);
    if (got.st_gid != wanted.st_gid) mode &= ~static_cast<mode_t>(S_ISGID);
    if (wantsAccessControlList) {
        // With a list, the group bits are its mask; without it they would give the rights to the owning
        // group.
        const auto names = attributeNames(to);
        if (!names) return names.error();
        if (!contains(*names, kAccessControlList)) mode &= ~static_cast<mode_t>(S_IRWXG);
    }
    return mode;
}

}  // namespace

Result<void> carryMetadata(const OpenFile& from, const OpenFile& to) {
    struct stat wanted {};
    if (fstat(from.number(), &wanted) != 0) return lastError(from.path());
    const auto names = attributeNames(from);
    if (!names) return names.error();

    // The order matters. Nobody else gets access before all is set. The owner can still write attributes,
    // although the final mode may be read-only. Changing the owner clears file capabilities and set-ID
    // bits.
    if (uninterrupted([&] { return fchmod(to.number(), S_IRUSR | S_IWUSR); }) != 0)
        return lastError(to.path());
    if (auto done = carryOwner(wanted, to); !done) return done;
    if (auto done = carryAttributes(from, to, *names); !done) return done;
    const auto mode = permittedMode(wanted, to, contains(*names, kAccessControlList));
    if (!mode) return mode.error();
    if (uninterrupted([&] { return fchmod(to.number(), *mode); }) != 0) return lastError(to.path());
    return {};
}

Result<void> carryTimes(const OpenFile& from, const OpenFile& to) {
    const std::array<timespec, 2> times{from.status.st_atim, from.status.st_mtim};
    if (uninterrupted([&] { return futimens(to.number(), times.data()); }) != 0) return lastError(to.path());
    return {};
}

}  // namespace pinwell::files
