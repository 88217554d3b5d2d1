#include "local_platform.h"

#include <stdexcept>
#include <utility>

#include "defaults/user_defaults.h"
#include "https/session.h"
#include "roots.h"
#include "src/PWHashedFile/file_kind.h"
#include "trust/trust_service.h"

namespace pinwell::library {

namespace {

// Reading an artefact uses none of these services, and a host program would not want them.

[[noreturn]] void refuse(const char* what) {
    throw std::logic_error(what);
}

class NoSessions final : public https::SessionService {
    base::Result<std::shared_ptr<https::Session>> ephemeralSession(https::SessionDelegate&) override {
        refuse("the library asks no service");
    }
};

class NoDefaults final : public defaults::UserDefaultsService {
    std::unique_ptr<defaults::UserDefaults> openDomain(std::string_view) override {
        refuse("the library has no user's settings");
    }
};

/// The verdict contains what the tool would log.
class NoLog final : public syslog::SystemLog {
    void error(std::string_view) override {}
};

}  // namespace

struct LocalPlatform::Services {
    Services(const ticket::TrustedRoots* roots, std::int64_t evaluationTime)
        : files(files::makeLocalFileManager(
              [this](const files::ItemFacts& facts) { return nameType(*types, facts); })),
          trust(trust::makeTrustService(
              [contents = roots == nullptr ? nullptr : ticket::TrustedRootsAccess::contentsOf(*roots)] {
                  return contents == nullptr ? trust::Anchors() : contents->anchors;
              },
              [evaluationTime] { return values::Date{evaluationTime}; })) {}

    const std::unique_ptr<types::TypeService> types = types::makeTypeService(types::MimeDatabase::leftAlone);
    const std::unique_ptr<files::FileManager> files;
    const std::unique_ptr<codesign::CodeSigningService> codeSigning = codesign::makeCodeSigningService();
    const std::unique_ptr<trust::TrustService> trust;
    const std::unique_ptr<https::SessionService> https = std::make_unique<NoSessions>();
    const std::unique_ptr<defaults::UserDefaultsService> defaults = std::make_unique<NoDefaults>();
    const std::unique_ptr<syslog::SystemLog> log = std::make_unique<NoLog>();
    const config::PlatformDirectory directory{std::string()};
};

LocalPlatform::LocalPlatform(const ticket::TrustedRoots* roots, std::int64_t evaluationTime)
    : services_(std::make_unique<const Services>(roots, evaluationTime)) {}

LocalPlatform::~LocalPlatform() = default;

Platform LocalPlatform::services() const {
    return {*services_->files, *services_->types,    *services_->codeSigning,
            *services_->trust, *services_->https,    *services_->defaults,
            *services_->log,   services_->directory, [](int) { refuse("the library ends no process"); }};
}

}  // namespace pinwell::library
