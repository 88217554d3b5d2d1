// The configuration by user and system: the platform directory's settings and root certificates, and a domain
// of user defaults. The input is all three at once.
#include <algorithm>
#include <cstdlib>

#include "config/platform_directory.h"
#include "defaults/user_defaults.h"
#include "support/certificate_builder.h"
#include "support/temporary_directory.h"
#include "target.h"
#include "trust/trust.h"

namespace pinwell::fuzz {
namespace {

constexpr std::size_t kLongestHostAndPort = 253 + 6;

struct Scene {
    Scene() { setenv("XDG_CONFIG_HOME", directory.path().c_str(), 1); }

    test::TemporaryDirectory directory;
    Data leaf = test::TicketChain().issue().leaf.der;
};

void examineHost(const config::PlatformDirectory& directory) {
    const auto host = directory.lumoraHost();
    if (!host) {
        require(!host.error().localizedDescription().empty(), "a refusal says why");
        return;
    }
    const auto isPlain = [](char c) {
        return c > ' ' && c < 0x7F && c != '/' && c != '@' && c != '?' && c != '#';
    };
    require(!host->empty() && host->size() <= kLongestHostAndPort && std::ranges::all_of(*host, isPlain),
            "a host is a host, and a port at most");
}

void examineDefaults() {
    const auto domain = defaults::makeUserDefaultsService()->openDomain("domain");
    domain->registerDefaults({{"text", "default"}, {"flag", true}});
    static_cast<void>(domain->stringForKey("text"));
    static_cast<void>(domain->boolForKey("flag"));
}

void examineRoots(const config::PlatformDirectory& directory, ByteView leaf) {
    const auto service = trust::makeTrustService(
        directory, [](std::string_view) {}, [] { return values::Date{1795204500}; });
    const auto certificate = service->parseCertificate(leaf);
    auto policy = std::make_shared<trust::Policy>();
    policy->options.emplace(trust::option::kIdLinkage, true);
    const auto object = service->makeTrust({certificate}, policy);
    require(object.has_value(), "there is a trust object");
    const auto verdict = (*object)->evaluate();
    require(verdict.has_value(), "there is a verdict");
    require(*verdict != trust::Verdict::unspecified, "a leaf is not trusted without its issuers");
}

}  // namespace

void examine(ByteView input) {
    static const Scene scene;
    test::writeFile(scene.directory / "platform.json", input);
    test::writeFile(scene.directory / "domain.json", input);
    test::writeFile(scene.directory / "roots/root.pem", input);
    const config::PlatformDirectory directory(scene.directory.path());
    examineHost(directory);
    examineDefaults();
    examineRoots(directory, scene.leaf);
}

}  // namespace pinwell::fuzz
