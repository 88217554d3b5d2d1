// Tickets that are fetched as a separate asset.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/file.h>

#include <cerrno>
#include <filesystem>
#include <utility>

#include "base/bytes.h"
#include "src/messages.h"
#include "support/controller_run.h"
#include "support/message_capture.h"
#include "values/url.h"
#include "values/value.h"

namespace pinwell {
namespace {

using base::Data;
using test::ControllerRun;
using test::MessageCapture;
using test::unsignedTicket;
using values::Value;

class LargeTicket : public testing::Test {
  protected:
    LargeTicket() {
        run.controller.setOperation(kOperationValidate);
        run.controller.setTempFileURL(run.platform.directory.url("tmp/REQUEST.ticket"));
    }

    bool start(const std::string& urlTemplate) {
        return run.controller.asynchronouslyDownloadLargeTicketFromURLString(urlTemplate);
    }
    std::string requestedURL() const {
        return run.platform.https.sessions.at(0)->downloadTasks.at(0)->request.url->absoluteString();
    }

    // The service passes on the downloaded file.
    std::optional<int> finish(const Data& body, int status = 200) {
        start("https://assets.example/${f}");
        const auto task = run.platform.https.sessions.back()->downloadTasks.at(0);
        task->answered = https::HTTPResponse{*task->request.url, status, {}};
        test::writeFile(run.platform.directory / "tmp/download", base::ByteView(body));
        return run.platform.exitStatusOf([&] {
            run.controller.didFinishDownloading(*run.platform.https.sessions.back(), *task,
                                                run.platform.directory.url("tmp/download"));
        });
    }

    ControllerRun run;
    const Data ticket = unsignedTicket({ControllerRun::fileHash()});
};

TEST_F(LargeTicket, TheTokenAtTheEndBecomesTheFileName) {
    EXPECT_TRUE(start("https://assets.example/path/${f}"));
    EXPECT_EQ(requestedURL(), "https://assets.example/path/lmasset.ticket");
}

TEST_F(LargeTicket, EveryTokenIsReplaced) {
    EXPECT_TRUE(start("https://assets.example/${f}/as?name=${f}"));
    EXPECT_EQ(requestedURL(), "https://assets.example/lmasset.ticket/as?name=lmasset.ticket");
}

TEST_F(LargeTicket, AMillionTokensAreReplacedInOnePass) {
    std::string tokens;
    std::string names;
    for (int i = 0; i < 1'000'000; ++i) {
        tokens += "${f}";
        names += "lmasset.ticket";
    }
    EXPECT_TRUE(start("https://assets.example/" + tokens));
    EXPECT_EQ(requestedURL(), "https://assets.example/" + names);
}

TEST_F(LargeTicket, WithoutASessionIsNotUnderWay) {
    run.platform.https.failure = base::Error(std::string(base::kURLErrorDomain), 14, "no thread");
    EXPECT_FALSE(start("https://assets.example/${f}"));
}

TEST_F(LargeTicket, ATemplateWithoutTheTokenIsUsedUnchanged) {
    EXPECT_TRUE(start("https://assets.example/ticket?key=a%20b"));
    EXPECT_EQ(requestedURL(), "https://assets.example/ticket?key=a%20b");
}

TEST_F(LargeTicket, ThePlainRequestIsAGETWithoutBodyOrHeaders) {
    start("https://assets.example/${f}");
    const https::Request& request = run.platform.https.sessions.at(0)->downloadTasks.at(0)->request;
    EXPECT_EQ(request.method, "GET");
    EXPECT_TRUE(request.body.empty());
    EXPECT_TRUE(request.headers.empty());
}

TEST_F(LargeTicket, ATemplateThatMakesNoURLIsNotStartedAndSaysSoWithTheMissingURL) {
    const MessageCapture output(kVerbosityVerbose);
    EXPECT_FALSE(start("no url ${f}"));
    EXPECT_EQ(output.lines(),
              (std::vector<std::string>{"Large ticket was requested from an invalid URL: (null)",
                                        "URL of large ticket asset: no url lmasset.ticket"}));
}

TEST_F(LargeTicket, ATicketOfTheAnnouncedSizeIsJudgedAndKept) {
    run.controller.setLargeTicketSize(ticket.size());
    const MessageCapture output(kVerbosityVerbose);
    EXPECT_EQ(finish(ticket), 0);
    EXPECT_NE(output.text().find("Big ticket response is "), std::string::npos);
    EXPECT_TRUE(
        output.contains("Downloaded large ticket size is " + std::to_string(ticket.size()) + " bytes"));
    EXPECT_EQ(test::readFile(run.platform.directory / "tmp/REQUEST.ticket"), base::toString(ticket));
}

TEST_F(LargeTicket, ATicketOfAnotherSizeEndsWith65) {
    run.controller.setLargeTicketSize(ticket.size() + 1);
    const MessageCapture output(kVerbosityNormal);
    EXPECT_EQ(finish(ticket), 65);
    EXPECT_EQ(output.lines()[0], "We were expecting a ticket size of " + std::to_string(ticket.size() + 1) +
                                     " but download a ticket of size " + std::to_string(ticket.size()));
    EXPECT_EQ(output.lines()[1], "The validate action failed! Error 65.");
}

TEST_F(LargeTicket, TheSizeIsCheckedBeforeTheStatus) {
    run.controller.setLargeTicketSize(5);
    const MessageCapture output(kVerbosityNormal);
    EXPECT_EQ(finish(base::toData("Not here"), 404), 65);
    EXPECT_EQ(output.lines()[0], "We were expecting a ticket size of 5 but download a ticket of size 8");
}

TEST_F(LargeTicket, AnotherStatusThan200EndsWith68) {
    run.controller.setLargeTicketSize(ticket.size());
    const MessageCapture output(kVerbosityNormal);
    EXPECT_EQ(finish(ticket, 500), 68);
    EXPECT_EQ(output.lines()[0], "Attempting to download larger ticket for App.app failed. " +
                                     https::localizedStringForStatusCode(500));
}

TEST_F(LargeTicket, WithoutAnAnnouncedSizeEveryDownloadFailsTheSizeCheck) {
    const MessageCapture output(kVerbosityNormal);
    EXPECT_EQ(finish(ticket), 65);
    EXPECT_EQ(output.lines()[0], "We were expecting a ticket size of (null) but download a ticket of size " +
                                     std::to_string(ticket.size()));
}

TEST_F(LargeTicket, AnAnnouncedSizeThatIsNoCountFailsTheSizeCheck) {
    for (const Value& size : {Value(-1), Value("300"), Value(1e300), Value(Value::Null{})}) {
        run.controller.setLargeTicketSize(size);
        EXPECT_EQ(finish(ticket), 65);
    }
}

TEST_F(LargeTicket, AFractionalSizeIsCutToItsWholePart) {
    run.controller.setLargeTicketSize(static_cast<double>(ticket.size()) + 0.5);
    EXPECT_EQ(finish(ticket), 0);
}

TEST_F(LargeTicket, AnEmptyBodyWithoutAnAnnouncedSizeIsNoTicket) {
    const MessageCapture output(kVerbosityNormal);
    EXPECT_EQ(finish(Data{}), 65);
    EXPECT_EQ(output.lines()[0], "Could not validate ticket for " + run.artefact());
}

TEST_F(LargeTicket, ATicketOfTheRightSizeThatFailsTheCheckEndsWith65) {
    const Data other = unsignedTicket({Data(20, std::byte{1})});
    run.controller.setLargeTicketSize(other.size());
    const MessageCapture output(kVerbosityNormal);
    EXPECT_EQ(finish(other), 65);
    EXPECT_EQ(output.lines()[0], "Could not validate ticket for " + run.artefact());
}

// A response without a status has no wrong status.
TEST_F(LargeTicket, AResponseThatIsNotHTTPIsJudgedByItsBody) {
    run.controller.setLargeTicketSize(ticket.size());
    start("https://assets.example/${f}");
    const auto& session = run.platform.https.sessions.back();
    test::writeFile(run.platform.directory / "tmp/download", base::ByteView(ticket));
    const MessageCapture output(kVerbosityVerbose);
    EXPECT_EQ(run.platform.exitStatusOf([&] {
        run.controller.didFinishDownloading(*session, *session->downloadTasks.at(0),
                                            run.platform.directory.url("tmp/download"));
    }),
              0);
    EXPECT_TRUE(output.contains("Big ticket response is (null)"));
}

TEST_F(LargeTicket, ADownloadThatCannotBeReadIsOfSize0) {
    run.controller.setLargeTicketSize(ticket.size());
    run.platform.files.fail("contentsOfFile", EIO);
    const MessageCapture output(kVerbosityNormal);
    EXPECT_EQ(finish(ticket), 65);
    EXPECT_EQ(output.lines()[0], "We were expecting a ticket size of " + std::to_string(ticket.size()) +
                                     " but download a ticket of size 0");
}

TEST_F(LargeTicket, ADownloadThatCannotBeReadIsNoApprovalAlsoWhenItIsAnnouncedAsEmpty) {
    for (const Value& announced : {Value(0), Value()}) {
        run.controller.setLargeTicketSize(announced);
        run.platform.files.fail("contentsOfFile", EIO);
        run.file->setAppropriateExitCode(kExitOK);  // as the stapled ticket left it
        const MessageCapture output(kVerbosityNormal);
        EXPECT_EQ(finish(ticket), 65);
        EXPECT_EQ(output.lines(), (std::vector<std::string>{"Could not save data. A parameter was not valid.",
                                                            "The validate action failed! Error 65."}));
    }
}

TEST_F(LargeTicket, AFailedDownloadRecords68NamesThePathAndDoesNotEndTheRun) {
    start("https://assets.example/${f}");
    const auto& session = run.platform.https.sessions.at(0);
    const MessageCapture output(kVerbosityNormal);
    EXPECT_EQ(run.platform.exitStatusOf([&] {
        run.controller.didComplete(*session, *session->downloadTasks.at(0),
                                   Error("URLErrorDomain", 10, "the connection was lost"));
    }),
              std::nullopt);
    EXPECT_EQ(output.text(),
              "Large ticket for " + run.artefact() + " failed to download. the connection was lost\n");
    EXPECT_EQ(run.file->appropriateExitCode(), 68);
}

TEST_F(LargeTicket, CompletionWithoutAnErrorDoesNothing) {
    start("https://assets.example/${f}");
    const auto& session = run.platform.https.sessions.at(0);
    run.file->setAppropriateExitCode(42);
    const MessageCapture output(kVerbosityVerbose);
    run.controller.didComplete(*session, *session->downloadTasks.at(0), std::nullopt);
    EXPECT_EQ(output.text(), "");
    EXPECT_EQ(run.file->appropriateExitCode(), 42);
}

TEST_F(LargeTicket, ThatFailsToDownloadGivesTheLockUp) {
    const auto isLocked = [&] {
        const base::FileDescriptor other(open(run.artefact().c_str(), O_RDONLY | O_CLOEXEC));
        return flock(other.get(), LOCK_EX | LOCK_NB) != 0 && errno == EWOULDBLOCK;
    };
    auto lock = run.platform.files.lockItem(URL::fileURLWithPath(run.artefact()), [] {});
    ASSERT_TRUE(lock.has_value());
    run.controller.keepLock(*std::move(lock));
    start("https://assets.example/${f}");
    const auto session = run.platform.https.sessions.back();
    const auto task = session->downloadTasks.at(0);

    run.controller.didComplete(*session, *task, std::nullopt);
    EXPECT_TRUE(isLocked());

    const MessageCapture output(kVerbosityQuiet);
    run.controller.didComplete(*session, *task, Error(std::string(base::kURLErrorDomain), 1, "cut off"));
    EXPECT_FALSE(isLocked());
}

}  // namespace
}  // namespace pinwell
