#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>

#include "sandbox/sandbox.h"
#include "support/environment.h"
#include "support/file_properties.h"
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

TEST(NeededFiles, HoldTheLoadersOwnDirectories) {
    const auto paths = pathsOf(sandbox::libraryFiles());
    EXPECT_THAT(paths, testing::Contains("/usr/lib"));
    // The loader's own directories come after ours.
    EXPECT_GT(std::count(paths.begin(), paths.end(), "/usr/lib"), 1);
}

class NameServices : public testing::Test {
  protected:
    std::vector<std::string> filesFor(std::string_view line) const {
        writeFile(directory / "nsswitch.conf", line);
        return pathsOf(sandbox::nameResolutionFiles(directory / "nsswitch.conf"));
    }

    TemporaryDirectory directory;
};

TEST_F(NameServices, ThatAreKnownReadTheirFiles) {
    for (const char* const line :
         {"hosts: files dns\n", "hosts:\tfiles mdns4_minimal [NOTFOUND=return] dns\n",
          "# hosts: foreign\nhosts: resolve [!UNAVAIL=return] files myhostname dns",
          "passwd: files foreign\n", ""})
        EXPECT_THAT(filesFor(line), testing::Not(testing::Contains("/etc"))) << line;
}

TEST_F(NameServices, ThatAreNotKnownReadTheSystemsFiles) {
    for (const char* const line : {"hosts: files foreign\n", "passwd: files\n  hosts: foreign\n"})
        EXPECT_THAT(filesFor(line), testing::IsSupersetOf({"/etc", "/run", "/usr", "/var"})) << line;
}

TEST(FilesWithLinks, IncludeTheTargetsOfTheirLinks) {
    const TemporaryDirectory directory;
    writeFile(directory / "elsewhere/root.pem", "");
    writeFile(directory / "certificates/other.pem", "");
    writeFile(directory / "platform/roots/own.pem", "");
    makeLink(directory / "elsewhere/root.pem", directory / "platform/roots/link.pem");
    makeLink(directory / "certificates", directory / "platform/compat-roots");
    makeLink(directory / "elsewhere/root.pem", directory / "certificates/further.pem");
    EXPECT_THAT(pathsOf(sandbox::filesWithLinks(directory / "platform")),
                testing::UnorderedElementsAre(directory / "platform", directory / "platform/roots/link.pem",
                                              directory / "platform/compat-roots",
                                              directory / "platform/compat-roots/further.pem"));
}

TEST(FileAndItsLinks, HoldTheDirectoriesThatTheLinksLeadTo) {
    const TemporaryDirectory directory;
    writeFile(directory / "archive/site/key2.pem", "");
    writeFile(directory / "live/site/README", "");
    writeFile(directory / "service/README", "");
    makeLink("../../archive/site/key2.pem", directory / "live/site/key.pem");
    makeLink(directory / "live/site/key.pem", directory / "service/server.key");
    EXPECT_THAT(pathsOf(sandbox::fileAndItsLinks(directory / "service/server.key")),
                testing::ElementsAre(directory / "service/server.key", directory / "live/site",
                                     directory / "live/site/../../archive/site"));
    EXPECT_THAT(pathsOf(sandbox::fileAndItsLinks(directory / "live/site/README")),
                testing::ElementsAre(directory / "live/site/README"));
}

}  // namespace
}  // namespace pinwell::test
