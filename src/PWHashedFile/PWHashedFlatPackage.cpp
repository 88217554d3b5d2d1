#include "src/PWHashedFile/PWHashedFlatPackage.h"

#include <algorithm>
#include <utility>

#include "src/PWHashedFile/package_trailer.h"
#include "src/messages.h"

namespace pinwell {
namespace {

using files::FileHandle;
using files::FileHandleError;
using foundation::ByteView;

// What is met on the way backwards through a file. It is kept back to front, so that to put something in
// front is to append: a chain of a million empty trailers costs no more than its length.
class BackwardCollection {
  public:
    void putInFront(ByteView bytes) { reversed_.insert(reversed_.end(), bytes.rbegin(), bytes.rend()); }
    void clear() { reversed_.clear(); }
    std::size_t size() const { return reversed_.size(); }

    Data inFileOrder() && {
        std::reverse(reversed_.begin(), reversed_.end());
        return std::move(reversed_);
    }

  private:
    Data reversed_;
};

Data readAt(FileHandle& file, std::uint64_t offset, std::uint64_t length) {
    file.seek(offset);
    return file.read(length);
}

void mustNotExceed(std::uint64_t limit, std::uint64_t length) {
    if (length > limit) throw FileHandleError(foundation::format("More than %llu bytes are not read", limit));
}

}  // namespace

std::optional<Data> PWHashedFlatPackage::_ticketData() {
    noteState();
    const auto opened = platform().files.openForReading(*fileURL());
    if (!opened) {
        NoisyLog("Could not create file handle to %@. %@", fileURL(), opened.error());
        NoisyLog("Could not get ticket for %@. %@", fileURL()->path(), opened.error());
        return std::nullopt;
    }
    return readSize(**opened) ? walkTrailers(**opened) : std::nullopt;
}

bool PWHashedFlatPackage::readSize(FileHandle& file) {
    try {
        origEOL_ = file.seekToEnd();
        return origEOL_ > 0;
    } catch (const FileHandleError& failure) {
        NoisyLog("Could not get file size of %@. This should not have happened. %@", name(), failure.what());
        return false;
    }
}

std::optional<Data> PWHashedFlatPackage::walkTrailers(FileHandle& file) {
    BackwardCollection unknown;
    std::optional<Data> ticket;
    std::uint64_t position = origEOL_;
    try {
        for (;;) {
            if (position < kTrailerSize) return std::nullopt;
            trailer_header record;
            if (!trailer_data_is_valid(readAt(file, position - kTrailerSize, kTrailerSize), &record)) break;
            if (trailer_is_terminator(record.firstWord(), record.length())) {
                hasTrailers_ = true;
                NoisyLog("Found Terminator at %llu", position - kTrailerSize);
                break;
            }
            const std::string magic = record.magic();
            NoisyLog("{magic: %c%c%c%c, version: %d, type: %d, length: %d}", magic[0], magic[1], magic[2],
                     magic[3], record.version(), record.type(), record.length());

            const std::uint64_t total = record.length() + std::uint64_t{kTrailerSize};
            if (total > position) return std::nullopt;
            const std::uint64_t start = position - total;
            if (record.type() == kTicketTrailerType) {
                ticket = readTicket(file, start, record.length());
                if (!ticket) unknown.clear();
                break;
            }
            NoisyLog("Found unknown trailer type %d. Adding %llu bytes to append.", record.type(), total);
            mustNotExceed(kMaximumUnknownTrailers, unknown.size() + total);
            const Data trailer = readAt(file, start, total);
            if (trailer.size() != total)
                NoisyLog("Data read for unknown trailer does not match expected size. %lu vs %llu.",
                         trailer.size(), total);
            unknown.putInFront(trailer);
            position = start;
        }
    } catch (const FileHandleError& failure) {
        NoisyLog("Couldn't read existing package trailers of %@. %@.", name(), failure.what());
        unknown.clear();
    }
    if (unknown.size() > 0) {
        hasTrailers_ = true;
        dataToAppend_ = std::move(unknown).inFileOrder();
    }
    return ticket;
}

std::optional<Data> PWHashedFlatPackage::readTicket(FileHandle& file, std::uint64_t start,
                                                    std::uint32_t length) {
    ticketStart_ = start;
    ticketLength_ = length;
    NoisyLog("Found expected ticket at %llu with length of %d", start, length);
    try {
        mustNotExceed(kMaximumTicket, length);
        return readAt(file, start, length);
    } catch (const FileHandleError& failure) {
        NoisyLog("Couldn't read existing ticket of %@. %@.", name(), failure.what());
        ticketLength_ = 0;
        ticketStart_ = 0;
        return std::nullopt;
    }
}

}  // namespace pinwell
