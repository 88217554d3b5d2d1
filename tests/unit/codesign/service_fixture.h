// A service over a temporary directory, and the tests' calls to it.
#pragma once

#include <gtest/gtest.h>

#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "codesign/service.h"
#include "foundation/bytes.h"
#include "foundation/url.h"
#include "support/executable_image_builder.h"
#include "support/temporary_directory.h"

namespace pinwell::test {

/// The service's result for one path.
struct Answer {
    codesign::Status created = codesign::kSuccess;
    codesign::Status validity = codesign::kSuccess;
    codesign::Status copied = codesign::kSuccess;
    codesign::SigningInformation information;
};

inline foundation::Data codeDirectoryNamed(const std::string& identifier) {
    return CodeDirectoryBuilder().identifier(identifier).build();
}

inline foundation::Data imageNamed(const std::string& identifier) {
    return ExecutableImageBuilder()
        .signature(SuperBlobBuilder::adHoc(codeDirectoryNamed(identifier)).build())
        .build();
}

class CodeSigningTest : public ::testing::Test {
  protected:
    static constexpr std::uint32_t kValidityFlags = 6;
    static constexpr std::uint32_t kAllSets = 1 | 2 | 16;

    /// Bundles as BundleBuilder writes them by default; finding executables in others is not this service's
    /// matter.
    static std::optional<std::string> sampleExecutable(foundation::Places&, const std::string& bundle) {
        return bundle + "/Contents/Programs/Sample";
    }

    Answer ask(const std::string& path) {
        Answer answer;
        std::shared_ptr<codesign::StaticCode> code;
        answer.created = service.createStaticCode(foundation::URL::fileURLWithPath(path), 0, code);
        if (!code) return answer;
        answer.validity = service.checkValidity(*code, kValidityFlags);
        std::optional<codesign::SigningInformation> information;
        answer.copied = service.copySigningInformation(*code, kAllSets, information);
        if (information) answer.information = *information;
        return answer;
    }

    Answer askAbout(const Data& contents) {
        writeFile(scratch / "sample", contents);
        return ask(scratch / "sample");
    }

    TemporaryDirectory scratch;
    codesign::FileCodeSigningService service{
        codesign::CodeAccess{std::make_shared<foundation::Places>(), sampleExecutable}};
};

}  // namespace pinwell::test
