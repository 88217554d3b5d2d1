#include <gtest/gtest.h>
#include <libxml/xmlmemory.h>

#include <cstdlib>
#include <cstring>

#include "allocation_count.h"
#include "support/archive_builder.h"
#include "support/temporary_directory.h"
#include "support/text.h"
#include "xar/archive.h"
#include "xar/inflater.h"
#include "xar/table_of_contents.h"

namespace pinwell::test {
namespace {

using foundation::asBytes;

std::string inTable(const std::string& contents) {
    return "<xar><toc>" + contents + "</toc></xar>";
}

// What the XML library, which does not use operator new, is given while this lives. One at a time.
class ParserMemory {
  public:
    ParserMemory() {
        bytes_ = 0;
        xmlMemGet(&free_, &malloc_, &realloc_, &duplicate_);
        xmlMemSetup(
            std::free, [](std::size_t size) { return std::malloc(counted(size)); },
            [](void* block, std::size_t size) { return std::realloc(block, counted(size)); },
            [](const char* text) {
                auto* const copy = static_cast<char*>(std::malloc(counted(std::strlen(text) + 1)));
                return copy == nullptr ? nullptr : std::strcpy(copy, text);
            });
    }
    ~ParserMemory() { xmlMemSetup(free_, malloc_, realloc_, duplicate_); }
    ParserMemory(const ParserMemory&) = delete;
    ParserMemory& operator=(const ParserMemory&) = delete;

    std::size_t bytes() const { return bytes_; }

  private:
    static std::size_t counted(std::size_t size) {
        bytes_ += size;
        return size;
    }

    static inline std::size_t bytes_ = 0;
    xmlFreeFunc free_ = nullptr;
    xmlMallocFunc malloc_ = nullptr;
    xmlReallocFunc realloc_ = nullptr;
    xmlStrdupFunc duplicate_ = nullptr;
};

// Feeds a document as an archive does and answers how much of it was taken before it was refused.
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
    xar::Inflater inflater(kLimit, [&](foundation::ByteView piece) {
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
    EXPECT_EQ(xar::Archive::open(directory / "archive.xar"), nullptr);
    EXPECT_LE(count.bytes(), 16U * 1024);
}

TEST(BoundedWork, TableNestedAMillionDeepIsLeftAtTheLimit) {
    const std::string document = inTable(repeated("<a>", 1'000'000));
    const ParserMemory memory;
    EXPECT_LE(takenOf(document), 64U * 1024);
    EXPECT_LE(memory.bytes(), kMebibyte);
}

TEST(BoundedWork, TableWithEntitiesIsLeftAtTheDocumentType) {
    const std::string document =
        "<!DOCTYPE xar [" + repeated("<!ENTITY a 'aaaaaaaaaaaaaaaa'>", 100'000) + "]>" + inTable("");
    const ParserMemory memory;
    EXPECT_EQ(takenOf(document), 0U);
    EXPECT_LE(memory.bytes(), kMebibyte);
}

TEST(BoundedWork, TableOfAMillionNamesIsLeftAtTheLimit) {
    std::string names;
    for (int i = 0; i < 1'000'000; ++i) names += "<file n" + std::to_string(i) + "=''/>";
    const std::string document = inTable(names);
    const ParserMemory memory;
    EXPECT_LT(takenOf(document), document.size() / 2);
    EXPECT_LE(memory.bytes(), 64 * kMebibyte);
}

// What is passed over is not kept.
TEST(BoundedWork, TableOfAMillionFilesTakesNoMemoryForThem) {
    const std::string document = inTable(repeated("<file id='1'><name>n</name></file>", 1'000'000));
    const AllocationCount count;
    EXPECT_EQ(takenOf(document), document.size());
    EXPECT_LE(count.bytes(), kMebibyte);
}

}  // namespace
}  // namespace pinwell::test
