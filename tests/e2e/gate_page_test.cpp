// The report in HTML, in a browser: its visible contents, and that it runs nothing and sends no request.
//
// Skipped without Chromium. Its screenshots are in the test's own directory, which is removed.
#include <netinet/in.h>
#include <poll.h>
#include <sys/socket.h>
#include <unistd.h>

#include <array>
#include <atomic>
#include <filesystem>
#include <stdexcept>
#include <thread>

#include "base/byte_io.h"
#include "base/handle.h"
#include "browser.h"
#include "gate_fixture.h"
#include "values/json.h"
#include "values/value.h"

namespace pinwell::test {
namespace {

using base::FileDescriptor;
using testing::AllOf;
using testing::HasSubstr;
using testing::Not;
using values::Value;

/// A server on loopback without contents, which counts connections.
class EmptyServer {
  public:
    EmptyServer() : socket_(::socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0)) {
        sockaddr_in address{};
        address.sin_family = AF_INET;
        address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
        socklen_t length = sizeof address;
        auto* const any = reinterpret_cast<sockaddr*>(&address);
        if (!socket_ || ::bind(socket_.get(), any, length) != 0 || ::listen(socket_.get(), 8) != 0 ||
            ::getsockname(socket_.get(), any, &length) != 0)
            throw std::runtime_error("no server can be made");
        port_ = ntohs(address.sin_port);
        thread_ = std::thread([this] { serve(); });
    }
    ~EmptyServer() {
        isStopping_ = true;
        thread_.join();
    }
    EmptyServer(const EmptyServer&) = delete;
    EmptyServer& operator=(const EmptyServer&) = delete;

    std::string address() const { return "127.0.0.1:" + std::to_string(port_); }
    int visitors() const { return visitors_; }

  private:
    void serve() {
        constexpr std::string_view kNothing =
            "HTTP/1.1 404 Not Found\r\nContent-Length: 0\r\nConnection: close\r\n\r\n";
        while (!isStopping_) {
            pollfd waiting{socket_.get(), POLLIN, 0};
            if (::poll(&waiting, 1, 50) <= 0) continue;
            const FileDescriptor visitor(::accept4(socket_.get(), nullptr, nullptr, SOCK_CLOEXEC));
            if (!visitor) continue;
            ++visitors_;
            std::array<char, 4096> request{};
            static_cast<void>(::recv(visitor.get(), request.data(), request.size(), 0));
            static_cast<void>(::send(visitor.get(), kNothing.data(), kNothing.size(), MSG_NOSIGNAL));
        }
    }

    FileDescriptor socket_;
    std::uint16_t port_ = 0;
    std::atomic<int> visitors_ = 0;
    std::atomic<bool> isStopping_ = false;
    std::thread thread_;
};

class GatePage : public GateRun {
  protected:
    void SetUp() override {
        if (!hasBrowser()) GTEST_SKIP() << "Chromium is not installed";
        GateRun::SetUp();
    }

    /// Writes the report on these paths and returns its path.
    std::string pageOf(const std::vector<std::string>& paths) const {
        const std::string page = directory / "page.html";
        gate({"--offline", "--format", "html", "-o", page}, paths);
        return page;
    }

    ProcessResult chromium(std::vector<std::string> arguments) const {
        return browse(command({}), directory.path(), std::move(arguments));
    }

    /// The final document in the browser.
    std::string documentIn(const std::string& page) const {
        const ProcessResult result = chromium({"--dump-dom", "file://" + page});
        EXPECT_EQ(result.exitStatus, 0) << result.errors;
        EXPECT_THAT(result.output, HasSubstr("</html>")) << result.errors;
        return result.output;
    }

    /// A row of the page for each check of the run that failed.
    std::vector<std::string> rowsOfFailedChecks(const std::vector<std::string>& paths) const {
        const std::string report = gate({"--offline", "--format", "json"}, paths).output;
        const auto document = values::parseJSON(base::asBytes(report));
        std::vector<std::string> rows;
        for (const Value& result : *(*document)["results"].array())
            for (const Value& check : *result["checks"].array())
                if (*check["outcome"].string() == "failed")
                    rows.push_back("<tr><td class=\"failed\">failed</td><td>" + *check["name"].string() +
                                   "</td><td>" + *check["place"].string() + "</td>");
        return rows;
    }
};

TEST_F(GatePage, ShowsTheConclusionAndEveryCheckThatFailed) {
    flip(application() + "/Contents/Resources/ReadMe.txt", 0);
    flip(image(), 0);
    const std::vector<std::string> paths{application(), image(), package()};
    const std::string page = documentIn(pageOf(paths));
    EXPECT_THAT(page, HasSubstr("<h1>1 of 3 may be let in.</h1>"));
    EXPECT_THAT(page, AllOf(HasSubstr("<h2>" + application() + "</h2>"),
                            HasSubstr("<h2>" + image() + "</h2>"), HasSubstr("<h2>" + package() + "</h2>")));
    EXPECT_THAT(page, AllOf(HasSubstr("<span class=\"verdict\">altered</span>: It is not what was signed."),
                            HasSubstr("<span class=\"verdict\">good</span>")));
    const std::vector<std::string> rows = rowsOfFailedChecks(paths);
    EXPECT_GE(rows.size(), 2U);
    for (const std::string& row : rows) EXPECT_THAT(page, HasSubstr(row));
}

TEST_F(GatePage, CanBePictured) {
    flip(image(), 0);
    const std::string page = pageOf({image(), package()});
    const std::string picture = directory / "picture.png";
    const ProcessResult result =
        chromium({"--screenshot=" + picture, "--window-size=800,600", "file://" + page});
    ASSERT_EQ(result.exitStatus, 0) << result.errors;
    const std::string bytes = readFile(picture);
    ASSERT_GT(bytes.size(), 1000U);  // a blank one has fewer
    EXPECT_EQ(bytes.substr(1, 3), "PNG");
    base::ByteReader reader(base::asBytes(bytes));
    reader.seek(16, "width");
    EXPECT_EQ(reader.be32("width"), 800U);
    EXPECT_EQ(reader.be32("height"), 600U);
}

TEST_F(GatePage, GivesEveryCellRoomOnANarrowScreen) {
    flip(application() + "/Contents/Resources/ReadMe.txt", 0);
    std::string page = readFile(pageOf({application(), image()}));
    // Without the page's own policy, so that a script can measure it.
    const std::size_t policy = page.find("<meta http-equiv");
    page.erase(policy, page.find('>', policy) + 1 - policy);
    page +=
        "<script>const widths = [...document.querySelectorAll('section > table td:not(:empty)')]"
        ".map(cell => cell.offsetWidth); document.title = `${widths.length} cells, narrowest "
        "${Math.min(...widths) < 200 ? 'too narrow' : 'wide enough'}, page "
        "${document.documentElement.scrollWidth > innerWidth ? 'too wide' : 'fits'}`;</script>";
    writeFile(directory / "measured.html", std::string_view(page));
    const ProcessResult result =
        chromium({"--window-size=400,800", "--dump-dom", "file://" + (directory / "measured.html")});
    EXPECT_THAT(result.output, HasSubstr(" cells, narrowest wide enough, page fits</title>"));
    EXPECT_THAT(result.output, Not(HasSubstr("<title>0 cells")));
}

TEST_F(GatePage, RunsNothingAndSendsNoRequestForAnyName) {
    const EmptyServer server;
    const std::string script = "<script>document.title='run'</script>";
    const std::string picture = "<img src=http:\\\\" + server.address() + "\\x>";
    std::vector<std::string> paths;
    for (const std::string& name :
         {script + ".dmg", picture + ".dmg", std::string("\"'><b onclick=1>.dmg")}) {
        paths.push_back(directory / name);
        std::filesystem::create_directories(std::filesystem::path(paths.back()).parent_path());
        std::filesystem::copy_file(image(), paths.back());
        flip(paths.back(), 0);
    }
    const std::string file = pageOf(paths);
    const std::string page = documentIn(file);
    EXPECT_THAT(page, AllOf(HasSubstr("<title>pinwell-gate</title>"), HasSubstr("&lt;script&gt;"),
                            HasSubstr("Content-Security-Policy"), Not(HasSubstr("<script")),
                            Not(HasSubstr("<img")), Not(HasSubstr("<b "))));
    EXPECT_EQ(server.visitors(), 0);

    // Even if something got into the page, its policy would allow neither.
    const std::string markup = script + "<img src=\"http://" + server.address() + "/x\">";
    std::string spoilt = readFile(file);
    spoilt.insert(spoilt.find("<h1>"), markup);
    writeFile(directory / "spoilt.html", std::string_view(spoilt));
    EXPECT_THAT(documentIn(directory / "spoilt.html"),
                AllOf(HasSubstr("<img"), HasSubstr("<title>pinwell-gate</title>")));
    EXPECT_EQ(server.visitors(), 0);

    // Without it, both happen.
    writeFile(directory / "other.html", std::string_view("<!DOCTYPE html><title>none</title>" + markup));
    EXPECT_THAT(documentIn(directory / "other.html"), HasSubstr("<title>run</title>"));
    EXPECT_GT(server.visitors(), 0);
}

}  // namespace
}  // namespace pinwell::test
