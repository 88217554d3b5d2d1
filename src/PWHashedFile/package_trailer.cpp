#include "src/PWHashedFile/package_trailer.h"

#include <algorithm>
#include <limits>
#include <string_view>

#include "foundation/byte_reader.h"
#include "foundation/byte_writer.h"
#include "src/messages.h"

namespace pinwell {
namespace {

using foundation::ByteReader;
using foundation::ByteView;

constexpr std::string_view kTrailerMagic = "t8lr";

constexpr std::size_t kTrailerVersionOffset = 4;
constexpr std::size_t kTypeOffset = 6;
constexpr std::size_t kLengthOffset = 8;
constexpr unsigned kTypeShift = 8 * kTypeOffset;  // of the type in the record's first word

ByteReader readerAt(const trailer_header& record, std::size_t offset) {
    ByteReader reader{ByteView(record.bytes)};
    reader.seek(offset, "trailer field");
    return reader;
}

}  // namespace

std::string trailer_header::magic() const {
    return foundation::toString(ByteView(bytes).first(kTrailerMagic.size()));
}
std::uint16_t trailer_header::version() const {
    return readerAt(*this, kTrailerVersionOffset).le16("version");
}
std::uint16_t trailer_header::type() const {
    return readerAt(*this, kTypeOffset).le16("type");
}
std::uint32_t trailer_header::length() const {
    return readerAt(*this, kLengthOffset).le32("length");
}
std::uint64_t trailer_header::firstWord() const {
    return readerAt(*this, 0).le64("first word");
}

trailer_header ticketTrailer(std::uint32_t length) {
    foundation::ByteWriter writer;
    writer.text(kTrailerMagic).le16(kTrailerVersion).le16(kTicketTrailerType).le64(length);
    trailer_header record;
    std::copy(writer.data().begin(), writer.data().end(), record.bytes.begin());
    return record;
}

bool isWritableTicketLength(std::uint64_t length) {
    return length > 0 && length <= std::numeric_limits<std::uint32_t>::max();
}

bool trailer_data_is_valid(ByteView bytes, trailer_header* record) {
    if (bytes.size() != kTrailerSize) {
        NoisyLog("Length %zu does not equal expected size of %lu", bytes.size(), kTrailerSize);
        return false;
    }
    trailer_header found;
    std::copy(bytes.begin(), bytes.end(), found.bytes.begin());
    if (found.version() != kTrailerVersion) {
        NoisyLog("We do not know how to deal with trailer version %d. Exepected %d", found.version(),
                 kTrailerVersion);
        return false;
    }
    if (found.magic() != kTrailerMagic) {
        NoisyLog("Expected Magic %4s for trailer but found %4s", kTerminatorTrailer.magic(), found.magic());
        return false;
    }
    if (record != nullptr) *record = found;
    return true;
}

std::optional<ticket_fault> faultOfTrailer(const trailer_header& record, std::uint64_t recordOffset) {
    const bool hasMagic = record.magic() == kTrailerMagic;
    const bool hasVersion = record.version() == kTrailerVersion;
    const bool hasKnownType = record.type() == kTerminatorTrailerType || record.type() == kTicketTrailerType;
    if (!hasMagic && !(hasVersion && hasKnownType)) return std::nullopt;
    if (!hasVersion) return ticket_fault{recordOffset, "a trailer's version is not 1"};
    if (!hasMagic) return ticket_fault{recordOffset, "a trailer does not begin with its magic, \"t8lr\""};
    if (record.length() > recordOffset)
        return ticket_fault{recordOffset, "a trailer's data would begin before the file"};
    return std::nullopt;
}

bool trailer_is_terminator(std::uint64_t firstWord, std::uint64_t length) {
    const auto countedLength = static_cast<std::uint32_t>(length);
    if (countedLength != 0) {
        NoisyLog("Terminator Trailer size must be 0, not %d", countedLength);
        return false;
    }
    const auto type = static_cast<std::uint16_t>(firstWord >> kTypeShift);
    if (type != kTerminatorTrailerType) {
        NoisyLog("Trailer type %d does not match expected terminator type %d", type, kTerminatorTrailerType);
        return false;
    }
    return true;
}

}  // namespace pinwell
