#include "admin_service.h"

#include <stdexcept>

namespace pinwell::test {

void AdminServiceTest::admit(const std::string& client, const std::string& roles) {
    record("client-certificate", {client, "--out", directory / client});
    clients_ += "\"" + client + "\" = [" + roles + "]\n";
    writeFile(serviceDirectory + "/service/access.toml", std::string_view(clients_));
}

void AdminServiceTest::serve() {
    serving = std::make_unique<RunningProcess>(
        lumoraCommand({"serve", serviceDirectory, "--listen", "127.0.0.1:0", "--admin-listen", "127.0.0.1:0",
                       "--client-ca", serviceDirectory + "/service/clients/ca.pem", "--update-platform"}));
    const std::string mark = "administration at ";
    const auto line = serving->waitForLine(mark);
    if (!line || !serving->waitForLine("ready at https://127.0.0.1:"))
        throw std::runtime_error("lumora-local did not start: " + serving->resultSoFar().errors);
    administration_ = line->substr(line->find(mark) + mark.size());
}

ProcessResult AdminServiceTest::ticketTool(std::vector<std::string> arguments) const {
    Command made = command(std::move(arguments));
    made.executable = PINWELL_TICKET_PROGRAM;
    return runProcess(made);
}

ProcessResult AdminServiceTest::request(const std::string& client, std::vector<std::string> arguments) const {
    arguments.insert(arguments.begin(),
                     {"request", "--url", administration(), "--cert", clientFile(client, "client.pem"),
                      "--key", clientFile(client, "client.key"), "--out", tickets, "--retry-delay", "0.1"});
    return ticketTool(std::move(arguments));
}

}  // namespace pinwell::test
