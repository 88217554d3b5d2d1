// Every costly input against its control: processor time in proportion, and memory in proportion to length.
#include <gtest/gtest.h>

#include "costly_input.h"
#include "measured_read.h"

namespace pinwell::test {
namespace {

constexpr std::size_t kMebibyte = std::size_t{1024} * 1024;
constexpr std::size_t kLength = kMebibyte / 4;
constexpr int kRuns = 3;

// Stops an endless run; it measures nothing.
constexpr unsigned kLimit = 60;

// Together 256 MiB for an input of 16 MiB.
constexpr double kFixedMebibytes = 48;
constexpr double kMemoryForAByte = 13;

constexpr int kMeasuredAgain = 3;

class Costly : public testing::TestWithParam<CostlyInput> {};

TEST_P(Costly, InputIsReadInProportion) {
    const CostlyInput& row = GetParam();
    const Data costly = row.costly(kLength);
    const Data control = row.control(kLength);
    ASSERT_LE(costly.size(), kLength + kLength / 4) << "the builder keeps to the length";

    MeasuredRead expected = measureRead(row.read, control, kRuns, kLimit);
    MeasuredRead got = measureRead(row.read, costly, kRuns, kLimit);
    // Other work on the machine disturbs caches, and so the ratio. A real fault shows every time.
    for (int again = 0; again < kMeasuredAgain && got.seconds > row.times * expected.seconds; ++again) {
        expected = measureRead(row.read, control, kRuns, kLimit);
        got = measureRead(row.read, costly, kRuns, kLimit);
    }
    ASSERT_EQ(expected.failure, "") << "of the control";
    ASSERT_TRUE(expected.isTaken) << "a control is taken";
    ASSERT_EQ(got.failure, "") << row.cost;
    EXPECT_EQ(got.isTaken, row.isTaken) << row.cost;

    EXPECT_LE(got.seconds, row.times * expected.seconds) << row.cost;
    if (memoryIsMeasured()) {
        const double length = static_cast<double>(costly.size()) / kMebibyte;
        EXPECT_LE(got.mebibytes, kFixedMebibytes + kMemoryForAByte * length) << row.cost;
    }
}

INSTANTIATE_TEST_SUITE_P(Inputs, Costly, testing::ValuesIn(costlyInputs()),
                         [](const auto& tested) { return tested.param.name; });

Data fiveBytes() {
    return base::toData("12345");
}

// The precondition of the table: a higher cost is found.
TEST(MeasuredRead, SeesTimeMemoryAndTheResult) {
    const auto busy = [](const Data&) {
        volatile unsigned long sum = 0;
        for (unsigned long i = 0; i < 50'000'000; ++i) sum = sum + i;
        return sum > 0;
    };
    const auto large = [](const Data& input) {
        const Data block(64 * kMebibyte, input.front());
        return block.back() != input.front();
    };
    const auto idle = [](const Data&) { return true; };
    const MeasuredRead ofBusy = measureRead(busy, fiveBytes(), 1, kLimit);
    const MeasuredRead ofLarge = measureRead(large, fiveBytes(), 1, kLimit);
    const MeasuredRead ofIdle = measureRead(idle, fiveBytes(), 1, kLimit);
    EXPECT_GT(ofBusy.seconds, 10 * ofIdle.seconds);
    EXPECT_TRUE(ofBusy.isTaken);
    EXPECT_FALSE(ofLarge.isTaken);
    if (memoryIsMeasured()) {
        EXPECT_GE(ofLarge.mebibytes, 60);
        EXPECT_LE(ofIdle.mebibytes, 8);
    }
}

TEST(MeasuredRead, ReportsTheCauseOfTheReadersEnd) {
    EXPECT_EQ(
        measureRead([](const Data&) -> bool { throw std::runtime_error("thrown"); }, fiveBytes(), 1, kLimit)
            .failure,
        "thrown");
    EXPECT_NE(measureRead([](const Data&) -> bool { abort(); }, fiveBytes(), 1, kLimit).failure, "");
    EXPECT_EQ(measureRead(
                  [](const Data& input) {
                      volatile bool endless = true;
                      while (endless) static_cast<void>(input);
                      return true;
                  },
                  fiveBytes(), 1, 1)
                  .failure,
              "it took more than 1 s of processor time, or was killed");
}

}  // namespace
}  // namespace pinwell::test
