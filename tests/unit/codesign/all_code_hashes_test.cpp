#include <filesystem>

#include "codesign/service.h"
#include "service_fixture.h"
#include "support/disk_image_builder.h"

namespace pinwell::test {
namespace {

using codesign::kSuccess;

/// Valid in form, but neither ad hoc nor with a signer.
Data invalidImage() {
    const Data codeDirectory = CodeDirectoryBuilder().flags(0).build();
    return ExecutableImageBuilder().signature(SuperBlobBuilder().blob(0, codeDirectory).build()).build();
}

class AllCodeHashes : public CodeSigningTest {
  protected:
    /// The identifiers found, in order.
    std::vector<std::string> identifiersAt(const std::string& path, codesign::Status expected = kSuccess) {
        const auto all = service.allCodeHashes(values::URL::fileURLWithPath(path));
        EXPECT_EQ(statusOf(all), expected);
        std::vector<std::string> identifiers;
        if (!all) return identifiers;
        for (const auto& information : *all) identifiers.push_back(information.identifier.value_or("none"));
        return identifiers;
    }

    std::vector<std::string> identifiersIn(const BundleBuilder& bundle) {
        bundle.write(scratch / "Sample.app");
        return identifiersAt(scratch / "Sample.app");
    }
};

using Identifiers = std::vector<std::string>;

TEST_F(AllCodeHashes, AreThoseOfAllDirectoriesOfAllSignedSlices) {
    const Data sha1 = CodeDirectoryBuilder().digestType(1).build();
    const Data sha256 = CodeDirectoryBuilder().digestType(2).build();
    const Data two = ExecutableImageBuilder()
                         .signature(SuperBlobBuilder().blob(0, sha1).blob(0x1000, sha256).build())
                         .build();
    const Data plain = ExecutableImageBuilder().withoutSignature().build();
    writeFile(scratch / "tool", UniversalImageBuilder()
                                    .slice(7, imageNamed("seven"))
                                    .slice(kSampleX86, plain)
                                    .slice(kSampleArm, two)
                                    .build());
    const std::vector<codesign::SigningInformation> all =
        service.allCodeHashes(scratch.url("tool")).asOptional().value();
    ASSERT_EQ(all.size(), 2U);
    EXPECT_EQ(all[0].cdHashes, std::vector<Data>{codeHashOf(2, codeDirectoryNamed("seven"))});
    EXPECT_EQ(all[1].cdHashes, (std::vector<Data>{codeHashOf(2, sha256), codeHashOf(1, sha1)}));
    EXPECT_EQ(all[1].digestAlgorithms, (std::vector<std::uint32_t>{2, 1}));
}

TEST_F(AllCodeHashes, AreThoseOfASignedDiskImage) {
    writeFile(scratch / "image",
              DiskImageBuilder().data(Data(100)).superblob(SuperBlobBuilder::adHoc()).build());
    EXPECT_EQ(identifiersAt(scratch / "image"), Identifiers{"com.example.sample"});
}

TEST_F(AllCodeHashes, CountTheMainExecutableOnceAndFirst) {
    EXPECT_EQ(identifiersIn(BundleBuilder().file("Contents/Aaa/library", imageNamed("library"))),
              (Identifiers{"com.example.sample", "library"}));
}

TEST_F(AllCodeHashes, IncludeNestedCodeWhereverItLies) {
    const auto bundle = BundleBuilder()
                            .file("Contents/Frameworks/Kit.framework/Versions/A/Kit", imageNamed("kit"))
                            .file("Contents/Frameworks/libone.dylib", imageNamed("one"))
                            .file("Contents/Helpers/helper", imageNamed("helper"))
                            .file("Contents/PlugIns/Deep.bundle/Contents/Programs/Deep", imageNamed("deep"))
                            .file("Contents/Resources/text.txt", base::toData("text"));
    EXPECT_EQ(identifiersIn(bundle), (Identifiers{"com.example.sample", "kit", "one", "helper", "deep"}));
}

TEST_F(AllCodeHashes, IncludeANestedBundleInTheSeparateForm) {
    BundleBuilder()
        .executable(base::toData("#!/bin/sh\n"))
        .separateSignature(codeDirectoryNamed("script"), {}, {})
        .write(scratch / "Sample.app/Contents/PlugIns/Inner.bundle");
    EXPECT_EQ(identifiersIn(BundleBuilder()), (Identifiers{"com.example.sample", "script"}));
}

TEST_F(AllCodeHashes, PassOverNestedCodeThatIsBroken) {
    const auto bundle = BundleBuilder()
                            .file("Contents/Helpers/a", Data(4, std::byte{0xCA}))
                            .file("Contents/Helpers/b", invalidImage())
                            .file("Contents/Helpers/c", UniversalImageBuilder().count(0).build())
                            .file("Contents/Helpers/d", ExecutableImageBuilder().withoutSignature().build())
                            .file("Contents/Helpers/e", ExecutableImageBuilder().commandCount(9).build())
                            .file("Contents/Helpers/f", imageNamed("good"));
    EXPECT_EQ(identifiersIn(bundle), (Identifiers{"com.example.sample", "good"}));
}

TEST_F(AllCodeHashes, DoNotFollowLinks) {
    writeFile(scratch / "outside/tool", imageNamed("outside"));
    BundleBuilder().write(scratch / "Sample.app");
    std::filesystem::create_directory_symlink(scratch / "outside", scratch / "Sample.app/Contents/Linked");
    std::filesystem::create_symlink(scratch / "outside/tool", scratch / "Sample.app/Contents/tool");
    std::filesystem::create_directory_symlink(scratch / "Sample.app", scratch / "Sample.app/Contents/Self");
    EXPECT_EQ(identifiersAt(scratch / "Sample.app"), Identifiers{"com.example.sample"});
}

TEST_F(AllCodeHashes, ListTheSameLibraryOnce) {
    const auto bundle =
        BundleBuilder().file("Contents/A/one", imageNamed("one")).file("Contents/B/one", imageNamed("one"));
    EXPECT_EQ(identifiersIn(bundle), (Identifiers{"com.example.sample", "one"}));
}

TEST_F(AllCodeHashes, OfABrokenArtefactAreRefused) {
    writeFile(scratch / "tool", invalidImage());
    EXPECT_EQ(identifiersAt(scratch / "tool", codesign::kInvalidSignature), Identifiers{});
    const auto universal =
        UniversalImageBuilder().slice(kSampleArm, imageNamed("good")).slice(kSampleX86, invalidImage());
    writeFile(scratch / "tool", universal.build());
    EXPECT_EQ(identifiersAt(scratch / "tool", codesign::kInvalidSignature), Identifiers{});
}

TEST_F(AllCodeHashes, OfAnUnsignedArtefactAreNone) {
    writeFile(scratch / "tool", ExecutableImageBuilder().withoutSignature().build());
    EXPECT_EQ(identifiersAt(scratch / "tool", codesign::kUnsigned), Identifiers{});
    EXPECT_EQ(identifiersAt(scratch / "missing", codesign::kStaticCodeNotFound), Identifiers{});
}

TEST_F(AllCodeHashes, OfATooDeepBundleAreRefusedRatherThanCutShort) {
    BundleBuilder().write(scratch / "Sample.app");
    std::string deep = scratch / "Sample.app";
    for (unsigned i = 0; i < codesign::kMaximumBundleDepth; ++i) deep += "/d";
    std::filesystem::create_directories(deep);
    EXPECT_EQ(identifiersAt(scratch / "Sample.app"), Identifiers{"com.example.sample"});
    std::filesystem::create_directories(deep + "/d");
    EXPECT_EQ(identifiersAt(scratch / "Sample.app", codesign::kUnimplemented), Identifiers{});
}

}  // namespace
}  // namespace pinwell::test
