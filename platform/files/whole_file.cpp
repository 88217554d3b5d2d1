// Files read, written and replaced whole.
#include <fcntl.h>
#include <unistd.h>

#include <array>
#include <cstdio>
#include <string_view>
#include <system_error>
#include <utility>

#include "base/file_io.h"
#include "operations.h"

namespace pinwell::files {
namespace {

constexpr std::size_t kRandomLetters = 6;

// An unguessable name: `prefix` and kRandomLetters letters and digits.
std::string freshName(std::string_view prefix) {
    constexpr std::string_view kLetters = "abcdefghijklmnopqrstuvwxyzABCDEFGHIJKLMNOPQRSTUVWXYZ0123456789";
    std::array<unsigned char, kRandomLetters> random{};
    if (getentropy(random.data(), random.size()) != 0)
        throw std::system_error(errno, std::generic_category(), "getentropy");
    std::string name(prefix);
    // The distribution is not uniform and need not be: the name must be hard to guess, not secret.
    for (const unsigned char byte : random) name += kLetters[byte % kLetters.size()];
    return name;
}

// The result of `make` for the first fresh name that is free: for a used name its error is EEXIST.
template <class Make>
auto underFreshName(std::string_view prefix, Make make) {
    constexpr int kMaximumTries = 100;  // the 62^6 names of one prefix are never that full
    auto made = make(freshName(prefix));
    for (int tries = 1; tries < kMaximumTries && !made && made.error().code() == EEXIST; ++tries)
        made = make(freshName(prefix));
    return made;
}

// Creates and opens a hidden file of mode 0600 with a free name, for writing, beside the item at `place`.
Result<OpenFile> createTemporaryFileBeside(const Place& place) {
    const std::string directory = directoryOf(place.path);
    auto file = underFreshName(".pinwell-", [&](const std::string& name) {
        return createFile({place.parent, name, directory + "/" + name});
    });
    if (!file) return Error::posix(static_cast<int>(file.error().code()), directory);
    return file;
}

// One rename; errors name the new place.
Result<void> renameItem(const Place& from, const Place& to) {
    const int done = uninterrupted(
        [&] { return renameat(from.directory(), from.name.c_str(), to.directory(), to.name.c_str()); });
    if (done != 0) return lastError(to.path);
    return {};
}

Result<void> makePrivate(const OpenFile& file) {
    if (uninterrupted([&] { return fchmod(file.number(), S_IRUSR | S_IWUSR); }) != 0)
        return lastError(file.path());
    return {};
}

Result<void> fill(OpenFile& file, ByteView contents) {
    if (auto done = makePrivate(file); !done) return done;
    if (auto done = writeAll(file, contents); !done) return done;
    return flush(file.number(), file.path());
}

Result<void> overwrite(ByteView contents, const Place& place) {
    // O_CREAT although the file exists: the kernel's protection against files that others have placed in
    // shared directories (fs.protected_regular) applies only to creating opens. No O_TRUNC, because the type
    // is checked once more after the open.
    auto file = openRegularFile(place, O_WRONLY | O_CREAT);
    if (!file) return file.error();
    if (uninterrupted([&] { return ftruncate(file->number(), 0); }) != 0) return lastError(place.path);
    if (auto done = fill(*file, contents); !done) return done;
    return closeReporting(*file);
}

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

Result<Data> readWholeFile(const Place& place) {
    const auto file = openRegularFile(place, O_RDONLY);
    if (!file) return file.error();
    if (file->status.st_size > static_cast<off_t>(kMaximumWholeFile)) return Error::posix(EFBIG, place.path);
    return base::readSmallFile(file->descriptor, place.path, kMaximumWholeFile);
}

Result<void> writeFileAtomically(ByteView contents, const Place& place) {
    const Place parent{place.parent, ".", directoryOf(place.path)};
    const auto directory = openDirectory(parent);
    if (!directory) return directory.error();
    auto file = createTemporaryFileBeside(place);
    if (!file) return file.error();

    const Place temporary = std::exchange(file->place, place);  // errors use the caller's name
    HalfMadeFile halfMade(temporary);
    if (auto done = fill(*file, contents); !done) return done;
    if (auto done = closeReporting(*file); !done) return done;
    if (auto done = renameItem(temporary, place); !done) return done;
    halfMade.keep();
    return flush(directory->get(), parent.path);
}

Result<void> writeFilePlainly(ByteView contents, const Place& place) {
    auto file = createFile(place);
    if (!file) return file.error().code() == EEXIST ? overwrite(contents, place) : file.error();

    HalfMadeFile halfMade(place);
    if (auto done = fill(*file, contents); !done) return done;
    if (auto done = closeReporting(*file); !done) return done;
    if (auto done = flushDirectoryOf(place); !done) return done;
    halfMade.keep();
    return {};
}

Result<std::string> makeReplacementDirectory(const Place& item) {
    if (const auto status = item.status(); !status) return status.error();
    const std::string directory = directoryOf(item.path);
    const auto made = underFreshName(kNamePrefix, [&](const std::string& name) -> Result<Place> {
        if (uninterrupted([&] { return mkdirat(item.directory(), name.c_str(), S_IRWXU); }) != 0)
            return lastError(directory);
        return Place{item.parent, name, (directory == "/" ? directory : directory + "/") + name};
    });
    if (!made) return made.error();
    if (auto isPrivate = makePrivate(*made); !isPrivate) {
        unlinkat(made->directory(), made->name.c_str(), AT_REMOVEDIR);
        return isPrivate.error();
    }
    return made->path;
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
