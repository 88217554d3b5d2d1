// A small signed application to try the service with. In Sample.app/Contents:
//
//   Info.plist
//   Programs/Sample                 the executable; any one directory in Contents would do
//   Programs/sample-tool            a nested program
//   Frameworks/Greeting.framework   a nested framework of one version, with links, a seal and resources
//   Resources/                      ReadMe.txt; Latest.txt, a link to it; en.lproj/Greeting.txt (optional)
//   _CodeSignature/CodeResources    the seal of all these (ad_hoc_signature.h)
//
// The executables are universal images of two slices, each signed ad hoc (ad_hoc_signature.h).
#include <map>

#include "ad_hoc_signature.h"
#include "base/byte_io.h"
#include "file_writing.h"
#include "formats/executable_image.h"
#include "samples.h"
#include "values/format.h"
#include "values/value.h"

namespace pinwell::lumora {
namespace {

using base::ByteView;
using base::ByteWriter;
using base::Data;

constexpr std::string_view kName = "Sample";
constexpr std::string_view kBundleIdentifier = "example.lumora.sample";
constexpr std::string_view kFramework = "Greeting";
constexpr std::string_view kTool = "sample-tool";
constexpr std::string_view kApplicationReadMe = "A sample application, to try a record service with.\n";
constexpr std::string_view kGreeting = "Hello.\n";

// Executable image. The text segment is one alignment unit long; the signature follows it.
constexpr std::uint32_t kNoUndefinedSymbols = 1;
constexpr std::uint32_t kCommandMain = 0x80000028;
constexpr std::uint32_t kSegmentCommandSize = 72;
constexpr std::uint32_t kSectionSize = 80;
constexpr std::uint32_t kMainCommandSize = 24;
constexpr std::uint32_t kCommandsSize =
    2 * kSegmentCommandSize + kSectionSize + kMainCommandSize + kSignatureCommandSize;
constexpr std::uint32_t kInstructions = 0x80000400;  // section flags: only code
constexpr unsigned kAlignmentBits = 14;
constexpr std::uint32_t kAlignment = 1U << kAlignmentBits;
constexpr std::uint64_t kLoadAddress = 0x100000000;

/// "return 0" for each processor.
Data program(std::uint32_t cpuType) {
    ByteWriter code;
    if (cpuType == kCpuType64Arm) {
        code.le32(0x52800000).le32(0xD65F03C0);  // mov w0, #0; ret
    } else {
        code.be16(0x31C0).u8(0xC3);  // xor eax, eax; ret
    }
    return std::move(code).take();
}

void appendName(ByteWriter& writer, std::string_view name) {
    writer.text(name).zeros(16 - name.size());
}

struct Segment {
    std::string_view name;
    std::uint64_t offset;
    std::uint64_t fileSize;
    std::uint32_t protection;
    std::uint32_t sections;
};

void appendSegment(ByteWriter& image, const Segment& segment) {
    image.le32(kLoadCommandSegment64).le32(kSegmentCommandSize + segment.sections * kSectionSize);
    appendName(image, segment.name);
    image.le64(kLoadAddress + segment.offset)
        .le64(kAlignment)
        .le64(segment.offset)
        .le64(segment.fileSize)
        .le32(segment.protection)
        .le32(segment.protection)
        .le32(segment.sections)
        .le32(0);
}

/// Header, commands and code: the bytes under the page hashes.
Data textSegment(std::uint32_t cpuType, std::uint32_t signatureSize) {
    const Data code = program(cpuType);
    const std::uint32_t codeOffset = std::uint32_t{kImageHeaderSize64} + kCommandsSize;
    constexpr std::uint32_t kReadExecute = 5;
    constexpr std::uint32_t kRead = 1;

    ByteWriter image;
    image.le32(kImageMagic64)
        .le32(cpuType)
        .le32(cpuType == kCpuType64X86 ? 3 : 0)  // subtype: every processor of the type
        .le32(kFileTypeExecutable)
        .le32(4)
        .le32(kCommandsSize)
        .le32(kNoUndefinedSymbols)
        .le32(0);
    appendSegment(image, {"__TEXT", 0, kAlignment, kReadExecute, 1});
    appendName(image, "__text");
    appendName(image, "__TEXT");
    image.le64(kLoadAddress + codeOffset).le64(code.size()).le32(codeOffset).le32(2).le32(0).le32(0);
    image.le32(kInstructions).zeros(12);
    appendSegment(image, {"__LINKEDIT", kAlignment, signatureSize, kRead, 0});
    image.le32(kCommandMain).le32(kMainCommandSize).le64(codeOffset).le64(0);
    image.le32(kLoadCommandSignature).le32(kSignatureCommandSize).le32(kAlignment).le32(signatureSize);
    image.bytes(code).zeros(kAlignment - image.size());
    return std::move(image).take();
}

}  // namespace

namespace {

struct SignedImage {
    Data bytes;
    Data codeHash;
};

SignedImage signedImage(std::uint32_t cpuType, const std::string& identifier,
                        const SealedComponents& components) {
    std::map<std::uint32_t, Data> slots;
    if (!components.informationPropertyList.empty()) slots.emplace(1, components.informationPropertyList);
    if (!components.resourceSeal.empty()) slots.emplace(3, components.resourceSeal);
    const auto signatureOf = [&](ByteView code) {
        return AdHocSignature{
            .identifier = identifier, .code = code, .components = slots, .isMainProgram = true};
    };
    // The load command gives the signature's length, and its digests cover the load command.
    const Data placeholder(kAlignment);
    const std::size_t size = signatureOf(placeholder).superblob().size();
    Data image = textSegment(cpuType, static_cast<std::uint32_t>(size));
    const AdHocSignature signature = signatureOf(image);
    const Data superblob = signature.superblob();
    Data codeHash = signature.codeHash();
    base::append(image, superblob);
    return {std::move(image), std::move(codeHash)};
}

}  // namespace

Data makeSignedImage(std::uint32_t cpuType, const std::string& identifier,
                     const SealedComponents& components) {
    return signedImage(cpuType, identifier, components).bytes;
}

Data makeUniversalImage(const std::vector<std::pair<std::uint32_t, Data>>& slices) {
    ByteWriter header;
    ByteWriter contents;  // from the first slice on
    header.be32(kUniversalMagic32).be32(static_cast<std::uint32_t>(slices.size()));
    for (const auto& [cpuType, slice] : slices) {
        header.be32(cpuType)
            .be32(cpuType == kCpuType64X86 ? 3 : 0)
            .be32(static_cast<std::uint32_t>(kAlignment + contents.size()))
            .be32(static_cast<std::uint32_t>(slice.size()))
            .be32(kAlignmentBits);
        contents.bytes(slice);
        if (&slice != &slices.back().second)
            contents.zeros((kAlignment - slice.size() % kAlignment) % kAlignment);
    }
    header.zeros(kAlignment - header.size()).bytes(contents.data());
    return std::move(header).take();
}

namespace {

/// A universal image of a slice for each processor.
struct Program {
    Data image;
    std::vector<Data> codeHashes;  // the first is the hash of the slice that identifies the code
};

Program makeProgram(const std::string& identifier, const SealedComponents& components) {
    SignedImage intel = signedImage(kCpuType64X86, identifier, components);
    SignedImage arm = signedImage(kCpuType64Arm, identifier, components);
    return {makeUniversalImage({{kCpuType64X86, intel.bytes}, {kCpuType64Arm, arm.bytes}}),
            {arm.codeHash, intel.codeHash}};
}

Data information(const std::string& name, const std::string& identifier, const char* type) {
    return propertyListDocument({{"CFBundleExecutable", name},
                                 {"CFBundleIdentifier", identifier},
                                 {"CFBundleName", name},
                                 {"CFBundlePackageType", type},
                                 {"CFBundleVersion", "1"}});
}

/// Writes the framework, and adds it to the seal of its bundle.
void writeFramework(const std::string& frameworks, ResourceSeal& outer) {
    const std::string name(kFramework);
    const std::string identifier = std::string(kBundleIdentifier) + ".greeting";
    const Data list = information(name, identifier, "FMWK");
    ResourceSeal seal;
    seal.addFile("Resources/Info.plist", list);
    seal.addFile("Resources/Greeting.txt", base::asBytes(kGreeting));
    const SealedComponents components{.informationPropertyList = list, .resourceSeal = seal.document()};
    const Program program = makeProgram(identifier, components);
    outer.addNestedCode("Frameworks/" + name + ".framework", program.codeHashes);

    const std::string framework = frameworks + "/" + name + ".framework";
    const std::string version = framework + "/Versions/A";
    for (const std::string& directory :
         {framework, framework + "/Versions", version, version + "/Resources", version + "/_CodeSignature"})
        makeDirectory(directory, kPublicDirectoryMode);
    writeNewFile(version + "/" + name, program.image, kProgramFileMode);
    writeNewFile(version + "/Resources/Info.plist", list, kPublicFileMode);
    writeNewFile(version + "/Resources/Greeting.txt", base::asBytes(kGreeting), kPublicFileMode);
    writeNewFile(version + "/_CodeSignature/CodeResources", components.resourceSeal, kPublicFileMode);
    makeLink(framework + "/Versions/Current", "A");
    for (const std::string& entry : {name, std::string("Resources")})
        makeLink(framework + "/" + entry, "Versions/Current/" + entry);
}

void writeResources(const std::string& resources, ResourceSeal& seal) {
    makeDirectory(resources, kPublicDirectoryMode);
    makeDirectory(resources + "/en.lproj", kPublicDirectoryMode);
    writeNewFile(resources + "/ReadMe.txt", base::asBytes(kApplicationReadMe), kPublicFileMode);
    writeNewFile(resources + "/en.lproj/Greeting.txt", base::asBytes(kGreeting), kPublicFileMode);
    makeLink(resources + "/Latest.txt", "ReadMe.txt");
    seal.addFile("Resources/ReadMe.txt", base::asBytes(kApplicationReadMe));
    seal.addOptionalFile("Resources/en.lproj/Greeting.txt", base::asBytes(kGreeting));
    seal.addLink("Resources/Latest.txt", "ReadMe.txt");
}

void writeTool(const std::string& programs, ResourceSeal& seal) {
    const std::string name(kTool);
    const Program program = makeProgram(std::string(kBundleIdentifier) + ".tool", {});
    writeNewFile(programs + "/" + name, program.image, kProgramFileMode);
    seal.addNestedCode("Programs/" + name, program.codeHashes);
}

}  // namespace

std::string writeSampleApplication(const std::string& directory) {
    const std::string name(kName);
    const std::string identifier(kBundleIdentifier);
    std::string path = directory + "/" + name + ".app";
    PendingDirectory pending(path, kPublicDirectoryMode);
    const std::string contents = pending.path() + "/Contents";
    makeDirectory(contents, kPublicDirectoryMode);
    for (const char* const part : {"/Frameworks", "/Programs", "/_CodeSignature"})
        makeDirectory(contents + part, kPublicDirectoryMode);

    ResourceSeal seal;
    writeFramework(contents + "/Frameworks", seal);
    writeResources(contents + "/Resources", seal);
    writeTool(contents + "/Programs", seal);
    const SealedComponents components{.informationPropertyList = information(name, identifier, "APPL"),
                                      .resourceSeal = seal.document()};
    writeNewFile(contents + "/Info.plist", components.informationPropertyList, kPublicFileMode);
    writeNewFile(contents + "/Programs/" + name, makeProgram(identifier, components).image, kProgramFileMode);
    writeNewFile(contents + "/_CodeSignature/CodeResources", components.resourceSeal, kPublicFileMode);
    pending.publish();
    return path;
}

}  // namespace pinwell::lumora
