#include "support/failing_calls.h"

#include <dirent.h>
#include <fcntl.h>
#include <sys/file.h>
#include <sys/ioctl.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <sys/types.h>
#include <sys/vfs.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstdarg>
#include <ctime>
#include <filesystem>
#include <utility>

namespace pinwell::test {
namespace {

thread_local Trouble* current = nullptr;

constexpr std::size_t kShortCount = 3;

struct CallNature {
    std::string_view name;
    bool isInterruptible;  // POSIX lets a signal interrupt it
    bool moves;            // it may move fewer bytes than requested
    bool stores;           // it fails on a full or broken volume
};

constexpr std::array kNatures{
    CallNature{"open", true, false, false},     CallNature{"openat", true, false, false},
    CallNature{"openat2", true, false, false},  CallNature{"close", true, false, false},
    CallNature{"flock", true, false, false},    CallNature{"fchmod", true, false, false},
    CallNature{"fchown", true, false, false},   CallNature{"read", true, true, false},
    CallNature{"pread", true, true, false},     CallNature{"write", true, true, true},
    CallNature{"pwrite", true, true, true},     CallNature{"copy_file_range", true, true, true},
    CallNature{"fallocate", true, false, true}, CallNature{"ftruncate", true, false, true},
    CallNature{"fsync", true, false, true},     CallNature{"ioctl", true, false, true},
};

// All other calls have none of it.
CallNature natureOf(std::string_view name) {
    const auto* const found = std::find_if(kNatures.begin(), kNatures.end(),
                                           [&](const CallNature& call) { return call.name == name; });
    return found == kNatures.end() ? CallNature{name, false, false, false} : *found;
}

bool isStandardStream(int file) {
    return file <= STDERR_FILENO;
}

bool fails(const char* name) {
    return current != nullptr && current->fails(name);
}
std::size_t shortened(std::size_t count) {
    return current != nullptr && current->isShort() ? std::min(count, kShortCount) : count;
}

}  // namespace

Trouble::Trouble(Kind kind, std::size_t number, std::set<std::string> names, int reason)
    : kind_(kind), number_(number), names_(std::move(names)), reason_(reason) {
    current = this;
}

Trouble::~Trouble() {
    current = nullptr;
}

Trouble Trouble::atCall(std::size_t number, int reason) {
    return {Kind::atCall, number, {}, reason};
}
Trouble Trouble::shortAtCall(std::size_t number) {
    return {Kind::shortAtCall, number, {}, 0};
}
Trouble Trouble::fromCallOn(std::size_t number, int reason) {
    return {Kind::fromCallOn, number, {}, reason};
}
Trouble Trouble::atEvery(std::set<std::string> names, int reason) {
    return {Kind::atEvery, 0, std::move(names), reason};
}
Trouble Trouble::interruptions() {
    return {Kind::interruptions, 0, {}, EINTR};
}
Trouble Trouble::shortCounts() {
    return {Kind::shortCounts, 0, {}, 0};
}
Trouble Trouble::none() {
    return {Kind::none, 0, {}, 0};
}

bool Trouble::fails(const std::string& name) {
    const std::size_t number = calls_++;
    bool failing = false;
    switch (kind_) {
        case Kind::none:
        case Kind::shortCounts:
            break;
        case Kind::atCall:
            failing = number == number_;
            break;
        case Kind::shortAtCall:
            if (number == number_) failedCall_ = name;
            break;
        case Kind::fromCallOn:
            if (number == number_) failedCall_ = name;
            failing = number >= number_ && natureOf(name).stores && !isShort();
            break;
        case Kind::atEvery:
            failing = names_.contains(name);
            break;
        case Kind::interruptions:
            if (!natureOf(name).isInterruptible) break;
            failing = std::exchange(interrupted_, name) != name;
            break;
    }
    if (!failing) {
        interrupted_.clear();
        return false;
    }
    failedCall_ = name;
    errno = reason_;
    return true;
}

bool Trouble::isShort() const noexcept {
    if (kind_ == Kind::shortCounts) return true;
    return (kind_ == Kind::shortAtCall || kind_ == Kind::fromCallOn) && calls_ == number_ + 1 &&
           natureOf(failedCall_).moves;
}

void Trouble::noteOpening(int flags) {
    if ((flags & O_CLOEXEC) == 0) ++inheritable_;
}

void Trouble::noteFlush(int file) {
    flushed_.push_back(std::filesystem::read_symlink("/proc/self/fd/" + std::to_string(file)));
}

}  // namespace pinwell::test

// The linker's names; each does the work of its call, or fails.
// NOLINTBEGIN: the linker and the system prescribe these reserved and variadic names
using pinwell::test::current;
using pinwell::test::fails;
using pinwell::test::isStandardStream;
using pinwell::test::shortened;

namespace {
void noteOpening(int flags) {
    if (current != nullptr) current->noteOpening(flags);
}
mode_t modeArgument(int flags, va_list arguments) {
    const bool present = (flags & O_CREAT) != 0 || (flags & O_TMPFILE) == O_TMPFILE;
    return present ? va_arg(arguments, mode_t) : 0;
}
}  // namespace

extern "C" {

#define PINWELL_WRAP(answer, failure, call, parameters, arguments) \
    answer __real_##call parameters;                               \
    answer __wrap_##call parameters;                               \
    answer __wrap_##call parameters {                              \
        return fails(#call) ? failure : __real_##call arguments;   \
    }

PINWELL_WRAP(int, -1, fallocate, (int file, int mode, off_t at, off_t length), (file, mode, at, length))
PINWELL_WRAP(int, -1, flock, (int file, int operation), (file, operation))
PINWELL_WRAP(int, -1, rmdir, (const char* path), (path))
PINWELL_WRAP(int, -1, unlink, (const char* path), (path))
PINWELL_WRAP(int, -1, fchmod, (int file, mode_t mode), (file, mode))
PINWELL_WRAP(int, -1, fchown, (int file, uid_t user, gid_t group), (file, user, group))
PINWELL_WRAP(DIR*, nullptr, fdopendir, (int file), (file))
PINWELL_WRAP(ssize_t, -1, fgetxattr, (int file, const char* name, void* value, size_t size),
             (file, name, value, size))
PINWELL_WRAP(ssize_t, -1, flistxattr, (int file, char* list, size_t size), (file, list, size))
PINWELL_WRAP(int, -1, fremovexattr, (int file, const char* name), (file, name))
PINWELL_WRAP(int, -1, fsetxattr, (int file, const char* name, const void* value, size_t size, int flags),
             (file, name, value, size, flags))
PINWELL_WRAP(int, -1, fstat, (int file, struct stat* status), (file, status))
PINWELL_WRAP(int, -1, ftruncate, (int file, off_t length), (file, length))
PINWELL_WRAP(int, -1, futimens, (int file, const timespec* times), (file, times))
PINWELL_WRAP(off_t, -1, lseek, (int file, off_t distance, int from), (file, distance, from))
PINWELL_WRAP(int, -1, lstat, (const char* path, struct stat* status), (path, status))
PINWELL_WRAP(int, -1, fstatat, (int directory, const char* name, struct stat* status, int flags),
             (directory, name, status, flags))
PINWELL_WRAP(int, -1, fstatfs, (int file, struct statfs* status), (file, status))
PINWELL_WRAP(int, -1, mkdirat, (int directory, const char* name, mode_t mode), (directory, name, mode))
PINWELL_WRAP(int, -1, renameat, (int from, const char* old, int to, const char* name), (from, old, to, name))
PINWELL_WRAP(dirent*, nullptr, readdir, (DIR * stream), (stream))
PINWELL_WRAP(ssize_t, -1, readlink, (const char* path, char* target, size_t size), (path, target, size))
PINWELL_WRAP(int, -1, rename, (const char* from, const char* to), (from, to))
PINWELL_WRAP(int, -1, unlinkat, (int directory, const char* name, int flags), (directory, name, flags))
PINWELL_WRAP(ssize_t, -1, pread, (int file, void* bytes, size_t count, off_t at),
             (file, bytes, shortened(count), at))
PINWELL_WRAP(ssize_t, -1, pwrite, (int file, const void* bytes, size_t count, off_t at),
             (file, bytes, shortened(count), at))
PINWELL_WRAP(ssize_t, -1, copy_file_range,
             (int from, off_t* in, int to, off_t* out, size_t count, unsigned flags),
             (from, in, to, out, shortened(count), flags))

#undef PINWELL_WRAP

ssize_t __real_read(int file, void* bytes, size_t count);
ssize_t __wrap_read(int file, void* bytes, size_t count);
ssize_t __wrap_read(int file, void* bytes, size_t count) {
    if (isStandardStream(file)) return __real_read(file, bytes, count);
    return fails("read") ? -1 : __real_read(file, bytes, shortened(count));
}

ssize_t __real_write(int file, const void* bytes, size_t count);
ssize_t __wrap_write(int file, const void* bytes, size_t count);
ssize_t __wrap_write(int file, const void* bytes, size_t count) {
    if (isStandardStream(file)) return __real_write(file, bytes, count);
    return fails("write") ? -1 : __real_write(file, bytes, shortened(count));
}

// Closes in any case, as the kernel does.
int __real_close(int file);
int __wrap_close(int file);
int __wrap_close(int file) {
    if (!fails("close")) return __real_close(file);
    const int reason = errno;
    __real_close(file);
    errno = reason;
    return -1;
}

int __real_fsync(int file);
int __wrap_fsync(int file);
int __wrap_fsync(int file) {
    if (fails("fsync")) return -1;
    const int answer = __real_fsync(file);
    if (answer == 0 && current != nullptr) current->noteFlush(file);
    return answer;
}

int __real_open(const char* path, int flags, ...);
int __wrap_open(const char* path, int flags, ...);
int __wrap_open(const char* path, int flags, ...) {
    va_list arguments;
    va_start(arguments, flags);
    const mode_t mode = modeArgument(flags, arguments);
    va_end(arguments);
    noteOpening(flags);
    return fails("open") ? -1 : __real_open(path, flags, mode);
}

// The name of open in a fortified build when its flags are not constant.
int __real___open_2(const char* path, int flags);
int __wrap___open_2(const char* path, int flags);
int __wrap___open_2(const char* path, int flags) {
    noteOpening(flags);
    return fails("open") ? -1 : __real___open_2(path, flags);
}

int __real_openat(int directory, const char* path, int flags, ...);
int __wrap_openat(int directory, const char* path, int flags, ...);
int __wrap_openat(int directory, const char* path, int flags, ...) {
    va_list arguments;
    va_start(arguments, flags);
    const mode_t mode = modeArgument(flags, arguments);
    va_end(arguments);
    noteOpening(flags);
    return fails("openat") ? -1 : __real_openat(directory, path, flags, mode);
}

// As with open.
int __real___openat_2(int directory, const char* path, int flags);
int __wrap___openat_2(int directory, const char* path, int flags);
int __wrap___openat_2(int directory, const char* path, int flags) {
    noteOpening(flags);
    return fails("openat") ? -1 : __real___openat_2(directory, path, flags);
}

// For calls that the C library has no function for; of these, openat2 concerns files. Like the C library's,
// it reads six words, whether or not the caller passed them, and a sanitizer must not see that.
long __real_syscall(long number, ...);
long __wrap_syscall(long number, ...);
__attribute__((no_sanitize_address)) long __wrap_syscall(long number, ...) {
    va_list arguments;
    va_start(arguments, number);
    std::array<long, 6> words{};
    for (long& word : words) word = va_arg(arguments, long);
    va_end(arguments);
    if (number == SYS_openat2 && fails("openat2")) return -1;
    return __real_syscall(number, words[0], words[1], words[2], words[3], words[4], words[5]);
}

// Every request of the file service takes one word, a number or a pointer.
int __real_ioctl(int file, unsigned long request, ...);
int __wrap_ioctl(int file, unsigned long request, ...);
int __wrap_ioctl(int file, unsigned long request, ...) {
    va_list arguments;
    va_start(arguments, request);
    const unsigned long argument = va_arg(arguments, unsigned long);
    va_end(arguments);
    return fails("ioctl") ? -1 : __real_ioctl(file, request, argument);
}

}  // extern "C"
// NOLINTEND
