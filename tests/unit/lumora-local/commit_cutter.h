// A relay between a store and its database. It loses a commit, or the response to it, or never responds.
#pragma once

#include <atomic>
#include <string>
#include <thread>
#include <vector>

#include "base/handle.h"
#include "support/temporary_directory.h"

namespace pinwell::lumora::test {

class CommitCutter {
  public:
    enum class Cut {
        nothing,
        commit,  // the connection ends before the server hears of the commit
        answer,  // it ends after the server has committed
        all,     // no byte passes in either direction
    };

    /// Passes connections on to the server with its socket in that directory.
    explicit CommitCutter(std::string serverDirectory);
    ~CommitCutter();
    CommitCutter(const CommitCutter&) = delete;
    CommitCutter& operator=(const CommitCutter&) = delete;

    /// The directory of its own socket.
    const std::string& directory() const { return directory_.path(); }

    /// Its action on the next commit; after that it passes everything on again.
    void cut(Cut cut) { next_ = cut; }

    int cuts() const { return cuts_; }

  private:
    void listen();
    void pass(base::FileDescriptor client);

    const std::string serverDirectory_;
    const pinwell::test::TemporaryDirectory directory_;
    base::FileDescriptor listener_;
    std::atomic<Cut> next_{Cut::nothing};
    std::atomic<int> cuts_{0};
    std::atomic<bool> stopping_{false};
    std::thread thread_;
    std::vector<std::thread> connections_;
};

}  // namespace pinwell::lumora::test
