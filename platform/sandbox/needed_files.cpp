// The files that the libraries of a process open while it runs.

#include <dlfcn.h>
#include <glob.h>
#include <pwd.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cstddef>
#include <filesystem>
#include <memory>
#include <new>
#include <optional>
#include <sstream>
#include <string>
#include <string_view>
#include <system_error>
#include <vector>

#include "base/bytes.h"
#include "base/file_io.h"
#include "runtime/process.h"
#include "sandbox/sandbox.h"

namespace pinwell::sandbox {
namespace {

namespace fs = std::filesystem;
using runtime::secureEnvironment;

// Far more than any real system's few lines.
constexpr std::size_t kMaximumConfiguration = std::size_t{64} * 1024;
constexpr std::string_view kBlank = " \t";

void addReadable(FileRules& rules, std::string path) {
    if (path.starts_with('/')) rules.push_back({std::move(path), Access::read});
}

// A list of directories in an environment variable, with colons between them (LD_LIBRARY_PATH also allows
// semicolons).
void addList(FileRules& rules, std::string_view list, std::string_view suffix = {}) {
    while (true) {
        const std::size_t end = list.find_first_of(":;");
        addReadable(rules, std::string(list.substr(0, end)) + std::string(suffix));
        if (end == std::string_view::npos) return;
        list.remove_prefix(end + 1);
    }
}

void addVariable(FileRules& rules, const char* name) {
    if (const auto list = secureEnvironment(name)) addList(rules, *list);
}

// ldconfig(8): one directory on each line, or `include PATTERN`; # begins a comment.
void addLoaderConfiguration(FileRules& rules, const std::string& path, int depth);

void addIncluded(FileRules& rules, const std::string& pattern, int depth) {
    glob_t found{};
    if (glob(pattern.c_str(), 0, nullptr, &found) == 0)
        for (std::size_t i = 0; i < found.gl_pathc; ++i)
            addLoaderConfiguration(rules, found.gl_pathv[i], depth + 1);
    globfree(&found);
}

void addLoaderConfiguration(FileRules& rules, const std::string& path, int depth) {
    constexpr int kDeepestInclude = 4;
    constexpr std::string_view kInclude = "include";
    const auto bytes = base::readSmallFile(path, kMaximumConfiguration);
    if (!bytes || depth > kDeepestInclude) return;
    const std::string contents = base::toString(*bytes);
    std::string_view text = contents;
    while (!text.empty()) {
        const std::size_t end = text.find('\n');
        std::string_view line = text.substr(0, end);
        text.remove_prefix(end == std::string_view::npos ? text.size() : end + 1);
        line = line.substr(0, line.find('#'));
        line.remove_prefix(std::min(line.find_first_not_of(kBlank), line.size()));
        line = line.substr(0, line.find_last_not_of(kBlank) + 1);
        if (!line.starts_with(kInclude)) {
            addReadable(rules, std::string(line));
            continue;
        }
        line.remove_prefix(kInclude.size());
        line.remove_prefix(std::min(line.find_first_not_of(kBlank), line.size()));
        std::string pattern(line);
        if (!pattern.starts_with('/')) pattern = path.substr(0, path.rfind('/') + 1) + pattern;
        addIncluded(rules, pattern, depth);
    }
}

constexpr std::size_t kMaximumLinks = 10'000;
constexpr int kLinkDepth = 2;
constexpr int kMaximumHops = 40;  // as the kernel's own

void addLinks(FileRules& rules, const fs::path& directory, int depth) {
    std::error_code failure;
    for (fs::directory_iterator entry(directory, failure); !failure && entry != fs::directory_iterator();
         entry.increment(failure)) {
        std::error_code unknown;
        if (entry->is_symlink(unknown)) {
            if (rules.size() > kMaximumLinks) return;
            rules.push_back({entry->path().native(), Access::read});
        }
        if (depth < kLinkDepth && entry->is_directory(unknown)) addLinks(rules, entry->path(), depth + 1);
    }
}

// The directories in which the loader searches, in its order, with the program's own (RUNPATH).
void addLoaderDirectories(FileRules& rules) {
    void* const program = dlopen(nullptr, RTLD_LAZY);
    Dl_serinfo size{};
    if (program == nullptr || dlinfo(program, RTLD_DI_SERINFOSIZE, &size) != 0) return;
    const auto room = std::make_unique<std::byte[]>(size.dls_size);
    auto* const found = new (room.get()) Dl_serinfo(size);
    if (dlinfo(program, RTLD_DI_SERINFOSIZE, found) != 0 || dlinfo(program, RTLD_DI_SERINFO, found) != 0)
        return;
    for (unsigned i = 0; i < found->dls_cnt; ++i) addReadable(rules, found->dls_serpath[i].dls_name);
}

// The home directory of the process's user in the user database.
std::optional<std::string> homeOfUser() {
    std::array<char, 4096> buffer{};
    passwd entry{};
    passwd* user = nullptr;
    if (getpwuid_r(getuid(), &entry, buffer.data(), buffer.size(), &user) != 0 || user == nullptr) return {};
    return user->pw_dir;
}

// The services of a line such as "hosts: files mdns4_minimal [NOTFOUND=return] dns".
std::vector<std::string> hostServices(const std::string& switchFile) {
    constexpr std::string_view kHosts = "hosts:";
    std::vector<std::string> services;
    const auto bytes = base::readSmallFile(switchFile, kMaximumConfiguration);
    if (!bytes) return services;
    std::istringstream lines(base::toString(*bytes));
    for (std::string line; std::getline(lines, line);) {
        line.resize(std::min(line.find('#'), line.size()));
        const std::size_t start = std::min(line.find_first_not_of(kBlank), line.size());
        if (!std::string_view(line).substr(start).starts_with(kHosts)) continue;
        std::istringstream words(line.substr(start + kHosts.size()));
        for (std::string word; words >> word;)
            if (word.find_first_of("[]=") == std::string::npos) services.push_back(word);
    }
    return services;
}

bool isKnownService(const std::string& name) {
    constexpr std::array<std::string_view, 13> kKnown{
        "files", "dns", "resolve", "myhostname",   "mymachines",    "mdns",         "mdns4",
        "mdns6", "sss", "compat",  "mdns_minimal", "mdns4_minimal", "mdns6_minimal"};
    return std::find(kKnown.begin(), kKnown.end(), name) != kKnown.end();
}

}  // namespace

FileRules filesWithLinks(const std::string& directory) {
    FileRules rules{{directory, Access::read}};
    addLinks(rules, directory, 0);
    return rules;
}

FileRules fileAndItsLinks(const std::string& path, Access access) {
    FileRules rules{{path, access}};
    fs::path link = path;
    std::error_code failure;
    for (int hops = 0; hops < kMaximumHops; ++hops) {
        const fs::path target = fs::read_symlink(link, failure);
        if (failure) break;
        link = link.parent_path() / target;  // the target itself if it is absolute
        rules.push_back({link.parent_path().native(), access});
    }
    return rules;
}

FileRules libraryFiles() {
    FileRules rules;
    for (const char* const path : {"/lib",
                                   "/lib32",
                                   "/lib64",
                                   "/libx32",
                                   "/usr/lib",
                                   "/usr/lib32",
                                   "/usr/lib64",
                                   "/usr/libx32",
                                   "/usr/local/lib",
                                   "/usr/share/locale",
                                   "/usr/share/zoneinfo",
                                   "/etc/ld.so.cache",
                                   "/etc/ld.so.conf",
                                   "/etc/ld.so.conf.d",
                                   "/etc/localtime",
                                   "/etc/locale.alias",
                                   "/etc/ssl/openssl.cnf",
                                   "/etc/ssl/openssl.cnf.d",
                                   "/etc/ssl/fipsmodule.cnf",
                                   "/etc/pki/tls/fipsmodule.cnf",
                                   "/etc/pki/tls/openssl.cnf",
                                   "/etc/pki/tls/openssl.d",
                                   "/etc/crypto-policies",
                                   "/dev/urandom",
                                   "/dev/random",
                                   "/dev/zero",
                                   "/proc/self",
                                   "/proc/cpuinfo",
                                   "/proc/meminfo",
                                   "/proc/filesystems",
                                   "/proc/sys/crypto",
                                   "/proc/sys/vm/overcommit_memory",
                                   "/sys/devices/system/cpu",
                                   "/sys/kernel/mm/transparent_hugepage"})
        addReadable(rules, path);
    rules.push_back({"/dev/null", Access::write});
    for (const char* const variable : {"LD_LIBRARY_PATH", "OPENSSL_CONF", "OPENSSL_CONF_INCLUDE",
                                       "OPENSSL_MODULES", "OPENSSL_ENGINES", "GCONV_PATH", "LOCPATH"})
        addVariable(rules, variable);
    addLoaderDirectories(rules);
    addLoaderConfiguration(rules, "/etc/ld.so.conf", 0);
    return rules;
}

FileRules nameResolutionFiles(const std::string& switchFile) {
    FileRules rules;
    for (const char* const path : {"/etc/resolv.conf",    "/etc/hosts",           "/etc/host.conf",
                                   "/etc/nsswitch.conf",  "/etc/gai.conf",        "/etc/services",
                                   "/etc/protocols",      "/etc/networks",        "/etc/hostname",
                                   "/etc/machine-info",   "/etc/passwd",          "/etc/mdns.allow",
                                   "/etc/nscd.conf",      "/run/systemd/resolve", "/run/systemd/machines",
                                   "/run/NetworkManager", "/run/resolvconf",      "/run/connman",
                                   "/run/nscd",           "/var/cache/nscd",      "/var/lib/sss/mc",
                                   "/var/lib/sss/pubconf"})
        addReadable(rules, path);
    addVariable(rules, "HOSTALIASES");
    const auto services = hostServices(switchFile);
    if (!std::all_of(services.begin(), services.end(), isKnownService))
        for (const char* const path : {"/etc", "/run", "/usr", "/var"}) addReadable(rules, path);
    return rules;
}

FileRules typeDatabaseFiles() {
    FileRules rules;
    auto home = secureEnvironment("HOME");
    const auto own = secureEnvironment("XDG_DATA_HOME");
    if (own && !own->empty()) {
        addReadable(rules, *own + "/mime");
    } else {
        if (!home) home = homeOfUser();
        if (home) addReadable(rules, *home + "/.local/share/mime");
    }
    const auto system = secureEnvironment("XDG_DATA_DIRS");
    addList(rules, system && !system->empty() ? *system : "/usr/local/share:/usr/share", "/mime");
    return rules;
}

}  // namespace pinwell::sandbox
