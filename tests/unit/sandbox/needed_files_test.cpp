#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>

#include "sandbox/sandbox.h"
#include "support/environment.h"
#include "support/temporary_directory.h"

namespace pinwell::test {
namespace {

using sandbox::Access;
using sandbox::FileRules;

std::vector<std::string> pathsOf(const FileRules& rules) {
    std::vector<std::string> paths;
    for (const sandbox::FileRule& rule : rules) paths.push_back(rule.path);
    return paths;
}

TEST(NeededFiles, AreOnlyRead) {
    FileRules all = sandbox::libraryFiles();
    append(all, sandbox::nameResolutionFiles());
    append(all, sandbox::typeDatabaseFiles());
    for (const sandbox::FileRule& rule : all) {
        EXPECT_EQ(rule.access, rule.path == "/dev/null" ? Access::write : Access::read) << rule.path;
        EXPECT_THAT(rule.path, testing::StartsWith("/"));
    }
}

TEST(NeededFiles, AreNeverAWholeRootOrHome) {
    FileRules all = sandbox::libraryFiles();
    append(all, sandbox::nameResolutionFiles());
    append(all, sandbox::typeDatabaseFiles());
    const auto paths = pathsOf(all);
    for (const char* const broad :
         {"/", "/etc", "/home", "/root", "/usr", "/var", "/run", "/proc", "/dev", ""})
        EXPECT_THAT(paths, testing::Not(testing::Contains(broad)));
}

TEST(NeededFiles, HoldTheDirectoriesOfTheCallersLoaderPath) {
    const ScopedVariable variable("LD_LIBRARY_PATH", "/opt/one:relative:/opt/two;/opt/three:");
    const auto paths = pathsOf(sandbox::libraryFiles());
    for (const char* const wanted : {"/opt/one", "/opt/two", "/opt/three"})
        EXPECT_THAT(paths, testing::Contains(wanted));
    EXPECT_THAT(paths, testing::Not(testing::Contains("relative")));
}

TEST(NeededFiles, HoldTheConfigurationThatTheCallerNamesForOpenSSL) {
    const ScopedVariable variable("OPENSSL_CONF", "/opt/openssl.cnf");
    EXPECT_THAT(pathsOf(sandbox::libraryFiles()), testing::Contains("/opt/openssl.cnf"));
}

TEST(NeededFiles, HoldTheTypeDatabasesOfTheUser) {
    {
        const ScopedVariable home("HOME", "/home/user");
        const ScopedVariable own("XDG_DATA_HOME", std::nullopt);
        const ScopedVariable system("XDG_DATA_DIRS", std::nullopt);
        EXPECT_THAT(
            pathsOf(sandbox::typeDatabaseFiles()),
            testing::ElementsAre("/home/user/.local/share/mime", "/usr/local/share/mime", "/usr/share/mime"));
    }
    const ScopedVariable own("XDG_DATA_HOME", "/data");
    const ScopedVariable system("XDG_DATA_DIRS", "/one:/two");
    EXPECT_THAT(pathsOf(sandbox::typeDatabaseFiles()),
                testing::ElementsAre("/data/mime", "/one/mime", "/two/mime"));
}

}  // namespace
}  // namespace pinwell::test
