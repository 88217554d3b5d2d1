// The options of pinwell-gate.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

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

}  // namespace pinwell::gate
