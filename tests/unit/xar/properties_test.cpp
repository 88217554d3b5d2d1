// The properties of an archive.
#include "fixture.h"

namespace pinwell::test {
namespace {

using ArchiveProperties = ArchiveTest;

TEST_F(ArchiveProperties, AreTheTextBelowTheTable) {
    const auto archive = open(ArchiveBuilder());
    EXPECT_EQ(property(archive, "checksum/size"), (Property{0, "20"}));
    EXPECT_EQ(property(archive, "checksum/offset"), (Property{0, "0"}));
    EXPECT_EQ(property(archive, "creation-time"), (Property{0, "2026-11-20T19:55:00"}));
}

TEST_F(ArchiveProperties, AreAsTheyAreWritten) {
    for (const char* size : {" 20 ", "020", "20xyz", "\t20"}) {
        const auto archive = open(ArchiveBuilder().checksumSize(size));
        ASSERT_NE(archive, nullptr) << size;
        EXPECT_EQ(property(archive, "checksum/size"), (Property{0, size}));
    }
}

TEST_F(ArchiveProperties, ThatAreNotThereAreMinus1AndNull) {
    const auto archive = open(ArchiveBuilder().checksumElement("<checksum style='sha1'/>"));
    EXPECT_EQ(property(archive, "checksum/size"), kNoProperty);
    EXPECT_EQ(property(archive, "checksum/"), kNoProperty);
    EXPECT_EQ(property(archive, "/checksum"), kNoProperty);
    EXPECT_EQ(property(archive, ""), kNoProperty);
    EXPECT_EQ(property(archive, nullptr), kNoProperty);
}

TEST_F(ArchiveProperties, WithoutTextAreNull) {
    const auto archive =
        open(ArchiveBuilder().element("<a/><b></b><c> \n </c><d><e>text</e></d><f><!-- 20 --></f>"));
    for (const char* key : {"a", "b", "c", "d", "f", "checksum"})
        EXPECT_EQ(property(archive, key), (Property{0, std::nullopt})) << key;
    EXPECT_EQ(property(archive, "d/e"), (Property{0, "text"}));
}

TEST_F(ArchiveProperties, TextInPiecesIsOneText) {
    const auto archive = open(
        ArchiveBuilder().checksumSize("<!-- a -->2<?p i?>&#x30;<![CDATA[x&]]>").element("<a>1<b>2</b>3</a>"));
    EXPECT_EQ(property(archive, "checksum/size"), (Property{0, "20x&"}));
    EXPECT_EQ(property(archive, "a"), (Property{0, "13"}));
    EXPECT_EQ(property(archive, "a/b"), (Property{0, "2"}));
}

TEST_F(ArchiveProperties, OfOnePathTheFirstCounts) {
    const auto archive =
        open(ArchiveBuilder().element("<a>first</a><a>second<b>inside</b></a><c/><c>text</c>"));
    EXPECT_EQ(property(archive, "a"), (Property{0, "first"}));
    EXPECT_EQ(property(archive, "a/b"), (Property{0, "inside"}));
    EXPECT_EQ(property(archive, "c"), (Property{0, std::nullopt}));
}

TEST_F(ArchiveProperties, OfFilesAndSignaturesAreNotTheArchives) {
    const auto archive = open(ArchiveBuilder().signature("CMS"));
    EXPECT_EQ(property(archive, "file"), kNoProperty);
    EXPECT_EQ(property(archive, "file/name"), kNoProperty);
    EXPECT_EQ(property(archive, "name"), kNoProperty);
    EXPECT_EQ(property(archive, "signature/size"), kNoProperty);
    EXPECT_EQ(property(archive, "toc"), kNoProperty);
}

TEST_F(ArchiveProperties, StayWhereTheyAreUntilTheArchiveIsClosed) {
    const auto archive = open(ArchiveBuilder());
    const auto file = reinterpret_cast<xar_file_t>(archive.get());
    const char* first = nullptr;
    const char* second = nullptr;
    xar_prop_get(file, "checksum/size", &first);
    xar_prop_get(file, "creation-time", &second);
    xar_prop_get(file, "checksum/size", &second);
    EXPECT_EQ(first, second);
    EXPECT_STREQ(first, "20");
}

TEST_F(ArchiveProperties, WithoutAPlaceForTheResultAreMinus1) {
    const auto archive = open(ArchiveBuilder());
    EXPECT_EQ(xar_prop_get(reinterpret_cast<xar_file_t>(archive.get()), "checksum/size", nullptr), -1);
    const char* value = "left over";
    EXPECT_EQ(xar_prop_get(nullptr, "checksum/size", &value), -1);
    EXPECT_EQ(value, nullptr);
}

}  // namespace
}  // namespace pinwell::test
