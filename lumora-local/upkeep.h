// The commands that maintain a service: rotate, certify, client-certificate, check, backup, restore.
//
// rotate and certify give new files new names. Last, service.json is replaced in one step and names them. So
// a reader finds either the old keys and certificates or the new ones. The old files remain for processes
// that have read the old service.json. A ticket contains its own chain, so earlier tickets stay genuine while
// clients trust the root.
//
// client-certificate has an authority of its own, for clients of the administration listener only: no other
// part of the service trusts it.
//
//   DIR/service/clients/ca.pem   the authority's certificate, for --client-ca
//   DIR/service/clients/ca.key   its key, encrypted like the service's other keys
//
// backup puts a whole service into one file while it runs. The file is a SQLite database: the records and
// their log at one moment, and a table `sqlar` (SQLite's own form of an archive) with service.json, keys,
// certificates and the platform directory. It does not contain a root's key in another place, a token, or a
// passphrase.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "service_directory.h"
#include "values/date.h"

namespace CLI {
class App;
}

namespace pinwell::lumora {

/// The changes, as lines for a person.
using RotationReport = std::vector<std::string>;

struct SignerRotation {
    std::string tokenKey;     // a pkcs11: URI whose key becomes the signer's; empty: a fresh key in a file
    std::string requestFile;  // makes a request for another authority's certificate; nothing else changes yet
};

/// Gives the signer a new key, certified by the service's own intermediate certificate. Throws Failure:
/// EX_CONFIG if that one's key is not in the service.
RotationReport rotateSigner(const ServiceDirectory& directory, const SignerRotation& rotation,
                            values::Date now);

/// Gives the server a new key and certificate for the hosts of service.json. `rootDirectory` has root.key; if
/// empty, root.key is in the service's directory. Throws Failure.
RotationReport rotateServer(const ServiceDirectory& directory, const std::string& rootDirectory,
                            values::Date now);

/// Installs the three certificates of the PEM file `chainFile`, signer first. They are for the last requested
/// key, or for `key` (a file or a pkcs11: URI) if that is not empty. A new root is added to the platform
/// directory. Throws Failure (EX_DATAERR) if clients would refuse the chain, or it is for another key. Then
/// nothing is changed.
RotationReport certifySignerElsewhere(const ServiceDirectory& directory, const std::string& chainFile,
                                      const std::string& key, values::Date now);

/// The path of the authority's certificate, present or future.
std::string clientAuthorityPath(const ServiceDirectory& directory);

/// Makes `folder`, which must be missing or empty, with client.pem and client.key (mode 0600, unencrypted)
/// for a client of that name. The first call also makes the authority. Throws Failure: EX_USAGE if the name
/// is not 1 to 64 bytes of UTF-8 without control characters.
void makeClientCertificate(const ServiceDirectory& directory, const std::string& name,
                           const std::string& folder, values::Date now);

/// The outcome of one check: of keys, certificates, platform directory, access list or store.
enum class Condition { fine, expiresSoon, wrong };

struct Finding {
    Condition condition = Condition::fine;
    std::string subject;  // the checked item
    std::string text;
};

/// Completes all checks, even after a fault; writes nothing. `warning` is in seconds.
std::vector<Finding> checkService(const ServiceDirectory& directory, values::Date now, std::int64_t warning);

/// 0; 1 if something expires soon; EX_CONFIG if something is wrong.
int exitStatusOf(const std::vector<Finding>& findings);

/// One line a finding, tab-separated: ok, soon or wrong; the subject; the text.
std::string describeFindings(const std::vector<Finding>& findings);

/// "12h", "30d" or "8w" in seconds; `nullopt` for any other text, and for more than a century.
std::optional<std::int64_t> parseDuration(std::string_view text);

/// Makes `file`, flushed and readable only by its owner; on failure it makes no file. Throws Failure:
/// EX_CANTCREAT if it exists, EX_CONFIG if the records are in a database, which needs its own backup.
void backUp(const ServiceDirectory& directory, const std::string& file);

/// Makes a service at `path`, which must be missing or an empty directory, from a backup; on failure it makes
/// nothing. It verifies the log first. Throws Failure (EX_DATAERR) if `file` is no backup, or is damaged.
void restore(const std::string& file, const std::string& path);

/// The values of their command lines, as text. Must outlive the parsing.
struct UpkeepVerbs {
    std::string directory;
    std::vector<std::string> words;  // after the directory
    std::string file;                // restore: the backup
    std::string key;
    std::string rootDirectory;
    std::string requestFile;
    std::string out;
    std::string warning = "30d";
    int exitStatus = 0;  // of the program, once the command has run
};

void declareUpkeepVerbs(CLI::App& app, UpkeepVerbs& verbs);

}  // namespace pinwell::lumora
