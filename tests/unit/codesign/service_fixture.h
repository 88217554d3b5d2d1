// A service over a temporary directory, and the tests' calls to it.
#pragma once

#include <gtest/gtest.h>

#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "base/bytes.h"
#include "codesign/service.h"
#include "support/executable_image_builder.h"
#include "support/status.h"
#include "support/temporary_directory.h"
#include "values/url.h"

namespace pinwell::test {

/// The service's result for one path.
struct Answer {
    codesign::Status created = codesign::kSuccess;
    codesign::Status validity = codesign::kSuccess;
    codesign::Status copied = codesign::kSuccess;
    codesign::SigningInformation information;
};

inline base::Data codeDirectoryNamed(const std::string& identifier) {
    return CodeDirectoryBuilder().identifier(identifier).build();
}

inline base::Data imageNamed(const std::string& identifier) {
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
    static std::optional<std::string> sampleExecutable(base::Places&, const std::string& bundle) {
        return bundle + "/Contents/Programs/Sample";
    }

    Answer ask(const std::string& path) {
        Answer answer;
        const auto code = service.staticCode(values::URL::fileURLWithPath(path), 0);
        answer.created = statusOf(code);
        if (!code) return answer;
        answer.validity = statusOf(service.checkValidity(**code, kValidityFlags));
        const auto information = service.signingInformation(**code, kAllSets);
        answer.copied = statusOf(information);
        if (information) answer.information = information->value();
        return answer;
    }

    std::shared_ptr<codesign::StaticCode> codeAt(const std::string& name) {
        return service.staticCode(scratch.url(name), 0).asOptional().value();
    }

    codesign::SigningInformation informationOf(const codesign::StaticCode& code, std::uint32_t sets) {
        return service.signingInformation(code, sets).asOptional().value().value();
    }

    Answer askAbout(const Data& contents) {
        writeFile(scratch / "sample", contents);
        return ask(scratch / "sample");
    }

    TemporaryDirectory scratch;
    codesign::FileCodeSigningService service{
        codesign::CodeAccess{std::make_shared<base::Places>(), sampleExecutable}};
};

}  // namespace pinwell::test
