#include "src/PWHashedFile/package_trailer_walk.h"

#include <algorithm>
#include <iterator>
#include <utility>
#include <vector>

#include "src/PWHashedFile/held_ticket.h"
#include "src/PWHashedFile/trailer_window.h"
#include "src/messages.h"

namespace pinwell {
namespace {

using files::FileHandleError;
using files::FileReader;
using foundation::ByteView;
using foundation::Data;
using foundation::SharedBytes;
using foundation::SparseBuffer;

// Collects pieces on the way backwards through a file, in reverse order. Short pieces share a buffer with
// reversed bytes, so that inserting at the start is an append.
class BackwardCollection {
  public:
    void putInFront(SharedBytes bytes) {
        size_ += bytes.size();
        if (bytes.size() <= kShort) {
            reversed_.insert(reversed_.end(), std::make_reverse_iterator(bytes.end()),
                             std::make_reverse_iterator(bytes.begin()));
        } else {
            closeBuffer();
            pieces_.push_back(std::move(bytes));
        }
    }
    void clear() { *this = {}; }
    std::uint64_t size() const { return size_; }

    SharedBytes inFileOrder() && {
        closeBuffer();
        if (pieces_.size() == 1) return pieces_.front();
        SparseBuffer whole(size_);
        for (std::size_t offset = 0; !pieces_.empty(); pieces_.pop_back()) {
            whole.put(offset, pieces_.back());
            offset += pieces_.back().size();
        }
        return whole;
    }

  private:
    static constexpr std::size_t kShort = TrailerWindow::kSize;

    void closeBuffer() {
        if (reversed_.empty()) return;
        std::reverse(reversed_.begin(), reversed_.end());
        pieces_.emplace_back(std::exchange(reversed_, {}));
    }

    std::vector<SharedBytes> pieces_;
    Data reversed_;
    std::uint64_t size_ = 0;
};

class Walk {
  public:
    Walk(FileReader& file, const std::string& name, const TrailerVisitor& visit)
        : file_(file), window_(file), name_(name), visit_(visit) {}

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

    // The start of the trailer that ends at `position`; `nullopt` where the walk ends. If the walk reaches
    // the start of the file, it is not whole, and the collected pieces are not used.
    std::optional<std::uint64_t> step(std::uint64_t position, bool& isWhole) {
        if (position < kTrailerSize) {
            isWhole = false;
            return std::nullopt;
        }
        const std::uint64_t recordOffset = position - kTrailerSize;
        trailer_header record;
        const ByteView bytes = window_.readAt(recordOffset, kTrailerSize);
        if (!trailer_data_is_valid(bytes, &record)) {
            noteDamage(bytes, recordOffset);
            return std::nullopt;
        }
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
            found_.fault = faultOfTrailer(record, recordOffset);
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

    // Without a fault these bytes are not a record: the archive's, in a package without trailers.
    void noteDamage(ByteView bytes, std::uint64_t recordOffset) {
        trailer_header damaged;
        if (bytes.size() != damaged.bytes.size()) return;
        std::copy(bytes.begin(), bytes.end(), damaged.bytes.begin());
        found_.fault = faultOfTrailer(damaged, recordOffset);
    }

    SharedBytes readAt(std::uint64_t start, std::uint64_t length) {
        if (length <= TrailerWindow::kSize) return foundation::toData(window_.readAt(start, length));
        file_.seek(start);
        return files::readShared(file_, length);
    }

    void collect(const trailer_header& record, std::uint64_t start, std::uint64_t total) {
        NoisyLog("Found unknown trailer type %d. Adding %llu bytes to append.", record.type(), total);
        SharedBytes trailer = readAt(start, total);
        if (trailer.size() != total)
            NoisyLog("Data read for unknown trailer does not match expected size. %lu vs %llu.",
                     trailer.size(), total);
        unknown_.putInFront(std::move(trailer));
    }

    void readTicket(std::uint64_t start, std::uint32_t length) {
        NoisyLog("Found expected ticket at %llu with length of %d", start, length);
        try {
            found_.ticket = foundation::toData(readAt(start, heldOfTicket(length)).view());
            found_.ticketStart = start;
            found_.ticketLength = length;
        } catch (const FileHandleError& failure) {
            NoisyLog("Couldn't read existing ticket of %@. %@.", name_, failure.what());
            refuse(start, "the ticket cannot be read");
            unknown_.clear();
        }
    }

    FileReader& file_;
    TrailerWindow window_;
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
