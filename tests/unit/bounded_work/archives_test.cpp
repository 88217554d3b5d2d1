#include <gtest/gtest.h>
#include <xar/xar.h>

#include "allocation_count.h"
#include "support/archive_builder.h"
#include "support/temporary_directory.h"
#include "support/text.h"
#include "values/xml_parser.h"
#include "xar/inflater.h"
#include "xar/table_of_contents.h"

namespace pinwell::test {
namespace {

using base::asBytes;

std::string inTable(const std::string& contents) {
    return "<xar><toc>" + contents + "</toc></xar>";
}

// Feeds a document in the way of an archive, and returns how much of it was read before the refusal.
std::size_t takenOf(const std::string& document) {
    constexpr std::size_t kPiece = 64 * 1024;
    xar::TableOfContentsReader reader;
    std::size_t taken = 0;
    while (taken < document.size()) {
        const auto piece = asBytes(document).subspan(taken).first(std::min(kPiece, document.size() - taken));
        if (!reader.feed(piece)) return taken;
        taken += piece.size();
    }
    return taken;
}

TEST(BoundedWork, StreamThatInflatesAThousandfoldIsLeftAtTheLimit) {
    constexpr std::size_t kLimit = kMebibyte;
    const Data stream = deflated(Data(64 * kLimit));
    ASSERT_LT(stream.size(), kLimit / 8);
    std::size_t had = 0;
    const AllocationCount count;
    xar::Inflater inflater(kLimit, [&](base::ByteView piece) {
        had += piece.size();
        return true;
    });
    EXPECT_FALSE(inflater.feed(stream));
    EXPECT_LE(had, kLimit);
    EXPECT_LE(count.bytes(), kMebibyte);
}

TEST(BoundedWork, ArchiveThatClaimsAnExbibyteOfTableIsLeftAfterItsHeader) {
    TemporaryDirectory directory;
    writeFile(directory / "archive.xar", ByteView(ArchiveBuilder().compressedLength(1ULL << 60U).build()));
    const AllocationCount count;
    EXPECT_EQ(xar_open((directory / "archive.xar").c_str(), 0), nullptr);
    EXPECT_LE(count.bytes(), 16U * 1024);
}

// A document is taken in pieces of 256 KiB.
constexpr std::size_t kPieceOfXML = kMebibyte / 4;

TEST(BoundedWork, TableNestedAMillionDeepIsLeftAtTheLimit) {
    EXPECT_LE(takenOf(inTable(repeated("<a>", 1'000'000))), kPieceOfXML);
}

TEST(BoundedWork, TableWithEntitiesIsLeftAtTheDocumentType) {
    EXPECT_LE(
        takenOf("<!DOCTYPE xar [" + repeated("<!ENTITY a 'aaaaaaaaaaaaaaaa'>", 100'000) + "]>" + inTable("")),
        kPieceOfXML);
}

// The XML library stores each name, and its memory is limited.
TEST(BoundedWork, TableOfAMillionNamesIsLeftAtTheLimit) {
    std::string names;
    for (int i = 0; i < 1'000'000; ++i) names += "<file n" + std::to_string(i) + "=''/>";
    const std::string document = inTable(names);
    EXPECT_LT(takenOf(document), document.size() / 2);
}

TEST(BoundedWork, TableWithACommentOfSixteenMebibytesIsLeftAtTheLimit) {
    EXPECT_LE(takenOf("<!--" + std::string(16 * kMebibyte, 'c') + "-->" + inTable("")),
              values::kMaximumXMLMemory);
}

// Ignored elements are not stored.
TEST(BoundedWork, TableOfAMillionFilesTakesNoMemoryForThem) {
    const std::string document = inTable(repeated("<file id='1'><name>n</name></file>", 1'000'000));
    const AllocationCount count;
    EXPECT_EQ(takenOf(document), document.size());
    EXPECT_LE(count.bytes(), kMebibyte);
}

}  // namespace
}  // namespace pinwell::test
