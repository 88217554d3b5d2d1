// A whole platform of fakes around a real directory, for unit tests of the tool.
//
// The test sets the results of code signing, trust, sessions, user defaults and the system log. Files and
// types are real, below a temporary directory, with every file operation recorded. The end of the process is
// an exception.
#pragma once

#include <optional>

#include "base/bytes.h"
#include "config/platform_directory.h"
#include "src/platform.h"
#include "support/fake_code_signing.h"
#include "support/fake_file_manager.h"
#include "support/fake_sessions.h"
#include "support/fake_system_log.h"
#include "support/fake_trust_service.h"
#include "support/fake_user_defaults.h"
#include "support/temporary_directory.h"

namespace pinwell::test {

/// Thrown instead of the end of the process.
struct ProcessExit {
    int status;
};

class TestPlatform {
  public:
    TestPlatform();

    /// References to the members below.
    Platform services();

    /// The same with another code-signing service, the real one for instance.
    Platform servicesWith(codesign::CodeSigningService& other);

    /// The exit code of `action`; `nullopt` if it returns.
    template <class Action>
    std::optional<int> exitStatusOf(Action&& action) {
        try {
            action();
        } catch (const ProcessExit& exit) {
            return exit.status;
        }
        return std::nullopt;
    }

    TemporaryDirectory directory;  // artefacts, the platform directory, and "tmp" for downloads
    std::unique_ptr<types::TypeService> types;
    RecordingFileManager files;
    FakeCodeSigningService codeSigning;
    FakeTrustService trust;
    FakeSessionService https;
    FakeUserDefaultsService userDefaults;
    FakeSystemLog systemLog;
    config::PlatformDirectory platformDirectory;
};

/// A well-framed ticket container whose payload lists `hashes` with algorithm 2, each of the payload's one
/// hash length. Its certificates and signature are filler: only a trust service that accepts anything accepts
/// it.
base::Data unsignedTicket(const std::vector<base::Data>& hashes, std::uint32_t flags = 0);

}  // namespace pinwell::test
