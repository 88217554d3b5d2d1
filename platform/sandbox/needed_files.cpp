// The files that the libraries of a process look for while it runs.

#include <glob.h>

#include <algorithm>
#include <string>
#include <string_view>

#include "foundation/bytes.h"
#include "foundation/file_io.h"
#include "foundation/process.h"
#include "sandbox/sandbox.h"

namespace pinwell::sandbox {
namespace {

using foundation::secureEnvironment;

// Far above what any system has: a few lines.
constexpr std::size_t kMaximumLoaderConfiguration = std::size_t{64} * 1024;

void addReadable(FileRules& rules, std::string path) {
    if (path.starts_with('/')) rules.push_back({std::move(path), Access::read});
}

// A list of directories as the environment has it: colons between them (LD_LIBRARY_PATH also has semicolons).
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

// ldconfig(8): a directory a line, or `include PATTERN`; # begins a comment.
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
    constexpr std::string_view kBlank = " \t";
    const auto bytes = foundation::readSmallFile(path, kMaximumLoaderConfiguration);
    if (!bytes || depth > kDeepestInclude) return;
    const std::string contents = foundation::toString(*bytes);
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

}  // namespace

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
    for (const char* const variable :
         {"LD_LIBRARY_PATH", "OPENSSL_CONF", "OPENSSL_MODULES", "OPENSSL_ENGINES", "GCONV_PATH", "LOCPATH"})
        addVariable(rules, variable);
    addLoaderConfiguration(rules, "/etc/ld.so.conf", 0);
    return rules;
}

FileRules nameResolutionFiles() {
    FileRules rules;
    for (const char* const path :
         {"/etc/resolv.conf", "/etc/hosts", "/etc/host.conf", "/etc/nsswitch.conf", "/etc/gai.conf",
          "/etc/services", "/etc/protocols", "/etc/networks", "/etc/hostname", "/etc/passwd",
          "/etc/mdns.allow", "/etc/nscd.conf", "/run/systemd/resolve", "/run/nscd", "/var/cache/nscd",
          "/var/lib/sss/mc", "/var/lib/sss/pubconf"})
        addReadable(rules, path);
    addVariable(rules, "HOSTALIASES");
    return rules;
}

FileRules typeDatabaseFiles() {
    FileRules rules;
    const auto home = secureEnvironment("HOME");
    const auto own = secureEnvironment("XDG_DATA_HOME");
    if (own && !own->empty()) {
        addReadable(rules, *own + "/mime");
    } else if (home) {
        addReadable(rules, *home + "/.local/share/mime");
    }
    const auto system = secureEnvironment("XDG_DATA_DIRS");
    addList(rules, system && !system->empty() ? *system : "/usr/local/share:/usr/share", "/mime");
    return rules;
}

}  // namespace pinwell::sandbox
