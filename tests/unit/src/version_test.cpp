#include <gtest/gtest.h>

#include "src/pinwell_vers.h"

namespace pinwell {
namespace {

TEST(Version, IsAnIdentificationStringThatEndsInTheNumberAndANewline) {
    EXPECT_STREQ(pinwellVersionString, "@(#)PROGRAM:pinwell  PROJECT:pinwell-34\n");
}

TEST(Version, IsANumber) {
    EXPECT_EQ(pinwellVersionNumber, 34.0);
}

}  // namespace
}  // namespace pinwell
