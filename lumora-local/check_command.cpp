#include <algorithm>
#include <charconv>
#include <filesystem>
#include <functional>
#include <memory>
#include <system_error>

#include "access_list.h"
#include "base/text.h"
#include "certificates.h"
#include "config/platform_directory.h"
#include "event.h"
#include "failure.h"
#include "key_file.h"
#include "rfc3339.h"
#include "service_store.h"
#include "upkeep.h"
#include "values/format.h"

namespace pinwell::lumora {
namespace {

using values::Date;
using values::format;

constexpr std::int64_t kHour = 3600;
constexpr std::int64_t kCentury = std::int64_t{36525} * 24 * kHour;

class Inspection {
  public:
    Inspection(const ServiceDirectory& directory, Date now, std::int64_t warning)
        : directory_(directory), now_(now), warning_(warning) {}

    std::vector<Finding> run() {
        look("platform directory", [&] { readRoots(); });
        look("ticket signer", [&] { checkSigner(); });
        look("ticket authority's key", [&] { checkAuthorityKeys(); });
        look("server", [&] { checkServer(); });
        look("administration", [&] { checkAdministration(); });
        look("record store", [&] { checkStore(); });
        return std::move(findings_);
    }

  private:
    static bool exists(const std::string& path) {
        std::error_code ignored;
        return std::filesystem::symlink_status(path, ignored).type() != std::filesystem::file_type::not_found;
    }

    void look(const std::string& subject, const std::function<void()>& check) {
        subject_ = subject;
        try {
            check();
        } catch (const std::exception& error) {
            add(Condition::wrong, error.what());
        }
    }

    void add(Condition condition, std::string text) {
        findings_.push_back({condition, subject_, std::move(text)});
    }

    void require(bool fits, const std::string& text) {
        if (!fits) add(Condition::wrong, text);
    }

    void checkDate(const std::string& name, X509* certificate) {
        const std::int64_t expiry = expiryOf(certificate);
        const std::string date = toRfc3339(Date{expiry});
        if (expiry <= now_.seconds) {
            add(Condition::wrong, format("%@ has expired: %@", name, date));
        } else if (expiry - now_.seconds < warning_) {
            add(Condition::expiresSoon, format("%@ expires soon: %@", name, date));
        } else {
            add(Condition::fine, format("%@ is valid until %@", name, date));
        }
    }

    void readRoots() {
        const config::PlatformDirectory platform(directory_.platformPath());
        for (const std::string& path : platform.rootCertificateFiles())
            roots_.push_back(readCertificateFile(path));
        require(!roots_.empty(), "it holds no root");
        for (const CertificateHandle& root : roots_) checkDate(nameOf(root.get()), root.get());
    }

    bool isPublished(X509* root) const {
        return std::any_of(roots_.begin(), roots_.end(),
                           [&](const CertificateHandle& known) { return X509_cmp(known.get(), root) == 0; });
    }

    void checkSigner() {
        static_cast<void>(directory_.openSigner());  // throws unless key and certificate fit
        std::vector<CertificateHandle> chain;
        for (const std::string& path : directory_.signerChainPaths())
            chain.push_back(readCertificateFile(path));
        if (const auto fault = faultOfSignerChain(chain)) add(Condition::wrong, *fault);
        require(isPublished(chain.back().get()),
                format("the platform directory lacks its root %@", nameOf(chain.back().get())));
        for (const CertificateHandle& certificate : chain)
            checkDate(nameOf(certificate.get()), certificate.get());
    }

    /// Keys that may be in another place.
    void checkAuthorityKeys() {
        checkKeyIfThere("root.key", directory_.rootCertificatePath());
        const std::vector<std::string>& chain = directory_.signerChainPaths();
        if (chain.size() > 1) checkKeyIfThere("ticket-intermediate.key", chain[1]);
    }

    void checkKeyIfThere(const std::string& name, const std::string& certificatePath) {
        const std::string path = directory_.servicePath(name);
        if (!exists(path)) return;
        const CertificateHandle certificate = readCertificateFile(certificatePath);
        const KeyHandle key = readKeyFile(path, directory_.settings().passphraseFile);
        const bool fits = X509_check_private_key(certificate.get(), key.get()) == 1;
        ERR_clear_error();
        require(fits, format("the key in %@ is not the one of the certificate in %@", path, certificatePath));
    }

    void checkServer() {
        constexpr std::size_t kMostCertificates = 8;
        const auto chain = readCertificateFiles(directory_.serverCertificatePath(), kMostCertificates);
        X509* server = chain.front().get();
        const KeyHandle key = readKeyFile(directory_.serverKeyPath(), directory_.settings().passphraseFile);
        require(X509_check_private_key(server, key.get()) == 1, "key and certificate do not belong together");
        ERR_clear_error();
        const bool anchored = std::any_of(roots_.begin(), roots_.end(), [&](const CertificateHandle& root) {
            return !faultOfIssue(chain.back().get(), root.get());
        });
        require(anchored, "no root of the platform directory has issued it");
        for (const std::string& host : directory_.hosts()) checkHost(server, host);
        checkHost(server, directory_.advertisedEndpoint().host);
        checkDate(nameOf(server), server);
    }

    void checkHost(X509* server, const std::string& host) {
        const bool covered = isAddress(host)
                                 ? X509_check_ip_asc(server, host.c_str(), 0) == 1
                                 : X509_check_host(server, host.data(), host.size(),
                                                   X509_CHECK_FLAG_NEVER_CHECK_SUBJECT, nullptr) == 1;
        ERR_clear_error();
        require(covered, format("its certificate does not name %@", host));
    }

    /// A service without the administration listener has none of this.
    void checkAdministration() {
        const std::string access = directory_.accessPath();
        const std::string authority = clientAuthorityPath(directory_);
        if (exists(authority)) {
            checkKeyIfThere("clients/ca.key", authority);
            checkAuthority(authority);
        }
        if (const auto& admin = directory_.settings().admin) {
            if (admin->clientAuthorities != authority) checkAuthority(admin->clientAuthorities);
        } else if (!exists(access)) {
            return;
        }
        const std::size_t clients = readAccessFile(access).size();
        add(Condition::fine, format("access.toml gives rights to %zu clients", clients));
    }

    void checkAuthority(const std::string& path) {
        constexpr std::size_t kMostAuthorities = 64;
        for (const CertificateHandle& certificate : readCertificateFiles(path, kMostAuthorities))
            checkDate(nameOf(certificate.get()), certificate.get());
    }

    void checkStore() {
        const std::unique_ptr<RecordStore> store = openStore(directory_);
        const HistorySummary summary = verifyHistory(*store, std::nullopt);
        add(Condition::fine,
            format("%zu records, %zu events, the log is whole", store->countRecords(), summary.events));
    }

    const ServiceDirectory& directory_;
    Date now_;
    std::int64_t warning_;
    std::string subject_;
    std::vector<CertificateHandle> roots_;
    std::vector<Finding> findings_;
};

}  // namespace

std::vector<Finding> checkService(const ServiceDirectory& directory, Date now, std::int64_t warning) {
    return Inspection(directory, now, warning).run();
}

int exitStatusOf(const std::vector<Finding>& findings) {
    const auto any = [&](Condition condition) {
        return std::any_of(findings.begin(), findings.end(),
                           [&](const Finding& finding) { return finding.condition == condition; });
    };
    if (any(Condition::wrong)) return EX_CONFIG;
    return any(Condition::expiresSoon) ? 1 : EX_OK;
}

std::string describeFindings(const std::vector<Finding>& findings) {
    std::string text;
    for (const Finding& finding : findings) {
        const char* word = finding.condition == Condition::fine    ? "ok"
                           : finding.condition == Condition::wrong ? "wrong"
                                                                   : "soon";
        text += format("%s\t%s\t%s\n", word, finding.subject, base::escapeForDisplay(finding.text));
    }
    return text;
}

std::optional<std::int64_t> parseDuration(std::string_view text) {
    if (text.size() < 2) return std::nullopt;
    const char unit = text.back();
    const std::int64_t factor = unit == 'h'   ? kHour
                                : unit == 'd' ? 24 * kHour
                                : unit == 'w' ? 168 * kHour
                                              : 0;
    text.remove_suffix(1);
    std::uint32_t number = 0;
    const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), number);
    if (factor == 0 || error != std::errc{} || end != text.data() + text.size()) return std::nullopt;
    const std::int64_t seconds = std::int64_t{number} * factor;
    if (seconds > kCentury) return std::nullopt;
    return seconds;
}

}  // namespace pinwell::lumora
