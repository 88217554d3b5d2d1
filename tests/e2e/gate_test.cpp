// Runs of pinwell-gate: samples of a real record service, stapled by the real tool, each spoilt in one way.
#include <filesystem>
#include <functional>
#include <ostream>
#include <stdexcept>

#include "gate_fixture.h"
#include "support/file_properties.h"

namespace pinwell::test {
namespace {

using testing::HasSubstr;
using testing::IsEmpty;
using testing::StartsWith;

class Gate : public GateRun {
  protected:
    /// Samples that no ticket was stapled to.
    std::vector<std::string> freshSamples() const {
        const ProcessResult result = lumora({"sample", directory / "fresh"});
        EXPECT_EQ(result.exitStatus, 0) << result.errors;
        return linesOf(result.output);
    }

    std::string policyFile(std::string_view text) const {
        writeFile(directory / "policy.toml", text);
        return directory / "policy.toml";
    }
};

// Untouched samples.

TEST_F(Gate, AdmitsSignedAndStapledArtefacts) {
    for (const std::string& path : samples)
        for (const char* const how : {"--offline", "--online", "--shallow"})
            EXPECT_THAT(gate({how, path}), Ended(0, testing::ElementsAre(StartsWith(path + ": good."))))
                << how;
}

// Tampering, one fault a row.

/// The offset of a text in a file.
std::size_t placeOf(const std::string& contents, std::string_view text) {
    const std::size_t at = contents.find(text);
    if (at == std::string::npos) throw std::runtime_error("the sample does not hold what is to be spoilt");
    return at;
}

using Spoil = std::function<void(const std::string& path)>;

Spoil byteAt(std::size_t at) {
    return [=](const std::string& path) { flip(path, at); };
}

Spoil byteIn(const std::string& below, std::size_t at) {
    return [=](const std::string& path) { flip(path + "/" + below, at); };
}

Spoil byteBehind(const std::string& text, std::size_t distance) {
    return [=](const std::string& path) { flip(path, placeOf(readFile(path), text) + distance); };
}

constexpr std::size_t kImageTrailer = 512;  // bytes, at the end

Spoil trailerByte(std::size_t at) {
    return [=](const std::string& path) { flip(path, readFile(path).size() - kImageTrailer + at); };
}

/// In the heap of the archive, which begins after header and table of contents.
Spoil heapByte(std::size_t at) {
    return [=](const std::string& path) {
        const std::string contents = readFile(path);
        std::size_t tableLength = 0;
        for (std::size_t i = 8; i < 16; ++i)
            tableLength = tableLength << 8U | static_cast<unsigned char>(contents.at(i));
        flip(path, 28 + tableLength + at);
    };
}

Spoil removed(const std::string& below) {
    return [=](const std::string& path) { std::filesystem::remove_all(path + "/" + below); };
}

Spoil added(const std::string& below) {
    return [=](const std::string& path) { writeFile(path + "/" + below, std::string_view("new\n")); };
}

Spoil renamed(const std::string& from, const std::string& to) {
    return [=](const std::string& path) { std::filesystem::rename(path + "/" + from, path + "/" + to); };
}

Spoil linked(const std::string& below, const std::string& target) {
    return [=](const std::string& path) {
        std::filesystem::remove_all(path + "/" + below);
        makeLink(target, path + "/" + below);
    };
}

Spoil both(const Spoil& first, const Spoil& second) {
    return [=](const std::string& path) {
        first(path);
        second(path);
    };
}

Spoil copied(const std::string& from, const std::string& to) {
    return [=](const std::string& path) {
        std::filesystem::copy_file(path + "/" + from, path + "/" + to,
                                   std::filesystem::copy_options::overwrite_existing);
    };
}

Spoil cutTo(const std::string& below, std::size_t length) {
    return [=](const std::string& path) { std::filesystem::resize_file(path + "/" + below, length); };
}

Spoil shortened() {
    return [](const std::string& path) {
        std::filesystem::resize_file(path, std::filesystem::file_size(path) - 1);
    };
}

Spoil lengthened() {
    return [](const std::string& path) { writeFile(path, std::string_view(readFile(path) + "\n")); };
}

struct Tampering {
    std::string name;
    std::string sample;
    Spoil spoil;
    std::string place;  // a part of the report
};

void PrintTo(const Tampering& row, std::ostream* out) {
    *out << row.name;
}

class TamperedSample : public Gate, public testing::WithParamInterface<Tampering> {};

TEST_P(TamperedSample, EndsWith65AndNamesThePlace) {
    const Tampering& row = GetParam();
    const std::string path = directory / ("samples/" + row.sample);
    row.spoil(path);
    for (const char* const how : {"--offline", "--online"}) {
        const ProcessResult result = gate({how, path});
        EXPECT_EQ(result.exitStatus, 65) << how << "\n" << result.output;
        EXPECT_THAT(result.output, HasSubstr(row.place)) << how;
        EXPECT_THAT(result.errors, IsEmpty()) << how;
    }
}

const std::string kCodeDirectory = "\xfa\xde\x0c\x02";
const std::string kSuperBlob = "\xfa\xde\x0c\xc0";

const std::vector<Tampering> kImageRows{
    {"FirstByteOfTheData", "Sample.dmg", byteAt(0), "page"},
    {"MiddleOfTheData", "Sample.dmg", byteAt(200), "page"},
    {"PropertyListBeginning", "Sample.dmg", byteBehind("<plist", 3), "page"},
    {"PropertyListEnd", "Sample.dmg", byteBehind("</plist>", 7), "page"},
    {"SignatureMagic", "Sample.dmg", byteBehind(kSuperBlob, 3), "signature"},
    {"SignatureLength", "Sample.dmg", byteBehind(kSuperBlob, 7), "signature"},
    {"CodeDirectoryVersion", "Sample.dmg", byteBehind(kCodeDirectory, 11), "stapled ticket"},
    {"CodeDirectoryFlags", "Sample.dmg", byteBehind(kCodeDirectory, 15), "stapled ticket"},
    {"CodeDirectoryCodeLimit", "Sample.dmg", byteBehind(kCodeDirectory, 35), "stapled ticket"},
    {"CodeDirectoryDigest", "Sample.dmg", byteBehind(kCodeDirectory, 120), "stapled ticket"},
    {"TrailerMagic", "Sample.dmg", trailerByte(0), "trailer"},
    {"TrailerVersion", "Sample.dmg", trailerByte(7), "trailer"},
    {"TrailerFlags", "Sample.dmg", trailerByte(15), "special slot"},
    {"TrailerDataOffset", "Sample.dmg", trailerByte(31), "special slot"},
    {"TrailerDataLength", "Sample.dmg", trailerByte(39), "special slot"},
    {"TrailerSegment", "Sample.dmg", trailerByte(70), "special slot"},
    {"TrailerDataChecksum", "Sample.dmg", trailerByte(90), "special slot"},
    {"TrailerSectorCount", "Sample.dmg", trailerByte(499), "special slot"},
    {"TrailerLastByte", "Sample.dmg", trailerByte(511), "special slot"},
    {"OneByteLess", "Sample.dmg", shortened(), "trailer"},
    {"OneByteMore", "Sample.dmg", lengthened(), "trailer"},
    {"UnsignedData", "Unsigned.dmg", byteAt(100), "stapled ticket"},
    {"UnsignedPropertyList", "Unsigned.dmg", byteBehind("<plist", 3), "stapled ticket"},
    {"UnsignedTrailer", "Unsigned.dmg", trailerByte(499), "stapled ticket"},
    {"UnsignedOneByteLess", "Unsigned.dmg", shortened(), "trailer"},
};

// The heap contains the checksum of 20 bytes, the signature, and the files, at the places in the table.
const std::vector<Tampering> kPackageRows{
    {"Magic", "Sample.pkg", byteAt(0), "archive"},
    {"HeaderSize", "Sample.pkg", byteAt(5), "archive"},
    {"TableLength", "Sample.pkg", byteAt(15), "archive"},
    {"TableUnpackedLength", "Sample.pkg", byteAt(23), "archive"},
    {"ChecksumAlgorithm", "Sample.pkg", byteAt(27), ""},
    {"TableBeginning", "Sample.pkg", byteAt(28), "archive"},
    {"TableMiddle", "Sample.pkg", byteAt(1000), "archive"},
    {"TableChecksum", "Sample.pkg", heapByte(0), "table of contents"},
    {"SignatureTag", "Sample.pkg", heapByte(20), "archive-signature"},
    {"SignatureContentType", "Sample.pkg", heapByte(30), "archive-signature"},
    {"PackedFile", "Sample.pkg", heapByte(2288 + 60), "PackageInfo"},
    {"PackedFileFirstByte", "Sample.pkg", heapByte(2288), "PackageInfo"},
    {"PackedFileLastByte", "Sample.pkg", heapByte(2288 + 129), "PackageInfo"},
    {"PlainFileFirstByte", "Sample.pkg", heapByte(2418), "ReadMe.txt"},
    {"PlainFileLastByte", "Sample.pkg", heapByte(2418 + 47), "ReadMe.txt"},
    {"OneByteLess", "Sample.pkg", shortened(), "stapled ticket"},
    {"OneByteMore", "Sample.pkg", lengthened(), "stapled ticket"},
};

const std::string kFramework = "Contents/Frameworks/Greeting.framework";
const std::string kVersion = kFramework + "/Versions/A";

const std::vector<Tampering> kApplicationRows{
    {"UniversalHeader", "Sample.app", byteIn("Contents/Programs/Sample", 7), "Contents/Programs/Sample"},
    {"ExecutablePage", "Sample.app", byteIn("Contents/Programs/Sample", 0x4000 + 200), "page"},
    {"ExecutableGap", "Sample.app", byteIn("Contents/Programs/Sample", 5000), "Contents/Programs/Sample"},
    {"ExecutableCut", "Sample.app", cutTo("Contents/Programs/Sample", 30000), "image-structure"},
    {"ExecutableEmpty", "Sample.app", cutTo("Contents/Programs/Sample", 0), "signature"},
    {"ExecutableRemoved", "Sample.app", removed("Contents/Programs/Sample"), "bundle-structure"},
    {"ExecutableOfAnother", "Sample.app", copied("Contents/Programs/sample-tool", "Contents/Programs/Sample"),
     "Contents/Programs/Sample"},
    {"PropertyList", "Sample.app", byteIn("Contents/Info.plist", 300), "property list"},
    {"PropertyListRemoved", "Sample.app", removed("Contents/Info.plist"), "property list"},
    {"PropertyListWhereAFrameworkHasIt", "Sample.app",
     renamed("Contents/Info.plist", "Contents/Resources/Info.plist"), "property list"},
    {"PropertyListReplacedByLink", "Sample.app",
     both(renamed("Contents/Info.plist", "Contents/Resources/Info.plist"),
          linked("Contents/Info.plist", "Resources/ReadMe.txt")),
     "property list"},
    {"PropertyListReplacedByDirectory", "Sample.app",
     both(renamed("Contents/Info.plist", "Contents/Resources/Info.plist"),
          [](const std::string& path) { std::filesystem::create_directory(path + "/Contents/Info.plist"); }),
     "property list"},
    {"SealByte", "Sample.app", byteIn("Contents/_CodeSignature/CodeResources", 700), "sealed resources"},
    {"SealRemoved", "Sample.app", removed("Contents/_CodeSignature"), "sealed resources"},
    {"ResourceByte", "Sample.app", byteIn("Contents/Resources/ReadMe.txt", 0),
     "Contents/Resources/ReadMe.txt"},
    {"LocalizedResourceByte", "Sample.app", byteIn("Contents/Resources/en.lproj/Greeting.txt", 6),
     "Contents/Resources/en.lproj/Greeting.txt"},
    {"ResourceAdded", "Sample.app", added("Contents/Resources/New.txt"), "Contents/Resources/New.txt"},
    {"FileAddedToContents", "Sample.app", added("Contents/New"), "Contents/New"},
    {"FileAddedBesideContents", "Sample.app", added("Beside"), "unsealed: Beside"},
    {"ProgramAdded", "Sample.app", added("Contents/Programs/new"), "Contents/Programs/new"},
    {"ResourceRemoved", "Sample.app", removed("Contents/Resources/ReadMe.txt"),
     "missing: Contents/Resources/ReadMe.txt"},
    {"ResourceRenamed", "Sample.app",
     renamed("Contents/Resources/ReadMe.txt", "Contents/Resources/Other.txt"),
     "Contents/Resources/Other.txt"},
    {"ResourceReplacedByLink", "Sample.app", linked("Contents/Resources/ReadMe.txt", "../Info.plist"),
     "Contents/Resources/ReadMe.txt"},
    {"LinkElsewhere", "Sample.app", linked("Contents/Resources/Latest.txt", "en.lproj"),
     "Contents/Resources/Latest.txt"},
    {"LinkRemoved", "Sample.app", removed("Contents/Resources/Latest.txt"), "Contents/Resources/Latest.txt"},
    {"NestedToolByte", "Sample.app", byteIn("Contents/Programs/sample-tool", 0x4000 + 200),
     "Contents/Programs/sample-tool"},
    {"NestedToolRemoved", "Sample.app", removed("Contents/Programs/sample-tool"),
     "missing: Contents/Programs/sample-tool"},
    {"NestedToolOfAnother", "Sample.app", copied("Contents/Programs/Sample", "Contents/Programs/sample-tool"),
     "Contents/Programs/sample-tool"},
    {"FrameworkByte", "Sample.app", byteIn(kVersion + "/Greeting", 0x4000 + 200), kFramework},
    {"FrameworkPropertyList", "Sample.app", byteIn(kVersion + "/Resources/Info.plist", 300), kFramework},
    {"FrameworkResource", "Sample.app", byteIn(kVersion + "/Resources/Greeting.txt", 0), "Greeting.txt"},
    {"FrameworkResourceAdded", "Sample.app", added(kVersion + "/Resources/New.txt"), "New.txt"},
    {"FrameworkSeal", "Sample.app", byteIn(kVersion + "/_CodeSignature/CodeResources", 700), kFramework},
    {"FrameworkVersionElsewhere", "Sample.app", linked(kFramework + "/Versions/Current", "B"), kFramework},
    {"FrameworkRemoved", "Sample.app", removed("Contents/Frameworks"), "missing: " + kFramework},
    {"TicketByte", "Sample.app", byteIn("Contents/CodeResources", 100), "stapled ticket"},
    {"TicketRemoved", "Sample.app", removed("Contents/CodeResources"), "ticket-stapled"},
};

const auto kNameOfRow = [](const testing::TestParamInfo<Tampering>& info) { return info.param.name; };

INSTANTIATE_TEST_SUITE_P(Image, TamperedSample, testing::ValuesIn(kImageRows), kNameOfRow);
INSTANTIATE_TEST_SUITE_P(Package, TamperedSample, testing::ValuesIn(kPackageRows), kNameOfRow);
INSTANTIATE_TEST_SUITE_P(Application, TamperedSample, testing::ValuesIn(kApplicationRows), kNameOfRow);

// Tickets.

TEST_F(Gate, EndsWith65WithoutATicket) {
    const std::vector<std::string> fresh = freshSamples();
    ASSERT_EQ(fresh.size(), 4U);
    for (const std::string& path : fresh) {
        const ProcessResult result = gate({"--offline", path});
        EXPECT_EQ(result.exitStatus, 65) << path;
        EXPECT_THAT(result.output, HasSubstr("No ticket is stapled to it.")) << path;
    }
}

TEST_F(Gate, EndsWith77OnlineForARevokedArtefact) {
    serveRecords();
    for (const std::string& path : samples) {
        record("revoke", {path});
        EXPECT_EQ(gate({"--offline", path}).exitStatus, 0) << path;
        const ProcessResult result = gate({"--online", path});
        EXPECT_EQ(result.exitStatus, 77) << path;
        EXPECT_THAT(result.output, StartsWith(path + ": revoked.")) << path;
    }
}

TEST_F(Gate, EndsWith68IfTheServiceCannotBeReached) {
    serveRecords();
    stopService();
    for (const std::string& path : samples) {
        EXPECT_EQ(gate({"--online", path}).exitStatus, 68) << path;
        EXPECT_EQ(gate({"--offline", path}).exitStatus, 0) << path;
    }
}

// Usage and policy.

TEST_F(Gate, EndsWith64ForWrongUsage) {
    for (const std::vector<std::string>& arguments :
         std::vector<std::vector<std::string>>{{},
                                               {"--nonsense", image()},
                                               {"--format", "morse", image()},
                                               {"--online", "--offline", image()}}) {
        const ProcessResult result = gate(arguments);
        EXPECT_EQ(result.exitStatus, 64);
        EXPECT_THAT(result.output, IsEmpty());
        EXPECT_THAT(result.errors, StartsWith("pinwell-gate: "));
    }
}

TEST_F(Gate, EndsWith78ForAPolicyThatIsWrongAndNamesTheLine) {
    for (const char* const text : {"require-team = \"A\"\nmax-ticket-age = 4\n", "\nmax-age = \"4d\"\n",
                                   "\nrequire-team =\n", "\nrequire-team = []\n"}) {
        const std::string file = policyFile(text);
        const ProcessResult result = gate({"--policy", file, image()});
        EXPECT_EQ(result.exitStatus, 78) << text;
        EXPECT_THAT(result.errors, StartsWith("pinwell-gate: " + file + ":2: ")) << text;
        EXPECT_THAT(result.output, IsEmpty()) << text;
    }
}

TEST_F(Gate, EndsWith65IfThePolicyRefuses) {
    for (const std::vector<std::string>& policy :
         std::vector<std::vector<std::string>>{{"--require-team", "NOSUCHTEAM"},
                                               {"--require-identifier", "org.example.other.*"},
                                               {"--require-secure-timestamp"},
                                               {"--policy", policyFile("require-team = \"NOSUCHTEAM\"\n")}}) {
        std::vector<std::string> arguments = policy;
        arguments.insert(arguments.end(), {"--offline", application()});
        const ProcessResult result = gate(arguments);
        EXPECT_EQ(result.exitStatus, 65) << policy.front();
        EXPECT_THAT(result.output, HasSubstr("The policy does not admit it.")) << policy.front();
    }
    EXPECT_EQ(gate({"--max-ticket-age", "1d", "--offline", application()}).exitStatus, 0);
}

// Several paths.

TEST_F(Gate, JudgesEveryArtefactOfADirectory) {
    const std::string below = directory / "samples";
    EXPECT_THAT(gate({"--offline", "--recursive", below}), Ended(0, testing::SizeIs(samples.size())));
    EXPECT_EQ(gate({"--offline", below}).exitStatus, 66);
    flip(unsignedImage(), 100);
    EXPECT_EQ(gate({"--offline", "-r", below}).exitStatus, 65);
    std::filesystem::create_directories(directory / "nothing");
    EXPECT_EQ(gate({"--offline", "-r", directory / "nothing"}).exitStatus, 66);
}

TEST_F(Gate, EndsWith66ForAFileThatIsNoArtefact) {
    writeFile(directory / "text", std::string_view("text\n"));
    EXPECT_EQ(gate({"--offline", directory / "text"}).exitStatus, 66);
    EXPECT_EQ(gate({"--offline", directory / "missing"}).exitStatus, 66);
    makeLink(image(), directory / "link.dmg");
    const ProcessResult link = gate({"--offline", directory / "link.dmg"});
    EXPECT_EQ(link.exitStatus, 66);
    EXPECT_THAT(link.output, HasSubstr("This is a symbolic link; what it leads to must be named."));
}

TEST_F(Gate, OfSeveralPathsTheWorstDecides) {
    serveRecords();
    record("revoke", {package()});
    flip(unsignedImage(), 100);
    const std::string missing = directory / "missing";
    EXPECT_EQ(gate({"--online", image(), missing, unsignedImage(), package()}).exitStatus, 77);
    EXPECT_EQ(gate({"--online", image(), missing, unsignedImage()}).exitStatus, 65);
    EXPECT_EQ(gate({"--online", image(), missing}).exitStatus, 66);
    EXPECT_EQ(gate({"--online", image(), application()}).exitStatus, 0);
    stopService();
    EXPECT_EQ(gate({"--online", image(), missing, unsignedImage()}).exitStatus, 65);
    EXPECT_EQ(gate({"--online", missing, image()}).exitStatus, 66);
    EXPECT_EQ(gate({"--online", image()}).exitStatus, 68);
}

}  // namespace
}  // namespace pinwell::test
