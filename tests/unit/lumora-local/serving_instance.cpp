#include "serving_instance.h"

#include <arpa/inet.h>
#include <httplib.h>
#include <netinet/in.h>
#include <signal.h>
#include <sys/socket.h>

#include <chrono>
#include <cstdlib>
#include <set>
#include <stdexcept>

#include "base/handle.h"
#include "base/text.h"
#include "crypto/crypto.h"
#include "lumora-local/failure.h"
#include "running_service.h"
#include "values/json.h"
#include "values/value.h"

namespace pinwell::lumora::test {
namespace {

using base::Data;
using pinwell::test::Command;
using std::chrono::milliseconds;
using std::chrono::steady_clock;

constexpr int kRecordsOfAWriter = 4;
constexpr std::chrono::seconds kPatience{120};
constexpr std::chrono::seconds kRetryTime{60};

Command lumora(std::vector<std::string> arguments) {
    return {.executable = LUMORA_LOCAL,
            .arguments = std::move(arguments),
            .environment = {{"PATH", "/usr/bin:/bin"}, {"LC_ALL", "C"}}};
}

SignedRecord stateOf(const std::string& name, int state) {
    Data hash = base::toData(name);
    hash.resize(20);
    return {{name, "made up", {{2, hash}}, state % 3 == 0, false, values::Date{state}},
            base::toData(std::to_string(state))};
}

/// The state in a response; 0 if there is no such record, -1 if the response is unreadable.
int stateIn(const std::string& body) {
    const auto document = values::parseJSON(base::asBytes(body));
    if (!document) return -1;
    const values::Value& record = (*document)["records"][0];
    if (record["serverErrorCode"].string() != nullptr) return 0;
    const std::string* encoded = record["fields"]["signedTicket"]["value"].string();
    const auto ticket = encoded != nullptr ? base::decodeBase64(*encoded) : std::nullopt;
    return ticket ? std::atoi(base::toString(*ticket).c_str()) : -1;
}

}  // namespace

pinwell::test::ProcessResult runLumora(std::vector<std::string> arguments) {
    return pinwell::test::runProcess(lumora(std::move(arguments)));
}

std::string makeService(const pinwell::test::TemporaryDirectory& directory, const std::string& name) {
    const std::string path = directory / name;
    const auto made = runLumora({"init", "--host", "127.0.0.1", path});
    if (made.exitStatus != 0) throw std::runtime_error("init: " + made.errors);
    return path;
}

ServingInstance::ServingInstance(const std::string& service)
    : process_(lumora({"serve", service, "--listen", "127.0.0.1:0"})) {
    const auto line = process_.waitForLine("ready at ");
    if (!line) throw std::runtime_error("serve: " + process_.wait().errors);
    port_ = std::stoi(line->substr(line->rfind(':') + 1));
}

void ServingInstance::kill() {
    process_.sendSignal(SIGKILL);
    process_.wait();
}

int freePort() {
    const base::FileDescriptor socket(::socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0));
    sockaddr_in address{};
    address.sin_family = AF_INET;
    address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    socklen_t length = sizeof address;
    auto* generic = reinterpret_cast<sockaddr*>(&address);
    if (::bind(socket.get(), generic, length) != 0 || ::getsockname(socket.get(), generic, &length) != 0) {
        throw std::runtime_error("no free port");
    }
    return ntohs(address.sin_port);
}

std::unique_ptr<httplib::SSLClient> clientOf(const std::string& service, int port) {
    auto client = std::make_unique<httplib::SSLClient>("127.0.0.1", port);
    client->set_ca_cert_path((service + "/platform/roots/lumora-local.pem").c_str());
    client->enable_server_certificate_verification(true);
    client->set_keep_alive(true);
    return client;
}

int healthOf(const std::string& service, int port) {
    const auto answer = clientOf(service, port)->Get("/healthz");
    return answer ? answer->status : -1;
}

Load::Load(std::vector<RecordStore*> stores, std::string service, int port, int clients)
    : stores_(std::move(stores)), service_(std::move(service)), port_(port) {
    ::signal(SIGPIPE, SIG_IGN);  // instances that are killed hang up on their clients
    for (std::size_t i = 0; i < stores_.size() * kRecordsOfAWriter; ++i) {
        subjects_.push_back(std::make_unique<Subject>());
        subjects_.back()->name = "2/2/record-" + std::to_string(i);
    }
    for (std::size_t writer = 0; writer < stores_.size(); ++writer) {
        threads_.emplace_back([this, writer] { write(writer); });
    }
    for (int client = 0; client < clients; ++client) {
        threads_.emplace_back([this, client] { ask(static_cast<unsigned>(client)); });
    }
}

Load::~Load() {
    stop();
}

void Load::stop() {
    stopping_ = true;
    for (std::thread& thread : threads_) thread.join();
    threads_.clear();
}

void Load::write(std::size_t writer) {
    const Occasion occasion{values::Date{100}, "load", Reason::superseded, "", true};
    for (int state = 1; !stopping_; ++state) {
        for (std::size_t i = 0; i < kRecordsOfAWriter && !stopping_; ++i) {
            Subject& subject = *subjects_[writer * kRecordsOfAWriter + i];
            try {
                stores_[writer]->put(Environment::production, {stateOf(subject.name, state)}, occasion);
                subject.acknowledged = state;
                subject.all.push_back(state);
                ++acknowledged_;
            } catch (const Failure& failure) {
                (failure.exitStatus() == EX_TEMPFAIL ? refusedChanges_ : wrongFailures_) += 1;
            }
        }
    }
}

void Load::ask(unsigned seed) {
    const auto client = clientOf(service_, port_);
    for (std::size_t i = seed; !stopping_; ++i) {
        const Subject& subject = *subjects_[i % subjects_.size()];
        const auto end = steady_clock::now() + kRetryTime;
        while (!askOnce(*client, subject) && !stopping_) {
            if (steady_clock::now() > end) {
                ++exhausted_;
                break;
            }
            std::this_thread::sleep_for(milliseconds(20));
        }
    }
}

/// False if the client may try again.
bool Load::askOnce(httplib::SSLClient& client, const Subject& subject) {
    const int before = subject.acknowledged;
    const auto answer = client.Post(kLookupPath, R"({"records":[{"recordName":")" + subject.name + "\"}]}",
                                    "application/json");
    if (!answer || (answer->status == 503 && answer->has_header("Retry-After"))) {
        ++retriable_;
        return false;
    }
    const int state = answer->status == 200 ? stateIn(answer->body) : -1;
    if (state < 0) {
        ++wrongAnswers_;
    } else {
        ++answered_;
        if (state < before) ++older_;
    }
    return true;
}

bool Load::goOn(std::size_t changes, std::size_t lookups) {
    const Counts before = counts();
    const auto end = steady_clock::now() + kPatience;
    for (;;) {
        const Counts now = counts();
        if (now.acknowledged >= before.acknowledged + changes && now.answered >= before.answered + lookups) {
            return true;
        }
        if (steady_clock::now() > end) return false;
        std::this_thread::sleep_for(milliseconds(10));
    }
}

Load::Counts Load::counts() const {
    return {acknowledged_, refusedChanges_, wrongFailures_, answered_,
            retriable_,    wrongAnswers_,   older_,         exhausted_};
}

std::vector<std::string> Load::lost(RecordStore& store) const {
    std::set<std::pair<std::string, std::string>> logged;  // name, SHA-256 of the ticket
    store.forEachEvent({}, [&](const Event& event) { logged.insert({event.record, event.ticket}); });
    std::vector<std::string> lost;
    for (const auto& subject : subjects_) {
        for (const int state : subject->all) {
            const Data ticket = stateOf(subject->name, state).ticket;
            if (!logged.contains({subject->name, base::toHex(crypto::sha256(ticket))})) {
                lost.push_back(subject->name + ", put " + std::to_string(state) + ": not in the log");
            }
        }
        const auto delivery = store.findTicket(Environment::production, subject->name);
        const int last = delivery ? std::atoi(base::toString(*delivery->inlineTicket).c_str()) : 0;
        if (last < subject->acknowledged) lost.push_back(subject->name + ": an older ticket");
    }
    return lost;
}

}  // namespace pinwell::lumora::test
