#include "files/whole_file.h"

#include <fcntl.h>
#include <unistd.h>

#include <cstdio>
#include <utility>

#include "files/posix.h"

namespace pinwell::files {
namespace {

Result<void> makePrivate(const OpenFile& file) {
    if (uninterrupted([&] { return fchmod(file.number(), S_IRUSR | S_IWUSR); }) != 0)
        return lastError(file.path);
    return {};
}

Result<void> fill(OpenFile& file, ByteView contents) {
    if (auto done = makePrivate(file); !done) return done;
    if (auto done = writeAll(file, contents); !done) return done;
    return flush(file.number(), file.path);
}

Result<void> overwrite(ByteView contents, const std::string& path) {
    const auto status = statusOfItem(path);
    if (!status) return status.error();
    if (const int reason = notRegularReason(status->st_mode); reason != 0) return Error::posix(reason, path);

    // O_CREAT although the file is there: the kernel's guard against files that others have laid out for us
    // in shared directories (fs.protected_regular) looks at creating opens only. No O_TRUNC before the second
    // look.
    constexpr int kFlags = O_WRONLY | O_CREAT | O_CLOEXEC | O_NOFOLLOW | O_NONBLOCK | O_NOCTTY;
    FileDescriptor descriptor(uninterrupted([&] { return open(path.c_str(), kFlags, S_IRUSR | S_IWUSR); }));
    if (!descriptor) return lastError(path);
    OpenFile file{std::move(descriptor), path, {}};
    if (fstat(file.number(), &file.status) != 0) return lastError(path);
    if (const int reason = notRegularReason(file.status.st_mode); reason != 0)
        return Error::posix(reason, path);

    if (uninterrupted([&] { return ftruncate(file.number(), 0); }) != 0) return lastError(path);
    if (auto done = fill(file, contents); !done) return done;
    return closeReporting(file);
}

}  // namespace

Result<Data> readWholeFile(const std::string& path) {
    const auto file = openRegularFile(path, O_RDONLY);
    if (!file) return file.error();
    if (file->status.st_size > static_cast<off_t>(kMaximumWholeFile)) return Error::posix(EFBIG, path);
    auto contents = readUpTo(*file, kMaximumWholeFile + 1);
    if (contents && contents->size() > kMaximumWholeFile) return Error::posix(EFBIG, path);
    return contents;
}

Result<void> writeFileAtomically(ByteView contents, const std::string& path) {
    const std::string directoryPath = directoryOf(path);
    const auto directory = openDirectory(directoryPath, LastLink::followed);
    if (!directory) return directory.error();
    auto file = createTemporaryFile(directoryPath);
    if (!file) return file.error();

    const std::string temporary = std::exchange(file->path, path);  // an error names what the caller knows
    HalfMadeFile halfMade(temporary);
    if (auto done = fill(*file, contents); !done) return done;
    if (auto done = closeReporting(*file); !done) return done;
    if (uninterrupted([&] { return std::rename(temporary.c_str(), path.c_str()); }) != 0)
        return lastError(path);
    halfMade.keep();
    return flush(directory->get(), directoryPath);
}

Result<void> writeFilePlainly(ByteView contents, const std::string& path) {
    auto file = createFile(path);
    if (!file) return file.error().code() == EEXIST ? overwrite(contents, path) : file.error();

    HalfMadeFile halfMade(path);
    if (auto done = fill(*file, contents); !done) return done;
    if (auto done = closeReporting(*file); !done) return done;
    if (auto done = flushDirectoryOf(path); !done) return done;
    halfMade.keep();
    return {};
}

}  // namespace pinwell::files
