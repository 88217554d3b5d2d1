// The services of this machine, as the programs use them.
#pragma once

#include <functional>
#include <memory>

#include "defaults/user_defaults.h"
#include "https/session.h"
#include "src/platform.h"

namespace pinwell {

/// The services of this machine, made and connected, for main and the companions.
///
/// Owns every service; must outlive every user of its services(). The constructor reads only the
/// environment.
class HostPlatform {
  public:
    /// Whether a session keeps its connection for the next exchange, or makes a new one for each.
    enum class Connections : bool { closed, kept };

    /// `exitProcess` ends the process with a status.
    explicit HostPlatform(std::function<void(int)> exitProcess,
                          Connections connections = Connections::closed);
    HostPlatform(const HostPlatform&) = delete;
    HostPlatform& operator=(const HostPlatform&) = delete;

    Platform services() const;

  private:
    // In the order of their dependencies.
    const config::PlatformDirectory directory_;
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
