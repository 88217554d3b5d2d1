// The signatures of an archive, and the signed data.
#include <gmock/gmock.h>

#include <filesystem>

#include "fixture.h"

namespace pinwell::test {
namespace {

using testing::ElementsAre;

using ArchiveSignatures = ArchiveTest;

TEST_F(ArchiveSignatures, OfAnUnsignedArchiveAreNone) {
    const auto archive = open(ArchiveBuilder());
    EXPECT_EQ(xar_signature_first(archive.get()), nullptr);
}

TEST_F(ArchiveSignatures, ComeInDocumentOrder) {
    EXPECT_THAT(types(open(ArchiveBuilder().signature("RSA").signature("CMS").signature("RSA"))),
                ElementsAre("RSA", "CMS", "RSA"));
}

TEST_F(ArchiveSignatures, MayBeBeforeTheChecksumAndAfterTheFiles) {
    EXPECT_THAT(types(open(ArchiveBuilder().toc(
                    R"(<xar><toc><signature style="A"/>)"
                    R"(<checksum style="sha1"><offset>0</offset><size>20</size></checksum>)"
                    R"(<file/><signature style="B"/></toc></xar>)"))),
                ElementsAre("A", "B"));
}

TEST_F(ArchiveSignatures, TypeIsTheStyleAsItIsWritten) {
    EXPECT_THAT(types(open(ArchiveBuilder().signature(" cms ").signature("").signature("R&amp;D&#x21;"))),
                ElementsAre(" cms ", "", "R&D!"));
}

TEST_F(ArchiveSignatures, WithoutAStyleHaveNoType) {
    EXPECT_THAT(types(open(ArchiveBuilder().element("<signature/><signature x='CMS'/>").signature("CMS"))),
                ElementsAre(std::nullopt, std::nullopt, "CMS"));
}

TEST_F(ArchiveSignatures, OfBothNamesComeInDocumentOrder) {
    EXPECT_THAT(types(open(ArchiveBuilder().element(
                    "<signature style='RSA'/><x-signature style='CMS'><size>7</size></x-signature>"))),
                ElementsAre("RSA", "CMS"));
    EXPECT_THAT(types(open(ArchiveBuilder().element("<x-signature style='A'/><signature style='B'/>"))),
                ElementsAre("A", "B"));
    EXPECT_TRUE(types(open(ArchiveBuilder().element("<y-signature style='CMS'/>"))).empty());
}

TEST_F(ArchiveSignatures, InsideAFileOrAnythingElseAreNone) {
    EXPECT_TRUE(types(open(ArchiveBuilder().element("<file><signature style='CMS'/></file>"))).empty());
    EXPECT_TRUE(types(open(ArchiveBuilder().element("<other><signature style='CMS'/></other>"))).empty());
    EXPECT_THAT(
        types(open(ArchiveBuilder().element("<signature style='A'><signature style='B'/></signature>"))),
        ElementsAre("A"));
}

TEST_F(ArchiveSignatures, OutsideTheTableAreNone) {
    EXPECT_TRUE(types(open(ArchiveBuilder().digest("none").toc(
                          "<xar><signature style='CMS'/><toc/><signature style='CMS'/></xar>")))
                    .empty());
}

TEST_F(ArchiveSignatures, GoByTheirLocalName) {
    EXPECT_THAT(types(open(ArchiveBuilder().element("<s:signature xmlns:s='urn:s' style='CMS'/>"))),
                ElementsAre("CMS"));
    EXPECT_THAT(types(open(ArchiveBuilder().element("<signature xmlns='urn:s' style='CMS'/>"))),
                ElementsAre("CMS"));
    EXPECT_THAT(types(open(ArchiveBuilder().element("<u:signature style='CMS'/>"))), ElementsAre("CMS"))
        << "an undeclared prefix";
    for (const char* name : {"a:b:signature", ":signature", "signature:"})
        EXPECT_FALSE(opens(ArchiveBuilder().element("<" + std::string(name) + " style='CMS'/>"))) << name;
}

TEST_F(ArchiveSignatures, GoByTheExactLettersOfTheirName) {
    for (const char* name :
         {"Signature", "SIGNATURE", "xsignature", "x_signature", "signature.", "X-signature"})
        EXPECT_TRUE(types(open(ArchiveBuilder().element("<" + std::string(name) + " style='CMS'/>"))).empty())
            << name;
}

TEST_F(ArchiveSignatures, TextAndTypesStayAsTheyAreUntilTheArchiveIsClosed) {
    const auto archive = open(ArchiveBuilder().signature("CMS"));
    const char* const type = xar_signature_type(xar_signature_first(archive.get()));
    std::filesystem::remove(path);
    EXPECT_STREQ(type, "CMS");
    EXPECT_EQ(xar_signature_type(xar_signature_first(archive.get())), type);
}

TEST_F(ArchiveSignatures, SignTheChecksumWholeWhateverItsLength) {
    for (const char* name : {"md5", "sha1", "sha256", "sha512"}) {
        const ArchiveBuilder builder = ArchiveBuilder().digest(name).signature("CMS");
        const auto archive = open(builder);
        ASSERT_NE(archive, nullptr) << name;
        EXPECT_EQ(signedData(archive), builder.rightChecksum()) << name;
    }
}

TEST_F(ArchiveSignatures, AllSignTheSame) {
    const ArchiveBuilder builder = ArchiveBuilder().signature("RSA").signature("CMS");
    const auto archive = open(builder);
    std::uint8_t* bytes = nullptr;
    std::uint32_t length = 0;
    const auto second = xar_signature_next(xar_signature_first(archive.get()));
    ASSERT_EQ(xar_signature_copy_signed_data(second, &bytes, &length, nullptr, nullptr, nullptr), 0);
    EXPECT_EQ(base::toData(std::as_bytes(std::span(bytes, length))), builder.rightChecksum());
    std::free(bytes);
}

TEST_F(ArchiveSignatures, OutputsThatThisReaderDoesNotHaveAreRefused) {
    const auto archive = open(ArchiveBuilder().signature("CMS"));
    const auto signature = xar_signature_first(archive.get());
    std::uint8_t* bytes = nullptr;
    std::uint32_t length = 0;
    std::uint8_t* value = nullptr;
    std::uint32_t number = 0;
    EXPECT_EQ(xar_signature_copy_signed_data(signature, nullptr, &length, nullptr, nullptr, nullptr), 255);
    EXPECT_EQ(xar_signature_copy_signed_data(signature, &bytes, nullptr, nullptr, nullptr, nullptr), 255);
    EXPECT_EQ(xar_signature_copy_signed_data(signature, &bytes, &length, &value, nullptr, nullptr), 255);
    EXPECT_EQ(xar_signature_copy_signed_data(signature, &bytes, &length, nullptr, &number, nullptr), 255);
    EXPECT_EQ(xar_signature_copy_signed_data(signature, &bytes, &length, nullptr, nullptr, &number), 255);
    EXPECT_EQ(bytes, nullptr);
}

TEST_F(ArchiveSignatures, ThatCannotBeRightAreNotChecked) {
    EXPECT_TRUE(opens(ArchiveBuilder().element(
        "<signature "
        "style='CMS'><offset>99999999</offset><size>-1</size><KeyInfo>none</KeyInfo></signature>")));
}

}  // namespace
}  // namespace pinwell::test
