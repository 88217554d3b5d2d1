// Download tasks and the file they leave for a moment.
#include <sys/stat.h>

#include <filesystem>

#include "session_fixture.h"

namespace pinwell::test {
namespace {

using https::URLErrorCode;
using ::testing::ElementsAre;

class DownloadTask : public SessionTest {
  protected:
    bool nothingIsLeft() const { return std::filesystem::is_empty(directory.path()); }
};

TEST_F(DownloadTask, DeliversTheBodyInAPrivateFileThatIsGoneAfterwards) {
    server.enqueue(Script().respond({.body = "ticket"}));
    mode_t mode = 0;
    std::string path;
    delegate.onDownload = [&](https::Task&, const values::URL& location) {
        struct stat status {};
        path = location.path();
        EXPECT_EQ(::lstat(path.c_str(), &status), 0);
        mode = status.st_mode;
    };
    const Outcome outcome = download(get(server.url()));
    EXPECT_FALSE(outcome.error);
    EXPECT_EQ(outcome.text(), "ticket");
    EXPECT_EQ(outcome.status(), 200);
    EXPECT_TRUE(S_ISREG(mode));
    EXPECT_EQ(mode & 07777U, 0600U);
    EXPECT_TRUE(path.starts_with(directory.path() + "/"));
    EXPECT_TRUE(nothingIsLeft());
    EXPECT_THAT(delegate.events, ElementsAre("challenge 127.0.0.1", "downloaded", "complete"));
}

TEST_F(DownloadTask, DeliversTheBodyOfAnErrorStatusToo) {
    server.enqueue(Script().respond({.status = 500, .body = "sorry"}));
    const Outcome outcome = download(get(server.url()));
    EXPECT_EQ(outcome.status(), 500);
    EXPECT_EQ(outcome.text(), "sorry");
}

TEST_F(DownloadTask, DeliversAnEmptyFile) {
    server.enqueue(Script().respond({}));
    EXPECT_EQ(download(get(server.url())).text(), "");
}

TEST_F(DownloadTask, KeepsOnlyTheBodyOfTheLastResponse) {
    server.enqueue(Script().respond({.status = 302, .headers = {{"Location", "/next"}}, .body = "moved"}));
    server.enqueue(Script().respond({.body = "ticket"}));
    EXPECT_EQ(download(get(server.url())).text(), "ticket");
}

TEST_F(DownloadTask, LeavesNothingBehindWhenItBreaksOff) {
    server.enqueue(Script().readRequest().send("HTTP/1.1 200 OK\r\nContent-Length: 9\r\n\r\nhal").reset());
    expectFailure(download(get(server.url())), URLErrorCode::connectionLost, "the connection was");
    EXPECT_TRUE(nothingIsLeft());
    EXPECT_THAT(delegate.events, ElementsAre("challenge 127.0.0.1", "complete"));
}

TEST_F(DownloadTask, LeavesNothingBehindWhenTheServerIsRefused) {
    delegate.onChallenge = [](auto&, auto& completion) {
        completion(https::Disposition::cancelChallenge, std::nullopt);
    };
    expectFailure(download(get(server.url())), URLErrorCode::cancelled, "cancelled");
    EXPECT_TRUE(nothingIsLeft());
}

TEST_F(DownloadTask, HasALimitOfItsOwn) {
    options.maximumDownload = 1000;
    server.enqueue(
        Script().readRequest().send("HTTP/1.0 200 OK\r\n\r\n").sendEndlessly(std::string(256, 'x')));
    expectFailure(download(get(server.url())), URLErrorCode::tooLarge, "larger than the 1000 bytes allowed");
    EXPECT_TRUE(nothingIsLeft());
}

TEST_F(DownloadTask, FailsWithoutATemporaryDirectory) {
    options.temporaryDirectory = [this] { return directory.url("missing"); };
    expectFailure(download(get(server.url())), URLErrorCode::cannotWriteFile, "could not be written");
    EXPECT_TRUE(server.connections().empty());
}

}  // namespace
}  // namespace pinwell::test
