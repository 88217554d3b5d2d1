#include "lumora-local/record_name.h"

#include <gtest/gtest.h>

namespace pinwell::lumora {
namespace {

using base::Data;

const Data kTwentyBytes(20, std::byte{0xAB});
const Data kFortyEightBytes(48, std::byte{0x01});

TEST(RecordName, ContainsTheDigestTypeAndTheHash) {
    const std::string name = recordName({2, kTwentyBytes});
    EXPECT_EQ(name, "2/2/abababababababababababababababababababab");
    EXPECT_EQ(name.size(), 4U + 40U);
}

TEST(RecordName, IsOfTheFirstFormatForAnUnknownDigestType) {
    EXPECT_EQ(recordName({0, kTwentyBytes}), "1/abababababababababababababababababababab");
}

TEST(RecordName, CanBeParsed) {
    for (const CodeHash& hash : {CodeHash{0, kTwentyBytes}, CodeHash{1, kTwentyBytes},
                                 CodeHash{3, kTwentyBytes}, CodeHash{4, kFortyEightBytes}}) {
        EXPECT_EQ(parseRecordName(recordName(hash)), hash) << recordName(hash);
    }
}

TEST(RecordName, IsNotParsedFromOtherTexts) {
    const std::string hex = recordName({0, kTwentyBytes}).substr(2);
    for (const std::string& text :
         {std::string(), std::string("1/"), hex, "3/" + hex, "2/" + hex, "2/0/" + hex, "2/5/" + hex,
          "2/4/" + hex, "2/2/" + hex + "00", "2/2/" + hex.substr(2), "2/22/" + hex,
          "2/2/" + hex.substr(1) + "A", "2/2/" + hex.substr(1) + "g", "2/2/" + hex + "\n", std::string("2/2"),
          std::string("Sample.app")}) {
        EXPECT_EQ(parseRecordName(text), std::nullopt) << text;
    }
}

TEST(HashLength, FollowsTheDigestType) {
    EXPECT_EQ(hashLength(0), 20U);
    EXPECT_EQ(hashLength(1), 20U);
    EXPECT_EQ(hashLength(2), 20U);
    EXPECT_EQ(hashLength(3), 20U);
    EXPECT_EQ(hashLength(4), 48U);
    EXPECT_EQ(hashLength(5), std::nullopt);
}

}  // namespace
}  // namespace pinwell::lumora
