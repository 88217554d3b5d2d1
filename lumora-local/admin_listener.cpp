#include "admin_listener.h"

#include <signal.h>
#include <unistd.h>

#include <exception>
#include <utility>

#include "admin_routes.h"
#include "failure.h"
#include "service_store.h"
#include "values/format.h"

namespace pinwell::lumora {
namespace {

using values::format;

constexpr TokenBuckets::Allowance kRequestRate{200, std::chrono::milliseconds(50)};
constexpr std::size_t kWorkers = 4;
constexpr std::size_t kConnectionsPerAddress = 128;

TlsFiles tlsFilesOf(const ServiceDirectory& directory, const AdminOptions& options) {
    return {directory.serverCertificatePath(), directory.serverKeyPath(), directory.settings().passphraseFile,
            options.clientAuthorities};
}

std::shared_ptr<const TicketSigner> openSigner(const ServiceDirectory& directory) {
    requireChangesAllowed(directory);
    return std::make_shared<const TicketSigner>(directory.openSigner());
}

AdminRoutes allRoutes(RecordStore& store, RecordStore& reading, const SignerInUse& signer) {
    AdminRoutes routes = changingRoutes(store, signer);
    for (AdminRoute& route : readingRoutes(reading)) routes.push_back(std::move(route));
    for (AdminRoute& route : pageRoutes(reading)) routes.push_back(std::move(route));
    return routes;
}

}  // namespace

AdminListener::AdminListener(const ServiceDirectory& directory, AdminOptions options,
                             const ServeOutput& output)
    : options_(std::move(options)),
      output_(output),
      form_(directory.settings().log),
      signer_(openSigner(directory)),
      signerSettings_(directory.settings().signer),
      store_(openStore(directory)),
      reading_(openStore(directory)),
      access_(directory.accessPath()),
      tls_(tlsFilesOf(directory, options_)),
      listener_(options_.listen),
      rates_(kRequestRate),
      refusals_(*store_, output_.err),
      service_(allRoutes(*store_, *reading_, [this] { return signer(); }), access_, rates_, refusals_) {}

AdminListener::~AdminListener() {
    if (!thread_.joinable()) return;
    // Ends the service: it cannot continue after an error.
    if (std::uncaught_exceptions() > 0) ::kill(::getpid(), SIGTERM);
    thread_.join();
}

void AdminListener::addRights(sandbox::Confinement& rights, const ServiceDirectory& directory) const {
    const SignerSettings& signer = directory.settings().signer;
    std::vector<std::string> files{options_.clientAuthorities, directory.accessPath()};
    files.insert(files.end(), signer.chain.begin(), signer.chain.end());
    if (!isTokenKey(signer.key)) files.push_back(signer.key);
    for (const std::string& path : files) sandbox::append(rights.files, sandbox::fileAndItsLinks(path));
}

void AdminListener::start(int stopDescriptor, std::size_t connections, ServiceCounts& counts) {
    ServerLimits limits;
    limits.workers = kWorkers;
    limits.connections = connections;
    limits.connectionsPerAddress = std::min(kConnectionsPerAddress, connections);
    server_ = std::make_unique<Server>(service_, tls_, output_.requests, output_.err, limits, form_, &counts);
    thread_ = std::thread([this, stopDescriptor] {
        try {
            server_->run(listener_, stopDescriptor);
        } catch (const std::exception& error) {
            output_.err(format("the administration listener ended: %s", error.what()));
            ::kill(::getpid(), SIGTERM);
        }
    });
}

std::shared_ptr<const TicketSigner> AdminListener::signer() const {
    const std::lock_guard lock(mutex_);
    return signer_;
}

template <class Work>
void AdminListener::attempt(const char* kept, Work&& work) const {
    try {
        work();
    } catch (const Failure& failure) {
        output_.err(format("%s; the service goes on with %s", failure.what(), kept));
    }
}

void AdminListener::reloadAccess() {
    attempt("the access list that it has", [&] {
        access_.reload();
        output_.out("read access.toml again");
    });
}

void AdminListener::reload(const ServiceDirectory& directory) {
    attempt("the client authorities that it has", [&] { tls_.reload(tlsFilesOf(directory, options_)); });
    attempt("the signer that it has", [&] { reloadSigner(directory); });
}

void AdminListener::reloadSigner(const ServiceDirectory& directory) {
    const SignerSettings& now = directory.settings().signer;
    if (now.key == signerSettings_.key && now.chain == signerSettings_.chain) return;
    // A token is spoken to by a process that only a process with one thread and all its rights can start.
    if (isTokenKey(now.key)) throw Failure(EX_CONFIG, "a key in a token is used after a restart");
    auto fresh = openSigner(directory);
    const std::lock_guard lock(mutex_);
    signer_ = std::move(fresh);
    signerSettings_ = now;
}

}  // namespace pinwell::lumora
