// The services of this machine, made once and tied together: what main and the companions run on.
#pragma once

#include <functional>
#include <memory>

#include "src/platform.h"

namespace pinwell {

/// Owns every service; must outlive whatever was given its services(). Making it reads nothing but the
/// environment.
class HostPlatform {
  public:
    /// Whether a session keeps its connection from one exchange to the next, or has a new one for each.
    enum class Connections : bool { closed, kept };

    /// `exitProcess` ends the process with a status.
    explicit HostPlatform(std::function<void(int)> exitProcess,
                          Connections connections = Connections::closed);
    HostPlatform(const HostPlatform&) = delete;
    HostPlatform& operator=(const HostPlatform&) = delete;

    Platform services() const;

  private:
    // In the order of their dependencies.
    const foundation::PlatformDirectory directory_;
    const std::unique_ptr<syslog::SystemLog> systemLog_;
    const std::unique_ptr<types::TypeService> types_;
    const std::unique_ptr<files::FileManager> files_;
    const std::unique_ptr<codesign::CodeSigningService> codeSigning_;
    const std::unique_ptr<trust::TrustService> trust_;
    const std::unique_ptr<https::SessionService> https_;
    const std::unique_ptr<defaults::UserDefaultsService> userDefaults_;
    const std::function<void(int)> exitProcess_;
};

}  // namespace pinwell
