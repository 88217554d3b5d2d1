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

// The mode is 0700 less the umask, and a set-group-ID parent hands that bit down.
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
    // rename(2) does nothing at all between two names of one file.
    if (from->status.st_dev == to->status.st_dev && from->status.st_ino == to->status.st_ino)
        return Error::posix(EINVAL, replacement.path);
    // Opened beforehand, so that what cannot be flushed is not changed either.
    const Place parent{original.parent, ".", directoryOf(original.path)};
    const auto directory = openDirectory(parent);
    if (!directory) return directory.error();

    if (auto done = carryMetadata(*from, *to); !done) return done;
    if (auto done = flush(to->number(), replacement.path); !done) return done;
    if (auto done = renameItem(replacement, original); !done) return done;

    // Whatever keeps the directory (something else in it, say), the replacement has been made.
    if (isReplacementDirectory(emptied.name))
        unlinkat(emptied.directory(), emptied.name.c_str(), AT_REMOVEDIR);
    return flush(directory->get(), parent.path);
}

}  // namespace pinwell::files
