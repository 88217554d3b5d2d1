#include "admin_instance.h"

#include <httplib.h>
#include <signal.h>

#include <filesystem>
#include <stdexcept>

#include "serving_instance.h"

namespace pinwell::lumora::test {
namespace {

AdminAnswer toAnswer(const httplib::Result& result) {
    if (!result) return {};
    AdminAnswer answer{result->status, result->body, {}};
    for (const auto& [name, value] : result->headers) answer.headers[name] = value;
    return answer;
}

pinwell::test::Command serveCommand(const ServiceWithClients& service, const std::string& authorities,
                                    const std::vector<std::string>& options) {
    std::vector<std::string> arguments{
        "serve",          service.path(),
        "--listen",       "127.0.0.1:0",
        "--admin-listen", "127.0.0.1:0",
        "--client-ca",    authorities.empty() ? service.authority() : authorities};
    arguments.insert(arguments.end(), options.begin(), options.end());
    return {.executable = LUMORA_LOCAL,
            .arguments = std::move(arguments),
            .environment = {{"PATH", "/usr/bin:/bin"}, {"LC_ALL", "C"}}};
}

}  // namespace

AdminClient::AdminClient(const std::string& service, int port, const std::string& certificate,
                         const std::string& key)
    : client_(std::make_unique<httplib::SSLClient>("127.0.0.1", port, certificate, key)) {
    ::signal(SIGPIPE, SIG_IGN);  // instances that are killed hang up on their clients
    client_->set_ca_cert_path((service + "/platform/roots/lumora-local.pem").c_str());
    client_->enable_server_certificate_verification(true);
    client_->set_keep_alive(true);
    client_->set_read_timeout(60);
}

AdminClient::~AdminClient() = default;
AdminClient::AdminClient(AdminClient&&) noexcept = default;

AdminAnswer AdminClient::get(const std::string& target) {
    return toAnswer(client_->Get(target.c_str()));
}

AdminAnswer AdminClient::post(const std::string& path, const std::string& body, const std::string& key,
                              const std::string& contentType) {
    httplib::Headers headers;
    if (!key.empty()) headers.emplace("Idempotency-Key", key);
    return toAnswer(client_->Post(path.c_str(), headers, body, contentType.c_str()));
}

ServiceWithClients::ServiceWithClients() : service_(makeService(directory_, "service")) {
    std::filesystem::create_directory(directory_ / "clients");
    for (const char* name : {"ci.example", "manager", "auditor", "stranger"}) {
        const auto made = runLumora({"client-certificate", service_, name, "--out", folderOf(name)});
        if (made.exitStatus != 0) throw std::runtime_error("client-certificate: " + made.errors);
    }
    pinwell::test::writeFile(accessPath(),
                             "[clients]\n\"ci.example\" = [\"issue\", \"read\"]\n"
                             "manager = [\"issue\", \"revoke\", \"read\"]\nauditor = [\"read\"]\n");
}

AdminInstance::AdminInstance(const ServiceWithClients& service, const std::string& authorities,
                             const std::vector<std::string>& options)
    : service_(service), process_(serveCommand(service, authorities, options)) {
    const auto admin = process_.waitForLineWith("administration at ");
    const auto ready = process_.waitForLineWith("ready at ");
    if (!admin || !ready) throw std::runtime_error("serve: " + process_.wait().errors);
    const auto portIn = [](const std::string& line) {
        return std::stoi(line.substr(line.rfind("127.0.0.1:") + 10));
    };
    adminPort_ = portIn(*admin);
    port_ = portIn(*ready);
}

AdminClient AdminInstance::client(const std::string& name) const {
    return {service_.path(), adminPort_, service_.folderOf(name) + "/client.pem",
            service_.folderOf(name) + "/client.key"};
}

void AdminInstance::kill() {
    process_.sendSignal(SIGKILL);
    process_.wait();
}

pinwell::test::ProcessResult AdminInstance::stop() {
    process_.sendSignal(SIGTERM);
    return process_.wait();
}

std::string recordNamed(int number) {
    std::string digits = std::to_string(number);
    return "2/2/" + std::string(40 - digits.size(), '0') + digits;
}

std::string bodyFor(const std::string& record, const std::string& members) {
    return R"({"record":")" + record + '"' + (members.empty() ? "" : "," + members) + "}";
}

}  // namespace pinwell::lumora::test
