// The superblob of a disk image, split into its blobs and written again.
#include <algorithm>

#include "base/byte_io.h"
#include "codesign/code_signing.h"
#include "formats/superblob.h"
#include "src/messages.h"
#include "target.h"

namespace pinwell::fuzz {
namespace {

struct Header {
    std::uint32_t magic = 0;
    std::uint32_t length = 0;
    std::uint32_t count = 0;
};

Header headerOf(ByteView superblob) {
    base::ByteReader reader(superblob);
    Header header;
    header.magic = reader.be32("magic");
    header.length = reader.be32("length");
    header.count = reader.be32("count");
    return header;
}

bool isTicket(const BlobRecord& record) {
    return record.slotType == kTicketSlotType;
}

Data superblobOf(const BlobSet& blobs, ByteView ticket) {
    return base::toData(superblobWithTicket(blobs, ticket, 0, noisyDiagnostics()).view());
}

}  // namespace

void examine(ByteView input) {
    discardMessages();
    if (input.size() < kSuperblobHeaderSize) return;
    const Header header = headerOf(input);
    const auto blobs = orderedBlobSetForSuperBlob(input, header.count, noisyDiagnostics());
    if (!blobs) return;
    require(blobs->size() <= header.count, "no more blobs than were counted");
    for (const BlobRecord& record : *blobs) {
        require(record.length() <= input.size() && record.offset <= input.size() - record.length(),
                "a blob lies within the superblob");
        require(std::ranges::equal(record.data, input.subspan(record.offset, record.length())),
                "a blob is what stands at its offset");
    }
    if (blobs->size() < header.count) return;

    const Data rebuilt = superblobOf(*blobs, {});
    const bool isOurs = header.magic == kSuperblobMagic && header.length == input.size();
    if (isOurs && !blobs->empty() && std::ranges::none_of(*blobs, isTicket))
        require(std::ranges::equal(rebuilt, input), "what is taken apart goes together again");

    const Data ticket = base::toData("ticket");
    const Data stapled = superblobOf(*blobs, ticket);
    const auto again = orderedBlobSetForSuperBlob(stapled, headerOf(stapled).count, noisyDiagnostics());
    require(again && std::ranges::count_if(*again, isTicket) == 1, "there is one ticket afterwards");
    require(std::ranges::equal(again->back().data.subspan(kBlobHeaderSize), ticket), "the ticket reads back");
    require(superblobOf(*again, {}) == rebuilt, "without its ticket it is what it was");
}

}  // namespace pinwell::fuzz
