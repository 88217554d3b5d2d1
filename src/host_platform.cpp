#include "src/host_platform.h"

#include "https/session.h"
#include "src/PWHashedFile/file_kind.h"

namespace pinwell {

HostPlatform::HostPlatform(std::function<void(int)> exitProcess, Connections connections)
    : directory_(config::PlatformDirectory::current()),
      systemLog_(syslog::makeSystemLog()),
      types_(types::makeTypeService()),
      files_(files::makeLocalFileManager(
          [this](const files::ItemFacts& facts) { return nameType(*types_, facts); })),
      codeSigning_(codesign::makeCodeSigningService()),
      trust_(trust::makeTrustService(directory_, [this](std::string_view line) { systemLog_->error(line); })),
      https_(https::makeSessionService(*trust_, {.keepsConnection = connections == Connections::kept})),
      userDefaults_(defaults::makeUserDefaultsService()),
      exitProcess_(std::move(exitProcess)) {}

Platform HostPlatform::services() const {
    return {*files_,        *types_,     *codeSigning_, *trust_,     *https_,
            *userDefaults_, *systemLog_, directory_,    exitProcess_};
}

}  // namespace pinwell
