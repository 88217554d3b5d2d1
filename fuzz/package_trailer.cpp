// The trailers after a package's archive: found, and a ticket stapled among them.
#include "formats/package_trailers.h"

#include <algorithm>
#include <filesystem>

#include "src/PWHashedFile/PWHashedFlatPackage.h"
#include "support/test_platform.h"
#include "target.h"

namespace pinwell::fuzz {
namespace {

// How much of the file a new ticket leaves in place. With trailers but without a ticket it is nothing: the
// tool then writes from the file's beginning.
std::size_t keptLength(const PWHashedFlatPackage& package) {
    if (package.ticketStart() != 0) return package.ticketStart();
    return package.hasTrailers() ? 0 : package.origEOL();
}

void examineWriting(test::TestPlatform& platform, ByteView before, PWHashedFlatPackage& package) {
    const Data ticket = base::toData("a new ticket");
    const auto source = platform.directory.url("ticket");
    const auto target = platform.directory.url("Sample.pkg");
    test::writeFile(source.path(), ByteView(ticket));
    const std::size_t kept = keptLength(package);
    std::optional<Error> error;
    if (!package._writeNewTicketDataFromURL(source, target, false, &error)) return;

    PWHashedFlatPackage stapled(target, platform.services());
    const auto found = stapled._ticketData();
    require(found && *found == ticket, "a stapled ticket reads back");
    const std::string after = test::readFile(target.path());
    require(kept <= after.size() && std::ranges::equal(base::asBytes(after).first(kept), before.first(kept)),
            "nothing before the ticket changes");
}

}  // namespace

void examine(ByteView input) {
    discardMessages();
    if (input.size() >= kTrailerSize) {
        trailer_header record;
        const ByteView first = input.first(kTrailerSize);
        if (trailer_data_is_valid(first, &record))
            require(std::ranges::equal(record.bytes, first), "a record keeps its bytes");
    }

    test::TestPlatform platform;
    const auto url = platform.directory.url("Sample.pkg");
    test::writeFile(url.path(), input);
    PWHashedFlatPackage package(url, platform.services());
    const auto ticket = package.ticketData();
    require(package.origEOL() == input.size(), "the end of the file is known");
    if (ticket) {
        require(package.ticketStart() <= input.size() &&
                    package.ticketLength() <= input.size() - package.ticketStart(),
                "a ticket lies within the file");
        require(std::ranges::equal(*ticket, input.subspan(package.ticketStart(), package.ticketLength())),
                "a ticket is what stands there");
    }
    if (package.dataToAppend()) {
        require(package.dataToAppend()->size() <= input.size(), "trailers are no longer than the file");
        const ByteView tail = input.last(package.dataToAppend()->size());
        require(std::ranges::equal(*package.dataToAppend(), tail), "trailers are the end of the file");
    }
    require(platform.files.changes().empty(), "reading writes nothing");
    examineWriting(platform, input, package);
}

}  // namespace pinwell::fuzz
