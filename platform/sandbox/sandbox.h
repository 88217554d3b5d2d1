// What a process keeps of its rights before it reads bytes that it does not trust.
//
// Two facilities of the Linux kernel, both for good and for every thread and child that comes after:
//
//   Landlock   which files may be read and written, and whether TCP may be used (landlock(7), Linux 5.13)
//   seccomp    which system calls may be made (seccomp(2), through libseccomp)
//
// A kernel without one of them, or a container that forbids it, leaves the process as it is in that respect;
// confine() then says so. What is open stays open: descriptors from before are not touched.
//
// Landlock governs opening, making, renaming and removing. It does not govern stat(2), chmod(2), chown(2),
// utimensat(2), or connecting to a socket in the file system.
#pragma once

#include <string>
#include <vector>

namespace pinwell::sandbox {

enum class Access {
    /// Reads files and lists directories.
    read,
    /// The same for a file alone, and writes to it. For a directory: makes, renames and removes files and
    /// directories below it as well.
    write,
};

/// A file, or a directory with all that is below it. A symbolic link in the last component is followed. A
/// path that does not exist gives no right, also not to what is made there later.
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
    /// All but those that start programs, look into other processes, mount, trace, load code into the kernel,
    /// change identity, or set the machine up. Sockets are of the Unix family, and with a network of the
    /// IPv4,
    /// IPv6 and routing families too; except where the processor has one call for all that is done with
    /// sockets, which cannot be told apart.
    service,
    /// Only those that reading files, memory, threads and time need. No socket, no signal to another process,
    /// no change of any file, not even of its mode or its times.
    reading,
};

struct Confinement {
    FileRules files;
    Network network = Network::none;
    Calls calls = Calls::service;
};

/// Sets no_new_privs and gives up every right that `confinement` does not name. To be called once, while the
/// process has one thread. A forbidden file then fails with EACCES, a forbidden call with EPERM or, where the
/// C library has another way, with ENOSYS.
///
/// Returns a clause for each facility that is not in force, such as "Landlock is not in force: Function not
/// implemented"; empty when all are.
std::vector<std::string> confine(const Confinement& confinement);

/// Keeps the process from leaving a core dump and from being traced by other processes of its user: for a
/// process that holds private keys.
void forbidCoreDumps();

/// A directory to be read, with what the symbolic links in it and in its directories, two levels deep, lead
/// to: certificates are often links to where a package keeps them. Directories that are links count like
/// others. At most ten thousand links.
FileRules filesWithLinks(const std::string& directory);

/// A file that is read again while the process runs, and may be another file by then: beside the file, the
/// directories that the links on its way lead to.
FileRules fileAndItsLinks(const std::string& path, Access access = Access::read);

/// Shared libraries and data that the process's own libraries look for while it runs: the loader's
/// directories (LD_LIBRARY_PATH and what is linked into the program included), the configuration of OpenSSL,
/// locales, time zones, devices without contents, and /proc/self.
FileRules libraryFiles();

/// What finding the addresses of a host name reads: resolv.conf, hosts, nsswitch.conf and the files of the
/// services that it names (`switchFile`, nsswitch.conf(5)). A service that is not known may read /etc, /run,
/// /usr and /var.
FileRules nameResolutionFiles(const std::string& switchFile = "/etc/nsswitch.conf");

/// The shared MIME database: $XDG_DATA_HOME and $XDG_DATA_DIRS.
FileRules typeDatabaseFiles();

/// `more` at the end of `rules`.
void append(FileRules& rules, FileRules more);

}  // namespace pinwell::sandbox
