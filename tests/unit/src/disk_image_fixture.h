// An image in a temporary directory, on a platform with a fake code-signing service. The service treats every
// image as unsigned and has one synthetic cdhash.
#pragma once

#include <gtest/gtest.h>

#include <filesystem>

#include "base/bytes.h"
#include "src/PWHashedFile/PWHashedDiskImage.h"
#include "src/messages.h"
#include "support/disk_image_builder.h"
#include "support/message_capture.h"
#include "support/test_platform.h"
#include "values/url.h"

namespace pinwell::test {

using Lines = std::vector<std::string>;

class DiskImageTest : public testing::Test {
  protected:
    DiskImageTest() {
        std::filesystem::create_directory(directory / "tmp");
        platform.codeSigning.validity = codesign::kUnsigned;
        platform.codeSigning.detachedInformation.emplace();
        platform.codeSigning.detachedInformation->cdHashes = {syntheticHash()};
        platform.codeSigning.detachedInformation->digestAlgorithms = {2};
    }

    static base::Data syntheticHash() { return base::Data(20, std::byte{0xCD}); }

    void put(const DiskImageBuilder& builder) { writeFile(path, base::ByteView(builder.build())); }
    PWHashedDiskImage open() { return {url, platform.services()}; }

    /// The image's present bytes.
    std::string contents() const { return readFile(path); }
    static std::string contentsOf(const DiskImageBuilder& builder) { return base::toString(builder.build()); }

    TestPlatform platform;
    const TemporaryDirectory& directory = platform.directory;
    const std::string path = directory / "image.dmg";
    const values::URL url = directory.url("image.dmg");
};

}  // namespace pinwell::test
