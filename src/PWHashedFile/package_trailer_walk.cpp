#include "src/PWHashedFile/package_trailer_walk.h"

#include <algorithm>
#include <utility>

#include "src/messages.h"

namespace pinwell {
namespace {

using files::FileHandleError;
using files::FileReader;
using foundation::ByteView;
using foundation::Data;

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

Data readAt(FileReader& file, std::uint64_t offset, std::uint64_t length) {
    file.seek(offset);
    return file.read(length);
}

class Walk {
  public:
    Walk(FileReader& file, const std::string& name, const TrailerVisitor& visit)
        : file_(file), name_(name), visit_(visit) {}

    package_trailers run() {
        if (readSize()) readTrailers();
        return std::move(found_);
    }

  private:
    void refuse(std::uint64_t offset, const char* rule) { found_.fault = {offset, rule}; }

    bool readSize() {
        try {
            found_.fileSize = file_.seekToEnd();
            return found_.fileSize > 0;
        } catch (const FileHandleError& failure) {
            NoisyLog("Could not get file size of %@. This should not have happened. %@", name_,
                     failure.what());
            refuse(0, "the file's size cannot be found out");
            return false;
        }
    }

    void readTrailers() {
        std::uint64_t position = found_.fileSize;
        bool isWhole = true;
        try {
            while (const auto next = step(position, isWhole)) position = *next;
        } catch (const FileHandleError& failure) {
            NoisyLog("Couldn't read existing package trailers of %@. %@.", name_, failure.what());
            refuse(position, "the trailers cannot be read");
            unknown_.clear();
        }
        if (!isWhole || unknown_.size() == 0) return;
        found_.hasTrailers = true;
        found_.dataToAppend = std::move(unknown_).inFileOrder();
    }

    // Where the trailer that ends at `position` begins; nothing where the walk ends. A walk that comes upon
    // the start of the file is not whole: what it has collected is none of its business.
    std::optional<std::uint64_t> step(std::uint64_t position, bool& isWhole) {
        if (position < kTrailerSize) {
            isWhole = false;
            return std::nullopt;
        }
        const std::uint64_t recordOffset = position - kTrailerSize;
        trailer_header record;
        if (!trailer_data_is_valid(readAt(file_, recordOffset, kTrailerSize), &record)) return std::nullopt;
        if (visit_) visit_(recordOffset, record);
        if (trailer_is_terminator(record.firstWord(), record.length())) {
            found_.hasTrailers = found_.hasTerminator = true;
            NoisyLog("Found Terminator at %llu", recordOffset);
            return std::nullopt;
        }
        const std::string magic = record.magic();
        NoisyLog("{magic: %c%c%c%c, version: %d, type: %d, length: %d}", magic[0], magic[1], magic[2],
                 magic[3], record.version(), record.type(), record.length());

        const std::uint64_t total = record.length() + std::uint64_t{kTrailerSize};
        if (total > position) {
            refuse(recordOffset, "a trailer's data would begin before the file");
            isWhole = false;
            return std::nullopt;
        }
        const std::uint64_t start = position - total;
        if (record.type() == kTicketTrailerType) {
            readTicket(start, record.length());
            return std::nullopt;
        }
        collect(record, start, total);
        return start;
    }

    void collect(const trailer_header& record, std::uint64_t start, std::uint64_t total) {
        NoisyLog("Found unknown trailer type %d. Adding %llu bytes to append.", record.type(), total);
        mustNotExceed(kMaximumUnknownTrailers, unknown_.size() + total);
        const Data trailer = readAt(file_, start, total);
        if (trailer.size() != total)
            NoisyLog("Data read for unknown trailer does not match expected size. %lu vs %llu.",
                     trailer.size(), total);
        unknown_.putInFront(trailer);
    }

    void readTicket(std::uint64_t start, std::uint32_t length) {
        NoisyLog("Found expected ticket at %llu with length of %d", start, length);
        try {
            mustNotExceed(kMaximumTicket, length);
            found_.ticket = readAt(file_, start, length);
            found_.ticketStart = start;
            found_.ticketLength = length;
        } catch (const FileHandleError& failure) {
            NoisyLog("Couldn't read existing ticket of %@. %@.", name_, failure.what());
            refuse(start, length > kMaximumTicket ? "the ticket is too long to be read"
                                                  : "the ticket cannot be read");
            unknown_.clear();
        }
    }

    void mustNotExceed(std::uint64_t limit, std::uint64_t length) {
        if (length <= limit) return;
        found_.exceedsLimits = true;
        throw FileHandleError(foundation::format("More than %llu bytes are not read", limit));
    }

    FileReader& file_;
    const std::string& name_;
    const TrailerVisitor& visit_;
    BackwardCollection unknown_;
    package_trailers found_;
};

}  // namespace

package_trailers walkPackageTrailers(FileReader& file, const std::string& name, const TrailerVisitor& visit) {
    return Walk(file, name, visit).run();
}

}  // namespace pinwell
