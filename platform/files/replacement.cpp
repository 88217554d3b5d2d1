#include "files/replacement.h"

#include <fcntl.h>
#include <unistd.h>

#include <string_view>

#include "files/metadata.h"

namespace pinwell::files {
namespace {

constexpr std::string_view kNamePrefix = ".pinwell-replacement-";

bool isReplacementDirectory(std::string_view name) {
    return name.starts_with(kNamePrefix) && name.size() == kNamePrefix.size() + kRandomLetters;
}

// The mode is 0700 without the umask's bits, and a set-group-ID parent passes on that bit.
Result<void> makePrivate(const Place& place) {
    const auto directory = openDirectory(place);
    if (!directory) return directory.error();
    if (uninterrupted([&] { return fchmod(directory->get(), S_IRWXU); }) != 0) return lastError(place.path);
    return {};
}

}  // namespace

Result<std::string> makeReplacementDirectory(const Place& item) {
    if (const auto status = statusOfItem(item); !status) return status.error();
    const std::string directory = directoryOf(item.path);
    Place made{item.parent, {}, {}};
    const int done = underFreshName(
        kNamePrefix, made.name, [&](const char* name) { return mkdirat(item.directory(), name, S_IRWXU); });
    if (done != 0) return lastError(directory);
    made.path = (directory == "/" ? directory : directory + "/") + made.name;
    if (auto isPrivate = makePrivate(made); !isPrivate) {
        unlinkat(made.directory(), made.name.c_str(), AT_REMOVEDIR);
        return isPrivate.error();
    }
    return made.path;
}

Result<void> replaceFile(const Place& original, const Place& replacement, const Place& emptied) {
    const auto from = openRegularFile(original, O_RDONLY);
    if (!from) return from.error();
    const auto to = openRegularFile(replacement, O_RDONLY);
    if (!to) return to.error();
    // rename(2) between two names of one file does nothing.
    if (from->status.st_dev == to->status.st_dev && from->status.st_ino == to->status.st_ino)
        return Error::posix(EINVAL, replacement.path);
    // Opened before the rename, so that a directory that cannot be flushed is not changed.
    const Place parent{original.parent, ".", directoryOf(original.path)};
    const auto directory = openDirectory(parent);
    if (!directory) return directory.error();

    if (auto done = carryMetadata(*from, *to); !done) return done;
    if (auto done = flush(to->number(), replacement.path); !done) return done;
    if (auto done = renameItem(replacement, original); !done) return done;

    // Even if the directory cannot be removed (another file in it, for example), the replacement succeeded.
    if (isReplacementDirectory(emptied.name))
        unlinkat(emptied.directory(), emptied.name.c_str(), AT_REMOVEDIR);
    return flush(directory->get(), parent.path);
}

}  // namespace pinwell::files
