// The samples, for the tool and for other readers of their formats, before and after a staple.
#include <filesystem>

#include "local_service.h"
#include "support/file_properties.h"

namespace pinwell::test {
namespace {

using testing::AllOf;
using testing::Contains;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::Not;
using testing::StartsWith;

constexpr const char* kDataBehindTheArchive = "There are data after the end of archive";

class Sample : public LocalServiceTest {
  protected:
    /// The output of another program, found in the search path. It must succeed, and may warn only of a
    /// ticket after an archive, which really is data after the archive's end.
    ProcessResult tool(const std::string& name, std::vector<std::string> arguments) const {
        arguments.insert(arguments.begin(), name);
        const ProcessResult result = runProcess({.executable = "/usr/bin/env",
                                                 .arguments = std::move(arguments),
                                                 .environment = {{"PATH", "/usr/bin:/bin"}, {"LC_ALL", "C"}},
                                                 .workingDirectory = directory.path()});
        EXPECT_EQ(result.exitStatus, 0) << name << ": " << result.output << result.errors;
        const std::vector<std::string> lines = linesOf(result.output + result.errors);
        for (std::size_t i = 0; i + 1 < lines.size(); ++i) {
            if (lines[i].starts_with("WARNING")) {
                EXPECT_EQ(lines[i + 1], kDataBehindTheArchive) << name;
            }
        }
        return result;
    }

    void stapleWithATicketOfItsOwn(const std::string& path) {
        record("issue", {path});
        if (serving == nullptr) serveRecords();
        const std::string processing = "Processing: " + path;
        ASSERT_THAT(pinwell({"staple", path}), Ended(0, ElementsAre(processing, processing, kWorked)));
    }

    /// The package can be listed, tested and unpacked, into directories of these readers and this name.
    void isReadByOthers(const std::string& when) const {
        EXPECT_THAT(tool("7z", {"l", package()}).output,
                    AllOf(HasSubstr("PackageInfo"), HasSubstr("ReadMe.txt")));
        EXPECT_THAT(tool("7z", {"t", package()}).output, HasSubstr("Everything is Ok"));
        EXPECT_THAT(linesOf(tool("bsdtar", {"-tf", package()}).output),
                    ElementsAre("PackageInfo", "ReadMe.txt"));
        const std::string by7z = "7z-" + when;
        const std::string byBsdtar = "bsdtar-" + when;
        std::filesystem::create_directory(directory / by7z);
        std::filesystem::create_directory(directory / byBsdtar);
        tool("7z", {"x", "-o" + by7z, package()});
        tool("bsdtar", {"-x", "-C", byBsdtar, "-f", package()});
        for (const char* const name : {"/PackageInfo", "/ReadMe.txt"})
            EXPECT_EQ(readFile(directory / (by7z + name)), readFile(directory / (byBsdtar + name)));
        EXPECT_EQ(readFile(directory / (by7z + "/ReadMe.txt")),
                  "A sample package, to try a record service with.\n");
    }

    const std::string& signedImage() const { return samples.at(1); }
    const std::string& unsignedImage() const { return samples.at(2); }
    const std::string& package() const { return samples.at(3); }
};

TEST_F(Sample, ExistsForEveryKindOfArtefact) {
    const std::string in = directory / "samples/";
    EXPECT_THAT(samples,
                ElementsAre(in + "Sample.app", in + "Sample.dmg", in + "Unsigned.dmg", in + "Sample.pkg"));
}

TEST_F(Sample, GetsATicketAndThenARevokedOne) {
    record("issue", samples);
    serveRecords();
    for (const std::string& path : samples) {
        const std::string name = std::filesystem::path(path).filename();
        const std::string processing = "Processing: " + path;
        EXPECT_THAT(pinwell({"validate", path}),
                    Ended(65, ElementsAre(processing, name + " does not have a ticket stapled to it.")));
        EXPECT_THAT(pinwell({"staple", path}), Ended(0, ElementsAre(processing, processing, kWorked)));
        EXPECT_THAT(pinwell({"validate", path}), Ended(0, ElementsAre(processing, kValidated)));
        record("revoke", {path});
        EXPECT_THAT(pinwell({"validate", path}),
                    Ended(77, ElementsAre(processing, "Could not validate ticket for " + path,
                                          "The ticket for " + name +
                                              " has been revoked. Tollmark will prevent it from running.")));
    }
}

TEST_F(Sample, IsStapledAgainWithATicketThatIsDeliveredAsAnAsset) {
    for (const std::string& path : samples) {
        stapleWithATicketOfItsOwn(path);
        const std::string processing = "Processing: " + path;
        record("issue", {path, "--asset"});
        EXPECT_THAT(pinwell({"staple", "-v", path}),
                    Ended(0, Contains(StartsWith("URL of large ticket asset: https://127.0.0.1:"))));
        EXPECT_THAT(pinwell({"validate", path}), Ended(0, ElementsAre(processing, kValidated)));
    }
}

TEST_F(Sample, IsAnImageForOtherReadersBeforeAndAfter) {
    for (const std::string& path : {signedImage(), unsignedImage()}) {
        const std::string before = readFile(path);
        const std::size_t dataEnd = before.find("</plist>");  // a code signature would follow here
        ASSERT_NE(dataEnd, std::string::npos);
        EXPECT_THAT(tool("7z", {"l", path}).output, HasSubstr("README.TXT"));
        EXPECT_THAT(tool("7z", {"t", path}).output,
                    AllOf(HasSubstr("Everything is Ok"), Not(HasSubstr("WARNING"))));
        tool("dmg2img", {path, "before.img"});

        stapleWithATicketOfItsOwn(path);
        const std::string after = readFile(path);
        EXPECT_GT(after.size(), before.size());
        EXPECT_EQ(after.substr(0, dataEnd), before.substr(0, dataEnd));
        EXPECT_THAT(tool("7z", {"l", path}).output, HasSubstr("README.TXT"));
        EXPECT_THAT(tool("7z", {"t", path}).output,
                    AllOf(HasSubstr("Everything is Ok"), Not(HasSubstr("WARNING"))));
        tool("dmg2img", {path, "after.img"});
        EXPECT_EQ(readFile(directory / "after.img"), readFile(directory / "before.img"));
        EXPECT_EQ(readFile(directory / "after.img").size(), 256U * 512U);
    }
}

TEST_F(Sample, IsAPackageForOtherReadersBeforeAndAfter) {
    const std::string before = readFile(package());
    EXPECT_THAT(tool("7z", {"t", package()}).output, Not(HasSubstr(kDataBehindTheArchive)));
    isReadByOthers("before");

    stapleWithATicketOfItsOwn(package());
    const std::string after = readFile(package());
    EXPECT_GT(after.size(), before.size());
    EXPECT_EQ(after.substr(0, before.size()), before);
    isReadByOthers("after");
}

TEST_F(Sample, IsAPackageWithASignatureThatVerifies) {
    // The checksum is first in the heap and the signature follows it, both at the places in the table of
    // contents.
    const std::string contents = readFile(package());
    const auto at = [&](std::size_t offset) {
        return std::to_integer<unsigned>(std::byte(contents[offset]));
    };
    std::size_t heap = 28;
    for (std::size_t i = 8, length = 0; i < 16; ++i) {
        length = length << 8U | at(i);
        if (i == 15) heap += length;
    }
    tool("7z", {"x", package(), "[TOC].xml"});
    const std::string table = readFile(directory / "[TOC].xml");
    const std::string opening = R"(<signature style="CMS"><offset>20</offset><size>)";
    const std::size_t found = table.find(opening);
    ASSERT_NE(found, std::string::npos) << table;
    const std::size_t size = std::stoul(table.substr(found + opening.size()));
    writeFile(directory / "checksum", contents.substr(heap, 20));
    writeFile(directory / "signature", contents.substr(heap + 20, size));
    tool("openssl", {"cms", "-verify", "-inform", "DER", "-in", "signature", "-content", "checksum",
                     "-binary", "-noverify", "-out", "/dev/null"});
    writeFile(directory / "checksum", std::string(20, 'x'));
    EXPECT_NE(runProcess({.executable = "/usr/bin/openssl",
                          .arguments = {"cms", "-verify", "-inform", "DER", "-in", "signature", "-content",
                                        "checksum", "-binary", "-noverify", "-out", "/dev/null"},
                          .workingDirectory = directory.path()})
                  .exitStatus,
              0);
}

}  // namespace
}  // namespace pinwell::test
