// The protocol of a lookup, without a connection: the request to the record service, and reading its
// response.
//
//   POST https://HOST/database/1/CONTAINER/ENVIRONMENT/public/records/lookup    application/json
//        {"records": [{"recordName": "2/2/..."}]}
//     -> {"records": [RECORD]}, with these members of a RECORD:
//        fields.signedTicket.value                     the ticket in base64
//        fields.signedTicketAsset.value.downloadURL    the URL of a large ticket, with the token "${f}"
//        fields.signedTicketAsset.value.size           its length in bytes
//        reason                                        why there is no ticket
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "base/bytes.h"
#include "formats/code_hashes.h"
#include "https/session.h"
#include "src/platform.h"
#include "values/url.h"
#include "values/value.h"

namespace pinwell {

/// The response header that names a request.
inline constexpr std::string_view kRequestIdentifierHeader = "X-Ostrel-Request-UUID";

/// The domain of the user defaults; read only if internal security policies are allowed.
inline constexpr std::string_view kDefaultsDomain = "com.ostrel.tm.pinwell";

/// The URL of lookups: the platform directory's host, and the container and environment of the user defaults
/// if the build variant allows them. The error names the fault of platform.json.
base::Result<values::URL> lookupURL(const Platform& platform);

/// The body of a lookup of these records, in their order.
values::Value lookupBody(const std::vector<std::string>& recordNames);

/// The POST that looks these records up. Without a URL, the request does not start. `nullopt` if a name is
/// not UTF-8.
std::optional<https::Request> lookupRequest(std::optional<values::URL> url, const values::Value& body);

/// The members of a record that are read; nil if missing.
struct TicketRecord {
    values::Value ticket;
    values::Value assetURL;  // ignored if there is a ticket
    values::Value assetSize;
    values::Value reason;

    /// The ticket in base64. Null if there is none. Throws values::ValueTypeError if it is not text.
    const std::string* ticketText() const;

    /// The template of the asset's URL. Null if there is none or it is empty. Throws as ticketText().
    const std::string* assetURLTemplate() const;
};

/// The first record of a response. Throws values::ValueTypeError or std::out_of_range if the response has
/// another shape.
TicketRecord ticketRecordOf(const values::Value& response);

/// The faults of a downloaded asset, checked in this order.
enum class AssetFault : std::uint8_t {
    none,
    length,  // not the length in the record; a missing length means 0
    status,  // the status is not 200
};
AssetFault faultOfAsset(const values::Value& announcedSize, std::size_t length,
                        const std::optional<https::HTTPResponse>& response);

/// The text of an asset's URL: the template with a file name in place of each "${f}".
std::string assetURLText(std::string_view urlTemplate);

}  // namespace pinwell
