#include "server.h"

#include <algorithm>
#include <atomic>
#include <boost/asio/io_context.hpp>
#include <boost/asio/ip/tcp.hpp>
#include <boost/asio/posix/stream_descriptor.hpp>
#include <boost/asio/steady_timer.hpp>
#include <boost/asio/strand.hpp>
#include <deque>
#include <exception>
#include <memory>
#include <thread>

#include "connection.h"
#include "values/format.h"

namespace pinwell::lumora {
namespace {

namespace asio = boost::asio;
using Tcp = asio::ip::tcp;
using ErrorCode = boost::system::error_code;

// After the system had no descriptor or no memory for a connection.
constexpr std::chrono::milliseconds kPauseWhenShort{50};

// While all places are taken and somebody waits for one: how long a handshake may take, and when to look
// again.
constexpr std::chrono::milliseconds kHandshakeTimeWhenFull{1'000};
constexpr std::chrono::milliseconds kPauseWhenFull{100};

/// Accepts connections while there are places for them. Its own handlers run on one strand.
class Acceptor {
  public:
    Acceptor(asio::io_context& context, Listener& listener, ConnectionContext& shared)
        : context_(context),
          strand_(asio::make_strand(context)),
          acceptor_(strand_),
          pause_(strand_),
          shared_(shared),
          free_(shared.limits.connections) {
        acceptor_.assign(listener.isIPv6() ? Tcp::v6() : Tcp::v4(), listener.release().release());
        acceptor_.non_blocking(true);
    }

    /// On the strand.
    void acceptNext() {
        if (!acceptor_.is_open()) return;
        if (free_ == 0) {
            waiting_ = true;
            return makeRoomForTheNext();
        }
        acceptor_.async_accept(asio::make_strand(context_), [this](ErrorCode error, Tcp::socket socket) {
            if (error == asio::error::operation_aborted) return;
            if (error) return acceptAfterAPause();
            std::make_shared<Connection>(shared_, std::move(socket), takePlace())->start();
            acceptNext();
        });
    }

    void start() {
        asio::post(strand_, [this] { acceptNext(); });
    }

    void stop() {
        asio::post(strand_, [this] {
            ErrorCode ignored;
            acceptor_.close(ignored);
            pause_.cancel();
        });
    }

  private:
    /// Strangers who complete no handshake must not take all places.
    void makeRoomForTheNext() {
        if (std::exchange(watching_, true)) return;
        acceptor_.async_wait(Tcp::acceptor::wait_read, [this](ErrorCode error) {
            watching_ = false;
            if (error || !waiting_) return;
            if (shared_.table.closeHandshakesBefore(std::chrono::steady_clock::now() -
                                                    kHandshakeTimeWhenFull) > 0)
                return;
            pause_.expires_after(kPauseWhenFull);
            pause_.async_wait([this](ErrorCode cancelled) {
                if (!cancelled && waiting_) makeRoomForTheNext();
            });
        });
    }

    std::shared_ptr<void> takePlace() {
        --free_;
        return {nullptr, [this](void*) {
                    asio::post(strand_, [this] {
                        ++free_;
                        if (std::exchange(waiting_, false)) acceptNext();
                    });
                }};
    }

    void acceptAfterAPause() {
        pause_.expires_after(kPauseWhenShort);
        pause_.async_wait([this](ErrorCode error) {
            if (!error) acceptNext();
        });
    }

    asio::io_context& context_;
    asio::strand<asio::io_context::executor_type> strand_;
    Tcp::acceptor acceptor_;
    asio::steady_timer pause_;
    ConnectionContext& shared_;
    std::size_t free_;
    bool waiting_ = false;   // for a place
    bool watching_ = false;  // for the next connection, while there is no place
};

/// Calls back whenever a descriptor is readable, until it is cancelled. The descriptor stays its owner's.
class DescriptorWatch {
  public:
    DescriptorWatch(asio::io_context& context, int descriptor, std::function<void()> react)
        : strand_(asio::make_strand(context)), descriptor_(strand_, descriptor), react_(std::move(react)) {}
    ~DescriptorWatch() { descriptor_.release(); }
    DescriptorWatch(const DescriptorWatch&) = delete;
    DescriptorWatch& operator=(const DescriptorWatch&) = delete;

    void wait(bool again) {
        descriptor_.async_wait(asio::posix::stream_descriptor::wait_read, [this, again](ErrorCode error) {
            if (error) return;
            react_();
            if (again && !cancelled_) wait(again);
        });
    }

    void cancel() {
        asio::post(strand_, [this] {
            cancelled_ = true;
            ErrorCode ignored;
            descriptor_.cancel(ignored);
        });
    }

  private:
    asio::strand<asio::io_context::executor_type> strand_;
    asio::posix::stream_descriptor descriptor_;
    std::function<void()> react_;
    bool cancelled_ = false;
};

std::size_t workersFor(const ServerLimits& limits) {
    constexpr std::size_t kFewest = 4;  // while some wait for the records, others serve
    if (limits.workers > 0) return limits.workers;
    return std::max<std::size_t>(kFewest, std::thread::hardware_concurrency());
}

/// Runs handlers until there are no more. An exception of a handler ends only that handler.
void work(asio::io_context& context, const Server::LogLine& errorLog) {
    for (;;) {
        try {
            context.run();
            return;
        } catch (const std::exception& error) {
            errorLog(values::format("a connection ended: %s", error.what()));
        }
    }
}

}  // namespace

Server::Server(const HttpService& service, const TlsContext& context, LogLine accessLog, LogLine errorLog,
               const ServerLimits& limits, LogForm form, ServiceCounts* counts)
    : service_(service),
      context_(context),
      accessLog_(std::move(accessLog)),
      errorLog_(std::move(errorLog)),
      limits_(limits),
      form_(form),
      counts_(counts != nullptr ? *counts : ownCounts_) {}

void Server::run(Listener& listener, int stopDescriptor, const std::vector<Watch>& watches) {
    const std::size_t workers = workersFor(limits_);
    ConnectionTable table(limits_.connectionsPerAddress);
    std::atomic<bool> stopping{false};
    ConnectionContext shared{service_, context_, accessLog_, errorLog_, limits_,
                             form_,    table,    stopping,   counts_};
    asio::io_context context(static_cast<int>(workers));

    Acceptor acceptor(context, listener, shared);
    std::deque<DescriptorWatch> others;
    for (const Watch& watch : watches) others.emplace_back(context, watch.descriptor, watch.react).wait(true);
    DescriptorWatch stop(context, stopDescriptor, [&] {
        stopping = true;
        acceptor.stop();
        table.closeSilent();
        for (DescriptorWatch& other : others) other.cancel();
    });
    stop.wait(false);
    acceptor.start();

    std::vector<std::thread> threads;
    for (std::size_t i = 1; i < workers; ++i) threads.emplace_back([&] { work(context, errorLog_); });
    work(context, errorLog_);
    for (std::thread& thread : threads) thread.join();
}

}  // namespace pinwell::lumora
