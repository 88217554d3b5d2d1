#include "ticket_files.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstdio>
#include <ctime>
#include <nlohmann/json.hpp>

#include "base/file_io.h"
#include "base/text.h"
#include "codesign/code_directory.h"
#include "companion/streams.h"
#include "src/PWHashedFile/PWHashedFile.h"
#include "values/format.h"
#include "values/json.h"
#include "values/value.h"

namespace pinwell::ticket_files {

using base::Error;
using base::FileDescriptor;
using base::Result;
using retrieval::Cause;
using values::Value;

namespace {

bool writeAll(const FileDescriptor& file, base::ByteView bytes) {
    while (!bytes.empty()) {
        const ssize_t count = ::write(file.get(), bytes.data(), bytes.size());
        if (count < 0 && errno == EINTR) continue;
        if (count < 0) return false;
        bytes = bytes.subspan(static_cast<std::size_t>(count));
    }
    return ::fsync(file.get()) == 0;
}

bool flushFolderOf(const std::string& path) {
    const std::size_t slash = path.rfind('/');
    const std::string folder = slash == std::string::npos ? "." : path.substr(0, slash + 1);
    const FileDescriptor opened(::open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
    // A folder that cannot be opened cannot be flushed.
    return !opened || ::fsync(opened.get()) == 0 || errno == EINVAL;
}

}  // namespace

Result<void> writeNewFile(base::ByteView contents, const std::string& path) {
    const FileDescriptor file(
        ::open(path.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC, companion::kNewFileMode));
    if (!file) return Error::posix(errno, path);
    if (writeAll(file, contents) && flushFolderOf(path)) return {};
    const Error error = Error::posix(errno, path);
    ::unlink(path.c_str());
    return error;
}

Result<void> replaceFile(base::ByteView contents, const std::string& path) {
    const auto made = companion::makeFileBeside(path);
    if (!made) return made.error();
    if (writeAll(made->file, contents) && std::rename(made->path.c_str(), path.c_str()) == 0) {
        if (flushFolderOf(path)) return {};
        return Error::posix(errno, path);
    }
    const Error error = Error::posix(errno, path);
    ::unlink(made->path.c_str());
    return error;
}

std::string fileNameOfRecord(const std::string& recordName) {
    std::string name = recordName + ".ticket";
    std::replace(name.begin(), name.end(), '/', '-');
    return name;
}

namespace {

Error notAnIndex(const std::string& path) {
    return {base::kDataErrorDomain, base::kMalformedDocument,
            path + " is not an index of tickets that this version can read."};
}

std::string textOf(const Value& value) {
    if (value.string() == nullptr) throw values::ValueTypeError("a text was expected");
    return *value.string();
}

bool truthOf(const Value& value) {
    if (value.boolean() == nullptr) throw values::ValueTypeError("true or false was expected");
    return *value.boolean();
}

}  // namespace

Result<Index> Index::read(const std::string& directory) {
    const std::string path = directory + "/" + kIndexName;
    const auto contents = base::readSmallFile(path, values::kMaximumJSONSize);
    if (!contents) {
        if (contents.error().code() == ENOENT) return Index();
        return contents.error();
    }
    const auto document = values::parseJSON(*contents);
    if (!document) return notAnIndex(path);
    Index index;
    try {
        const auto* const tickets = (*document)["tickets"].array();
        if ((*document)["version"].unsignedIntegerValue() != kIndexVersion || tickets == nullptr)
            return notAnIndex(path);
        for (const Value& one : *tickets)
            index.set(textOf(one["recordName"]), {textOf(one["file"]), textOf(one["sha256"]),
                                                  textOf(one["fetched"]), truthOf(one["revoked"])});
    } catch (const values::ValueTypeError&) {
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
    return replaceFile(base::asBytes(document.dump() + "\n"), directory + "/" + kIndexName);
}

namespace {

std::string timeText() {
    const std::time_t now = std::time(nullptr);
    std::tm utc{};
    ::gmtime_r(&now, &utc);
    std::array<char, 32> text{};
    const std::size_t length = std::strftime(text.data(), text.size(), "%Y-%m-%dT%H:%M:%SZ", &utc);
    return {text.data(), length};
}

Error because(const std::string& what, const Error& error) {
    return {error.domain(), error.code(), what + ": " + error.localizedDescription()};
}

}  // namespace

Result<TicketDirectory> TicketDirectory::open(const std::string& path) {
    if (::mkdir(path.c_str(), 0777) != 0 && errno != EEXIST)
        return because("the directory cannot be made", Error::posix(errno, path));
    auto index = Index::read(path);
    if (!index) return because("the index cannot be used", index.error());
    return TicketDirectory(path, *std::move(index));
}

void TicketDirectory::keep(const retrieval::FetchedTicket& ticket, retrieval::Report& report) {
    const std::string file = fileNameOfRecord(ticket.recordName);
    report.file = file;
    if (const auto written = replaceFile(ticket.ticket, path_ + "/" + file); !written) {
        report.messages.push_back(values::format("Could not write the ticket to %@. %@", file,
                                                 written.error().localizedFailureReason()));
        report.exitStatus = retrieval::worseStatus(report.exitStatus, kExitCannotCreate);
        if (report.exitStatus == kExitCannotCreate) report.cause = Cause::notWritable;
        return;
    }
    if (ticket.cause == Cause::worked)
        report.messages.push_back(values::format("The ticket has been written to %@.", file));
    index_.set(ticket.recordName,
               {file, base::toHex(codesign::digest(codesign::DigestType::sha256, ticket.ticket)), timeText(),
                ticket.cause == Cause::revoked});
}

Result<void> TicketDirectory::close() const {
    const auto written = index_.write(path_);
    if (!written) return because("the index cannot be written", written.error());
    return {};
}

}  // namespace pinwell::ticket_files
