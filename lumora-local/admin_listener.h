// The second listener of a service, for clients with a certificate (admin_service.h).
//
// It has its own server, threads, connection to the store and bounds. So its clients never delay a
// lookup.
#pragma once

#include <memory>
#include <mutex>
#include <string>
#include <thread>

#include "admin_routes.h"
#include "endpoint.h"
#include "sandbox/sandbox.h"
#include "serve_command.h"
#include "server.h"

namespace pinwell::lumora {

class AdminListener {
  public:
    /// Opens everything it needs: the signing key (which may start a process, so the caller has one thread),
    /// the store, access.toml, the authorities, the socket. Throws Failure.
    AdminListener(const ServiceDirectory& directory, AdminOptions options, const ServeOutput& output);

    /// Waits for its threads. They end after `stopDescriptor` has become readable.
    ~AdminListener();
    AdminListener(const AdminListener&) = delete;
    AdminListener& operator=(const AdminListener&) = delete;

    const Endpoint& endpoint() const noexcept { return listener_.endpoint(); }

    /// Adds the files that it reads during the run.
    void addRights(sandbox::Confinement& rights, const ServiceDirectory& directory) const;

    /// Serves at most `connections` at once, with its own threads. `counts` must outlive them.
    void start(int stopDescriptor, std::size_t connections, ServiceCounts& counts);

    /// Reads access.toml again. An unusable file leaves the list unchanged and is logged as an error.
    void reloadAccess();

    /// Reads certificates and a key in a file again, as reloadAccess() does.
    void reload(const ServiceDirectory& directory);

  private:
    template <class Work>
    void attempt(const char* kept, Work&& work) const;
    std::shared_ptr<const TicketSigner> signer() const;
    void reloadSigner(const ServiceDirectory& directory);

    const AdminOptions options_;
    const ServeOutput output_;
    const LogForm form_;
    mutable std::mutex mutex_;
    std::shared_ptr<const TicketSigner> signer_;
    SignerSettings signerSettings_;
    std::unique_ptr<RecordStore> store_;
    std::unique_ptr<RecordStore> reading_;  // of its own, so that no reader waits for a writer
    AccessList access_;
    TlsContext tls_;
    Listener listener_;
    TokenBuckets rates_;
    RefusalLog refusals_;
    AdminService service_;
    std::unique_ptr<Server> server_;
    std::thread thread_;
};

}  // namespace pinwell::lumora
