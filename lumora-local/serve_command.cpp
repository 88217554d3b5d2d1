#include "serve_command.h"

#include <pthread.h>
#include <signal.h>
#include <sys/resource.h>
#include <sys/signalfd.h>
#include <sys/socket.h>
#include <sys/statvfs.h>
#include <sys/timerfd.h>
#include <sys/un.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <charconv>
#include <chrono>
#include <cstddef>
#include <cstdlib>
#include <cstring>
#include <initializer_list>
#include <mutex>
#include <optional>
#include <string_view>

#include "admin_listener.h"
#include "certificates.h"
#include "failure.h"
#include "file_writing.h"
#include "key_file.h"
#include "lookup.h"
#include "metrics.h"
#include "sandbox/sandbox.h"
#include "server.h"
#include "service_store.h"
#include "values/format.h"

namespace pinwell::lumora {
namespace {

using values::format;

constexpr std::size_t kAdminConnections = 512;

/// The endpoint at which a client reaches a service that listens at `bound`: nobody can connect to the
/// address of all interfaces.
Endpoint reachable(const ServiceDirectory& directory, const Endpoint& bound) {
    return isWildcard(bound.host) ? Endpoint{directory.hosts().front(), bound.port} : bound;
}

/// Lines about the service in the form of service.json. JSON lines all go to the output of the requests,
/// because standard error has the program's name before each line.
ServeOutput inForm(LogForm form, const ServeOutput& output) {
    if (form == LogForm::text) return {output.out, output.err, output.out};
    const auto as = [out = output.out](const char* level) {
        return [out, level](std::string_view line) { out(messageAsJson(values::Date::now(), level, line)); };
    };
    return {as("info"), as("error"), output.out};
}

/// Issuing and revoking need free space.
Obstacle fullDiskAt(const std::string& path) {
    return [path]() -> std::optional<std::string> {
        constexpr std::uint64_t kLeast = std::uint64_t{1024} * 1024;
        struct statvfs status {};
        if (::statvfs(path.c_str(), &status) != 0) return "The service's directory cannot be reached";
        if (std::uint64_t{status.f_bavail} * status.f_frsize >= kLeast) return std::nullopt;
        return "There is no space left for records";
    };
}

template <class Number>
std::optional<Number> numberIn(const char* text) {
    if (text == nullptr) return std::nullopt;
    Number number = 0;
    const char* end = text + std::strlen(text);
    const auto [stop, error] = std::from_chars(text, end, number);
    if (error != std::errc{} || stop != end || number <= 0) return std::nullopt;
    return number;
}

base::FileDescriptor connectTo(std::string_view name) {
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    const bool usable = name.size() > 1 && name.size() < sizeof address.sun_path;
    if (!usable || (name[0] != '/' && name[0] != '@')) return {};
    std::memcpy(address.sun_path, name.data(), name.size());
    if (name[0] == '@') address.sun_path[0] = '\0';  // an abstract name, which has no end mark
    const auto length = static_cast<socklen_t>(offsetof(sockaddr_un, sun_path) + name.size());
    base::FileDescriptor socket(::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0));
    // The socket interface's own cast: every address family shares this header.
    const auto* generic = reinterpret_cast<const sockaddr*>(&address);
    if (!socket || ::connect(socket.get(), generic, length) != 0) return {};
    return socket;
}

/// Reports to the service manager: sd_notify(3), one small datagram each. The protocol is documented and
/// stable, and this is the whole part that a service needs. Its library would be the larger part of the
/// loaded code.
///
/// For any thread.
class ServiceManager {
  public:
    /// Takes the manager's address from $NOTIFY_SOCKET. Without it, with an invalid address, and
    /// after the manager has gone, it sends nothing. Make it before the process gives up its
    /// rights.
    ServiceManager();

    /// Variables of sd_notify(3), one a line: "READY=1".
    void tell(std::string_view state) const noexcept;

    /// Half of the interval at which the manager expects a notification; `nullopt` if it expects none
    /// ($WATCHDOG_USEC, $WATCHDOG_PID).
    std::optional<std::chrono::microseconds> signOfLife() const noexcept { return signOfLife_; }

  private:
    base::FileDescriptor socket_;
    std::optional<std::chrono::microseconds> signOfLife_;
};

ServiceManager::ServiceManager() {
    const char* name = std::getenv("NOTIFY_SOCKET");
    if (name == nullptr) return;
    socket_ = connectTo(name);
    const auto interval = numberIn<std::int64_t>(std::getenv("WATCHDOG_USEC"));
    const char* process = std::getenv("WATCHDOG_PID");
    const bool ours = process == nullptr || numberIn<pid_t>(process) == ::getpid();
    if (socket_ && interval && ours) signOfLife_ = std::chrono::microseconds(*interval / 2 + 1);
}

void ServiceManager::tell(std::string_view state) const noexcept {
    if (socket_) ::send(socket_.get(), state.data(), state.size(), MSG_NOSIGNAL | MSG_DONTWAIT);
}

/// Becomes readable every `interval`; each time is read as eight bytes. Throws Failure.
base::FileDescriptor makeTicker(std::chrono::microseconds interval) {
    constexpr std::int64_t kMillion = 1'000'000;
    base::FileDescriptor timer(::timerfd_create(CLOCK_MONOTONIC, TFD_CLOEXEC | TFD_NONBLOCK));
    const timespec step{interval.count() / kMillion, interval.count() % kMillion * 1000};
    const itimerspec times{step, step};
    if (!timer || ::timerfd_settime(timer.get(), 0, &times, nullptr) != 0) {
        throw Failure(EX_OSERR, "cannot make a timer");
    }
    return timer;
}

/// Reports readiness to the service manager, and sends the notifications that it expects.
class ManagedRun {
  public:
    explicit ManagedRun(const ServiceManager& manager) : manager_(manager) {
        if (manager.signOfLife()) ticker_ = makeTicker(*manager.signOfLife());
    }

    void ready(const Endpoint& endpoint) const {
        manager_.tell(format("READY=1\nSTATUS=Serves lookups at https://%@", toString(endpoint)));
    }

    /// Runs on a thread that serves requests: if all of them are stuck, no notification is sent.
    std::optional<Watch> watch() const {
        if (!ticker_) return std::nullopt;
        return Watch{ticker_.get(), [this] {
                         std::uint64_t count = 0;
                         if (::read(ticker_.get(), &count, sizeof count) > 0) manager_.tell("WATCHDOG=1");
                     }};
    }

  private:
    const ServiceManager& manager_;
    base::FileDescriptor ticker_;
};

void announce(const ServiceDirectory& directory, const ServeOptions& options, const ServeOutput& output,
              const Endpoint& endpoint) {
    const auto& hosts = directory.hosts();
    if (std::find(hosts.begin(), hosts.end(), endpoint.host) == hosts.end()) {
        output.err(format("the service's certificate does not name %@: clients will refuse it there",
                          endpoint.host));
    }
    if (options.updatePlatform) directory.advertise(endpoint);
    const Endpoint advertised = directory.advertisedEndpoint();
    const std::string url = "https://" + toString(endpoint);
    output.out(format("ready at %@", url));
    if (!(advertised == endpoint)) {
        output.out(
            format("%@/platform.json sends clients to %@; with --update-platform it names this service",
                   directory.platformPath(), toString(advertised)));
    }
    if (options.readyFile) replaceFile(*options.readyFile, base::asBytes(url + "\n"), kPublicFileMode);
}

std::optional<AdminOptions> adminOf(const ServiceDirectory& directory) {
    const std::optional<AdminSettings>& settings = directory.settings().admin;
    if (!settings) return std::nullopt;
    return AdminOptions{settings->listen, settings->clientAuthorities};
}

void announce(const ServiceDirectory& directory, const AdminListener& admin, const ServeOutput& output) {
    const Endpoint endpoint = reachable(directory, admin.endpoint());
    const auto& hosts = directory.hosts();
    if (std::find(hosts.begin(), hosts.end(), endpoint.host) == hosts.end()) {
        output.err(format("the service's certificate does not name %@: clients will refuse it there",
                          endpoint.host));
    }
    output.out(format("administration at https://%@", toString(endpoint)));
}

base::FileDescriptor waitForSignals(std::initializer_list<int> numbers) {
    sigset_t signals;
    sigemptyset(&signals);
    for (const int number : numbers) sigaddset(&signals, number);
    if (::pthread_sigmask(SIG_BLOCK, &signals, nullptr) != 0) throw Failure(EX_OSERR, "cannot block signals");
    base::FileDescriptor descriptor(::signalfd(-1, &signals, SFD_CLOEXEC | SFD_NONBLOCK));
    if (!descriptor) throw Failure(EX_OSERR, "cannot wait for signals");
    return descriptor;
}

/// Takes the received signals.
void takeSignals(int descriptor) {
    signalfd_siginfo information{};
    while (::read(descriptor, &information, sizeof information) == sizeof information) continue;
}

TlsFiles tlsFilesOf(const ServiceDirectory& directory) {
    return {directory.serverCertificatePath(), directory.serverKeyPath(),
            directory.settings().passphraseFile};
}

/// When the certificates of the server and of the ticket signer's chain expire. A file that cannot be read is
/// left out.
std::vector<CertificateDate> certificateDates(const ServiceDirectory& directory) {
    std::vector<CertificateDate> dates;
    const auto add = [&](const char* role, const std::string& path) {
        try {
            dates.push_back({role, values::Date{expiryOf(readCertificateFile(path).get())}});
        } catch (const Failure&) {
            // A service for lookups has no signer; another file may have become unreadable.
        }
    };
    add("server", directory.serverCertificatePath());
    constexpr std::array kRoles{"signer", "intermediate", "root"};
    const std::vector<std::string>& chain = directory.signerChainPaths();
    for (std::size_t i = 0; i < chain.size() && i < kRoles.size(); ++i) add(kRoles.at(i), chain[i]);
    return dates;
}

/// The sources of the metrics. Its functions may be called from any thread.
class MetricsSource {
  public:
    MetricsSource(const ServiceDirectory& directory, const std::string& version, RecordStore& store)
        : version_(version), store_(store), certificates_(certificateDates(directory)) {}

    ServiceCounts& counts() noexcept { return counts_; }

    /// A file that has become unreadable keeps its known date.
    void readCertificatesAgain(const ServiceDirectory& directory) {
        std::vector<CertificateDate> dates = certificateDates(directory);
        const std::lock_guard lock(mutex_);
        for (CertificateDate& known : certificates_) {
            const auto same = std::find_if(dates.begin(), dates.end(), [&](const CertificateDate& date) {
                return date.role == known.role;
            });
            if (same != dates.end()) known = std::move(*same);
        }
    }

    std::string text() {
        ServiceFacts facts{version_, started_, {}, {}};
        try {
            facts.store = store_.facts();
        } catch (const std::exception&) {
            // The metrics report that the records cannot be read.
        }
        {
            const std::lock_guard lock(mutex_);
            facts.certificates = certificates_;
        }
        return describeMetrics(counts_.read(), facts);
    }

  private:
    const std::string version_;
    const values::Date started_ = values::Date::now();
    RecordStore& store_;
    ServiceCounts counts_;
    std::mutex mutex_;
    std::vector<CertificateDate> certificates_;
};

/// Reads the files that service.json names now, which may be different ones.
void reload(const std::string& path, TlsContext& tls, MetricsSource& metrics, AdminListener* admin,
            const ServeOutput& output) {
    if (admin != nullptr) admin->reloadAccess();  // even if the rest fails
    try {
        const ServiceDirectory directory = ServiceDirectory::open(path);
        if (admin != nullptr) admin->reload(directory);
        tls.reload(tlsFilesOf(directory));
        metrics.readCertificatesAgain(directory);
        output.out("read the certificate and the key again");
    } catch (const Failure& failure) {
        output.err(format("%s; the service goes on with the certificate that it has", failure.what()));
    }
}

/// Raises the limit of descriptors to the system's maximum. Returns how many of them may be connections.
std::size_t connectionsThatFit() {
    constexpr rlim_t kForEverythingElse = 64;
    rlimit limit{};
    if (::getrlimit(RLIMIT_NOFILE, &limit) != 0) return ServerLimits{}.connections;
    limit.rlim_cur = limit.rlim_max;
    ::setrlimit(RLIMIT_NOFILE, &limit);
    ::getrlimit(RLIMIT_NOFILE, &limit);
    const rlim_t fitting =
        limit.rlim_cur > 2 * kForEverythingElse ? limit.rlim_cur - kForEverythingElse : kForEverythingElse;
    return std::min<std::size_t>(ServerLimits{}.connections, fitting);
}

/// Runs before a byte of a client is read. Certificate and key may be links, which a renewal may change.
void giveUpRights(const ServiceDirectory& directory, const AdminListener* admin, const ServeOutput& output) {
    sandbox::Confinement rights;
    rights.files = sandbox::libraryFiles();
    rights.files.push_back({directory.path(), sandbox::Access::write});
    const TlsFiles tls = tlsFilesOf(directory);
    for (const std::string& path : {tls.certificate, tls.key})
        sandbox::append(rights.files, sandbox::fileAndItsLinks(path));
    addStoreRights(rights, directory);
    if (!tls.passphraseFile.empty())
        sandbox::append(rights.files, sandbox::fileAndItsLinks(pathOfPassphrase(tls.passphraseFile)));
    if (admin != nullptr) admin->addRights(rights, directory);
    for (const std::string& missing : sandbox::confine(rights)) output.err(missing);
}

}  // namespace

ServeSignals catchServeSignals() {
    return {waitForSignals({SIGTERM, SIGINT}), waitForSignals({SIGHUP})};
}

void serve(const ServiceDirectory& directory, const ServeOptions& options, const ServeOutput& lines,
           const ServeSignals& signals) {
    const ServeOutput output = inForm(directory.settings().log, lines);
    // A file of an earlier run would announce a service that does not listen yet.
    if (options.readyFile) ::unlink(options.readyFile->c_str());
    if (options.metricsListen) requireMetrics();
    // First, for a key in a token needs a process that has no second thread and no connection yet.
    const std::optional<AdminOptions> adminOptions = options.admin ? options.admin : adminOf(directory);
    std::optional<AdminListener> admin;
    if (adminOptions) admin.emplace(directory, *adminOptions, output);
    TlsContext tls(tlsFilesOf(directory));
    const std::unique_ptr<RecordStore> store = openStore(directory);
    Listener listener(options.listen ? *options.listen : directory.advertisedEndpoint());
    const Endpoint endpoint = reachable(directory, listener.endpoint());
    std::optional<Listener> metricsListener;
    if (options.metricsListen) {
        metricsListener.emplace(*options.metricsListen);
        output.out(format("metrics at http://%@/metrics", toString(metricsListener->endpoint())));
    }
    if (admin) announce(directory, *admin, output);
    announce(directory, options, output, endpoint);

    const ServiceManager manager;
    const ManagedRun run(manager);
    const LookupService lookups(*store, directory.hosts(), endpoint, fullDiskAt(directory.servicePath("")));
    ServerLimits limits;
    limits.connections = connectionsThatFit();
    const std::size_t adminConnections = std::min(kAdminConnections, limits.connections / 8);
    if (admin) limits.connections -= adminConnections;
    MetricsSource metrics(directory, options.version, *store);
    giveUpRights(directory, admin ? &*admin : nullptr, output);
    std::optional<MetricsListener> scrapes;
    if (metricsListener) scrapes.emplace(*metricsListener, [&metrics] { return metrics.text(); });
    Server server(lookups, tls, output.requests, output.err, limits, directory.settings().log,
                  &metrics.counts());
    const int hangUp = signals.reload.get();
    AdminListener* const adminListener = admin ? &*admin : nullptr;
    std::vector<Watch> watches{{hangUp, [&directory, &tls, &metrics, adminListener, &output, hangUp] {
                                    takeSignals(hangUp);
                                    reload(directory.path(), tls, metrics, adminListener, output);
                                }}};
    if (const auto watch = run.watch()) watches.push_back(*watch);
    if (admin) admin->start(signals.stop.get(), adminConnections, metrics.counts());
    run.ready(endpoint);
    server.run(listener, signals.stop.get(), watches);
    admin.reset();
    manager.tell("STOPPING=1");
    output.out("stopped");
}

}  // namespace pinwell::lumora
