// A code-signing service that answers what the test says.
#pragma once

#include <optional>

#include "codesign/code_signing.h"

namespace pinwell::test {

class FakeCodeSigningService : public codesign::CodeSigningService {
  public:
    codesign::Status createStatus = codesign::kSuccess;
    bool handsOutCode = true;
    codesign::Status validity = codesign::kSuccess;
    codesign::Status copyStatus = codesign::kSuccess;
    std::optional<codesign::SigningInformation> information;
    std::uint32_t validityFlags = 0;
    std::uint32_t informationSets = 0;
    int createCalls = 0;

    codesign::Status createStaticCode(const foundation::URL&, std::uint32_t,
                                      std::shared_ptr<codesign::StaticCode>& code) override {
        ++createCalls;
        if (createStatus == codesign::kSuccess && handsOutCode) code = std::make_shared<Code>();
        return createStatus;
    }
    codesign::Status checkValidity(codesign::StaticCode&, std::uint32_t flags) override {
        validityFlags = flags;
        return validity;
    }
    codesign::Status copySigningInformation(codesign::StaticCode&, std::uint32_t sets,
                                            std::optional<codesign::SigningInformation>& out) override {
        informationSets = sets;
        if (copyStatus == codesign::kSuccess) out = information;
        return copyStatus;
    }
    codesign::Status copyAllCodeHashes(const foundation::URL&,
                                       std::vector<codesign::SigningInformation>& all) override {
        if (information) all.push_back(*information);
        return copyStatus;
    }

  private:
    struct Code : codesign::StaticCode {};
};

}  // namespace pinwell::test
