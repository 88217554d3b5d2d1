#include "block_table.h"

#include <zlib.h>

#include <algorithm>
#include <array>
#include <optional>
#include <string>

#include "base/byte_io.h"
#include "codesign/code_error.h"
#include "values/format.h"
#include "values/property_list.h"
#include "values/value.h"
#include "verify/check.h"
#include "verify/page_digest.h"
#include "xar/inflater.h"

namespace pinwell::verify {

using base::ByteReader;
using base::ByteSource;
using codesign::FileRange;
using values::format;
using values::Value;

namespace {

constexpr std::uint64_t kSectorSize = 512;
constexpr std::uint64_t kMaximumSectors = std::uint64_t{1} << 48U;
constexpr std::uint32_t kTableMagic = 0x6D697368;  // "mish"
constexpr std::uint32_t kZeros = 0;
constexpr std::uint32_t kPlain = 1;
constexpr std::uint32_t kIgnored = 2;
constexpr std::uint32_t kZlib = 0x80000005;
constexpr std::uint32_t kComment = 0x7FFFFFFE;
constexpr std::uint32_t kEnd = 0xFFFFFFFF;

/// CRC-32 of concatenated parts.
struct Checksum {
    std::uint32_t value = 0;
    std::uint64_t length = 0;

    void append(const Checksum& other) {
        value =
            static_cast<std::uint32_t>(crc32_combine(value, other.value, static_cast<z_off_t>(other.length)));
        length += other.length;
    }
    void append(ByteView bytes) {
        value = static_cast<std::uint32_t>(
            crc32_z(value, reinterpret_cast<const Bytef*>(bytes.data()), bytes.size()));
        length += bytes.size();
    }
};

/// The checksum of zeros, by powers of two.
Checksum checksumOfZeros(std::uint64_t length) {
    constexpr std::size_t kPowers = 64;
    static const auto powers = [] {
        std::array<Checksum, kPowers> all;
        constexpr std::byte kZero{};
        all[0].append(ByteView(&kZero, 1));
        for (std::size_t i = 1; i + 1 < kPowers; ++i) {
            all[i] = all[i - 1];
            all[i].append(all[i - 1]);
        }
        return all;
    }();
    Checksum result;
    for (std::size_t i = 0; i + 1 < kPowers; ++i)
        if ((length >> i & 1U) != 0) result.append(powers[i]);
    return result;
}

Checksum checksumOf(const ByteSource& source, const FileRange& range) {
    Checksum checksum;
    readPieces(source, range, [&](ByteView piece) {
        checksum.append(piece);
        return true;
    });
    return checksum;
}

/// The value of a checksum field; `nullopt` if it is of another kind.
std::optional<std::uint32_t> statedChecksum(ByteReader reader) {
    constexpr std::uint32_t kCrc32 = 2;
    constexpr std::uint32_t kBits = 32;
    if (reader.be32("checksum type") != kCrc32 || reader.be32("checksum size") != kBits) return std::nullopt;
    return reader.be32("checksum");
}

struct Block {
    std::uint32_t type = 0;
    std::uint64_t sectors = 0;
    FileRange range;  // in the file
    Checksum found;
    bool isSound = true;

    bool hasBytes() const { return type == kPlain || type == kZlib; }
    std::uint64_t unpackedLength() const { return sectors * kSectorSize; }
};

struct Table {
    std::string place;
    std::optional<std::uint32_t> stated;
    std::vector<Block> blocks;
    std::string fault;  // it contradicts itself
    bool isReadable = true;
};

/// Reads the tables, and bounds the bytes to unpack.
class TableReader {
  public:
    TableReader(FileRange dataFork, std::uint64_t limit) : dataFork_(dataFork), limit_(limit) {}

    Table read(ByteView bytes, std::string place) {
        Table table;
        table.place = std::move(place);
        try {
            readInto(bytes, table);
        } catch (const base::ShortRead& error) {
            table.fault = error.what();
        }
        return table;
    }

    bool isWithinBounds() const {
        return blocks_ <= kMaximumBlocks && packed_ <= kMaximumUnpacked && unpacked_ <= kMaximumUnpacked;
    }

    /// Whether the blocks have more bytes than the file, so that some would be unpacked several times.
    bool sharesBytes() const { return packed_ > dataFork_.length; }

  private:
    void readInto(ByteView bytes, Table& table) {
        ByteReader reader(bytes);
        if (reader.be32("magic") != kTableMagic) {
            table.fault = "no table";
            return;
        }
        reader.skip(12, "version and first sector");
        const std::uint64_t sectors = reader.be64("count of sectors");
        const std::uint64_t base = reader.be64("data offset");
        reader.seek(64, "checksum");
        table.stated = statedChecksum(reader);
        reader.seek(200, "count of blocks");
        const std::uint32_t count = reader.be32("count of blocks");
        std::uint64_t next = 0;
        for (std::uint32_t i = 0; i < count && table.fault.empty(); ++i) {
            if (++blocks_ > kMaximumBlocks) return;
            if (readBlock(reader, base, next, table)) break;
        }
        if (table.fault.empty() && next != sectors)
            table.fault = format("blocks of %llu sectors, where it states %llu", next, sectors);
    }

    /// Returns true for the last block.
    bool readBlock(ByteReader& reader, std::uint64_t base, std::uint64_t& next, Table& table) {
        Block block;
        block.type = reader.be32("block type");
        reader.skip(4, "comment");
        const std::uint64_t first = reader.be64("first sector");
        block.sectors = reader.be64("count of sectors");
        const std::uint64_t offset = reader.be64("offset");
        block.range.length = reader.be64("length");
        if (block.type == kEnd) return true;
        if (block.type == kComment) return false;
        if (first != next || block.sectors > kMaximumSectors - next) {
            table.fault = format("a block that begins with sector %llu after %llu sectors", first, next);
            return false;
        }
        next += block.sectors;
        table.isReadable =
            table.isReadable && (block.hasBytes() || block.type == kZeros || block.type == kIgnored);
        if (block.hasBytes()) place(block, base, offset, table);
        table.blocks.push_back(block);
        return false;
    }

    void place(Block& block, std::uint64_t base, std::uint64_t offset, Table& table) {
        const bool isInside = base <= dataFork_.length && offset <= dataFork_.length - base &&
                              block.range.length <= dataFork_.length - base - offset &&
                              dataFork_.offset <= limit_ && dataFork_.length <= limit_ - dataFork_.offset;
        if (!isInside) {
            table.fault = "a block outside of the data";
            return;
        }
        block.range.offset = dataFork_.offset + base + offset;
        packed_ += block.range.length;
        unpacked_ += block.unpackedLength();
    }

    const FileRange dataFork_;
    const std::uint64_t limit_;
    std::size_t blocks_ = 0;
    std::uint64_t packed_ = 0;
    std::uint64_t unpacked_ = 0;
};

void unpack(const ByteSource& source, Block& block) {
    if (!block.hasBytes()) {
        block.found = checksumOfZeros(block.unpackedLength());
        return;
    }
    if (block.type == kPlain) {
        block.found = checksumOf(source, block.range);
    } else {
        xar::Inflater inflater(block.unpackedLength(), [&](ByteView bytes) {
            block.found.append(bytes);
            return true;
        });
        block.isSound = readPieces(source, block.range, [&](ByteView piece) { return inflater.feed(piece); });
        block.isSound = block.isSound && inflater.complete();
    }
    block.isSound = block.isSound && block.found.length == block.unpackedLength();
}

class SecondOpinion {
  public:
    SecondOpinion(const ByteSource& source, const codesign::DiskImageTrailer& trailer, Workers& workers,
                  Section& section)
        : source_(source),
          trailer_(trailer.header()),
          limit_(trailer.signedLimit()),
          workers_(workers),
          section_(section),
          dataFork_{trailer_.dataForkOffset(), trailer_.dataForkLength()} {}

    void run() {
        const std::optional<Data> document = propertyList();
        if (!document) return skip("it has no list of its blocks");
        const base::Result<Value> list = values::parsePropertyList(*document);
        if (!list) return skip("its list of blocks cannot be read");
        const values::Array* const tables = (*list)["resource-fork"]["blkx"].array();
        if (tables == nullptr || tables->empty()) return skip("its list names no blocks");

        TableReader reader(dataFork_, limit_);
        std::vector<Table> read;
        for (const Value& one : *tables) {
            const Data* const bytes = one["Data"].data();
            const std::string* const name = one["Name"].string();
            std::string place =
                format("block table %zu (%@)", read.size() + 1, name != nullptr ? *name : std::string());
            read.push_back(reader.read(bytes != nullptr ? ByteView(*bytes) : ByteView(), std::move(place)));
            if (!reader.isWithinBounds())
                return skip(format("it would unpack to more than %llu MiB", kMaximumUnpacked >> 20U));
        }
        if (reader.sharesBytes())
            return fail("block tables", "blocks of bytes of their own", "blocks that share some");
        for (Table& table : read) checkTable(table);
        checkMaster(read);
        checkDataFork();
    }

  private:
    std::optional<Data> propertyList() const {
        const std::uint64_t offset = trailer_.xmlOffset();
        const std::uint64_t length = trailer_.xmlLength();
        if (length == 0 || length > values::kMaximumPropertyListSize || offset > limit_ ||
            length > limit_ - offset)
            return std::nullopt;
        return source_.read(offset, static_cast<std::size_t>(length));
    }

    void checkTable(Table& table) {
        if (!table.fault.empty()) return fail(table.place, "blocks one after the other", table.fault);
        if (!table.isReadable)
            return section_.skip(kBlockTable, table.place,
                                 "it has blocks that are packed in a way that is not read");
        workers_.forEach(table.blocks.size(), [&](std::size_t i) { unpack(source_, table.blocks[i]); });
        Checksum all;
        for (const Block& block : table.blocks) {
            if (!block.isSound)
                return fail(table.place, "blocks of their length", "one that cannot be unpacked");
            all.append(block.found);
        }
        compare(table.place, table.stated, all.value);
    }

    void checkMaster(const std::vector<Table>& tables) {
        base::ByteWriter values;
        for (const Table& table : tables) {
            if (!table.stated) return;
            values.be32(*table.stated);
        }
        Checksum all;
        all.append(values.data());
        ByteReader reader(trailer_.masterChecksum());
        compare("master checksum", statedChecksum(reader), all.value);
    }

    void checkDataFork() {
        ByteReader reader(trailer_.dataForkChecksum());
        const std::optional<std::uint32_t> stated = statedChecksum(reader);
        if (dataFork_.offset > limit_ || dataFork_.length > limit_ - dataFork_.offset)
            return fail("data fork", "data before the signature", "data that reach further");
        if (dataFork_.length > kMaximumUnpacked) return skip("its data are too long");
        if (!stated) return compare("data fork", stated, 0);
        compare("data fork", stated, checksumOf(source_, dataFork_).value);
    }

    void compare(const std::string& place, std::optional<std::uint32_t> stated, std::uint32_t found) {
        if (!stated) return section_.skip(kBlockTable, place, "it has no checksum of a known kind");
        const std::string expected = format("CRC-32 %08x", *stated);
        if (*stated == found) return section_.pass(kBlockTable, place, expected);
        fail(place, expected, format("CRC-32 %08x", found));
    }

    void fail(const std::string& place, std::string expected, std::string found) {
        section_.fail(kBlockTable, place, std::move(expected), std::move(found));
    }

    void skip(std::string why) { section_.skip(kBlockTable, "disk image", std::move(why)); }

    const ByteSource& source_;
    const UDIFFileHeader& trailer_;
    const std::uint64_t limit_;
    Workers& workers_;
    Section& section_;
    const FileRange dataFork_;
};

}  // namespace

void checkBlockTables(const ByteSource& source, const codesign::DiskImageTrailer& trailer, Workers& workers,
                      Section& section) {
    SecondOpinion(source, trailer, workers, section).run();
}

}  // namespace pinwell::verify
