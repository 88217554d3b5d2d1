#include "values/url.h"

#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>

#include <filesystem>

#include "support/temporary_directory.h"

namespace pinwell::values {
namespace {

std::string tidied(std::string_view path) {
    return URL::fileURLWithPath(path).path();
}

TEST(FileURL, DropsPartsWithoutAMeaning) {
    EXPECT_EQ(tidied("/a//b/"), "/a/b");
    EXPECT_EQ(tidied("/a/./b/."), "/a/b");
    EXPECT_EQ(tidied("///"), "/");
    EXPECT_EQ(tidied("/."), "/");
}

TEST(FileURL, KeepsParentComponentsSinceLinksDecideTheirMeaning) {
    EXPECT_EQ(tidied("/a/../b/.."), "/a/../b/..");
}

TEST(FileURL, TakesRelativePathsAgainstTheCurrentDirectory) {
    const std::string current = std::filesystem::current_path().native();
    EXPECT_EQ(tidied("x/y"), tidied(current + "/x/y"));
    EXPECT_EQ(tidied("."), current);
    EXPECT_EQ(tidied("../x"), tidied(current + "/../x"));
}

TEST(FileURL, NeverHangsARelativePathBelowTheRoot) {
    // In a separate process, because all tests of this one share the current directory.
    const test::TemporaryDirectory directory;
    const std::string doomed = directory / "doomed";
    std::filesystem::create_directory(doomed);
    const pid_t child = fork();
    ASSERT_GE(child, 0);
    if (child == 0) {
        const bool gone = chdir(doomed.c_str()) == 0 && rmdir(doomed.c_str()) == 0;
        _exit(gone && tidied("../etc/passwd") == "/proc/self/cwd/../etc/passwd" ? 0 : 1);
    }
    int status = 0;
    ASSERT_EQ(waitpid(child, &status, 0), child);
    EXPECT_EQ(status, 0);
}

TEST(FileURL, OfAnEmptyPathNamesNothing) {
    const URL url = URL::fileURLWithPath("");
    EXPECT_TRUE(url.isFileURL());
    EXPECT_EQ(url.path(), "");
    EXPECT_EQ(url.lastPathComponent(), "");
    EXPECT_EQ(url.appendingPathComponent("etc").path(), "");
    EXPECT_EQ(url.deletingLastPathComponent().path(), "");
}

TEST(FileURL, IsPercentEncodedWhenDescribed) {
    EXPECT_EQ(URL::fileURLWithPath("/a b%#?[\xC3\xA9").absoluteString(), "file:///a%20b%25%23%3F%5B%C3%A9");
    EXPECT_EQ(URL::fileURLWithPath("/a-._~!$&'()*+,;=:@").absoluteString(), "file:///a-._~!$&'()*+,;=:@");
}

TEST(FileURL, KeepsNamesThatAreNotUTF8) {
    const URL url = URL::fileURLWithPath("/\xFF\x01");
    EXPECT_EQ(url.path(), "/\xFF\x01");
    EXPECT_EQ(url.absoluteString(), "file:///%FF%01");
}

TEST(FileURL, KnowsItsLastComponentAndParent) {
    const URL url = URL::fileURLWithPath("/a/b.c");
    EXPECT_EQ(url.lastPathComponent(), "b.c");
    EXPECT_EQ(url.deletingLastPathComponent().path(), "/a");
    EXPECT_EQ(URL::fileURLWithPath("/a").deletingLastPathComponent().path(), "/");
    EXPECT_EQ(URL::fileURLWithPath("/").deletingLastPathComponent().path(), "/");
    EXPECT_EQ(URL::fileURLWithPath("/").lastPathComponent(), "/");
}

TEST(FileURL, AppendsComponents) {
    EXPECT_EQ(URL::fileURLWithPath("/a").appendingPathComponent("b c").path(), "/a/b c");
    EXPECT_EQ(URL::fileURLWithPath("/").appendingPathComponent("b").path(), "/b");
}

TEST(PathExtension, IsWhatFollowsTheLastDot) {
    EXPECT_EQ(pathExtensionOfName("a.tar.gz"), "gz");
    EXPECT_EQ(pathExtensionOfName("a"), "");
    EXPECT_EQ(pathExtensionOfName(".hidden"), "");
    EXPECT_EQ(pathExtensionOfName(".hidden.x"), "x");
    EXPECT_EQ(pathExtensionOfName("a."), "");
    EXPECT_EQ(pathExtensionOfName("."), "");
    EXPECT_EQ(pathExtensionOfName(".."), "");
    EXPECT_EQ(pathExtensionOfName(""), "");
    EXPECT_EQ(URL::fileURLWithPath("/x.app/b").pathExtension(), "");
    EXPECT_EQ(URL::fileURLWithPath("/x.APP/").pathExtension(), "APP");
}

TEST(WebURL, KeepsTheTextAndReadsItsParts) {
    const auto url = URL::fromString("HTTPS://User@API.Example:8443/a%20b/c?q=/x#f");
    ASSERT_TRUE(url);
    EXPECT_EQ(url->absoluteString(), "HTTPS://User@API.Example:8443/a%20b/c?q=/x#f");
    EXPECT_EQ(url->scheme(), "https");
    EXPECT_EQ(url->host(), "api.example");
    EXPECT_EQ(url->path(), "/a%20b/c");
    EXPECT_FALSE(url->isFileURL());
}

TEST(WebURL, ReadsAnAddressInBrackets) {
    const auto url = URL::fromString("https://[2001:DB8::1]:443/");
    ASSERT_TRUE(url);
    EXPECT_EQ(url->host(), "2001:db8::1");
    EXPECT_FALSE(URL::fromString("https://[::1/"));
}

TEST(WebURL, RefusesTextThatIsNoURL) {
    for (const std::string_view text : {"", "https", "//host/", ":x", "1a://h/", "a b://h/", "https:///path",
                                        "https://", "http:", "https://:80/", "https://u@/x"})
        EXPECT_FALSE(URL::fromString(text)) << text;
}

TEST(WebURL, RefusesCharactersThatBelongNowhere) {
    for (const std::string_view text : {"https://h/a b", "https://h/\n", "https://h/<x>", "https://h/\"",
                                        "https://h/\\", "https://h/^", "https://h/`", "https://h/{}",
                                        "https://h/|", "https://h/\xC3\xA9", "https://h/\x7F", " https://h/"})
        EXPECT_FALSE(URL::fromString(text)) << text;
    EXPECT_FALSE(URL::fromString(std::string_view("https://h/\0", 11)));
}

TEST(WebURL, RefusesMalformedPercentEscapes) {
    for (const std::string_view text : {"https://h/%", "https://h/%4", "https://h/%4g", "https://h/%%41"})
        EXPECT_FALSE(URL::fromString(text)) << text;
    EXPECT_TRUE(URL::fromString("https://h/%41%fF"));
}

TEST(WebURL, AppendsAnEncodedComponentBeforeTheQuery) {
    const auto url = URL::fromString("https://h/a?q=1");
    ASSERT_TRUE(url);
    EXPECT_EQ(url->appendingPathComponent("b c").absoluteString(), "https://h/a/b%20c?q=1");
    EXPECT_EQ(url->appendingPathComponent("b c").path(), "/a/b%20c");
    EXPECT_EQ(URL::fromString("https://h")->appendingPathComponent("x").absoluteString(), "https://h/x");
}

TEST(PercentEncoding, KeepsUnreservedCharactersAndThoseThatTheCallerNames) {
    EXPECT_EQ(percentEncoded("aZ09-._~"), "aZ09-._~");
    EXPECT_EQ(percentEncoded("a/b:c%\xFF\n"), "a%2Fb%3Ac%25%FF%0A");
    EXPECT_EQ(percentEncoded("a/b:c", "/"), "a/b%3Ac");
}

}  // namespace
}  // namespace pinwell::values
