// The hash in the name of a record.
#include "retrieval/ticket_fetch.h"

#include <gtest/gtest.h>

namespace pinwell::test {
namespace {

using retrieval::hashInRecordName;

const std::string kTwenty(40, 'a');

TEST(RecordName, HoldsAHash) {
    EXPECT_EQ(hashInRecordName("2/2/" + kTwenty), base::Data(20, std::byte{0xAA}));
    EXPECT_EQ(hashInRecordName("1/" + kTwenty), base::Data(20, std::byte{0xAA}));
    EXPECT_EQ(hashInRecordName("2/4/" + std::string(96, '0')), base::Data(48));
    EXPECT_TRUE(hashInRecordName("2/4294967295/" + kTwenty));
    EXPECT_TRUE(hashInRecordName("2/1/" + std::string(128, '9')));
}

TEST(RecordName, ReturnsNulloptForOtherText) {
    for (const std::string& name : {std::string(),
                                    std::string("2"),
                                    std::string("2/"),
                                    std::string("2/2"),
                                    std::string("2/2/"),
                                    "2//" + kTwenty,
                                    "2/02/" + kTwenty,
                                    "2/0/" + kTwenty,
                                    "2/-2/" + kTwenty,
                                    "2/x/" + kTwenty,
                                    "2/12345678901/" + kTwenty,
                                    "3/2/" + kTwenty,
                                    "/2/2/" + kTwenty,
                                    "2/2/" + kTwenty + "/",
                                    "2/2/" + kTwenty + "a",
                                    "2/2/" + std::string(38, 'a'),
                                    "2/2/" + std::string(130, 'a'),
                                    "2/2/" + std::string(40, 'A'),
                                    "2/2/" + std::string(40, 'g'),
                                    " 2/2/" + kTwenty,
                                    "2/2/" + kTwenty + "\n",
                                    std::string("release/Sample.dmg"),
                                    "./2/2/" + kTwenty})
        EXPECT_EQ(hashInRecordName(name), std::nullopt) << name;
}

}  // namespace
}  // namespace pinwell::test
