// The permitted contents of a bundle's seal.
#include "verify/seal.h"

#include <gmock/gmock.h>

#include <string>

#include "codesign/code_error.h"

namespace pinwell::test {
namespace {

using verify::Seal;

Seal sealWithRule(const std::string& value) {
    const std::string document = "<plist><dict><key>files2</key><dict/><key>rules2</key><dict><key>.</key>" +
                                 value + "</dict></dict></plist>";
    return Seal::parse(base::asBytes(document));
}

TEST(Seal, TakesWeightsThatAreNumbers) {
    for (const char* const value : {"<real>20.5</real>", "<integer>3</integer>", "<real>inf</real>",
                                    "<dict><key>weight</key><real>1e3</real></dict>"})
        EXPECT_TRUE(sealWithRule(value).ruleFor("a").has_value()) << value;
}

// Without a number there is no order of rules.
TEST(Seal, RefusesAWeightThatIsNoNumber) {
    for (const char* const value :
         {"<real>nan</real>", "<dict><key>weight</key><real>-nan</real></dict>",
          "<dict><key>weight</key><string>3</string></dict>", "<dict><key>weight</key><true/></dict>"})
        EXPECT_THROW(static_cast<void>(sealWithRule(value)), codesign::CodeError) << value;
}

}  // namespace
}  // namespace pinwell::test
