#include "config/platform_directory.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/prctl.h>
#include <sys/stat.h>
#include <sys/statvfs.h>

#include <filesystem>

#include "support/environment.h"
#include "support/file_properties.h"
#include "support/process.h"
#include "support/temporary_directory.h"

namespace pinwell::config {
namespace {

using test::ScopedVariable;
using test::TemporaryDirectory;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::StartsWith;

// The host that a platform.json with these contents gives, or the error's text.
std::string hostFrom(std::string_view contents) {
    const TemporaryDirectory directory;
    test::writeFile(directory / "platform.json", contents);
    const auto host = PlatformDirectory(directory.path()).lumoraHost();
    if (host) return *host;
    EXPECT_THAT(host.error().localizedDescription(), StartsWith(directory / "platform.json"));
    return "error: " + host.error().localizedFailureReason();
}

std::string hostNamed(const std::string& host) {
    return hostFrom(R"({"lumora": {"host": ")" + host + "\"}}");
}

TEST(PlatformHost, IsTheOneInTheFile) {
    for (const char* host : {"api.example", "localhost", "api.example:8443", "127.0.0.1", "127.0.0.1:1",
                             "[::1]", "[2001:db8::1]:65535", "a-b.C9"})
        EXPECT_EQ(hostNamed(host), host);
}

TEST(PlatformHost, IsTheBuiltInOneWhenTheFileOrTheEntryIsAbsent) {
    const TemporaryDirectory directory;
    for (const std::string& path : {directory.path(), directory / "missing"}) {
        const auto host = PlatformDirectory(path).lumoraHost();
        ASSERT_TRUE(host);
        EXPECT_EQ(*host, PINWELL_LUMORA_HOST);
    }
    EXPECT_EQ(hostFrom("{}"), PINWELL_LUMORA_HOST);
    EXPECT_EQ(hostFrom(R"({"lumora": {}, "other": 1})"), PINWELL_LUMORA_HOST);
}

TEST(PlatformHost, IgnoresUnknownKeys) {
    EXPECT_EQ(hostFrom(R"({"x": [], "lumora": {"y": {}, "host": "h"}})"), "h");
}

TEST(PlatformHost, IsRefusedWhenItIsNone) {
    for (const char* host : {"",           ":443",  "a b",       "a/b",           "https://a", "user@a",
                             "a:",         "a:0",   "a:65536",   "a:99999999999", "a:1:2",     "a:x",
                             "a:-1",       "-a",    "a-",        "a..b",          ".a",        "a.",
                             "a_b",        "::1",   "[::1",      "[::1]443",      "[::1]:",    "[a]",
                             "[::1%eth0]", "1.2.3", "1.2.3.256", "a\\u0000b",     "\\u00e9",   "a#b",
                             "a?b",        "%41"})
        EXPECT_THAT(hostNamed(host), HasSubstr("lumora.host")) << host;
    EXPECT_THAT(hostNamed(std::string(64, 'a')), HasSubstr("lumora.host"));
    std::string longest;
    for (int i = 0; i < 128; ++i) longest += "a.";
    EXPECT_THAT(hostNamed(longest + "b"), HasSubstr("lumora.host"));
}

TEST(PlatformHost, NamesThePositionOfASyntaxError) {
    EXPECT_EQ(hostFrom(R"({"lumora": x})"), "error: The JSON document is malformed at byte 11.");
    EXPECT_THAT(hostFrom(""), HasSubstr("byte 0"));
}

TEST(PlatformHost, NamesTheWrongEntry) {
    EXPECT_THAT(hostFrom("[]"), HasSubstr("not an object, at byte 0"));
    EXPECT_THAT(hostFrom("5"), HasSubstr("at byte 0"));
    EXPECT_THAT(hostFrom(R"({"lumora": "h"})"), HasSubstr("lumora is not an object"));
    EXPECT_THAT(hostFrom(R"({"lumora": null})"), HasSubstr("lumora is not an object"));
    EXPECT_THAT(hostFrom(R"({"lumora": {"host": 5}})"), HasSubstr("lumora.host"));
    EXPECT_THAT(hostFrom(R"({"lumora": {"host": null}})"), HasSubstr("lumora.host"));
}

TEST(PlatformHost, IsNotReadFromAPipeADirectoryOrAGiant) {
    const TemporaryDirectory directory;
    ASSERT_EQ(mkfifo((directory / "platform.json").c_str(), 0600), 0);
    EXPECT_FALSE(PlatformDirectory(directory.path()).lumoraHost());
    std::filesystem::remove(directory / "platform.json");
    std::filesystem::create_directory(directory / "platform.json");
    EXPECT_FALSE(PlatformDirectory(directory.path()).lumoraHost());
    EXPECT_THAT(hostFrom("{}" + std::string(kMaximumPlatformSettings, ' ')), HasSubstr("File too large"));
}

TEST(PlatformDirectory, IsTheOneThatTheEnvironmentNames) {
    const ScopedVariable variable("PINWELL_PLATFORM", "/some/where");
    EXPECT_EQ(PlatformDirectory::current().path(), "/some/where");
}

TEST(PlatformDirectory, IsTheInstalledOneOtherwise) {
    for (const std::optional<std::string>& value : {std::optional<std::string>(), {""}}) {
        const ScopedVariable variable("PINWELL_PLATFORM", value);
        EXPECT_THAT(PlatformDirectory::current().path(), testing::EndsWith("/pinwell/platform"));
    }
}

// The output of a copy of the probe, started by another user with PINWELL_PLATFORM set.
std::string probedByAnotherUser(const std::string& probe) {
    constexpr const char* kOther = "65534";
    const auto result =
        test::runProcess({.executable = "/usr/bin/setpriv",
                          .arguments = {std::string("--reuid=") + kOther, std::string("--regid=") + kOther,
                                        "--clear-groups", probe},
                          .environment = {{"PINWELL_PLATFORM", "/some/where"}}});
    EXPECT_EQ(result.exitStatus, 0) << result.errors;
    return result.output;
}

TEST(PlatformDirectory, IsTheInstalledOneForARunWithMoreRightsThanItsCaller) {
    if (!test::isSuperuser())
        GTEST_SKIP() << "only a superuser can make a program that runs with other rights";
    if (!test::emulator().empty()) GTEST_SKIP() << "an emulated program has the rights of its emulator";
    const TemporaryDirectory directory;
    test::setMode(directory.path(), 0755);
    const std::string probe = directory / "probe";
    std::filesystem::copy_file(PLATFORM_DIRECTORY_PROBE, probe);
    test::setMode(probe, 0755);
    EXPECT_EQ(probedByAnotherUser(probe), "65534 65534 /some/where\n");

    struct statvfs volume {};
    ASSERT_EQ(statvfs(probe.c_str(), &volume), 0);
    if ((volume.f_flag & ST_NOSUID) != 0)
        GTEST_SKIP() << "set-user-ID bits count for nothing in " << directory.path();
    if (prctl(PR_GET_NO_NEW_PRIVS, 0, 0, 0, 0) != 0)
        GTEST_SKIP() << "set-user-ID bits count for nothing in this process";
    test::setMode(probe, 04755);
    const std::string printed = probedByAnotherUser(probe);
    EXPECT_THAT(printed, StartsWith("65534 0 ")) << "runs with the rights of its owner";
    EXPECT_THAT(printed, testing::EndsWith("/pinwell/platform\n"));
}

TEST(PlatformDirectory, ListsCertificateFilesInByteOrder) {
    const TemporaryDirectory directory;
    const PlatformDirectory platform(directory.path());
    for (const char* name : {"roots/b.pem", "roots/a.pem", "roots/B.pem", "roots/a.crt", "roots/pem",
                             "compat-roots/c.pem", "user-trust/allow/d.pem", "user-trust/deny/e.pem"})
        test::writeFile(directory / name, "x");
    EXPECT_THAT(platform.rootCertificateFiles(),
                ElementsAre(directory / "roots/B.pem", directory / "roots/a.pem", directory / "roots/b.pem"));
    EXPECT_THAT(platform.compatibilityRootCertificateFiles(), ElementsAre(directory / "compat-roots/c.pem"));
    EXPECT_THAT(platform.userAllowedCertificateFiles(), ElementsAre(directory / "user-trust/allow/d.pem"));
    EXPECT_THAT(platform.userDeniedCertificateFiles(), ElementsAre(directory / "user-trust/deny/e.pem"));
}

TEST(PlatformDirectory, ListsEveryEntryOfThatNameWhateverItIs) {
    const TemporaryDirectory directory;
    test::writeFile(directory / "elsewhere", "x");
    std::filesystem::create_directories(directory / "roots/directory.pem");
    std::filesystem::create_symlink("../elsewhere", directory / "roots/link.pem");
    std::filesystem::create_symlink("missing", directory / "roots/dangling.pem");
    ASSERT_EQ(mkfifo((directory / "roots/pipe.pem").c_str(), 0600), 0);
    EXPECT_THAT(PlatformDirectory(directory.path()).rootCertificateFiles(),
                ElementsAre(directory / "roots/dangling.pem", directory / "roots/directory.pem",
                            directory / "roots/link.pem", directory / "roots/pipe.pem"));
}

TEST(PlatformDirectory, ThatDoesNotExistIsEmpty) {
    const TemporaryDirectory directory;
    const PlatformDirectory platform(directory / "missing");
    EXPECT_THAT(platform.rootCertificateFiles(), IsEmpty());
    EXPECT_THAT(platform.userDeniedCertificateFiles(), IsEmpty());
    EXPECT_FALSE(platform.allowsInternalSecurityPolicies());
}

TEST(PlatformDirectory, AllowsInternalPoliciesByAMarkerFile) {
    const TemporaryDirectory directory;
    const PlatformDirectory platform(directory.path());
    EXPECT_FALSE(platform.allowsInternalSecurityPolicies());
    test::writeFile(directory / "internal-security-policies", "");
    EXPECT_TRUE(platform.allowsInternalSecurityPolicies());
}

TEST(PlatformDirectory, DoesNotTakeADirectoryForTheMarker) {
    const TemporaryDirectory directory;
    std::filesystem::create_directory(directory / "internal-security-policies");
    EXPECT_FALSE(PlatformDirectory(directory.path()).allowsInternalSecurityPolicies());
}

}  // namespace
}  // namespace pinwell::config
