// A run over many paths: its options, the tickets that the caller has fetched, and the result for each path.
// Parallel reading, one series of lookups.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "base/bytes.h"
#include "base/error.h"
#include "src/platform.h"
#include "verify/check.h"
#include "verify/directory.h"

namespace pinwell::gate {

/// Requirements on an artefact besides being unchanged since signing.
struct Policy {
    std::optional<std::int64_t> maximumTicketAge;  // in seconds
    std::vector<std::string> teams;                // one of these; empty: any
    std::vector<std::string> identifiers;          // globs, one must match; empty: any
    bool requiresSecureTimestamp = false;
};

enum class Format { text, json, sarif, junit, html };

struct Options {
    enum class Tickets { online, offline, directory };

    Tickets tickets = Tickets::online;
    std::string ticketDirectory;
    bool isShallow = false;
    bool isRecursive = false;
    Policy policy;
    Format format = Format::text;
    std::string output;       // a file; empty: standard output
    std::string attestation;  // a file; empty: none
    std::vector<std::string> paths;
};

/// Maximum length of a ticket, as for stapled tickets.
inline constexpr std::uint64_t kMaximumTicketFile = std::uint64_t{64} * 1024 * 1024;

/// A directory of tickets that were fetched elsewhere: 2-2-HEX.ticket for the record 2/2/HEX. Immutable; may
/// be used from any number of threads.
class TicketDirectory {
  public:
    /// Follows a link: the caller chose the directory.
    static base::Result<TicketDirectory> open(const std::string& path);

    struct Found {
        std::string file;                  // its path, whether it exists or not
        std::optional<base::Data> ticket;  // `nullopt`: there is none
        std::string problem;               // why an existing file cannot be read
    };
    Found find(const std::string& recordName) const;

  private:
    TicketDirectory(std::string path, verify::DirectoryRef directory)
        : path_(std::move(path)), directory_(std::move(directory)) {}

    std::string path_;
    verify::DirectoryRef directory_;
};

/// In the order of gravity: the highest of several paths decides the exit status.
enum class Verdict {
    good,         // 0
    unreachable,  // 68: no usable response from the service
    unreadable,   // 66: it cannot be read, is of no supported kind, or has no signature at all
    noTicket,     // 65: none is stapled
    refused,      // 65: the ticket or a policy does not accept it
    altered,      // 65: something has changed since signing
    revoked,      // 77
};

/// "good", "unreachable" and so on.
std::string_view verdictName(Verdict verdict);
int exitStatusOf(Verdict verdict);

struct Result {
    std::string path;  // as given
    std::string kind;  // "bundle", "diskImage", "package", "executable"; empty if none
    Verdict verdict = Verdict::unreadable;
    std::string conclusion;  // a sentence
    verify::Section checks;

    // Of the artefact; empty without a readable signature.
    std::string recordName;
    std::uint32_t digestType = 0;
    base::Data codeHash;
    base::Data fileDigest;  // SHA-256 of a file's bytes, if an attestation is wanted
};

/// One result for each path, in their order. `tickets` is null without --tickets.
std::vector<Result> judgeAll(const std::vector<std::string>& paths, const Options& options,
                             const TicketDirectory* tickets, const Platform& platform);

/// The exit status of a run: the status of the gravest verdict.
int exitStatusOf(const std::vector<Result>& results);

}  // namespace pinwell::gate
