// The system's file calls as this folder uses them: interrupted calls repeated, short ones finished, and no
// errno lost on the way. For this folder only.
#pragma once

#include <sys/stat.h>

#include <algorithm>
#include <cerrno>
#include <optional>
#include <string>
#include <string_view>
#include <utility>

#include "files/file_manager.h"
#include "foundation/bytes.h"
#include "foundation/file_io.h"
#include "foundation/places.h"

namespace pinwell::files {

using foundation::Error;
using foundation::FileDescriptor;
using foundation::Place;
using foundation::Places;

/// Largest piece that is read or written with one call, and so the most that memory grows by at a time.
inline constexpr std::size_t kPieceSize = std::size_t{256} * 1024;
inline constexpr std::size_t kFirstPieceSize = std::size_t{4} * 1024;

/// The answer of `call`, made again for as long as a signal interrupts it.
template <class Call>
auto uninterrupted(Call call) {
    for (;;) {
        const auto answer = call();
        if (answer != -1 || errno != EINTR) return answer;
    }
}

/// The failure of the call made just before.
inline Error lastError(const std::string& path) {
    return Error::posix(errno, path);
}

/// An open regular file, with its place, which its errors name, and its status when it was opened.
struct OpenFile {
    FileDescriptor descriptor;
    Place place;
    struct stat status {};

    int number() const noexcept { return descriptor.get(); }
    const std::string& path() const noexcept { return place.path; }
};

/// The directory that a path's last component stands in.
std::string directoryOf(const std::string& path);

/// Status of the item itself, a link not followed.
Result<struct stat> statusOfItem(const Place& place);

/// Why an item of this type is not the regular file that was asked for; 0 when it is.
int notRegularReason(mode_t mode);

/// Opens what is a regular file before and after opening; never follows a link in the last component, never
/// blocks, and never opens a device. `access` is O_RDONLY, O_WRONLY or O_RDWR.
Result<OpenFile> openRegularFile(const Place& place, int access);

/// Modes of a new file: its owner's alone, or what the umask leaves of everybody's.
inline constexpr mode_t kPrivateFile = S_IRUSR | S_IWUSR;
inline constexpr mode_t kOrdinaryFile = S_IRUSR | S_IWUSR | S_IRGRP | S_IWGRP | S_IROTH | S_IWOTH;

/// Makes and opens a file for writing; there must be nothing at `place` yet.
Result<OpenFile> createFile(const Place& place, mode_t mode = kPrivateFile);

/// Makes and opens a hidden file of mode 0600 and of a name that was free, beside the item at `place`.
Result<OpenFile> createTemporaryFileBeside(const Place& place);

/// A name that nobody guesses: `prefix` and kRandomLetters letters and digits.
inline constexpr std::size_t kRandomLetters = 6;
std::string freshName(std::string_view prefix);

/// Gives `make` fresh names until one is free: it returns -1, with EEXIST in errno, for one that is not.
template <class Make>
int underFreshName(std::string_view prefix, std::string& name, Make make) {
    constexpr int kMaximumTries = 100;  // the 62^6 names of one prefix are never that full
    int answer = -1;
    for (int tries = 0; tries < kMaximumTries; ++tries) {
        name = freshName(prefix);
        answer = uninterrupted([&] { return make(name.c_str()); });
        if (answer != -1 || errno != EEXIST) return answer;
    }
    return answer;
}

/// Opens the directory itself, a link not followed.
Result<FileDescriptor> openDirectory(const Place& place);

/// One rename; errors name the new place.
Result<void> renameItem(const Place& from, const Place& to);

Result<void> writeAll(const OpenFile& file, ByteView bytes);

/// Reads by `readPiece`(buffer, size), which answers as read(2) does, until `length` bytes are had or the
/// file ends; nothing when a piece fails.
template <class ReadPiece>
std::optional<Data> readPieces(std::uint64_t length, ReadPiece readPiece) {
    Data data;
    while (data.size() < length) {
        const std::size_t had = data.size();
        // Little at first: most files are small, and fresh memory costs more than another call.
        const std::size_t piece = std::clamp(had, kFirstPieceSize, kPieceSize);
        data.resize(had + static_cast<std::size_t>(std::min<std::uint64_t>(length - had, piece)));
        const ssize_t count = uninterrupted([&] { return readPiece(data.data() + had, data.size() - had); });
        if (count < 0) return std::nullopt;
        data.resize(had + static_cast<std::size_t>(count));
        if (count == 0) break;
    }
    return data;
}

/// Reads from the current position until `length` bytes are had or the file ends.
Result<Data> readUpTo(const OpenFile& file, std::uint64_t length);

/// Returns when what `descriptor` stands for is on stable storage.
Result<void> flush(int descriptor, const std::string& path);

/// The same for the directory that an item stands in, and so for the name of what was made there; no failure
/// where the file system has no such thing, or the directory may not be read.
Result<void> flushDirectoryOf(const Place& place);

/// Closes and reports what the file system has kept back until now.
Result<void> closeReporting(OpenFile& file);

/// Unlinks a file that was begun and not kept, so that no failure leaves half of one behind.
class HalfMadeFile {
  public:
    explicit HalfMadeFile(Place place) : place_(std::move(place)) {}
    ~HalfMadeFile();
    HalfMadeFile(const HalfMadeFile&) = delete;
    HalfMadeFile& operator=(const HalfMadeFile&) = delete;

    void keep() noexcept { kept_ = true; }

  private:
    Place place_;
    bool kept_ = false;
};

}  // namespace pinwell::files
