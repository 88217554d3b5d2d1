// A disk image: its trailer and superblob, read by the tool and by the code-signing service, and a ticket
// stapled to it.
#include <algorithm>
#include <filesystem>

#include "codesign/code_signing.h"
#include "src/PWHashedFile/PWHashedDiskImage.h"
#include "support/test_platform.h"
#include "target.h"

namespace pinwell::fuzz {
namespace {

struct Scene {
    Scene() { std::filesystem::create_directory(platform.directory / "tmp"); }

    test::TestPlatform platform;
    std::unique_ptr<codesign::CodeSigningService> codeSigning = codesign::makeCodeSigningService();
    Platform services = platform.servicesWith(*codeSigning);
};

void examineLayout(const PWHashedDiskImage& image, ByteView input) {
    require(image.origEOF() == input.size(), "the end of the file is known");
    require(image.endOfDMGData() <= input.size() - kUDIFHeaderSize, "the data end before the trailer");
    require(image.blobs().size() == image.numBlobs(), "all blobs are there");
    if (image.syntheticCDHash()) return;
    require(image.csStart() + image.csLength() == input.size() - kUDIFHeaderSize,
            "the signature ends at the trailer");
    require(std::ranges::equal(image.superblob(), input.subspan(image.csStart(), image.csLength())),
            "the superblob is what stands there");
}

void examineStapling(Scene& scene, PWHashedDiskImage& image, ByteView input) {
    const Data ticket = base::toData("a new ticket");
    const auto source = scene.platform.directory.url("ticket");
    const auto target = scene.platform.directory.url("Sample.dmg");
    test::writeFile(source.path(), ByteView(ticket));
    std::optional<Error> error;
    if (!image._writeNewTicketDataFromURL(source, target, false, &error)) return;

    PWHashedDiskImage stapled(target, scene.services);
    require(stapled.appropriateExitCode() == kExitOK, "a stapled image is one still");
    const auto found = stapled._ticketData();
    require(found && *found == ticket, "a stapled ticket reads back");
    require(stapled.endOfDMGData() == image.endOfDMGData(), "the data end where they did");
    const std::string after = test::readFile(target.path());
    require(std::ranges::equal(base::asBytes(after).first(image.endOfDMGData()),
                               input.first(image.endOfDMGData())),
            "the data are what they were");
}

}  // namespace

void examine(ByteView input) {
    discardMessages();
    Scene scene;
    const auto url = scene.platform.directory.url("Sample.dmg");
    test::writeFile(url.path(), input);
    PWHashedDiskImage image(url, scene.services);
    static_cast<void>(image._cdHash());
    if (image.appropriateExitCode() != kExitOK) return;
    examineLayout(image, input);
    static_cast<void>(image._ticketData());
    require(scene.platform.files.changes().empty(), "reading writes nothing");
    examineStapling(scene, image, input);
}

}  // namespace pinwell::fuzz
