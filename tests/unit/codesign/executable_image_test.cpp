#include "codesign/executable_image.h"

#include <gtest/gtest.h>

#include "base/byte_io.h"
#include "codesign/code_error.h"
#include "support/executable_image_builder.h"

namespace pinwell::test {
namespace {

using base::MemorySource;
using codesign::FileRange;
using codesign::findImageSignature;
using codesign::isExecutableImage;
using codesign::preferredSlice;
using codesign::readSlices;

std::optional<FileRange> signatureOf(const Data& file) {
    const MemorySource source(file);
    return findImageSignature(source, preferredSlice(readSlices(source)));
}

void expectRefused(const Data& file) {
    try {
        signatureOf(file);
        ADD_FAILURE() << "accepted";
    } catch (const std::runtime_error& failure) {
        EXPECT_EQ(codesign::asCodeError(failure).status(), codesign::kInvalidSignature) << failure.what();
    }
}

/// The bytes at the place that was found.
Data signatureBytes(const Data& file) {
    const std::optional<FileRange> range = signatureOf(file);
    if (!range) return {};
    return base::toData(ByteView(file).subspan(range->offset, range->length));
}

TEST(ThinImage, GivesItsSignatureInEitherByteOrderAndWidth) {
    const Data superblob = SuperBlobBuilder::adHoc().build();
    EXPECT_EQ(signatureBytes(ExecutableImageBuilder().build()), superblob);
    EXPECT_EQ(signatureBytes(ExecutableImageBuilder().bits32().build()), superblob);
    EXPECT_EQ(signatureBytes(ExecutableImageBuilder().bigEndian().build()), superblob);
    EXPECT_EQ(signatureBytes(ExecutableImageBuilder().bigEndian().bits32().build()), superblob);
}

TEST(ThinImage, IsKnownByItsMagic) {
    EXPECT_TRUE(isExecutableImage(MemorySource(ExecutableImageBuilder().build())));
    EXPECT_TRUE(isExecutableImage(MemorySource(ExecutableImageBuilder().bits32().bigEndian().build())));
    EXPECT_TRUE(isExecutableImage(MemorySource(UniversalImageBuilder().build())));
    EXPECT_TRUE(isExecutableImage(MemorySource(UniversalImageBuilder().wide().build())));
    EXPECT_FALSE(isExecutableImage(MemorySource(ExecutableImageBuilder().magic(0xFEEDFACD).build())));
    EXPECT_FALSE(isExecutableImage(MemorySource(base::toData("#!/bin/sh\n"))));
    EXPECT_FALSE(isExecutableImage(MemorySource(Data(3, std::byte{0xFE}))));
    EXPECT_FALSE(isExecutableImage(MemorySource(Data())));
}

TEST(ThinImage, IsUnsignedWithoutTheLoadCommand) {
    EXPECT_EQ(signatureOf(ExecutableImageBuilder().withoutSignature().build()), std::nullopt);
}

TEST(ThinImage, IsUnsignedWhenTheSignatureHasNoLength) {
    EXPECT_EQ(signatureOf(ExecutableImageBuilder().signatureLength(0).build()), std::nullopt);
}

TEST(ThinImage, IsUnsignedWhenTheLoadCommandIsNotCounted) {
    EXPECT_EQ(signatureOf(ExecutableImageBuilder().commandCount(1).build()), std::nullopt);
    EXPECT_EQ(signatureOf(ExecutableImageBuilder().commandCount(0).build()), std::nullopt);
}

TEST(ThinImage, RefusesMoreLoadCommandsThanFit) {
    expectRefused(ExecutableImageBuilder().commandCount(3).build());
    expectRefused(ExecutableImageBuilder().commandCount(0xFFFFFFFF).build());
}

TEST(ThinImage, RefusesALoadCommandShorterThanItsHeader) {
    Data image = ExecutableImageBuilder().build();
    image[32 + 4] = std::byte{7};  // the first command's size
    expectRefused(image);
    image[32 + 4] = std::byte{0};
    expectRefused(image);
}

TEST(ThinImage, RefusesLoadCommandsThatReachPastTheirSpace) {
    expectRefused(ExecutableImageBuilder().commandsSize(39).build());
    expectRefused(ExecutableImageBuilder().commandsSize(7).build());
}

TEST(ThinImage, RefusesLoadCommandsBeyondTheFile) {
    const Data image = ExecutableImageBuilder().build();
    expectRefused(
        ExecutableImageBuilder().commandsSize(static_cast<std::uint32_t>(image.size() - 31)).build());
    expectRefused(ExecutableImageBuilder().commandsSize(0xFFFFFFFF).build());
}

// The list is read piece by piece: one command that is longer than a piece, and many in several pieces.
TEST(ThinImage, FindsItsSignatureAfterLoadCommandsOfAnyLengthAndNumber) {
    const Data superblob = SuperBlobBuilder::adHoc().build();
    EXPECT_EQ(signatureBytes(ExecutableImageBuilder().loadCommand(0x19, Data(5'000'000)).build()), superblob);
    ExecutableImageBuilder many;
    for (std::size_t i = 0; i < 20'000; ++i) many.loadCommand(0x19, Data(i % 64));
    EXPECT_EQ(signatureBytes(many.build()), superblob);
}

TEST(ThinImage, RefusesASignatureCommandOfAnotherSize) {
    expectRefused(ExecutableImageBuilder().signatureCommandSize(12).build());
    expectRefused(ExecutableImageBuilder().signatureCommandSize(24).build());
}

TEST(ThinImage, RefusesTwoSignatures) {
    const Data other = base::ByteWriter().le32(200).le32(12).data();
    expectRefused(ExecutableImageBuilder().loadCommand(0x1D, other).build());
}

TEST(ThinImage, RefusesASignatureBeyondTheFile) {
    const auto size = static_cast<std::uint32_t>(ExecutableImageBuilder().build().size());
    expectRefused(ExecutableImageBuilder().signatureOffset(size).build());
    expectRefused(ExecutableImageBuilder().signatureOffset(0xFFFFFFFF).build());
    expectRefused(ExecutableImageBuilder().signatureLength(size).build());
    expectRefused(ExecutableImageBuilder().signatureLength(0xFFFFFFFF).build());
}

TEST(ThinImage, RefusesASignatureInItsLoadCommands) {
    expectRefused(ExecutableImageBuilder().signatureOffset(0).build());
    expectRefused(ExecutableImageBuilder().signatureOffset(32 + 24 + 15).build());
}

TEST(UniversalImage, PrefersItsSlicesInOneOrderOnEveryHost) {
    const Data image = ExecutableImageBuilder().build();
    const auto preferred = [](const Data& file) {
        return preferredSlice(readSlices(MemorySource(file))).cpuType;
    };
    EXPECT_EQ(preferred(UniversalImageBuilder()
                            .slice(7, image)
                            .slice(kSampleX86, image)
                            .slice(kSampleArm, image)
                            .build()),
              kSampleArm);
    EXPECT_EQ(preferred(UniversalImageBuilder().slice(7, image).slice(kSampleX86, image).build()),
              kSampleX86);
    EXPECT_EQ(preferred(UniversalImageBuilder().slice(7, image).slice(18, image).build()), 7U);
}

TEST(UniversalImage, GivesItsSignatureRelativeToTheSlice) {
    const Data superblob = SuperBlobBuilder::adHoc().build();
    const Data plain = ExecutableImageBuilder().withoutSignature().build();
    const Data image = ExecutableImageBuilder().build();
    EXPECT_EQ(
        signatureBytes(UniversalImageBuilder().slice(kSampleX86, plain).slice(kSampleArm, image).build()),
        superblob);
    EXPECT_EQ(signatureBytes(
                  UniversalImageBuilder().wide().slice(kSampleX86, plain).slice(kSampleArm, image).build()),
              superblob);
}

TEST(UniversalImage, RefusesNoSlicesAndMoreThanTheFileHasRoomFor) {
    expectRefused(UniversalImageBuilder().count(0).build());
    expectRefused(UniversalImageBuilder().count(65).build());
    expectRefused(UniversalImageBuilder().count(0xFFFFFFFF).build());
}

TEST(UniversalImage, MayHaveAnyNumberOfSlices) {
    const Data plain = ExecutableImageBuilder().withoutSignature().build();
    for (const bool wide : {false, true}) {
        UniversalImageBuilder many;
        if (wide) many.wide();
        for (std::uint32_t type = 100; type < 2000; ++type) many.slice(type, plain);
        many.slice(kSampleArm, ExecutableImageBuilder().build());
        EXPECT_EQ(signatureBytes(many.build()), SuperBlobBuilder::adHoc().build());
    }
}

TEST(UniversalImage, RefusesTwoSlicesOfOneTypeAndSubtype) {
    const Data image = ExecutableImageBuilder().build();
    const auto two = UniversalImageBuilder().slice(kSampleArm, image).slice(kSampleArm, image);
    expectRefused(two.build());
    expectRefused(UniversalImageBuilder(two).subtypeOf(0, 2).subtypeOf(1, 2).build());
    expectRefused(UniversalImageBuilder(two).slice(kSampleX86, image).build());
    expectRefused(UniversalImageBuilder().slice(7, image).slice(kSampleArm, image).slice(7, image).build());
}

TEST(UniversalImage, DoesNotTellSlicesApartByTheCapabilitiesInTheirSubtype) {
    const Data image = ExecutableImageBuilder().build();
    const auto two = UniversalImageBuilder().slice(kSampleArm, image).slice(kSampleArm, image);
    expectRefused(UniversalImageBuilder(two).subtypeOf(0, 0x80000002).subtypeOf(1, 2).build());
    expectRefused(UniversalImageBuilder(two).subtypeOf(0, 0x80000000).subtypeOf(1, 0xFF000000).build());
}

TEST(UniversalImage, MayHaveSlicesOfOneTypeAndTwoSubtypes) {
    const Data image = ExecutableImageBuilder().build();
    const auto two = UniversalImageBuilder().slice(kSampleArm, image).slice(kSampleArm, image);
    EXPECT_EQ(signatureBytes(UniversalImageBuilder(two).subtypeOf(1, 2).build()),
              SuperBlobBuilder::adHoc().build());
}

TEST(UniversalImage, RefusesASliceThatReachesPastTheFile) {
    expectRefused(UniversalImageBuilder().sizeOf(0, 0xFFFFFFFF).build());
    expectRefused(UniversalImageBuilder().offsetOf(0, 0xFFFFFFFF).build());
    expectRefused(UniversalImageBuilder().wide().offsetOf(0, 0xFFFFFFFFFFFFFFFF).build());
    expectRefused(UniversalImageBuilder().wide().sizeOf(0, 0xFFFFFFFFFFFFFFFF).build());
}

TEST(UniversalImage, RefusesASliceThatIsTheImageItself) {
    expectRefused(UniversalImageBuilder().offsetOf(0, 0).build());
    expectRefused(UniversalImageBuilder().offsetOf(0, 8).build());
}

TEST(UniversalImage, RefusesAUniversalSlice) {
    expectRefused(UniversalImageBuilder().slice(kSampleArm, UniversalImageBuilder().build()).build());
}

TEST(UniversalImage, RefusesASliceThatIsNoImage) {
    expectRefused(UniversalImageBuilder().slice(kSampleArm, Data(100)).build());
    expectRefused(UniversalImageBuilder().slice(kSampleArm, Data(27)).build());
    expectRefused(UniversalImageBuilder().slice(kSampleArm, Data()).build());
}

TEST(UniversalImage, RefusesOverlappingSlices) {
    const Data image = ExecutableImageBuilder().build();
    const auto two = UniversalImageBuilder().slice(kSampleX86, image).slice(kSampleArm, image);
    expectRefused(UniversalImageBuilder(two).offsetOf(1, 64).build());
    expectRefused(UniversalImageBuilder(two).offsetOf(1, 65).build());
    expectRefused(UniversalImageBuilder(two).sizeOf(0, image.size() + 200).build());
}

TEST(UniversalImage, RefusesASignatureThatLeavesItsSlice) {
    const Data image = ExecutableImageBuilder().build();
    const Data reaching =
        ExecutableImageBuilder().signatureLength(static_cast<std::uint32_t>(image.size())).build();
    expectRefused(UniversalImageBuilder().slice(kSampleArm, reaching).slice(kSampleX86, image).build());
}

TEST(ExecutableImage, EndsCleanlyWhereverItIsCut) {
    for (const Data& whole :
         {ExecutableImageBuilder().build(), ExecutableImageBuilder().bits32().bigEndian().build(),
          UniversalImageBuilder().build(), UniversalImageBuilder().wide().build()}) {
        for (std::size_t length = 0; length < whole.size(); ++length) {
            expectRefused(Data(whole.begin(), whole.begin() + static_cast<std::ptrdiff_t>(length)));
        }
    }
}

}  // namespace
}  // namespace pinwell::test
