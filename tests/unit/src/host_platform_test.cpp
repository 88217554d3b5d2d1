#include "src/host_platform.h"

#include <gtest/gtest.h>

#include <filesystem>

#include "src/PWHashedFile/PWHashedFile.h"
#include "src/messages.h"
#include "support/code_directory_builder.h"
#include "support/executable_image_builder.h"
#include "support/message_capture.h"
#include "support/temporary_directory.h"

namespace pinwell {
namespace {

using base::Data;
using test::CodeDirectoryBuilder;

constexpr std::uint8_t kSHA256 = 2;

/// Writes a signed bundle, and returns its code hash.
Data signedBundle(const std::string& path, const std::string& identifier) {
    const Data codeDirectory =
        CodeDirectoryBuilder().identifier(identifier).covers(2, test::emptyRequirements()).build();
    test::BundleBuilder()
        .executable(test::ExecutableImageBuilder()
                        .signature(test::SuperBlobBuilder::adHoc(codeDirectory).build())
                        .build())
        .write(path);
    return test::codeHashOf(kSHA256, codeDirectory);
}

TEST(HostPlatform, HashesTheBundleThatItHoldsAndNotAnotherInItsPlace) {
    const test::TemporaryDirectory directory;
    const test::MessageCapture output(kVerbosityQuiet);
    const Data hash = signedBundle(directory / "App.app", "com.example.app");
    const Data other = signedBundle(directory / "Other.app", "com.example.other");
    ASSERT_NE(hash, other);
    const HostPlatform host([](int) {});
    const auto file = PWHashedFile::initWithFileURL(directory.url("App.app"), host.services());
    ASSERT_NE(file, nullptr);

    std::filesystem::rename(directory / "App.app", directory / "Found.app");
    std::filesystem::rename(directory / "Other.app", directory / "App.app");
    EXPECT_EQ(file->cdHash(), hash);
}

}  // namespace
}  // namespace pinwell
