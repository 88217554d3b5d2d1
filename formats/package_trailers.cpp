#include "formats/package_trailers.h"

#include <algorithm>
#include <iterator>
#include <limits>
#include <string_view>
#include <utility>
#include <vector>

#include "base/byte_io.h"
#include "formats/tm_ticket.h"

namespace pinwell {
namespace {

using base::ByteReader;
using base::ByteSource;
using base::ByteView;
using base::Data;
using base::ReadFailure;
using base::SharedBytes;
using base::SparseBuffer;

constexpr std::string_view kTrailerMagic = "t8lr";

constexpr std::size_t kTrailerVersionOffset = 4;
constexpr std::size_t kTypeOffset = 6;
constexpr std::size_t kLengthOffset = 8;
constexpr unsigned kTypeShift = 8 * kTypeOffset;  // of the type in the record's first word

ByteReader recordFieldAt(const trailer_header& record, std::size_t offset) {
    ByteReader reader{ByteView(record.bytes)};
    reader.seek(offset, "trailer field");
    return reader;
}

}  // namespace

std::string trailer_header::magic() const {
    return base::toString(ByteView(bytes).first(kTrailerMagic.size()));
}
std::uint16_t trailer_header::version() const {
    return recordFieldAt(*this, kTrailerVersionOffset).le16("version");
}
std::uint16_t trailer_header::type() const {
    return recordFieldAt(*this, kTypeOffset).le16("type");
}
std::uint32_t trailer_header::length() const {
    return recordFieldAt(*this, kLengthOffset).le32("length");
}
std::uint64_t trailer_header::firstWord() const {
    return recordFieldAt(*this, 0).le64("first word");
}

trailer_header ticketTrailer(std::uint32_t length) {
    base::ByteWriter writer;
    writer.text(kTrailerMagic).le16(kTrailerVersion).le16(kTicketTrailerType).le64(length);
    trailer_header record;
    std::copy(writer.data().begin(), writer.data().end(), record.bytes.begin());
    return record;
}

bool isWritableTicketLength(std::uint64_t length) {
    return length > 0 && length <= std::numeric_limits<std::uint32_t>::max();
}

bool trailer_data_is_valid(ByteView bytes, trailer_header* record, const Diagnostics& diagnostics) {
    if (bytes.size() != kTrailerSize) {
        diagnostics.note("Length %zu does not equal expected size of %lu", bytes.size(), kTrailerSize);
        return false;
    }
    trailer_header found;
    std::copy(bytes.begin(), bytes.end(), found.bytes.begin());
    if (found.version() != kTrailerVersion) {
        diagnostics.note("We do not know how to deal with trailer version %d. Exepected %d", found.version(),
                         kTrailerVersion);
        return false;
    }
    if (found.magic() != kTrailerMagic) {
        diagnostics.note("Expected Magic %4s for trailer but found %4s", kTerminatorTrailer.magic(),
                         found.magic());
        return false;
    }
    if (record != nullptr) *record = found;
    return true;
}

bool trailer_is_terminator(std::uint64_t firstWord, std::uint64_t length, const Diagnostics& diagnostics) {
    const auto countedLength = static_cast<std::uint32_t>(length);
    if (countedLength != 0) {
        diagnostics.note("Terminator Trailer size must be 0, not %d", countedLength);
        return false;
    }
    const auto type = static_cast<std::uint16_t>(firstWord >> kTypeShift);
    if (type != kTerminatorTrailerType) {
        diagnostics.note("Trailer type %d does not match expected terminator type %d", type,
                         kTerminatorTrailerType);
        return false;
    }
    return true;
}

std::optional<TicketFault> faultOfTrailer(const trailer_header& record, std::uint64_t recordOffset) {
    const bool hasMagic = record.magic() == kTrailerMagic;
    const bool hasVersion = record.version() == kTrailerVersion;
    const bool hasKnownType = record.type() == kTerminatorTrailerType || record.type() == kTicketTrailerType;
    if (!hasMagic && !(hasVersion && hasKnownType)) return std::nullopt;
    if (!hasVersion) return TicketFault{recordOffset, "a trailer's version is not 1"};
    if (!hasMagic) return TicketFault{recordOffset, "a trailer does not begin with its magic, \"t8lr\""};
    if (record.length() > recordOffset)
        return TicketFault{recordOffset, "a trailer's data would begin before the file"};
    return std::nullopt;
}

namespace {

/// The trailer of the record at `recordOffset`; `nullopt` if the bytes do not look like a record.
std::optional<SurveyedTrailer> surveyTrailer(ByteView bytes, std::uint64_t recordOffset) {
    if (bytes.size() != kTrailerSize) return std::nullopt;
    SurveyedTrailer found;
    found.recordOffset = recordOffset;
    std::copy(bytes.begin(), bytes.end(), found.record.bytes.begin());
    found.fault = faultOfTrailer(found.record, recordOffset);
    if (!found.fault && !trailer_data_is_valid(bytes, nullptr)) return std::nullopt;
    found.isTerminator = trailer_is_terminator(found.record.firstWord(), found.record.length());
    if (found.record.length() <= recordOffset) found.dataOffset = recordOffset - found.record.length();
    return found;
}

/// Reads a file backwards in small steps through a moving window. So a chain of a million empty trailers
/// costs a few reads for each mebibyte, instead of four calls for each trailer. The window is small at first:
/// most chains are short.
class TrailerWindow {
  public:
    /// Longest piece that is read through the window, in bytes.
    static constexpr std::uint64_t kSize = 64ULL * 1024;

    explicit TrailerWindow(const ByteSource& file) : file_(file) {}

    /// The `length` bytes at `offset`, at most kSize of them; fewer at the end of the file. Valid until the
    /// next call. Throws ReadFailure.
    ByteView readAt(std::uint64_t offset, std::uint64_t length) {
        if (!has(offset, length)) {
            const std::uint64_t end = offset + length;
            bytes_.clear();  // a failed read leaves no window
            start_ = end - std::min(end, std::max(length, next_));
            next_ = std::min(next_ * 2, kSize);
            bytes_ = file_.readUpTo(start_, end - start_);
        }
        const ByteView window = bytes_;
        const auto from = static_cast<std::size_t>(std::min<std::uint64_t>(offset - start_, window.size()));
        return window.subspan(from).first(std::min<std::size_t>(length, window.size() - from));
    }

  private:
    bool has(std::uint64_t offset, std::uint64_t length) const {
        return offset >= start_ && offset - start_ <= bytes_.size() &&
               length <= bytes_.size() - (offset - start_);
    }

    const ByteSource& file_;
    Data bytes_;
    std::uint64_t next_ = 1024;  // length of the next load
    std::uint64_t start_ = 0;    // of the bytes, in the file
};

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
    Walk(const ByteSource& file, const std::string& name, const TrailerVisitor& visit,
         const Diagnostics& diagnostics)
        : file_(file), window_(file), name_(name), visit_(visit), diagnostics_(diagnostics) {}

    PackageTrailers run() {
        if (readSize()) readTrailers();
        return std::move(found_);
    }

  private:
    void refuse(std::uint64_t offset, const char* rule) { found_.fault = {offset, rule}; }

    bool readSize() {
        try {
            found_.fileSize = file_.size();
            return found_.fileSize > 0;
        } catch (const ReadFailure& failure) {
            diagnostics_.note("Could not get file size of %@. This should not have happened. %@", name_,
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
        } catch (const ReadFailure& failure) {
            diagnostics_.note("Couldn't read existing package trailers of %@. %@.", name_, failure.what());
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
        const ByteView bytes = window_.readAt(recordOffset, kTrailerSize);
        const std::optional<SurveyedTrailer> trailer = surveyTrailer(bytes, recordOffset);
        const bool isValid = trailer_data_is_valid(bytes, nullptr, diagnostics_);
        if (!trailer || !isValid) {
            // Without a fault these bytes are not a record: the archive's, in a package without trailers.
            if (trailer) found_.fault = trailer->fault;
            return std::nullopt;
        }
        if (visit_) visit_(*trailer);
        const trailer_header& record = trailer->record;
        if (trailer_is_terminator(record.firstWord(), record.length(), diagnostics_)) {
            found_.hasTrailers = found_.hasTerminator = true;
            diagnostics_.note("Found Terminator at %llu", recordOffset);
            return std::nullopt;
        }
        const std::string magic = record.magic();
        diagnostics_.note("{magic: %c%c%c%c, version: %d, type: %d, length: %d}", magic[0], magic[1],
                          magic[2], magic[3], record.version(), record.type(), record.length());

        if (!trailer->dataOffset) {
            found_.fault = trailer->fault;
            isWhole = false;
            return std::nullopt;
        }
        const std::uint64_t start = *trailer->dataOffset;
        if (record.type() == kTicketTrailerType) {
            readTicket(start, record.length());
            return std::nullopt;
        }
        collect(record, start, position - start);
        return start;
    }

    SharedBytes readAt(std::uint64_t start, std::uint64_t length) {
        if (length <= TrailerWindow::kSize) return base::toData(window_.readAt(start, length));
        return file_.readSharedUpTo(start, length);
    }

    void collect(const trailer_header& record, std::uint64_t start, std::uint64_t total) {
        diagnostics_.note("Found unknown trailer type %d. Adding %llu bytes to append.", record.type(),
                          total);
        SharedBytes trailer = readAt(start, total);
        if (trailer.size() != total)
            diagnostics_.note("Data read for unknown trailer does not match expected size. %lu vs %llu.",
                              trailer.size(), total);
        unknown_.putInFront(std::move(trailer));
    }

    void readTicket(std::uint64_t start, std::uint32_t length) {
        diagnostics_.note("Found expected ticket at %llu with length of %d", start, length);
        try {
            found_.ticket = base::toData(readAt(start, heldOfTicket(length)).view());
            found_.ticketStart = start;
            found_.ticketLength = length;
        } catch (const ReadFailure& failure) {
            diagnostics_.note("Couldn't read existing ticket of %@. %@.", name_, failure.what());
            refuse(start, "the ticket cannot be read");
            unknown_.clear();
        }
    }

    const ByteSource& file_;
    TrailerWindow window_;
    const std::string& name_;
    const TrailerVisitor& visit_;
    const Diagnostics& diagnostics_;
    BackwardCollection unknown_;
    PackageTrailers found_;
};

}  // namespace

PackageTrailerSurvey surveyPackageTrailers(const ByteSource& file, const TrailerVisitor& visit) {
    PackageTrailerSurvey survey;
    TrailerWindow window(file);
    std::optional<std::uint64_t> position = file.size();
    while (position && *position >= kTrailerSize) {
        const std::uint64_t recordOffset = *position - kTrailerSize;
        const auto trailer = surveyTrailer(window.readAt(recordOffset, kTrailerSize), recordOffset);
        if (!trailer) break;
        visit(*trailer);
        if (!survey.ticketStart && !survey.fault) survey.fault = trailer->fault;
        survey.hasTerminator = trailer->isTerminator;
        if (trailer->isTerminator) break;
        position = trailer->dataOffset;
        if (survey.ticketStart || trailer->record.type() != kTicketTrailerType) continue;
        survey.ticketStart = position;
        survey.ticketLength = trailer->record.length();
    }
    if (survey.ticketStart && !survey.fault)
        survey.fault = faultOfTicketLength(survey.ticketLength, *survey.ticketStart);
    return survey;
}

PackageTrailers walkPackageTrailers(const ByteSource& file, const std::string& name,
                                    const TrailerVisitor& visit, const Diagnostics& diagnostics) {
    return Walk(file, name, visit, diagnostics).run();
}

}  // namespace pinwell
