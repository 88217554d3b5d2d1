// The host platform for the tool: the services, made once in main and passed down.
#pragma once

#include <functional>

#include "codesign/code_signing.h"
#include "config/platform_directory.h"
#include "files/file_manager.h"
#include "syslog/system_log.h"
#include "trust/trust.h"
#include "types/type_service.h"

namespace pinwell {

// Only declared here, because a reader of artefacts needs neither. A caller of one includes its header.
namespace https {
class SessionService;
}
namespace defaults {
class UserDefaultsService;
}

/// One reference to each service. Copies share the services, which must outlive them all.
struct Platform {
    files::FileManager& files;
    types::TypeService& types;
    codesign::CodeSigningService& codeSigning;
    trust::TrustService& trust;
    https::SessionService& https;
    defaults::UserDefaultsService& userDefaults;
    syslog::SystemLog& systemLog;
    const config::PlatformDirectory& directory;

    /// Ends the process with a status; does not return. A test may throw from it instead.
    std::function<void(int)> exitProcess;
};

}  // namespace pinwell
