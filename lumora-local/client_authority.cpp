#include "lumora-local/client_authority.h"

#include <filesystem>
#include <system_error>

#include "foundation/format.h"
#include "lumora-local/authority.h"
#include "lumora-local/client_certificate.h"
#include "lumora-local/failure.h"
#include "lumora-local/file_writing.h"
#include "lumora-local/key_file.h"

namespace pinwell::lumora {
namespace {

using foundation::format;

constexpr mode_t kFolderMode = 0700;
constexpr mode_t kCertificateMode = 0644;
constexpr mode_t kKeyMode = 0600;

/// Certificate and key under these names, both or none.
void writePair(const std::string& folder, const std::string& name, const Identity& identity) {
    PendingDirectory pending(folder, kFolderMode);
    writeNewFile(pending.path() + "/" + name + ".pem", foundation::asBytes(identity.certificate),
                 kCertificateMode);
    writeNewFile(pending.path() + "/" + name + ".key", foundation::asBytes(identity.privateKey), kKeyMode);
    flushDirectory(pending.path());
    pending.publish();
}

bool exists(const std::string& path) {
    std::error_code ignored;
    return std::filesystem::exists(path, ignored);
}

IssuerFiles requireAuthority(const ServiceDirectory& directory, foundation::Date now) {
    const std::string folder = directory.servicePath("clients");
    if (!exists(clientAuthorityPath(directory))) {
        Passphrase passphrase;
        if (!directory.settings().passphraseFile.empty())
            passphrase.read(directory.settings().passphraseFile);
        try {
            writePair(folder, "ca", createClientAuthority(now, passphrase.text()));
        } catch (const Failure&) {
            if (!exists(clientAuthorityPath(directory))) throw;  // another process was faster
        }
    }
    return {clientAuthorityPath(directory), folder + "/ca.key", directory.settings().passphraseFile};
}

}  // namespace

std::string clientAuthorityPath(const ServiceDirectory& directory) {
    return directory.servicePath("clients/ca.pem");
}

void makeClientCertificate(const ServiceDirectory& directory, const std::string& name,
                           const std::string& folder, foundation::Date now) {
    if (!canNameAClient(name)) {
        throw Failure(EX_USAGE, format("%@ is not a client's name: 1 to %zu bytes without control characters",
                                       name, kMaximumClientName));
    }
    const IssuerFiles authority = requireAuthority(directory, now);
    writePair(folder, "client", issueClient(authority, name, now));
}

}  // namespace pinwell::lumora
