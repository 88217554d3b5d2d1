#include "codesign/adhoc_signer.h"

#include <gtest/gtest.h>

#include <span>

#include "base/byte_io.h"
#include "service_fixture.h"
#include "support/disk_image_builder.h"

namespace pinwell::test {
namespace {

using base::ByteWriter;
using codesign::kSuccess;
using codesign::layOutOpaqueCodeDirectory;
using codesign::OpaqueSignature;

/// SHA-256 of FADE0C01 0000000C 00000000.
const Data kEmptyRequirementsDigest = codeDigest(2, emptyRequirements());

/// A code directory of an ordinary file, written down field by field.
Data expectedForFile(std::uint32_t limit, const Data& contentDigest) {
    return ByteWriter()
        .be32(0xFADE0C02)
        .be32(48 + 6 + 3 * 32)  // length
        .be32(0x20100)
        .be32(2)                // flags
        .be32(48 + 6 + 2 * 32)  // hash offset
        .be32(48)               // identifier offset
        .be32(2)                // special slots
        .be32(1)                // code slots
        .be32(limit)
        .u8(32)
        .u8(2)
        .u8(0)
        .u8(0)
        .be32(0)
        .be32(0)  // scatter offset
        .text("ADHOC")
        .u8(0)
        .bytes(kEmptyRequirementsDigest)
        .zeros(32)
        .bytes(contentDigest)
        .data();
}

TEST(OpaqueCodeDirectory, OfAFileIsLaidOutByteForByte) {
    const Data content(32, std::byte{0xC0});
    EXPECT_EQ(layOutOpaqueCodeDirectory({"ADHOC", 0x12345678, std::nullopt, content}),
              expectedForFile(0x12345678, content));
}

TEST(OpaqueCodeDirectory, OfADiskImageHasSixSpecialSlots) {
    const Data content(32, std::byte{0xC0});
    const Data trailer(32, std::byte{0x6B});
    const Data expected = ByteWriter()
                              .be32(0xFADE0C02)
                              .be32(48 + 6 + 7 * 32)
                              .be32(0x20100)
                              .be32(2)
                              .be32(48 + 6 + 6 * 32)
                              .be32(48)
                              .be32(6)
                              .be32(1)
                              .be32(4096)
                              .u8(32)
                              .u8(2)
                              .be16(0)
                              .be64(0)
                              .text("ADHOC")
                              .u8(0)
                              .bytes(trailer)
                              .zeros(3 * 32)
                              .bytes(kEmptyRequirementsDigest)
                              .zeros(32)
                              .bytes(content)
                              .data();
    EXPECT_EQ(layOutOpaqueCodeDirectory({"ADHOC", 4096, trailer, content}), expected);
}

/// The long form, with a limit of 4 GiB; `trailerSlots` come before the slots of every signature.
Data expectedLongForm(std::uint32_t specialSlots, const Data& trailerSlots, const Data& contentDigest) {
    return ByteWriter()
        .be32(0xFADE0C02)
        .be32(64 + 6 + (specialSlots + 1) * 32)
        .be32(0x20300)
        .be32(2)
        .be32(64 + 6 + specialSlots * 32)
        .be32(64)
        .be32(specialSlots)
        .be32(1)
        .be32(0xFFFFFFFF)
        .u8(32)
        .u8(2)
        .be16(0)
        .be64(0)  // spare and scatter offset
        .be64(0)  // team offset and spare
        .be64(0x100000000)
        .text("ADHOC")
        .u8(0)
        .bytes(trailerSlots)
        .bytes(kEmptyRequirementsDigest)
        .zeros(32)
        .bytes(contentDigest)
        .data();
}

TEST(OpaqueCodeDirectory, OfMoreThan32BitsHasTheLongForm) {
    const Data content(32, std::byte{0xC0});
    EXPECT_EQ(layOutOpaqueCodeDirectory({"ADHOC", 0x100000000, std::nullopt, content}),
              expectedLongForm(2, {}, content));
}

TEST(OpaqueCodeDirectory, OfAnImageOfMoreThan32BitsHasTheLongFormAndTheTrailersSlot) {
    const Data content(32, std::byte{0xC0});
    const Data trailer(32, std::byte{0x7D});
    EXPECT_EQ(layOutOpaqueCodeDirectory({"ADHOC", 0x100000000, trailer, content}),
              expectedLongForm(6, ByteWriter().bytes(trailer).zeros(3 * 32).data(), content));
}

TEST(OpaqueCodeDirectory, KeepsTheShortFormUpToTheLast32BitLimit) {
    const Data content(32, std::byte{0xC0});
    EXPECT_EQ(layOutOpaqueCodeDirectory({"ADHOC", 0xFFFFFFFF, std::nullopt, content}),
              expectedForFile(0xFFFFFFFF, content));
}

class AdHocSigning : public CodeSigningTest {
  protected:
    /// The information about the file once it was signed and given its detached signature, as a caller does
    /// it.
    codesign::SigningInformation sign(const Data& contents) {
        writeFile(scratch / "image", contents);
        const std::shared_ptr<codesign::StaticCode> code = codeAt("image");
        codesign::SignerParameters parameters;
        parameters.identifier = "ADHOC";
        parameters.detachedSignature = std::make_shared<Data>();
        const auto signer = service.makeSigner(parameters, codesign::kSignOpaque).asOptional().value();
        EXPECT_EQ(statusOf(service.addSignature(*signer, *code, 0)), kSuccess);
        EXPECT_EQ(statusOf(service.setDetachedSignature(*code, *parameters.detachedSignature, 0)), kSuccess);
        EXPECT_EQ(statusOf(service.checkValidity(*code, kValidityFlags)), kSuccess);
        EXPECT_EQ(readFile(scratch / "image"), base::toString(contents));
        return informationOf(*code, codesign::kSigningInformation);
    }
};

TEST_F(AdHocSigning, OfAFileHasTheHashOfItsCodeDirectory) {
    // More than one piece of reading.
    const Data contents(1'600'001, std::byte{0x42});
    const Data hash = codeHashOf(2, expectedForFile(1'600'001, codeDigest(2, contents)));
    const codesign::SigningInformation information = sign(contents);
    EXPECT_EQ(information.cdHashes, std::vector<Data>{hash});
    EXPECT_EQ(information.digestAlgorithms, std::vector<std::uint32_t>{2});
    EXPECT_EQ(information.unique, hash);
    EXPECT_EQ(information.identifier, "ADHOC");
    EXPECT_EQ(information.flags, 2U);
}

TEST_F(AdHocSigning, OfADiskImageCoversTheBytesBeforeItsTrailer) {
    const Data content(1000, std::byte{0x42});
    const Data codeDirectory = layOutOpaqueCodeDirectory(
        {"ADHOC", 1000, codeDigest(2, DiskImageBuilder().trailer()), codeDigest(2, content)});
    EXPECT_EQ(sign(DiskImageBuilder().data(content).build()).unique, codeHashOf(2, codeDirectory));
}

TEST_F(AdHocSigning, IsTheSameBeforeAndAfterATicketIsStapled) {
    const Data content(1000, std::byte{0x42});
    const Data stapled = SuperBlobBuilder().blob(0x10002, makeBlob(0xFADE0B01, Data(300))).build();
    const Data longer = SuperBlobBuilder().blob(0x10002, makeBlob(0xFADE0B01, Data(900))).build();
    const auto unsignedHash = sign(DiskImageBuilder().data(content).build()).unique;
    EXPECT_EQ(sign(DiskImageBuilder().data(content).superblob(stapled).build()).unique, unsignedHash);
    EXPECT_EQ(sign(DiskImageBuilder().data(content).superblob(longer).build()).unique, unsignedHash);
}

TEST_F(AdHocSigning, CoversASignatureAreaThatDoesNotEndAtTheTrailer) {
    const Data content(1000, std::byte{0x42});
    const Data trailer = DiskImageBuilder().codeSignOffset(900).codeSignLength(99).trailer();
    Data file = content;
    base::append(file, trailer);
    const Data codeDirectory = layOutOpaqueCodeDirectory(
        {"ADHOC", 1000, codeDigest(2, DiskImageBuilder().trailer()), codeDigest(2, content)});
    EXPECT_EQ(sign(file).unique, codeHashOf(2, codeDirectory));
}

TEST_F(AdHocSigning, OfATrailerAloneCoversNoBytes) {
    const Data codeDirectory = layOutOpaqueCodeDirectory(
        {"ADHOC", 0, codeDigest(2, DiskImageBuilder().trailer()), codeDigest(2, {})});
    EXPECT_EQ(sign(DiskImageBuilder().data({}).build()).unique, codeHashOf(2, codeDirectory));
}

TEST_F(AdHocSigning, TakesAnExecutableImageAsOpaqueData) {
    const Data image = ExecutableImageBuilder().build();
    const auto size = static_cast<std::uint32_t>(image.size());
    EXPECT_EQ(sign(image).unique, codeHashOf(2, expectedForFile(size, codeDigest(2, image))));
}

TEST_F(AdHocSigning, GivesOtherBytesAnotherHash) {
    EXPECT_NE(sign(DiskImageBuilder().data(Data(1000)).build()).unique,
              sign(DiskImageBuilder().data(Data(1001)).build()).unique);
}

TEST_F(AdHocSigning, NeedsItsParameters) {
    const codesign::SignerParameters good = {"ADHOC", std::make_shared<Data>(), codesign::DigestType::sha256};
    codesign::SignerParameters parameters = good;
    EXPECT_EQ(statusOf(service.makeSigner(parameters, 0)), codesign::kUnimplemented);
    parameters.digestAlgorithm = codesign::DigestType::sha1;
    EXPECT_EQ(statusOf(service.makeSigner(parameters, codesign::kSignOpaque)), codesign::kUnimplemented);
    parameters = good;
    parameters.identifier = "";
    EXPECT_EQ(statusOf(service.makeSigner(parameters, codesign::kSignOpaque)), codesign::kParameterError);
    parameters.identifier = std::string("AD\0HOC", 6);
    EXPECT_EQ(statusOf(service.makeSigner(parameters, codesign::kSignOpaque)), codesign::kParameterError);
    parameters = good;
    parameters.detachedSignature = nullptr;
    EXPECT_EQ(statusOf(service.makeSigner(parameters, codesign::kSignOpaque)), codesign::kParameterError);
}

TEST_F(AdHocSigning, RefusesADetachedSignatureThatIsNone) {
    writeFile(scratch / "image", "some bytes");
    const std::shared_ptr<codesign::StaticCode> code = codeAt("image");
    EXPECT_EQ(statusOf(service.setDetachedSignature(*code, {}, 0)), codesign::kInvalidSignature);
    EXPECT_EQ(statusOf(service.setDetachedSignature(*code, Data(100), 0)), codesign::kInvalidSignature);
    EXPECT_EQ(statusOf(service.setDetachedSignature(*code, SuperBlobBuilder().build(), 0)),
              codesign::kInvalidSignature);
    EXPECT_EQ(statusOf(service.checkValidity(*code, kValidityFlags)), codesign::kUnsigned);
}

}  // namespace
}  // namespace pinwell::test
