// The page for people of the administration listener, from the real service and in a browser.
//
// The browser has no certificate. A bridge with a certificate sends its requests to the service over TLS. It
// passes status, headers and body of each response on unchanged, unless a test changes them. Skipped without
// Chromium.
#include <httplib.h>

#include <filesystem>
#include <mutex>
#include <string_view>
#include <thread>

#include "admin_service.h"
#include "base/byte_io.h"
#include "browser.h"

namespace pinwell::test {
namespace {

using testing::AllOf;
using testing::Contains;
using testing::Each;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::Not;
using testing::StartsWith;

class Bridge {
  public:
    /// To the listener at "https://127.0.0.1:PORT", which is verified by this root.
    Bridge(const std::string& listener, std::string certificate, std::string key, std::string root)
        : servicePort_(std::stoi(listener.substr(listener.rfind(':') + 1))),
          certificate_(std::move(certificate)),
          key_(std::move(key)),
          root_(std::move(root)) {
        server_.Get(".*", [this](const httplib::Request& request, httplib::Response& response) {
            handOn(request.target, response);
        });
        port_ = server_.bind_to_any_port("127.0.0.1");
        if (port_ <= 0) throw std::runtime_error("no port for the bridge");
        thread_ = std::thread([this] { server_.listen_after_bind(); });
        while (!server_.is_running()) std::this_thread::yield();  // before that, stop() would have no effect
    }
    ~Bridge() {
        server_.stop();
        thread_.join();
    }
    Bridge(const Bridge&) = delete;
    Bridge& operator=(const Bridge&) = delete;

    std::string url(const std::string& target) const {
        return "http://127.0.0.1:" + std::to_string(port_) + target;
    }
    /// Adds markup at the end of each page, with or without the page's policy.
    void add(std::string markup, bool keepsPolicy) {
        const std::lock_guard lock(mutex_);
        added_ = std::move(markup);
        keepsPolicy_ = keepsPolicy;
    }
    std::vector<std::string> targets() const {
        const std::lock_guard lock(mutex_);
        return targets_;
    }

    httplib::Result ask(const std::string& target) const {
        httplib::SSLClient client("127.0.0.1", servicePort_, certificate_, key_);
        client.set_ca_cert_path(root_);
        client.enable_server_certificate_verification(true);
        client.set_read_timeout(30);
        return client.Get(target);
    }

  private:
    void handOn(const std::string& target, httplib::Response& response) {
        const httplib::Result answer = ask(target);
        const std::lock_guard lock(mutex_);
        targets_.push_back(target);
        if (!answer) {
            response.status = 599;
            return;
        }
        response.status = answer->status;
        const std::string type = answer->get_header_value("Content-Type");
        std::string body = answer->body;
        if (type.find("html") != std::string::npos && !added_.empty())
            body.insert(body.find("</main>"), added_);
        for (const auto& [name, value] : answer->headers) {
            const bool isPolicy = name == "Content-Security-Policy";
            if (name != "Content-Length" && name != "Content-Type" && name != "Connection" &&
                (!isPolicy || keepsPolicy_))
                response.set_header(name, value);
        }
        response.set_content(body, type);
    }

    const int servicePort_;
    const std::string certificate_;
    const std::string key_;
    const std::string root_;
    httplib::Server server_;
    int port_ = 0;
    std::thread thread_;
    mutable std::mutex mutex_;
    std::string added_;
    bool keepsPolicy_ = true;
    std::vector<std::string> targets_;
};

class AdminPage : public AdminServiceTest {
  protected:
    void SetUp() override {
        if (!hasBrowser()) GTEST_SKIP() << "Chromium is not installed";
        admit("anna.example", R"("issue", "revoke", "read")");
        admit("ci.example", R"("issue")");
        serve();
        bridge = bridgeOf("anna.example");
    }
    void TearDown() override {
        bridge.reset();
        AdminServiceTest::TearDown();
    }

    std::unique_ptr<Bridge> bridgeOf(const std::string& client) const {
        return std::make_unique<Bridge>(administration(), clientFile(client, "client.pem"),
                                        clientFile(client, "client.key"),
                                        serviceDirectory + "/service/root.pem");
    }
    /// Records of that label; the name of the last one.
    std::string issue(const std::string& label, int count = 1) {
        std::vector<std::string> arguments{"--label", label};
        for (int i = 0; i < count; ++i) {
            const std::string digits = std::to_string(1'000'000 + ++issued_);
            arguments.insert(arguments.end(),
                             {"--record", "2/2/" + std::string(40 - digits.size(), '0') + digits});
        }
        record("issue", arguments);
        return arguments.back();
    }
    ProcessResult browser(std::vector<std::string> arguments) const {
        return browse(command({}), directory.path(), std::move(arguments));
    }
    /// The final document in the browser.
    std::string documentAt(const std::string& target, std::vector<std::string> options = {}) const {
        options.insert(options.end(), {"--dump-dom", bridge->url(target)});
        const ProcessResult result = browser(std::move(options));
        EXPECT_EQ(result.exitStatus, 0) << result.errors;
        return result.output;
    }
    /// Where a page of that kind is, with records for it.
    std::string targetOf(std::string_view kind) {
        const std::string name = issue("A rather long name of an app " + std::string(200, 'x') + ".app");
        record("revoke", {name, "--reason", "compromised", "--comment", "the key was lost"});
        if (kind == "record") return "/records/" + name;
        issue("Many", 60);
        return kind == "search" ? "/" : kind == "records" ? "/records" : "/records?by=hash&text=none";
    }

    std::unique_ptr<Bridge> bridge;

  private:
    int issued_ = 0;
};

std::string titleOf(const std::string& document) {
    const std::size_t begin = document.find("<title>") + 7;
    return document.substr(begin, document.find("</title>") - begin);
}

TEST_F(AdminPage, LeadsFromTheSearchToTheHistoryOfARecord) {
    ASSERT_EQ(request("anna.example", {samples[0]}).exitStatus, 0);
    const std::string label = std::filesystem::path(samples[0]).filename();
    record("revoke", {samples[0], "--reason", "compromised", "--comment", "the key was lost"});
    EXPECT_THAT(documentAt("/"), AllOf(HasSubstr("<dt>Records</dt><dd>1</dd>"),
                                       HasSubstr("<dt>Events in the log</dt><dd>2</dd>"),
                                       HasSubstr("<bdi>anna.example</bdi>")));
    const std::string found = documentAt("/records?by=label&text=" + label + "&environment=production");
    EXPECT_THAT(found, AllOf(HasSubstr("<bdi>" + label + "</bdi></a>"), HasSubstr(">Revoked<")));
    const std::size_t link = found.find("href=\"/records/2/") + 6;
    const std::string page = documentAt(found.substr(link, found.find('"', link) - link));
    EXPECT_THAT(page, AllOf(HasSubstr("<h3>Issued</h3>"), HasSubstr("<h3>Revoked</h3>"),
                            HasSubstr("the key was lost"), HasSubstr("<dd>compromised</dd>")));
    EXPECT_EQ(titleOf(page), "Revoked: " + label + " - Record service");
    // No other request was sent.
    EXPECT_THAT(bridge->targets(),
                Each(testing::AnyOf("/", "/style.css", "/favicon.ico", StartsWith("/records"))));
}

TEST_F(AdminPage, IsRefusedWithoutACertificateAndTheRoleToRead) {
    EXPECT_EQ(bridgeOf("ci.example")->ask("/")->status, 403);
    EXPECT_EQ(bridge->ask("/")->status, 200);
    httplib::SSLClient nobody("127.0.0.1",
                              std::stoi(administration().substr(administration().rfind(':') + 1)));
    nobody.set_ca_cert_path(serviceDirectory + "/service/root.pem");
    EXPECT_FALSE(nobody.Get("/"));
}

TEST_F(AdminPage, RunsAndLoadsNothingForAnyLabel) {
    const std::string markup = "<script>document.title='run'</script><img src=\"/loaded\">";
    const std::string name = issue(markup + "\"'><b onclick=1>");
    for (const std::string& target : {std::string("/records"), "/records/" + name}) {
        EXPECT_THAT(documentAt(target), AllOf(HasSubstr("&lt;script&gt;"), Not(HasSubstr("<script")),
                                              Not(HasSubstr("<img")), Not(HasSubstr("<b "))));
    }
    EXPECT_THAT(bridge->targets(), Not(Contains("/loaded")));

    // Even if something got into the page, its policy would allow neither.
    bridge->add(markup, true);
    EXPECT_THAT(documentAt("/"),
                AllOf(HasSubstr("<img"), HasSubstr("<title>Search - Record service</title>")));
    EXPECT_THAT(bridge->targets(), Not(Contains("/loaded")));

    // Without it, both happen.
    bridge->add(markup, false);
    EXPECT_EQ(titleOf(documentAt("/")), "run");
    EXPECT_THAT(bridge->targets(), Contains("/loaded"));
}

class EachAdminPage : public AdminPage, public testing::WithParamInterface<const char*> {};

TEST_P(EachAdminPage, HasItsStyleAndFitsANarrowScreen) {
    const std::string target = targetOf(GetParam());
    bridge->add(
        "<script>addEventListener('load', () => { const style = getComputedStyle(document.body);"
        "const small = [...document.querySelectorAll('input, select, button')].filter(one => "
        "one.getBoundingClientRect().height < 24).length;"
        "document.title = `${style.marginTop} ${document.documentElement.scrollWidth} of ${innerWidth}, "
        "${document.documentElement.scrollWidth > innerWidth ? 'too wide' : 'fits'}, ${small} small`; });"
        "</script>",
        false);
    EXPECT_THAT(titleOf(documentAt(target, {"--window-size=400,800"})),
                AllOf(StartsWith("0px "), HasSubstr(", fits, 0 small")));
}

TEST_P(EachAdminPage, ShowsTheFocusAndReachesEveryElementInOrder) {
    const std::string target = targetOf(GetParam());
    bridge->add(
        "<script>addEventListener('load', () => { const all = "
        "[...document.querySelectorAll('a, input, select, button')];"
        "const hidden = all.filter(one => { one.focus(); const style = getComputedStyle(one); "
        "return document.activeElement !== one || style.outlineStyle === 'none' || "
        "parseFloat(style.outlineWidth) < 2 || one.getBoundingClientRect().left < 0; });"
        "const jumps = all.filter(one => one.tabIndex !== 0);"
        "document.title = `${all[0].className} first, ${all.length > 1}, ${hidden.length} hidden, "
        "${jumps.length} jumps`; });</script>",
        false);
    EXPECT_EQ(titleOf(documentAt(target)), "skip first, true, 0 hidden, 0 jumps");
}

/// A script that puts what axe finds into the title.
std::string axe() {
    return "<script>" + readFile(AXE_SCRIPT) +
           "</script><script>addEventListener('load', () => axe.run().then(found => { document.title = "
           "`${found.passes.length > 10 ? 'checked' : 'few'}: ` + found.violations.map(one => one.id + ' ' + "
           "one.nodes.map(node => node.target).join(' ')).join(', '); }));</script>";
}

bool hasAxe() {
    const std::string script = AXE_SCRIPT;
    return !script.empty() && std::filesystem::exists(script);
}
constexpr const char* kNoAxe = "axe-core is not installed: npm install --global axe-core";

TEST_P(EachAdminPage, HasNoFaultThatAxeFinds) {
    if (!hasAxe()) GTEST_SKIP() << kNoAxe;
    const std::string target = targetOf(GetParam());
    bridge->add(axe(), false);
    EXPECT_EQ(titleOf(documentAt(target, {"--virtual-time-budget=20000"})), "checked: ");
}

// What an edit is most likely to change, and what the other pages add.
constexpr auto kNameOfPage = [](const testing::TestParamInfo<const char*>& info) {
    return std::string(info.param);
};
INSTANTIATE_TEST_SUITE_P(APage, EachAdminPage, testing::Values("record"), kNameOfPage);
INSTANTIATE_TEST_SUITE_P(OtherPages, EachAdminPage, testing::Values("search", "records", "none"),
                         kNameOfPage);

TEST_F(AdminPage, HasNoFaultThatAxeFindsInDarkColours) {
    if (!hasAxe()) GTEST_SKIP() << kNoAxe;
    const std::string target = targetOf("record");
    bridge->add(axe(), false);
    EXPECT_EQ(titleOf(documentAt(target, {"--virtual-time-budget=20000", "--force-dark-mode"})), "checked: ");
}

TEST_F(AdminPage, HasFaultsThatAxeFindsIfTheyAreThere) {
    if (!hasAxe()) GTEST_SKIP() << kNoAxe;
    bridge->add("<img src=\"/x\"><p style=\"color: #eee; background: #fff\">pale</p>" + axe(), false);
    EXPECT_THAT(titleOf(documentAt("/", {"--virtual-time-budget=20000"})),
                AllOf(HasSubstr("image-alt"), HasSubstr("color-contrast")));
}

TEST_F(AdminPage, CanBePictured) {
    const std::string target = targetOf("record");
    const std::string picture = directory / "picture.png";
    const ProcessResult result =
        browser({"--screenshot=" + picture, "--window-size=800,600", bridge->url(target)});
    ASSERT_EQ(result.exitStatus, 0) << result.errors;
    const std::string bytes = readFile(picture);
    ASSERT_GT(bytes.size(), 5000U);  // a blank one has fewer
    base::ByteReader reader(base::asBytes(bytes));
    reader.seek(16, "width");
    EXPECT_EQ(reader.be32("width"), 800U);
    EXPECT_EQ(reader.be32("height"), 600U);
}

}  // namespace
}  // namespace pinwell::test
