// The host platform for the tool: one reference to each service, made once in main and passed down.
#pragma once

#include <functional>

#include "codesign/code_signing.h"
#include "defaults/user_defaults.h"
#include "files/file_manager.h"
#include "foundation/platform_directory.h"
#include "https/session.h"
#include "syslog/system_log.h"
#include "trust/trust.h"
#include "types/type_service.h"

namespace pinwell {

/// Copies share the services, which must outlive them all.
struct Platform {
    files::FileManager& files;
    types::TypeService& types;
    codesign::CodeSigningService& codeSigning;
    trust::TrustService& trust;
    https::SessionService& https;
    defaults::UserDefaultsService& userDefaults;
    syslog::SystemLog& systemLog;
    const foundation::PlatformDirectory& directory;

    /// Ends the process with a status; does not return. A test may throw from it instead.
    std::function<void(int)> exitProcess;
};

}  // namespace pinwell
