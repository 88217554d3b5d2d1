// Every byte of an artefact of each kind, changed by itself; after an edit, one byte in seven. This file
// lists the changes that a run does not notice. docs/deep-verification.md gives the reasons.
#include <gmock/gmock.h>

#include <filesystem>
#include <fstream>
#include <functional>

#include "base/byte_source.h"
#include "base/text.h"
#include "gate_fixture.h"
#include "lumora-local/samples.h"
#include "support/code_directory_builder.h"
#include "support/executable_image_builder.h"
#include "support/signed_image.h"
#include "verify/code.h"

namespace pinwell::test {
namespace {

using base::MemorySource;
using testing::IsEmpty;
using verify::Section;
using verify::VerifiedCode;
using verify::Workers;

constexpr values::Date kNow{1'795'204'500};

/// Another bit in each of eight bytes, so that no field changes only in its sign or its parity.
std::byte maskAt(std::size_t at) {
    return std::byte{1} << (at % 8);
}

using Verification = std::function<VerifiedCode(const MemorySource&, Workers&, Section&)>;

bool isCaught(const Data& bytes, const Verification& verification) {
    static Workers workers(1);
    Section section;
    const VerifiedCode code = verification(MemorySource(bytes), workers, section);
    return code.isSigned && worstOutcome(section) == verify::Outcome::failed;
}

/// The parameter is the distance between the bytes that are changed.
class EveryByte : public GateTest, public testing::WithParamInterface<std::size_t> {
  protected:
    /// The places in `file` where a change does not give 65, a line each: "OFFSET: STATUS". Deep verification
    /// alone finds most changes, in memory; a whole run over `artefact` finds the rest.
    std::vector<std::string> survivors(const std::string& artefact, const std::string& file,
                                       const Verification& verification = {}) const {
        EXPECT_EQ(exitStatusFor(artefact), 0);
        Data bytes = base::toData(readFile(file));
        std::vector<std::string> found;
        for (std::size_t at = 0; at < bytes.size(); at += GetParam()) {
            bytes[at] ^= maskAt(at);
            if (!verification || !isCaught(bytes, verification)) {
                putByte(file, at, bytes[at]);
                const int status = exitStatusFor(artefact);
                if (status != 65) found.push_back(std::to_string(at) + ": " + std::to_string(status));
                putByte(file, at, bytes[at] ^ maskAt(at));
            }
            bytes[at] ^= maskAt(at);
        }
        EXPECT_EQ(exitStatusFor(artefact), 0);
        return found;
    }

  private:
    static void putByte(const std::string& path, std::size_t at, std::byte value) {
        std::fstream file(path, std::ios::binary | std::ios::in | std::ios::out);
        file.seekp(static_cast<std::streamoff>(at));
        file.put(static_cast<char>(value));
        file.close();
        ASSERT_TRUE(file.good()) << path;
    }
};

VerifiedCode verifyImageBytes(const MemorySource& source, Workers& workers, Section& section) {
    return verify::verifyDiskImage(source, workers, section);
}

TEST_P(EveryByte, OfASignedDiskImageCounts) {
    const std::string path = stapled("Sample.dmg", lumora::makeDiskImage(lumora::ImageSignature::adHoc));
    EXPECT_THAT(survivors(path, path, verifyImageBytes), IsEmpty());
}

TEST_P(EveryByte, OfAnUnsignedDiskImageCounts) {
    const std::string path = stapled("Unsigned.dmg", lumora::makeDiskImage(lumora::ImageSignature::none));
    EXPECT_THAT(survivors(path, path, verifyImageBytes), IsEmpty());
}

TEST_P(EveryByte, OfAPackageCounts) {
    const std::string path = stapled("Sample.pkg", lumora::makePackage(kNow));
    EXPECT_THAT(survivors(path, path, verify::verifyPackage), IsEmpty());
}

class EveryByteOfCode : public EveryByte {
  protected:
    /// Writes a bundle around an executable, with one sealed file, and staples it.
    void writeBundle(const Data& image) const {
        writeFile(bundle + "/Contents/Info.plist", list);
        writeFile(bundle + "/Contents/_CodeSignature/CodeResources", seal);
        writeFile(bundle + "/Contents/Resources/text", text);
        writeFile(executable, image);
        std::filesystem::permissions(executable, std::filesystem::perms::owner_all);
        staple(bundle);
    }

    std::vector<std::string> survivorsIn(const Data& image) const {
        writeBundle(image);
        const verify::OutsideComponents outside{{1, {.bytes = &list}}, {3, {.bytes = &seal}}};
        return survivors(bundle, executable,
                         [&](const MemorySource& source, Workers& workers, Section& section) {
                             return verifyExecutable(source, outside, "executable", workers, section);
                         });
    }
    std::vector<std::string> survivorsIn(SignedImageParts parts) const {
        return survivorsIn(signedImageOf(covering(std::move(parts))));
    }

    SignedImageParts covering(SignedImageParts parts) const {
        parts.outside = {{1, list}, {3, seal}};
        return parts;
    }

    const std::string bundle = directory / "Sample.app";
    const std::string executable = bundle + "/Contents/Programs/Sample";
    const Data text = base::toData("text\n");
    const Data list = base::toData(
        "<plist version=\"1.0\"><dict><key>CFBundleExecutable</key><string>Sample</string></dict></plist>");
    const Data seal = base::toData(
        "<plist version=\"1.0\"><dict><key>files2</key><dict><key>Resources/text"
        "</key><dict><key>hash2</key><data>" +
        base::encodeBase64(codeDigest(2, text)) +
        "</data></dict></dict><key>rules2</key><dict/></dict></plist>");
};

TEST_P(EveryByteOfCode, OfAnAdHocExecutableCounts) {
    EXPECT_THAT(survivorsIn({.components = {{5, makeBlob(0xFADE7171, Data(20))}}}), IsEmpty());
}

TEST_P(EveryByteOfCode, OfAllCodeDirectoriesCounts) {
    EXPECT_THAT(survivorsIn({.digestTypes = {1, 2, 4}, .team = "TEAM42"}), IsEmpty());
}

TEST_P(EveryByteOfCode, OfAUniversalExecutableCounts) {
    SignedImageParts intel = covering({});
    intel.cpuType = kSampleX86;
    EXPECT_THAT(survivorsIn(UniversalImageBuilder()
                                .slice(kSampleX86, signedImageOf(intel))
                                .slice(kSampleArm, signedImageOf(covering({})))
                                .build()),
                IsEmpty());
}

TEST_P(EveryByteOfCode, OfEveryOtherFileOfABundleCounts) {
    writeBundle(signedImageOf(covering({})));
    for (const char* const file :
         {"Info.plist", "_CodeSignature/CodeResources", "CodeResources", "Resources/text"})
        EXPECT_THAT(survivors(bundle, bundle + "/Contents/" + file), IsEmpty()) << file;
}

/// The subject's place in self-signed certificates. With another subject than issuer, and without a key
/// identifier, they are like any certificate whose issuer is missing.
class SelfSigned : public EveryByteOfCode {
  protected:
    /// The survivors outside these places.
    std::vector<std::string> outsideOfSubjects(const std::vector<std::string>& found) const {
        constexpr std::string_view kSubject = "Test signer";
        constexpr std::size_t kAround = 6;  // its type, and its first bytes
        const std::string contents = readFile(executable);
        std::vector<std::string> others;
        for (const std::string& one : found) {
            const std::size_t at = std::stoul(one);
            const std::size_t end = contents.find(kSubject, at - std::min(at, kSubject.size() - 1));
            const bool isInside = end != std::string::npos && at + kAround >= end;
            if (!isInside || !one.ends_with(": 0")) others.push_back(one);
        }
        return others;
    }
};

TEST_P(SelfSigned, AllOfASignersMessageCountsButTheSubject) {
    EXPECT_THAT(outsideOfSubjects(survivorsIn({.digestTypes = {1, 2}, .hasSigner = true})), IsEmpty());
}

TEST_P(SelfSigned, AllOfATimeStampCountsButTheSubject) {
    EXPECT_THAT(outsideOfSubjects(survivorsIn({.hasSigner = true, .hasTimestamp = true})), IsEmpty());
}

// Odd, so that each bit is changed somewhere.
constexpr std::size_t kOneInSeven = 7;

INSTANTIATE_TEST_SUITE_P(All, EveryByte, testing::Values(1));
INSTANTIATE_TEST_SUITE_P(All, EveryByteOfCode, testing::Values(1));
INSTANTIATE_TEST_SUITE_P(All, SelfSigned, testing::Values(1));
INSTANTIATE_TEST_SUITE_P(OneInSeven, EveryByte, testing::Values(kOneInSeven));
INSTANTIATE_TEST_SUITE_P(OneInSeven, EveryByteOfCode, testing::Values(kOneInSeven));
INSTANTIATE_TEST_SUITE_P(OneInSeven, SelfSigned, testing::Values(kOneInSeven));

}  // namespace
}  // namespace pinwell::test
