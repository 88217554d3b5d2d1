// Package archives: the table of contents, compressed, and the bytes after it.
#include <zlib.h>

#include <stdexcept>

#include "base/byte_io.h"
#include "base/bytes.h"
#include "costly_input.h"
#include "src/PWHashedFile/PWHashedFlatPackage.h"
#include "support/archive_builder.h"
#include "support/temporary_directory.h"
#include "support/test_platform.h"
#include "xar/table_of_contents.h"

namespace pinwell::test {
namespace {

using base::toData;

/// Whether the archive has a hash.
bool read(const Data& archive) {
    TestPlatform platform;
    writeFile(platform.directory / "Sample.pkg", base::ByteView(archive));
    PWHashedFlatPackage package(platform.directory.url("Sample.pkg"), platform.services());
    return package.cdHash().has_value();
}

/// The zlib stream with this document, stored without compression: as long as its contents.
Data stored(const std::string& document) {
    constexpr std::size_t kLongestBlock = 65535;
    base::ByteWriter stream;
    stream.be16(0x7801);
    uLong check = adler32(0, nullptr, 0);
    std::vector<Bytef> piece;
    for (std::size_t at = 0; at < document.size() || at == 0; at += kLongestBlock) {
        const std::string part = document.substr(at, kLongestBlock);
        const bool isLast = at + part.size() == document.size();
        const auto length = static_cast<std::uint16_t>(part.size());
        stream.u8(isLast ? 1 : 0).le16(length).le16(static_cast<std::uint16_t>(~length)).text(part);
        piece.assign(part.begin(), part.end());
        check = adler32(check, piece.data(), static_cast<uInt>(piece.size()));
    }
    stream.be32(static_cast<std::uint32_t>(check));
    return std::move(stream).take();
}

std::string tableOf(const std::string& children) {
    return R"(<?xml version="1.0" encoding="UTF-8"?><xar><toc>)"
           R"(<checksum style="sha1"><offset>0</offset><size>20</size></checksum><signature style="CMS"/>)" +
           children + "</toc></xar>";
}

Data archiveOf(Data stream) {
    return ArchiveBuilder().compressedToc(std::move(stream)).build();
}

std::string file(std::size_t i) {
    const std::string number = std::to_string(i);
    return "<file id=\"" + number + "\"><data><length>" + number + "</length><offset>" + number +
           "</offset><extracted-checksum style=\"sha1\">da39a3ee5e6b4b0d3255bfef95601890afd80709"
           "</extracted-checksum></data><mode>0644</mode><name>file" +
           number + "</name></file>";
}

Data control(std::size_t length) {
    return archiveOf(stored(tableOf(filled(file, length))));
}

/// A table with these children, not compressed.
CostlyInput row(std::string name, std::string cost, bool isTaken,
                std::function<std::string(std::size_t)> children) {
    return {.name = "Archive" + name,
            .cost = std::move(cost),
            .read = read,
            .isTaken = isTaken,
            .costly = [children = std::move(children)](
                          std::size_t length) { return archiveOf(stored(tableOf(children(length)))); },
            .control = control};
}

/// An uncompressed document.
CostlyInput document(std::string name, std::string cost, std::function<std::string(std::size_t)> make) {
    return {
        .name = "Archive" + name,
        .cost = std::move(cost),
        .read = read,
        .isTaken = false,
        .costly = [make = std::move(make)](std::size_t length) { return archiveOf(stored(make(length))); },
        .control = control};
}

/// The stream of a table with repeated children `unit`, until `wants(compressed, contents)` is false.
Data compressed(const std::string& unit, const std::function<bool(std::size_t, std::size_t)>& wants) {
    const std::string before = tableOf("");
    z_stream state{};
    if (deflateInit(&state, Z_BEST_SPEED) != Z_OK) throw std::bad_alloc();
    Data out;
    const auto feed = [&](const std::string& text, int flush) {
        std::vector<Bytef> in(text.begin(), text.end());
        std::vector<Bytef> room(std::size_t{1} << 16U);
        state.next_in = in.data();
        state.avail_in = static_cast<uInt>(in.size());
        do {
            state.next_out = room.data();
            state.avail_out = static_cast<uInt>(room.size());
            deflate(&state, flush);
            base::append(out, std::as_bytes(std::span(room)).first(room.size() - state.avail_out));
        } while (state.avail_out == 0);
    };
    const std::size_t end = before.find("</toc>");
    feed(before.substr(0, end), Z_NO_FLUSH);
    for (std::size_t contents = before.size(); wants(out.size(), contents); contents += unit.size())
        feed(unit, Z_FULL_FLUSH);
    feed(before.substr(end), Z_FINISH);
    deflateEnd(&state);
    return out;
}

constexpr std::size_t kMebibyte = std::size_t{1} << 20U;

/// As long as requested, whatever its inflated length.
Data bomb(const std::string& unit, std::size_t length) {
    return compressed(unit, [=](std::size_t size, std::size_t) { return size < length; });
}

/// An honest table of the most that is read.
Data largestTable(std::size_t) {
    const std::string unit = filled(file, kMebibyte);
    return archiveOf(compressed(unit, [&](std::size_t, std::size_t contents) {
        return contents + unit.size() <= xar::kMaximumTableOfContents;
    }));
}

CostlyInput stream(std::string name, std::string cost, bool isTaken, std::function<Data(std::size_t)> make,
                   std::function<Data(std::size_t)> against = control) {
    return {.name = "Archive" + name,
            .cost = std::move(cost),
            .read = read,
            .isTaken = isTaken,
            .costly = [make = std::move(make)](std::size_t length) { return archiveOf(make(length)); },
            .control = std::move(against),
            // A block's code tables are a few bytes, and take as long as the text of a block: ten times the
            // control's time.
            .times = 30};
}

/// A deflate stream without contents: blocks of one kind, bit by bit.
class Blocks {
  public:
    /// `value`, of `count` bits, the lowest first.
    Blocks& bits(unsigned value, unsigned count) {
        for (unsigned i = 0; i < count; ++i) bit((value >> i) & 1U);
        return *this;
    }
    /// A Huffman code, highest bit first.
    Blocks& code(unsigned value, unsigned count) {
        for (unsigned i = count; i-- > 0;) bit((value >> i) & 1U);
        return *this;
    }
    std::size_t size() const { return bytes_.size(); }

    Data stream() && {
        Data whole = toData(std::string_view("\x78\x9C", 2));
        base::append(whole, bytes_);
        return whole;
    }

  private:
    void bit(unsigned value) {
        if (used_ % 8 == 0) bytes_.push_back(std::byte{0});
        bytes_.back() |= static_cast<std::byte>(value << (used_ % 8));
        ++used_;
    }

    Data bytes_;
    std::size_t used_ = 0;
};

/// Empty blocks of fixed codes: ten bits each.
Data emptyBlocks(std::size_t length) {
    Blocks blocks;
    while (blocks.size() < length) blocks.bits(0b010, 3).code(0, 7);
    return std::move(blocks).stream();
}

/// Blocks with their own code tables of the largest size, which use them only for the end of the block.
Data tables(std::size_t length) {
    Blocks blocks;
    // The lengths of the codes' lengths, in the order of the format: 16 17 18 0 8 7 9 6 10 5 11 4 12 3 13 2
    // 14 1 15. Two codes of one bit: 16 ("as before, 3 to 6 times") and 9. But 286 literals of 9 bits are too
    // few for a complete code, so 226 of them have 8 bits, with their own code: 8 and 9 have two bits.
    while (blocks.size() < length) {
        blocks.bits(0b100, 3).bits(286 - 257, 5).bits(30 - 1, 5).bits(19 - 4, 4);
        for (const unsigned bits :
             {1U, 0U, 0U, 0U, 3U, 0U, 3U, 0U, 0U, 3U, 0U, 3U, 0U, 0U, 0U, 0U, 0U, 0U, 0U})
            blocks.bits(bits, 3);
        // In order of symbols, codes of three bits: 4: 100, 5: 101, 8: 110, 9: 111; 16: 0.
        const auto repeat = [&](unsigned value, unsigned count) {
            blocks.code(value, 3);
            for (--count; count > 0;) {
                const unsigned times = count >= 9 || count == 6 ? 6 : count > 6 ? count - 3 : count;
                if (times < 3) {
                    for (; count > 0; --count) blocks.code(value, 3);
                    break;
                }
                blocks.code(0, 1).bits(times - 3, 2);
                count -= times;
            }
        };
        // 226 of 8 bits and 60 of 9 bits: 226/256 + 60/512 = 1.
        repeat(0b110, 226);
        repeat(0b111, 60);
        // 2 of 4 bits and 28 of 5 bits: 2/16 + 28/32 = 1.
        repeat(0b100, 2);
        repeat(0b101, 28);
        // The end of the block, symbol 256: the 31st of the codes of 9 bits, which begin at 226 * 2.
        blocks.code(226 * 2 + (256 - 226), 9);
    }
    return std::move(blocks).stream();
}

}  // namespace

std::vector<CostlyInput> archiveInputs() {
    using Length = std::size_t;
    const auto number = [](std::size_t i) { return std::to_string(i); };
    return {
        row("NameSpaces", "name-space declarations, each inside the one before, as far down as elements go",
            false,
            [=](Length n) {
                return filled([=](std::size_t i) { return "<f xmlns:n" + number(i) + "='u'>"; }, n);
            }),
        row("NameSpacesOfOneElement", "name-space declarations of one element", true,
            [=](Length n) {
                return "<file" + filled([=](std::size_t i) { return " xmlns:n" + number(i) + "='u'"; }, n) +
                       "/>";
            }),
        row("NameSpacesBesideOneAnother", "elements that each declare another name space", true,
            [=](Length n) {
                return filled(
                    [=](std::size_t i) { return "<file xmlns:n" + number(i) + "='u" + number(i) + "'/>"; },
                    n);
            }),
        row("Attributes", "attributes of one element", true,
            [=](Length n) {
                return "<file" + filled([=](std::size_t i) { return " a" + number(i) + "=''"; }, n) + "/>";
            }),
        row("Names", "names of elements", false,
            [=](Length n) { return filled([=](std::size_t i) { return "<f" + number(i) + "/>"; }, n); }),
        row("Depth", "elements inside elements", false, [](Length n) { return filled("<f>", n); }),
        row("EmptyElements", "the shortest elements that there are", true,
            [](Length n) { return "<file>" + filled("<a/>", n) + "</file>"; }),
        row("Properties", "elements that might be properties", false,
            [=](Length n) {
                return filled([=](std::size_t i) { return "<p" + number(i % 10'000) + "/>"; }, n);
            }),
        row("OneProperty", "one property, over and over", true, [](Length n) { return filled("<p/>", n); }),
        row("Signatures", "signatures", true, [](Length n) { return filled("<signature style='x'/>", n); }),
        row("Text", "text of one property", true,
            [](Length n) { return "<p>" + filled("text ", n) + "</p>"; }),
        row("References", "characters by their numbers", true,
            [](Length n) { return "<file>" + filled("&#x41;", n) + "</file>"; }),
        row("Sections", "marked sections", true,
            [](Length n) { return "<file>" + filled("<![CDATA[]]>", n) + "</file>"; }),
        row("Comments", "comments", true, [](Length n) { return filled("<!---->", n); }),
        row("Instructions", "processing instructions", true, [](Length n) { return filled("<?a?>", n); }),
        row("OneComment", "a comment without an end", false,
            [](Length n) { return "<!--" + filled("- ", n); }),
        row("OneTag", "a tag without an end", false, [](Length n) { return "<f a='" + filled("&lt;", n); }),
        row("OneName", "a name without an end", false, [](Length n) { return "<" + filled("f", n); }),
        document("Entities", "entities of entities",
                 [](Length n) {
                     std::string all = "<!DOCTYPE xar [<!ENTITY a0 'aaaaaaaaaa'>";
                     for (int i = 1; i < 30; ++i) {
                         const std::string before = "&a" + std::to_string(i - 1) + ";";
                         all += "<!ENTITY a" + std::to_string(i) + " '" + filled(before, 60) + "'>";
                     }
                     return all + "]>" + tableOf(filled("&a29;", n));
                 }),
        document("OneEntity", "a long entity, used many times",
                 [](Length n) {
                     return "<!DOCTYPE xar [<!ENTITY a '" + filled("a", n / 2) + "'>]>" +
                            tableOf(filled("&a;", n / 2));
                 }),
        document("ContentModel", "a declaration inside itself",
                 [](Length n) { return "<!DOCTYPE xar [<!ELEMENT xar " + filled("(", n) + "]>"; }),
        stream(
            "BombOfSpaces", "white space that compresses a thousandfold", true,
            [=](Length n) { return bomb(std::string(kMebibyte, ' '), n); }, largestTable),
        stream(
            "BombOfElements", "elements that compress a thousandfold", false,
            [](Length n) { return bomb(filled("<a/>", kMebibyte), n); }, largestTable),
        stream(
            "BombOfFiles", "files that compress a hundredfold", true,
            [](Length n) { return bomb(filled(file, kMebibyte), n); }, largestTable),
        stream("EmptyBlocks", "compressed blocks with nothing in them", false, emptyBlocks),
        stream("CodeTables", "compressed blocks that are nothing but code tables", false, tables),
        stream("AfterTheStream", "bytes behind the end of the stream, inside its length", true,
               [](Length n) {
                   Data padded = stored(tableOf(""));
                   padded.resize(n);
                   return padded;
               }),
    };
}

}  // namespace pinwell::test
