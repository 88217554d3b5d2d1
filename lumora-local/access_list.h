// DIR/service/access.toml: the roles of the clients.
//
//   [clients]
//   "ci.example"      = ["issue", "read"]
//   "release manager" = ["issue", "revoke", "read"]
//
// The name of a client is the common name of its certificate. A client that is not listed has no role. Other
// tables and keys are refused, and so are names of more than 64 bytes, an empty list, other roles, more than
// 10,000 clients, and a file of more than 1 MiB.
#pragma once

#include <map>
#include <memory>
#include <mutex>
#include <string>
#include <string_view>

namespace pinwell::lumora {

/// The roles of the file.
struct Rights {
    bool issue = false;
    bool revoke = false;
    bool read = false;

    bool any() const noexcept { return issue || revoke || read; }
    bool operator==(const Rights&) const = default;
};

/// Reads the file. Throws Failure (EX_CONFIG): one line that names the file and the line.
std::map<std::string, Rights, std::less<>> readAccessFile(const std::string& path);

/// For any thread.
class AccessList {
  public:
    /// Throws Failure as readAccessFile does.
    explicit AccessList(std::string path);

    /// None for a client that is not listed.
    Rights of(std::string_view client) const;

    /// Reads the file again. If it throws Failure, the list stays the same.
    void reload();

  private:
    using Clients = std::map<std::string, Rights, std::less<>>;

    const std::string path_;
    mutable std::mutex mutex_;
    std::shared_ptr<const Clients> clients_;
};

}  // namespace pinwell::lumora
