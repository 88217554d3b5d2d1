#include "codesign/service.h"

#include "service_fixture.h"

namespace pinwell::test {
namespace {

using codesign::kInvalidSignature;
using codesign::kStaticCodeNotFound;
using codesign::kSuccess;
using codesign::kUnsigned;

class StaticCodeOfAPath : public CodeSigningTest {};

TEST_F(StaticCodeOfAPath, IsAThinImageWithItsSignature) {
    const Data codeDirectory = CodeDirectoryBuilder().identifier("com.example.tool").build();
    const Data image =
        ExecutableImageBuilder().signature(SuperBlobBuilder::adHoc(codeDirectory).build()).build();
    const Answer answer = askAbout(image);
    EXPECT_EQ(answer.created, kSuccess);
    EXPECT_EQ(answer.validity, kSuccess);
    EXPECT_EQ(answer.copied, kSuccess);
    EXPECT_EQ(answer.information.unique, codeHashOf(2, codeDirectory));
    EXPECT_EQ(answer.information.identifier, "com.example.tool");
    EXPECT_EQ(answer.information.digestAlgorithm, 2U);
    EXPECT_EQ(answer.information.flags, 2U);
    EXPECT_EQ(answer.information.teamIdentifier, std::nullopt);
    EXPECT_EQ(answer.information.secureTimestamp, std::nullopt);
}

TEST_F(StaticCodeOfAPath, IsTheMainExecutableOfABundle) {
    BundleBuilder().write(directory / "Sample.app");
    const Answer answer = ask(directory / "Sample.app");
    EXPECT_EQ(answer.validity, kSuccess);
    EXPECT_EQ(answer.information.identifier, "com.example.sample");
}

}  // namespace
}  // namespace pinwell::test
