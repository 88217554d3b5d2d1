#include "files/whole_file.h"

#include <fcntl.h>
#include <unistd.h>

#include <utility>

#include "files/posix.h"

namespace pinwell::files {
namespace {

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
    const auto status = statusOfItem(place);
    if (!status) return status.error();
    if (const int reason = notRegularReason(status->st_mode); reason != 0)
        return Error::posix(reason, place.path);

    // O_CREAT although the file exists: the kernel's protection against files that others have placed in
    // shared directories (fs.protected_regular) applies only to creating opens. No O_TRUNC before the second
    // check.
    constexpr int kFlags = O_WRONLY | O_CREAT | O_CLOEXEC | O_NOFOLLOW | O_NONBLOCK | O_NOCTTY;
    FileDescriptor descriptor(
        uninterrupted([&] { return openat(place.directory(), place.name.c_str(), kFlags, kPrivateFile); }));
    if (!descriptor) return lastError(place.path);
    OpenFile file{std::move(descriptor), place, {}};
    if (fstat(file.number(), &file.status) != 0) return lastError(place.path);
    if (const int reason = notRegularReason(file.status.st_mode); reason != 0)
        return Error::posix(reason, place.path);

    if (uninterrupted([&] { return ftruncate(file.number(), 0); }) != 0) return lastError(place.path);
    if (auto done = fill(file, contents); !done) return done;
    return closeReporting(file);
}

}  // namespace

Result<Data> readWholeFile(const Place& place) {
    const auto file = openRegularFile(place, O_RDONLY);
    if (!file) return file.error();
    if (file->status.st_size > static_cast<off_t>(kMaximumWholeFile)) return Error::posix(EFBIG, place.path);
    auto contents = readUpTo(*file, kMaximumWholeFile + 1);
    if (contents && contents->size() > kMaximumWholeFile) return Error::posix(EFBIG, place.path);
    return contents;
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

}  // namespace pinwell::files
