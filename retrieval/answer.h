// The result of one try to get a record's ticket.
#pragma once

#include <chrono>
#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "foundation/bytes.h"
#include "https/session.h"

namespace pinwell::retrieval {

using foundation::Data;
using foundation::Error;

struct Answer {
    enum class Kind : std::uint8_t {
        answered,     // there is a response, with or without a ticket
        unreachable,  // a retry may help; there is an error, or a response without a body
        untrusted,    // there is an error: the server was refused
    };
    Kind kind = Kind::unreachable;

    /// The response as if this record alone had been looked up; set if the outcome is `answered`. Its request
    /// identifier is the service's with a number of ours, so that it is unique in the process.
    std::optional<https::HTTPResponse> response;
    Data body;

    /// The file that the record names instead of a ticket; `nullopt` if it names none, or its URL is invalid.
    struct Asset {
        https::HTTPResponse response;
        Data contents;
    };
    std::optional<Asset> asset;

    std::optional<Error> error;
    bool errorIsOfAsset = false;  // the lookup succeeded, the asset's download failed

    /// The delay that the service asks for.
    std::optional<std::chrono::seconds> retryAfter;

    /// The messages of the server's judgement, for the user.
    std::vector<std::string> messages;

    /// Whether the service responded that there is no ticket.
    bool hasNoTicket() const;
};

}  // namespace pinwell::retrieval
