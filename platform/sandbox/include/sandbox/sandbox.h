// What a process does to itself before it reads untrusted bytes: it gives up the rights that it does not
// need, and limits its processor time and stack.
//
// Confinement uses two facilities of the Linux kernel. Both are permanent, and bind every later thread and
// child:
//
//   Landlock   which files may be read and written, and whether TCP may be used (landlock(7), Linux 5.13)
//   seccomp    which system calls may be made (seccomp(2), through libseccomp)
//
// If a kernel lacks one of them, or a container forbids it, that restriction is missing; confine() then says
// so. Open descriptors stay open and keep their rights.
//
// Landlock restricts opening, creating, renaming and removing. It does not restrict stat(2), chmod(2),
// chown(2), utimensat(2), or connecting to a socket in the file system.
//
// The limits end a process that uses far more than its input can need: with one line and an exit status,
// instead of a hanging build or a crash. Every reader bounds its work, so this is for cases that the bounds
// miss, for example in a library.
#pragma once

#include <atomic>
#include <cstdint>
#include <string>
#include <vector>

namespace pinwell::sandbox {

enum class Access {
    /// Reads files and lists directories.
    read,
    /// The same, and writes to a file. For a directory: also creates, renames and removes files and
    /// directories below it.
    write,
};

/// A file, or a directory with everything below it. A symbolic link in the last component is followed. A path
/// that does not exist gives no right, not even if it is created later.
struct FileRule {
    std::string path;
    Access access = Access::read;
};
using FileRules = std::vector<FileRule>;

enum class Network {
    none,     ///< no TCP, and no sockets but those of the file system; with Calls::reading, no socket at all
    connect,  ///< TCP connections may be opened, not received
    listen,   ///< both
};

enum class Calls {
    /// All except calls that start programs, access other processes, mount, trace, load code
    /// into the kernel, change identity, or configure the machine. Sockets are of the
    /// Unix family, and with a network of the IPv4, IPv6 and routing families too. On
    /// processors with one call for all socket operations, families are not
    /// restricted.
    service,
    /// Only calls for reading files, memory, threads and time. No socket, no signal to another process, no
    /// change of any file, not even of its mode or times.
    reading,
};

struct Confinement {
    FileRules files;
    Network network = Network::none;
    Calls calls = Calls::service;
};

/// Sets no_new_privs and gives up every right that `confinement` does not name. Call it once, while the
/// process has one thread. Then opening a forbidden file fails with EACCES. A forbidden call fails with
/// EPERM, or with ENOSYS if the C library has an alternative.
///
/// Returns a clause for each facility that is not in force, such as "Landlock is not in force: Function not
/// implemented"; empty if all are in force.
std::vector<std::string> confine(const Confinement& confinement);

/// Prevents core dumps, and tracing by other processes of the user: for a process that holds private
/// keys.
void forbidCoreDumps();

/// Rules to read a directory, and the targets of the symbolic links in it and in its directories, two levels
/// deep: certificates are often links to a package's files. A link to a directory counts like a directory. At
/// most ten thousand links.
FileRules filesWithLinks(const std::string& directory);

/// Rules for a file that is read again later, and may have been replaced by then: the file, and the
/// directories of the links on its path.
FileRules fileAndItsLinks(const std::string& path, Access access = Access::read);

/// Shared libraries and data that the process's libraries open later: the loader's directories (with
/// LD_LIBRARY_PATH and the program's own), the configuration of OpenSSL, locales, time zones, devices without
/// contents, and /proc/self.
FileRules libraryFiles();

/// The files for name resolution: resolv.conf, hosts, nsswitch.conf and the files of the services
/// that it names (`switchFile`, nsswitch.conf(5)). An unknown service may read /etc, /run, /usr and
/// /var.
FileRules nameResolutionFiles(const std::string& switchFile = "/etc/nsswitch.conf");

/// The shared MIME database: $XDG_DATA_HOME and $XDG_DATA_DIRS.
FileRules typeDatabaseFiles();

/// `more` at the end of `rules`.
void append(FileRules& rules, FileRules more);

/// The limit of processor time, in seconds, for input of that many bytes: 60 s for reading (the slowest known
/// input takes 2 s), and a second for every MiB. Even a processor without hash instructions hashes ten times
/// as fast.
std::uint64_t processorSecondsFor(std::uint64_t bytes);

struct RunawayEnd {
    /// The descriptor for the line; -1 for none.
    int descriptor = 1;
    /// Lines without newlines.
    std::string processorTime;
    std::string stack;
    /// Read at the end; must live as long as the process.
    const std::atomic<std::int32_t>* exitStatus = nullptr;
};

/// From now on this process ends in this way if it has used `processorSeconds` in all, or if a thread with a
/// runtime::StackGuard exceeds its stack. The main thread's stack has at most 8 MiB. A lower limit that
/// the caller has set stays. If the time runs out during a write, the end waits for the write
/// (runtime::SignalDeferral). Call it before there is a second thread, and before the main thread's guard.
/// Other crashes are not changed; in builds with sanitizers, stacks are not limited either.
void limitRunaways(std::uint64_t processorSeconds, RunawayEnd end);

}  // namespace pinwell::sandbox
