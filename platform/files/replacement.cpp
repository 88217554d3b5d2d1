#include "files/replacement.h"

#include <fcntl.h>
#include <unistd.h>

#include <cstdio>
#include <cstdlib>
#include <string_view>

#include "files/metadata.h"
#include "files/posix.h"

namespace pinwell::files {
namespace {

constexpr std::string_view kNamePrefix = ".pinwell-replacement-";
constexpr std::string_view kNamePattern = "XXXXXX";  // mkdtemp(3)

bool isReplacementDirectory(std::string_view path) {
    const std::string_view name = path.substr(path.rfind('/') + 1);
    return name.starts_with(kNamePrefix) && name.size() == kNamePrefix.size() + kNamePattern.size();
}

// mkdtemp's mode is 0700 less the umask, and a set-group-ID parent hands that bit down.
Result<void> makePrivate(const std::string& path) {
    const auto directory = openDirectory(path, LastLink::refused);
    if (!directory) return directory.error();
    if (uninterrupted([&] { return fchmod(directory->get(), S_IRWXU); }) != 0) return lastError(path);
    return {};
}

}  // namespace

Result<std::string> makeReplacementDirectory(const std::string& item) {
    if (const auto status = statusOfItem(item); !status) return status.error();
    const std::string directory = directoryOf(item);
    std::string path = directory + "/";
    path += kNamePrefix;
    path += kNamePattern;
    if (mkdtemp(path.data()) == nullptr) return lastError(directory);
    if (auto done = makePrivate(path); !done) {
        rmdir(path.c_str());
        return done.error();
    }
    return path;
}

Result<void> replaceFile(const std::string& original, const std::string& replacement) {
    const auto from = openRegularFile(original, O_RDONLY);
    if (!from) return from.error();
    const auto to = openRegularFile(replacement, O_RDONLY);
    if (!to) return to.error();
    // rename(2) does nothing at all between two names of one file.
    if (from->status.st_dev == to->status.st_dev && from->status.st_ino == to->status.st_ino)
        return Error::posix(EINVAL, replacement);
    // Opened beforehand, so that what cannot be flushed is not changed either.
    const std::string directoryPath = directoryOf(original);
    const auto directory = openDirectory(directoryPath, LastLink::followed);
    if (!directory) return directory.error();

    if (auto done = carryMetadata(*from, *to); !done) return done;
    if (auto done = flush(to->number(), replacement); !done) return done;
    if (uninterrupted([&] { return std::rename(replacement.c_str(), original.c_str()); }) != 0)
        return lastError(original);

    // Whatever keeps the directory (something else in it, say), the replacement has been made.
    const std::string emptied = directoryOf(replacement);
    if (isReplacementDirectory(emptied)) rmdir(emptied.c_str());
    return flush(directory->get(), directoryPath);
}

}  // namespace pinwell::files
