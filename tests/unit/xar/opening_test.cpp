// The files, streams and documents that can be opened.
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>

#include "fixture.h"
#include "src/messages.h"
#include "support/message_capture.h"
#include "xar/table_of_contents.h"

namespace pinwell::test {
namespace {

using ArchiveOpening = ArchiveTest;

TEST_F(ArchiveOpening, IsForReadingOnly) {
    writeFile(path, ArchiveBuilder().build());
    EXPECT_EQ(xar_open(path.c_str(), 1), nullptr);
    EXPECT_EQ(xar_open(path.c_str(), -1), nullptr);
}

TEST_F(ArchiveOpening, OfNothingIsRefused) {
    EXPECT_EQ(xar_open(nullptr, 0), nullptr);
    EXPECT_EQ(xar_open("", 0), nullptr);
    EXPECT_EQ(xar_open((directory / "missing").c_str(), 0), nullptr);
}

TEST_F(ArchiveOpening, OfADirectoryIsRefused) {
    EXPECT_EQ(xar_open(directory.path().c_str(), 0), nullptr);
}

TEST_F(ArchiveOpening, OfAFIFOIsRefusedWithoutWaitingForAWriter) {
    ASSERT_EQ(mkfifo(path.c_str(), 0600), 0);
    EXPECT_EQ(xar_open(path.c_str(), 0), nullptr);
}

TEST_F(ArchiveOpening, FollowsASymbolicLink) {
    writeFile(path, ArchiveBuilder().build());
    std::filesystem::create_symlink(path, directory / "link");
    EXPECT_NE(OpenArchive(xar_open((directory / "link").c_str(), 0)), nullptr);
}

TEST_F(ArchiveOpening, HoldsOneDescriptorThatCloseGivesBackAndThatNoChildInherits) {
    const auto descriptors = [&] {
        std::vector<std::string> held;
        for (const auto& entry : std::filesystem::directory_iterator("/proc/self/fd")) {
            std::error_code gone;
            if (std::filesystem::read_symlink(entry, gone) == std::filesystem::canonical(path))
                held.push_back(entry.path().filename());
        }
        return held;
    };
    {
        const auto archive = open(ArchiveBuilder());
        const auto held = descriptors();
        ASSERT_EQ(held.size(), 1U);
        const std::string information = readFile("/proc/self/fdinfo/" + held.front());
        const std::size_t at = information.find("flags:");
        ASSERT_NE(at, std::string::npos);
        EXPECT_NE(std::stoul(information.substr(at + 6), nullptr, 8) & 02000000U, 0U) << information;
    }
    EXPECT_TRUE(descriptors().empty());
    EXPECT_FALSE(opens(ArchiveBuilder().algorithm(9)));
    EXPECT_TRUE(descriptors().empty()) << "a refusal gives it back, too";
}

TEST_F(ArchiveOpening, PrintsNothingWhateverIsWrong) {
    const MessageCapture output(kVerbosityVerbose);
    testing::internal::CaptureStderr();
    opensWithToc("<xar><toc></xar>");
    opensWithToc("<x:xar><toc/></x:xar>");
    opensWithToc("<xar><toc>&undeclared;</toc></xar>");
    opensWithToc("");
    opens(ArchiveBuilder().compressedToc(base::toData("no stream")));
    opens(ArchiveBuilder().algorithm(77));
    EXPECT_EQ(testing::internal::GetCapturedStderr(), "");
    EXPECT_EQ(output.text(), "");
}

TEST_F(ArchiveOpening, CutAnywhereBeforeTheEndOfTheChecksumIsRefused) {
    const ArchiveBuilder builder = ArchiveBuilder().signature("CMS");
    const Data whole = builder.build();
    const std::size_t needed = builder.heapStart() + 20;
    ASSERT_LT(needed, whole.size());
    for (std::size_t length = 0; length < whole.size(); ++length) {
        const Data cut(whole.begin(), whole.begin() + static_cast<std::ptrdiff_t>(length));
        EXPECT_EQ(open(cut) != nullptr, length >= needed) << length;
    }
}

TEST_F(ArchiveOpening, WithAnyByteOfTheTableOrItsChecksumChangedIsRefused) {
    const ArchiveBuilder builder = ArchiveBuilder().signature("CMS");
    const Data whole = builder.build();
    for (std::size_t at = 28; at < builder.heapStart() + 20; ++at) {
        Data changed = whole;
        changed[at] ^= std::byte{0x20};
        EXPECT_EQ(open(changed), nullptr) << at;
    }
}

TEST_F(ArchiveOpening, ReadsNothingAfterTheChecksum) {
    EXPECT_TRUE(opens(ArchiveBuilder().signature("CMS").afterChecksum({})));
    EXPECT_TRUE(opens(ArchiveBuilder().signature("CMS").afterChecksum(Data(100'000, std::byte{0xEE}))));
}

TEST_F(ArchiveOpening, OfAnEmptyOrMalformedStreamIsRefused) {
    EXPECT_FALSE(opens(ArchiveBuilder().compressedToc({})));
    EXPECT_FALSE(opens(ArchiveBuilder().compressedToc(base::toData("<xar><toc/></xar>"))));
    Data raw = deflated(tocWith(""));
    raw.erase(raw.begin(), raw.begin() + 2);  // the zlib header
    EXPECT_FALSE(opens(ArchiveBuilder().compressedToc(raw)));
}

TEST_F(ArchiveOpening, OfAStreamWithoutItsEndIsRefusedThoughTheDocumentIsWhole) {
    Data cut = deflated(tocWith(""));
    cut.resize(cut.size() - 4);  // the stream's own checksum
    EXPECT_FALSE(opens(ArchiveBuilder().compressedToc(cut)));
    cut = deflated(tocWith(""));
    cut.back() ^= std::byte{1};
    EXPECT_FALSE(opens(ArchiveBuilder().compressedToc(cut)));
}

TEST_F(ArchiveOpening, SkipsBytesAfterTheStreamInsideItsLength) {
    Data longer = deflated(tocWith(""));
    longer.resize(longer.size() + 1000);
    EXPECT_TRUE(opens(ArchiveBuilder().compressedToc(longer)));
}

TEST_F(ArchiveOpening, OfATableUpTo64MiBSucceedsAndOfALongerOneIsRefused) {
    constexpr std::size_t kLimit = std::size_t{64} * 1024 * 1024;
    std::string document = tocWith("");
    document.insert(document.size() - 6, kLimit - document.size(), ' ');  // before "</xar>"
    EXPECT_TRUE(opensWithToc(document));
    document.insert(document.size() - 6, 1, ' ');
    EXPECT_FALSE(opensWithToc(document));
}

TEST_F(ArchiveOpening, OfACompressedTableOver64MiBIsRefusedBeforeItIsRead) {
    constexpr std::uintmax_t kTerabyte = std::uintmax_t{1} << 40U;
    writeFile(path, ArchiveBuilder().compressedLength(kTerabyte).build());
    std::filesystem::resize_file(path, 2 * kTerabyte);
    EXPECT_EQ(xar_open(path.c_str(), 0), nullptr);
}

TEST_F(ArchiveOpening, TakesARightDocument) {
    EXPECT_TRUE(opensWithToc(tocWith("")));
}

TEST_F(ArchiveOpening, OfADocumentThatIsNotWellFormedIsRefused) {
    for (const char* document :
         {"", " ", "text", "<xar><toc></xar>", "<xar><toc/>", "<xar><toc/></xar><more/>",
          "<xar><toc/></xar>text", "<xar><toc a='1' a='2'/></xar>", "<xar><toc>&undeclared;</toc></xar>",
          "<xar><toc>\x01</toc></xar>"})
        EXPECT_FALSE(opens(ArchiveBuilder().digest("none").toc(document))) << document;
    EXPECT_TRUE(opens(ArchiveBuilder().digest("none").toc("<xar><toc/></xar>"))) << "which is right";
}

TEST_F(ArchiveOpening, OfAnotherRootOrWithoutATableIsRefused) {
    for (const char* document : {"<toc/>", "<zar><toc/></zar>", "<xar/>", "<xar><other><toc/></other></xar>"})
        EXPECT_FALSE(opens(ArchiveBuilder().digest("none").toc(document))) << document;
}

TEST_F(ArchiveOpening, OfTwoTablesIsRefused) {
    EXPECT_FALSE(opens(ArchiveBuilder().digest("none").toc("<xar><toc/><toc/></xar>")));
}

TEST_F(ArchiveOpening, PassesOverOtherElementsBesideTheTable) {
    EXPECT_TRUE(
        opens(ArchiveBuilder().digest("none").toc("<xar><subdoc><toc/></subdoc><toc/><more/></xar>")));
}

TEST_F(ArchiveOpening, OfADocumentTypeIsRefused) {
    EXPECT_FALSE(opensWithToc("<!DOCTYPE xar>" + tocWith("")));
    EXPECT_FALSE(opensWithToc("<!DOCTYPE xar [<!ENTITY a \"b\">]>" + tocWith("<name>&a;</name>")));
    EXPECT_FALSE(opensWithToc("<!DOCTYPE xar SYSTEM \"http://localhost/xar.dtd\">" + tocWith("")));
    EXPECT_FALSE(
        opensWithToc("<!DOCTYPE xar [<!ENTITY a SYSTEM \"file:///etc/hostname\">]>" + tocWith("<n>&a;</n>")));
}

TEST_F(ArchiveOpening, OfAnotherEncodingIsRefused) {
    std::string wide("\xFF\xFE", 2);
    for (const char c : tocWith("")) wide += {c, '\0'};
    EXPECT_FALSE(opensWithToc(wide));
    EXPECT_FALSE(opensWithToc(wide.substr(2)));
    EXPECT_FALSE(opensWithToc("\x4C\x6F\xA7\x94"));  // "<?xm" in EBCDIC, by which parsers recognise it
}

std::string declared(const std::string& encoding, const std::string& children) {
    return "<?xml version=\"1.0\" encoding=\"" + encoding + "\"?>" + tocWith(children);
}

TEST_F(ArchiveOpening, OfATableInISO88591ReadsItAsThat) {
    const auto archive =
        open(ArchiveBuilder().toc(declared("ISO-8859-1", "<name>\xE9</name><signature style='\xFF'/>")));
    ASSERT_NE(archive, nullptr);
    EXPECT_EQ(property(archive, "name"), (Property{0, "\xC3\xA9"}));
    EXPECT_EQ(types(archive), (std::vector<std::optional<std::string>>{"\xC3\xBF"}));
    EXPECT_FALSE(opensWithToc(declared("UTF-8", "<name>\xE9</name>")));
    EXPECT_FALSE(opensWithToc(tocWith("<name>\xE9</name>"))) << "which is UTF-8 unless it says otherwise";
}

// UTF-7, for example, would hide markup from a reader of the bytes.
TEST_F(ArchiveOpening, OfATableThatDeclaresAnotherEncodingIsRefused) {
    for (const char* encoding : {"UTF-7", "UTF-16", "ISO-8859-15", "windows-1252", "EBCDIC", "x"})
        EXPECT_FALSE(opensWithToc(declared(encoding, "+ADw-signature/+AD4-"))) << encoding;
    EXPECT_TRUE(opensWithToc(declared("utf-8", "")));
    EXPECT_FALSE(opensWithToc("\xEF\xBB\xBF" + declared("ISO-8859-1", ""))) << "two that differ";
}

TEST_F(ArchiveOpening, TakesAByteOrderMarkOfUTF8) {
    EXPECT_TRUE(opensWithToc("\xEF\xBB\xBF" + tocWith("")));
}

std::string nested(std::size_t depth) {
    std::string text;
    for (std::size_t i = 0; i < depth; ++i) text += "<a>";
    for (std::size_t i = 0; i < depth; ++i) text += "</a>";
    return text;
}

TEST_F(ArchiveOpening, OfElements64DeepSucceedsAndOfDeeperOnesIsRefused) {
    EXPECT_TRUE(opensWithToc(tocWith(nested(62))));
    EXPECT_FALSE(opensWithToc(tocWith(nested(63))));
    EXPECT_TRUE(opensWithToc(tocWith("<file>" + nested(61) + "</file>")));
    EXPECT_FALSE(opensWithToc(tocWith("<file>" + nested(62) + "</file>")));
    EXPECT_FALSE(opensWithToc(tocWith(nested(100'000))));
}

TEST_F(ArchiveOpening, OfAnElementWithHundredsOfAttributesSucceedsAndWithAMillionIsRefused) {
    const auto element = [](std::size_t count) {
        std::string text = "<file";
        for (std::size_t i = 0; i < count; ++i) text += " a" + std::to_string(i) + "='>'";
        return text + "/>";
    };
    EXPECT_TRUE(opensWithToc(tocWith(element(500))));
    EXPECT_FALSE(opensWithToc(tocWith(element(1'000'000))));
}

std::string repeated(const std::string& text, std::size_t count) {
    std::string all;
    all.reserve(text.size() * count);
    for (std::size_t i = 0; i < count; ++i) all += text;
    return all;
}

TEST_F(ArchiveOpening, OfMoreThanFourMillionElementsIsRefused) {
    constexpr std::size_t kLimit = std::size_t{1} << 22U;
    constexpr std::size_t kOthers = 6;  // xar, toc, checksum, offset, size, file
    const auto table = [](std::size_t count) {
        return tocWith("<file>" + repeated("<a/>", count - kOthers) + "</file>");
    };
    EXPECT_TRUE(opensWithToc(table(kLimit)));
    EXPECT_FALSE(opensWithToc(table(kLimit + 1)));
}

// The XML library remembers each.
TEST_F(ArchiveOpening, OfMoreNamesThanTheXMLLibraryHasRoomForIsRefused) {
    const auto table = [](std::size_t count) {
        std::string files;
        for (std::size_t i = 0; i < count; ++i) files += "<a" + std::to_string(i) + "/>";
        return tocWith("<file>" + files + "</file>");
    };
    EXPECT_TRUE(opensWithToc(table(10'000)));
    EXPECT_FALSE(opensWithToc(table(500'000)));
}

TEST_F(ArchiveOpening, OfMoreThan65536SignaturesIsRefusedSinceNoneMayBeDropped) {
    constexpr std::size_t kLimit = std::size_t{1} << 16U;
    EXPECT_EQ(types(open(ArchiveBuilder().toc(tocWith(repeated("<signature/>", kLimit))))).size(), kLimit);
    EXPECT_FALSE(opensWithToc(tocWith(repeated("<signature/>", kLimit + 1))));
}

TEST_F(ArchiveOpening, OfMoreThan4096PropertiesIsRefused) {
    const auto table = [](std::size_t count) {
        std::string properties;
        for (std::size_t i = 3; i < count; ++i) properties += "<p" + std::to_string(i) + "/>";
        return tocWith(properties);
    };
    EXPECT_TRUE(opensWithToc(table(4096)));
    EXPECT_FALSE(opensWithToc(table(4097)));
}

TEST_F(ArchiveOpening, OfAPropertysPathOver1024BytesIsRefused) {
    const auto table = [](std::size_t length) { return tocWith("<" + std::string(length, 'a') + "/>"); };
    EXPECT_TRUE(opensWithToc(table(1023)));
    EXPECT_FALSE(opensWithToc(table(1024)));
}

TEST_F(ArchiveOpening, OfMoreThanAMebibyteOfTextsAndStylesIsRefused) {
    constexpr std::size_t kOthers = 1 + 2 + 4;  // "0", "20", "sha1"
    const std::string most(xar::kMaximumKept - kOthers, 'x');
    EXPECT_TRUE(opensWithToc(tocWith("<a>" + most + "</a>")));
    EXPECT_FALSE(opensWithToc(tocWith("<a>" + most + "x</a>")));
    EXPECT_FALSE(opensWithToc(tocWith("<a>" + most + "</a><signature style='x'/>")));
    EXPECT_TRUE(opensWithToc(tocWith("<file><name>" + most + most + "</name></file>")))
        << "which is not kept";
}

}  // namespace
}  // namespace pinwell::test
