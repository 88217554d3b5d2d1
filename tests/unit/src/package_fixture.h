// A flat package in a directory of the test's own, on a platform of fakes.
#pragma once

#include <gtest/gtest.h>

#include <string>

#include "src/PWHashedFile/PWHashedFlatPackage.h"
#include "src/messages.h"
#include "support/message_capture.h"
#include "support/package_builder.h"
#include "support/test_platform.h"
#include "values/url.h"

namespace pinwell::test {

class FlatPackageTest : public testing::Test {
  protected:
    void put(const std::string& contents) { writeFile(path, contents); }
    void put(const PackageBuilder& builder) { put(builder.build()); }
    std::string contents() const { return readFile(path); }

    /// Compares the beginning of `text`, which does not depend on the system's wording.
    static bool begins(const std::string& text, const std::string& beginning) {
        return text.rfind(beginning, 0) == 0;
    }

    TestPlatform platform;
    const std::string path = platform.directory / "Sample.pkg";
    const values::URL url = platform.directory.url("Sample.pkg");
    PWHashedFlatPackage package{url, platform.services()};
};

}  // namespace pinwell::test
