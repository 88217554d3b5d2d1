#include "trust/anchors.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <filesystem>

#include "support/certificate_builder.h"
#include "support/file_properties.h"
#include "support/temporary_directory.h"

namespace pinwell::trust {
namespace {

using base::asBytes;

const test::IssuedChain& chain() {
    static const test::IssuedChain issued = test::TicketChain().issue();
    return issued;
}

TEST(AnchorFile, MayHoldSeveralCertificates) {
    const auto read = readPem(asBytes(chain().root.pem() + chain().leaf.pem()));
    ASSERT_TRUE(read);
    ASSERT_EQ(read->size(), 2U);
    EXPECT_EQ((*read)[1]->der(), chain().leaf.der);
}

TEST(AnchorFile, MayHoldTextAndOtherBlocks) {
    const auto read = readPem(asBytes(
        "Our root\n" + test::toPem("PUBLIC KEY", chain().leaf.key.publicKeyInfo()) + chain().root.pem()));
    ASSERT_TRUE(read);
    EXPECT_EQ(read->size(), 1U);
}

TEST(AnchorFile, CountsForNothingWithoutACertificate) {
    EXPECT_FALSE(readPem({}));
    EXPECT_FALSE(readPem(asBytes("no certificate at all\n")));
    EXPECT_FALSE(readPem(asBytes(test::toPem("PUBLIC KEY", chain().leaf.key.publicKeyInfo()))));
}

TEST(AnchorFile, CountsForNothingWhenOneBlockIsBroken) {
    std::string text = chain().root.pem() + chain().leaf.pem();
    EXPECT_FALSE(readPem(asBytes(text.substr(0, text.size() - 40))));
    EXPECT_FALSE(readPem(asBytes(chain().root.pem() + test::toPem("CERTIFICATE", asBytes("not DER")))));
}

TEST(AnchorFile, HasALimitOnItsSize) {
    EXPECT_FALSE(readPem(asBytes(chain().root.pem() + std::string(kMaximumPemFileSize, '\n'))));
}

TEST(AnchorFile, HasALimitOnItsCertificates) {
    std::string text;
    for (std::size_t i = 0; i < kMaximumCertificatesPerFile; ++i) text += chain().root.pem();
    ASSERT_LT(text.size(), kMaximumPemFileSize / 2) << "so that it is not the size that is refused";
    const auto read = readPem(asBytes(text));
    ASSERT_TRUE(read);
    EXPECT_EQ(read->size(), 1024U);
    EXPECT_FALSE(readPem(asBytes(text + chain().root.pem())));
}

constexpr const char* kStores[] = {"roots", "compat-roots", "user-trust/allow", "user-trust/deny"};

struct Loaded {
    Anchors anchors;
    std::vector<std::string> log;

    std::vector<std::size_t> counts() const {
        return {anchors.roots.size(), anchors.compatibility.size(), anchors.allowed.size(),
                anchors.denied.size()};
    }
};

Loaded loadFrom(const test::TemporaryDirectory& directory) {
    Loaded loaded;
    loaded.anchors = loadAnchors(config::PlatformDirectory(directory.path()),
                                 [&](std::string_view line) { loaded.log.emplace_back(line); });
    return loaded;
}

struct Unreadable {
    const char* name;
    std::function<void(const std::string& path)> make;
    const char* reason;

    friend void PrintTo(const Unreadable& entry, std::ostream* out) { *out << entry.name; }
};

class UnreadableAnchor : public testing::TestWithParam<Unreadable> {};

TEST_P(UnreadableAnchor, CountsForNothingAndIsNamedInTheLog) {
    const test::TemporaryDirectory directory;
    std::vector<testing::Matcher<std::string>> lines;
    for (const char* store : kStores) {
        test::writeFile(directory / (std::string(store) + "/good.pem"), chain().root.pem());
        const std::string path = directory / (std::string(store) + "/bad.pem");
        GetParam().make(path);
        lines.emplace_back(testing::AllOf(testing::StartsWith("Could not read certificates. " + path),
                                          testing::HasSubstr(GetParam().reason)));
    }
    const Loaded loaded = loadFrom(directory);
    EXPECT_THAT(loaded.log, testing::ElementsAreArray(lines));
    EXPECT_THAT(loaded.counts(), testing::Each(1));
}

INSTANTIATE_TEST_SUITE_P(
    Entry, UnreadableAnchor,
    testing::Values(
        Unreadable{"DanglingLink", [](const std::string& path) { test::makeLink("missing", path); },
                   "No such file"},
        Unreadable{"LinkToItself", [](const std::string& path) { test::makeLink("bad.pem", path); },
                   "symbolic links"},
        Unreadable{"Directory", [](const std::string& path) { test::makeDirectory(path); }, "directory"},
        Unreadable{"Pipe", [](const std::string& path) { test::makeFifo(path); }, "Invalid argument"},
        Unreadable{"Device", [](const std::string& path) { test::makeLink("/dev/zero", path); },
                   "Invalid argument"},
        Unreadable{"EmptyFile", [](const std::string& path) { test::writeFile(path, ""); }, "not a PEM file"},
        Unreadable{"Text", [](const std::string& path) { test::writeFile(path, "text"); }, "not a PEM file"},
        Unreadable{"Giant",
                   [](const std::string& path) {
                       test::writeFile(path, chain().root.pem());
                       std::filesystem::resize_file(path, kMaximumDeniedFileSize + 1);
                   },
                   "File too large"}),
    [](const auto& tested) { return std::string(tested.param.name); });

// Distrust: a damaged block does not undo the others.

std::string base64Of(const test::IssuedCertificate& certificate) {
    const std::string pem = certificate.pem();
    const std::size_t start = pem.find('\n') + 1;
    return pem.substr(start, pem.find("-----END") - start);
}

std::string block(const std::string& body) {
    return "-----BEGIN CERTIFICATE-----\n" + body + "-----END CERTIFICATE-----\n";
}

TEST(LargeDenyFile, StillDenies) {
    const test::TemporaryDirectory directory;
    const std::string remark(kMaximumPemFileSize, '#');
    test::writeFile(directory / "user-trust/deny/large.pem", remark + "\n" + chain().leaf.pem());
    const Loaded loaded = loadFrom(directory);
    EXPECT_THAT(loaded.log, testing::IsEmpty());
    EXPECT_EQ(loaded.anchors.denied.size(), 1U);
}

struct DamagedBlock {
    const char* name;
    std::function<std::string()> text;
    const char* reason;

    friend void PrintTo(const DamagedBlock& one, std::ostream* out) { *out << one.name; }
};

class DenyFile : public testing::TestWithParam<DamagedBlock> {};

TEST_P(DenyFile, CountsWithItsOtherBlocksAndIsNamedInTheLog) {
    const test::TemporaryDirectory directory;
    const std::string path = directory / "user-trust/deny/bad.pem";
    test::writeFile(path, chain().root.pem() + GetParam().text() + chain().leaf.pem());
    const Loaded loaded = loadFrom(directory);
    ASSERT_EQ(loaded.log.size(), 1U);
    EXPECT_THAT(
        loaded.log.front(),
        testing::AllOf(testing::StartsWith("Could not read certificates. " + path),
                       testing::HasSubstr("the block at line "), testing::HasSubstr(GetParam().reason)));
    EXPECT_TRUE(loaded.anchors.denied.reaches(*X509Certificate::parse(chain().root.der)));
    EXPECT_TRUE(loaded.anchors.denied.reaches(*X509Certificate::parse(chain().leaf.der)));
}

INSTANTIATE_TEST_SUITE_P(
    With, DenyFile,
    testing::Values(
        DamagedBlock{"NoBase64", [] { return block("MII*\n"); }, "not in base64"},
        DamagedBlock{"ACutLine", [] { return block(base64Of(chain().intermediate).substr(1)); },
                     "not in base64"},
        DamagedBlock{"NoCertificate", [] { return test::toPem("CERTIFICATE", asBytes("not DER")); },
                     "it is no certificate"},
        DamagedBlock{"BytesLeftOver",
                     [] {
                         Data longer = chain().intermediate.der;
                         longer.push_back(std::byte{0});
                         return test::toPem("CERTIFICATE", longer);
                     },
                     "no proper certificate; its key is distrusted"},
        DamagedBlock{"HalfACertificate",
                     [] { return test::toPem("CERTIFICATE", ByteView(chain().intermediate.der).first(100)); },
                     "it is no certificate"},
        DamagedBlock{"NoEndLine",
                     [] { return "-----BEGIN CERTIFICATE-----\n" + base64Of(chain().intermediate); },
                     "end is missing"},
        DamagedBlock{"NoFirstLine",
                     [] { return base64Of(chain().intermediate) + "-----END CERTIFICATE-----\n"; },
                     "an end and no beginning"},
        DamagedBlock{"AnEndOfAnotherLabel",
                     [] {
                         return "-----BEGIN CERTIFICATE-----\n" + base64Of(chain().intermediate) +
                                "-----BEGIN X-----\n-----END X-----\n";
                     },
                     "end is missing"}),
    [](const auto& tested) { return tested.param.name; });

TEST(DenyFile, MayEndInsideABlock) {
    const test::TemporaryDirectory directory;
    const std::string cut = chain().root.pem();
    test::writeFile(directory / "user-trust/deny/a.pem", chain().leaf.pem() + cut.substr(0, cut.size() / 2));
    const Loaded loaded = loadFrom(directory);
    EXPECT_EQ(loaded.log.size(), 1U);
    EXPECT_TRUE(loaded.anchors.denied.reaches(*X509Certificate::parse(chain().leaf.der)));
}

TEST(DenyFile, NamesEveryDamagedBlockUpToABound) {
    const auto linesFor = [](int blocks) {
        const test::TemporaryDirectory directory;
        std::string text = chain().root.pem();
        for (int i = 0; i < blocks; ++i) text += block("*\n");
        test::writeFile(directory / "user-trust/deny/a.pem", text);
        const Loaded loaded = loadFrom(directory);
        EXPECT_EQ(loaded.anchors.denied.size(), 1U);
        return loaded.log;
    };
    EXPECT_EQ(linesFor(16).size(), 16U);
    EXPECT_EQ(linesFor(1000).size(), 17U);
    EXPECT_THAT(linesFor(1000).back(), testing::HasSubstr("984 more blocks are damaged"));
}

TEST(DenyFile, HasNoLimitOnItsCertificates) {
    const test::TemporaryDirectory directory;
    std::string text;
    for (std::size_t i = 0; i < kMaximumCertificatesPerFile; ++i) text += chain().root.pem();
    test::writeFile(directory / "user-trust/deny/a.pem", text + chain().leaf.pem());
    const Loaded loaded = loadFrom(directory);
    EXPECT_THAT(loaded.log, testing::IsEmpty());
    EXPECT_TRUE(loaded.anchors.denied.reaches(*X509Certificate::parse(chain().leaf.der)));
}

TEST(DenyFile, MayHoldTrustedCertificatesOfOpenssl) {
    const test::TemporaryDirectory directory;
    Data trusted = chain().leaf.der;
    base::append(trusted, Data{std::byte{0x30}, std::byte{0}});
    test::writeFile(directory / "user-trust/deny/a.pem", test::toPem("TRUSTED CERTIFICATE", trusted));
    EXPECT_TRUE(loadFrom(directory).anchors.denied.reaches(*X509Certificate::parse(chain().leaf.der)));
}

TEST(AnchorFile, ThatIsTrustedCountsForNothingWithADamagedBlock) {
    const test::TemporaryDirectory directory;
    for (const char* store : {"roots", "compat-roots", "user-trust/allow"})
        test::writeFile(directory / (std::string(store) + "/a.pem"), chain().root.pem() + block("*\n"));
    const Loaded loaded = loadFrom(directory);
    EXPECT_EQ(loaded.log.size(), 3U);
    EXPECT_THAT(loaded.counts(), testing::Each(0));
}

TEST(AnchorStore, PassesOverOtherNames) {
    const test::TemporaryDirectory directory;
    for (const char* name : {"README", "a.crt", "a.pem.old"})
        test::writeFile(directory / (std::string("user-trust/deny/") + name), "text");
    const Loaded loaded = loadFrom(directory);
    EXPECT_THAT(loaded.log, testing::IsEmpty());
    EXPECT_THAT(loaded.counts(), testing::Each(0));
}

TEST(AnchorList, ContainsACertificateByteForByte) {
    const CertificateList list{X509Certificate::parse(chain().root.der)};
    EXPECT_TRUE(contains(list, *X509Certificate::parse(chain().root.der)));
    Data other = chain().root.der;
    other.back() ^= std::byte{1};
    EXPECT_FALSE(contains(list, *X509Certificate::parse(other)));
}

using base::toData;

const std::string kOne = "-----BEGIN ONE-----\nAQID\n-----END ONE-----\n";

TEST(PemText, IsBlocksAndTheTextBetweenThem) {
    const std::string text = "a word\n" + kOne + "\n--- not a marker ---\n" + kOne;
    const auto blocks = readPemBlocks(text);
    ASSERT_EQ(blocks.size(), 2U);
    EXPECT_EQ(blocks[0].label, "ONE");
    EXPECT_EQ(blocks[0].line, 2U);
    EXPECT_EQ(blocks[1].line, 7U);
    EXPECT_EQ(blocks[1].data, toData("\1\2\3"));
    EXPECT_TRUE(readPemBlocks("").empty());
    EXPECT_TRUE(readPemBlocks("-----").empty());
    EXPECT_TRUE(readPemBlocks("-----BEGIN ONE").empty());
}

TEST(PemBlock, MayHoldWhiteSpaceAnywhereAndAnyLineEnd) {
    for (const char* text : {"-----BEGIN ONE-----\r\nAQ\r\nID\r\n-----END ONE-----\r\n",
                             "-----BEGIN ONE-----\rAQID\r-----END ONE-----",
                             "  -----BEGIN ONE-----\n\n  AQ ID\t\n\n  -----END ONE-----",
                             "-----BEGIN ONE-----AQID-----END ONE-----",
                             "\xEF\xBB\xBF-----BEGIN ONE-----\nAQID\n-----END ONE-----"}) {
        const auto blocks = readPemBlocks(text);
        ASSERT_EQ(blocks.size(), 1U) << text;
        EXPECT_EQ(blocks[0].data, toData("\1\2\3")) << text;
    }
}

struct Damage {
    const char* name;
    std::string text;
    std::size_t damagedBlocks = 1;
};

class DamagedPem : public testing::TestWithParam<Damage> {};

TEST_P(DamagedPem, LeavesTheBlocksAroundItWhole) {
    const std::string text = kOne + GetParam().text + kOne;
    std::size_t whole = 0;
    std::size_t damaged = 0;
    for (const PemBlock& block : readPemBlocks(text)) {
        EXPECT_EQ(block.data.has_value(), block.damage.empty());
        ++(block.data ? whole : damaged);
    }
    EXPECT_EQ(whole, 2U);
    EXPECT_EQ(damaged, GetParam().damagedBlocks);
}

INSTANTIATE_TEST_SUITE_P(
    By, DamagedPem,
    testing::Values(Damage{"NoBase64", "-----BEGIN ONE-----\nA*ID\n-----END ONE-----\n"},
                    Damage{"ACutLine", "-----BEGIN ONE-----\nAQI\n-----END ONE-----\n"},
                    Damage{"PaddingInside", "-----BEGIN ONE-----\nAQ==AQID\n-----END ONE-----\n"},
                    Damage{"AHeader", "-----BEGIN ONE-----\nKey: value\n\nAQID\n-----END ONE-----\n"},
                    Damage{"NoEnd", "-----BEGIN ONE-----\nAQID\n"},
                    Damage{"AnEndOfAnotherLabel", "-----BEGIN ONE-----\nAQID\n-----END TWO-----\n", 2},
                    Damage{"NoBeginning", "AQID\n-----END ONE-----\n"},
                    Damage{"ABeginningThatIsDamaged", "----BEGIN ONE-----\nAQID\n-----END ONE-----\n"},
                    Damage{"AnEndThatIsDamaged", "-----BEGIN ONE-----\nAQID\n-----END ONE----\n"},
                    Damage{"AZeroByte", std::string("-----BEGIN ONE-----\nAQ\0ID\n-----END ONE-----\n", 44)}),
    [](const auto& tested) { return tested.param.name; });

TEST(PemBlock, IsOfACertificateByItsLabel) {
    const auto isCertificate = [](std::string_view label) { return isCertificateBlock({label, 1, {}, {}}); };
    EXPECT_TRUE(isCertificate("CERTIFICATE"));
    EXPECT_TRUE(isCertificate("X509 CERTIFICATE"));
    EXPECT_TRUE(isCertificate("X.509 CERTIFICATE"));
    EXPECT_FALSE(isCertificate("CERTIFICATE REQUEST"));
    EXPECT_FALSE(isCertificate("TRUSTED CERTIFICATE"));
    EXPECT_FALSE(isCertificate(""));
}

}  // namespace
}  // namespace pinwell::trust
