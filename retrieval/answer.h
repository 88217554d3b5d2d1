// What one try to get a record's ticket came to.
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
        answered,     // there is a response, whatever it says
        unreachable,  // another try may cure it; there is an error, or a response without a body
        untrusted,    // there is an error: the server was refused
    };
    Kind kind = Kind::unreachable;

    /// As if this record alone had been asked for; there is a response if it was answered. Its request
    /// identifier is the service's with a number of ours, so that no two answers of a process share one.
    std::optional<https::HTTPResponse> response;
    Data body;

    /// The file that the record names in place of a ticket; `nullopt` if it names none, or no valid URL.
    struct Asset {
        https::HTTPResponse response;
        Data contents;
    };
    std::optional<Asset> asset;

    std::optional<Error> error;
    bool errorIsOfAsset = false;  // the record was answered, its asset was not

    /// How long the service asks not to be asked.
    std::optional<std::chrono::seconds> retryAfter;

    /// What the server's judgement had to say, for the user.
    std::vector<std::string> messages;

    /// It was answered, and the answer says that there is no ticket.
    bool hasNoTicket() const;
};

}  // namespace pinwell::retrieval
