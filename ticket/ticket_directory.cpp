#include "ticket/ticket_directory.h"

#include <sys/stat.h>

#include <array>
#include <cerrno>
#include <ctime>

#include "codesign/code_directory.h"
#include "foundation/format.h"
#include "src/PWHashedFile/PWHashedFile.h"
#include "ticket/artefact.h"
#include "ticket/file_writing.h"

namespace pinwell::ticket_files {
namespace {

using foundation::Error;
using foundation::Result;
using retrieval::Cause;

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
        report.messages.push_back(foundation::format("Could not write the ticket to %@. %@", file,
                                                     written.error().localizedFailureReason()));
        report.exitStatus = retrieval::worseStatus(report.exitStatus, kExitCannotCreate);
        if (report.exitStatus == kExitCannotCreate) report.cause = Cause::notWritable;
        return;
    }
    if (ticket.cause == Cause::worked)
        report.messages.push_back(foundation::format("The ticket has been written to %@.", file));
    index_.set(ticket.recordName,
               {file, foundation::toHex(codesign::digest(codesign::DigestType::sha256, ticket.ticket)),
                timeText(), ticket.cause == Cause::revoked});
}

Result<void> TicketDirectory::close() const {
    const auto written = index_.write(path_);
    if (!written) return because("the index cannot be written", written.error());
    return {};
}

}  // namespace pinwell::ticket_files
