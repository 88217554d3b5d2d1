// One run of the controller over a bundle; the test replaces the network.
#pragma once

#include <functional>
#include <memory>
#include <optional>
#include <string>

#include "base/bytes.h"
#include "src/DownloadDelegate.h"
#include "support/test_platform.h"
#include "values/url.h"

namespace pinwell::test {

/// The exit code of a run of the tool with this response body to its lookup, if it sends one. The services
/// are the platform's, except the services that the test has replaced. `meanwhile` runs between request and
/// response.
int statusOfRun(std::uint8_t operation, const values::URL& path, TestPlatform& platform,
                const Platform& services, std::string_view answer,
                const std::function<void()>& meanwhile = {});

/// A bundle App.app whose cdhash is 20 bytes of 0xAB under algorithm 2, and a controller for it.
class ControllerRun {
  public:
    ControllerRun();

    static base::Data fileHash() { return base::Data(20, std::byte{0xAB}); }
    static constexpr const char* kPrettyHash = "2/abababababababababababababababababababab";

    std::string artefact() const { return platform.directory / "App.app"; }
    std::string stapledPath() const { return platform.directory / "App.app/Contents/CodeResources"; }
    void staple(const base::Data& ticket) { writeFile(stapledPath(), base::ByteView(ticket)); }

    /// The request of the lookup's one task; fails the test when there is none.
    const https::Request& request() const;

    /// Completes the lookup with this body; returns the exit code.
    std::optional<int> answer(std::string_view body,
                              https::Headers headers = {{"X-Ostrel-Request-UUID", "REQUEST"}},
                              int status = 200);
    std::optional<int> fail(const base::Error& error);

    /// A lookup response with the ticket inline.
    static std::string inlineAnswer(const base::Data& ticket);

    TestPlatform platform;
    std::shared_ptr<PWHashedFile> file;
    DownloadDelegate controller;
};

}  // namespace pinwell::test
