#include "ticket/index.h"

#include <cerrno>
#include <nlohmann/json.hpp>

#include "foundation/file_io.h"
#include "foundation/json.h"
#include "foundation/value.h"
#include "ticket/file_writing.h"

namespace pinwell::ticket_files {
namespace {

using foundation::Error;
using foundation::Result;
using foundation::Value;

Error notAnIndex(const std::string& path) {
    return {foundation::kDataErrorDomain, foundation::kMalformedDocument,
            path + " is not an index of tickets that this version can read."};
}

std::string textOf(const Value& value) {
    if (value.string() == nullptr) throw foundation::ValueTypeError("a text was expected");
    return *value.string();
}

bool truthOf(const Value& value) {
    if (value.boolean() == nullptr) throw foundation::ValueTypeError("true or false was expected");
    return *value.boolean();
}

}  // namespace

Result<Index> Index::read(const std::string& directory) {
    const std::string path = directory + "/" + kIndexName;
    const auto contents = foundation::readSmallFile(path, foundation::kMaximumJSONSize);
    if (!contents) {
        if (contents.error().code() == ENOENT) return Index();
        return contents.error();
    }
    const auto document = foundation::parseJSON(*contents);
    if (!document) return notAnIndex(path);
    Index index;
    try {
        const auto* const tickets = (*document)["tickets"].array();
        if ((*document)["version"].unsignedIntegerValue() != kIndexVersion || tickets == nullptr)
            return notAnIndex(path);
        for (const Value& one : *tickets)
            index.set(textOf(one["recordName"]), {textOf(one["file"]), textOf(one["sha256"]),
                                                  textOf(one["fetched"]), truthOf(one["revoked"])});
    } catch (const foundation::ValueTypeError&) {
        return notAnIndex(path);
    }
    return index;
}

Result<void> Index::write(const std::string& directory) const {
    nlohmann::ordered_json tickets = nlohmann::ordered_json::array();
    for (const auto& [recordName, entry] : entries_)
        tickets.push_back({{"recordName", recordName},
                           {"file", entry.file},
                           {"sha256", entry.sha256},
                           {"fetched", entry.fetched},
                           {"revoked", entry.revoked}});
    const nlohmann::ordered_json document = {{"version", kIndexVersion}, {"tickets", std::move(tickets)}};
    return replaceFile(foundation::asBytes(document.dump() + "\n"), directory + "/" + kIndexName);
}

}  // namespace pinwell::ticket_files
