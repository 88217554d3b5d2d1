#include "lumora-local/connection_table.h"

#include <gtest/gtest.h>

#include <vector>

namespace pinwell::lumora {
namespace {

class ConnectionTableTest : public testing::Test {
  protected:
    ConnectionTable::Identifier enter(const std::string& address, int name) {
        return table_.enter(address, [this, name] { closed_.push_back(name); });
    }

    ConnectionTable table_{2};
    std::vector<int> closed_;
};

TEST_F(ConnectionTableTest, MakesRoomByClosingThePeersOldestSilentConnection) {
    enter("a", 1);
    enter("a", 2);
    enter("a", 3);
    EXPECT_EQ(closed_, (std::vector<int>{1}));
    EXPECT_EQ(table_.count(), 2U);
}

TEST_F(ConnectionTableTest, CountsEachPeerByItself) {
    enter("a", 1);
    enter("a", 2);
    enter("b", 3);
    EXPECT_EQ(closed_, std::vector<int>{});
}

TEST_F(ConnectionTableTest, SparesAConnectionWithARequestUnderWay) {
    table_.becomeBusy(enter("a", 1));
    enter("a", 2);
    enter("a", 3);
    EXPECT_EQ(closed_, (std::vector<int>{2}));
}

TEST_F(ConnectionTableTest, ClosesTheRequestThatHasWaitedLongestWhenNoneIsSilent) {
    const auto first = enter("a", 1);
    table_.becomeWaiting(enter("a", 2));
    table_.becomeWaiting(first);
    EXPECT_NE(enter("a", 3), 0U);
    EXPECT_EQ(closed_, (std::vector<int>{2}));
}

TEST_F(ConnectionTableTest, SparesAWaitingRequestWhileAnotherConnectionIsSilent) {
    table_.becomeWaiting(enter("a", 1));
    enter("a", 2);
    enter("a", 3);
    EXPECT_EQ(closed_, (std::vector<int>{2}));
}

TEST_F(ConnectionTableTest, RefusesOneMoreWhenAllAreBusy) {
    table_.becomeBusy(enter("a", 1));
    table_.becomeBusy(enter("a", 2));
    EXPECT_EQ(enter("a", 3), 0U);
    EXPECT_EQ(closed_, std::vector<int>{});
}

TEST_F(ConnectionTableTest, TakesTheOneThatHasBeenSilentLongest) {
    const auto first = enter("a", 1);
    enter("a", 2);
    table_.becomeBusy(first);
    table_.becomeSilent(first);
    enter("a", 3);
    EXPECT_EQ(closed_, (std::vector<int>{2}));
}

TEST_F(ConnectionTableTest, ForgetsConnectionsThatLeave) {
    const auto first = enter("a", 1);
    enter("a", 2);
    table_.leave(first);
    table_.leave(first);
    enter("a", 3);
    EXPECT_EQ(closed_, std::vector<int>{});
    EXPECT_EQ(table_.count(), 2U);
}

TEST_F(ConnectionTableTest, ClosesAConnectionWithoutAHandshakeBeforeASilentOne) {
    table_.becomeSilent(enter("a", 1));
    enter("a", 2);
    enter("a", 3);
    EXPECT_EQ(closed_, (std::vector<int>{2}));
}

TEST_F(ConnectionTableTest, ClosesTheHandshakesThatBeganBeforeATime) {
    table_.becomeSilent(enter("a", 1));
    enter("b", 2);
    EXPECT_EQ(table_.closeHandshakesBefore(std::chrono::steady_clock::now() - std::chrono::hours(1)), 0U);
    EXPECT_EQ(closed_, std::vector<int>{});
    const auto later = std::chrono::steady_clock::now() + std::chrono::hours(1);
    EXPECT_EQ(table_.closeHandshakesBefore(later), 1U);
    EXPECT_EQ(table_.closeHandshakesBefore(later), 0U);
    EXPECT_EQ(closed_, (std::vector<int>{2}));
}

TEST_F(ConnectionTableTest, ClosesTheSilentOnesOnceAtTheEnd) {
    table_.becomeBusy(enter("a", 1));
    table_.becomeWaiting(enter("c", 3));
    enter("b", 2);
    table_.closeSilent();
    table_.closeSilent();
    EXPECT_EQ(closed_, (std::vector<int>{2}));
}

}  // namespace
}  // namespace pinwell::lumora
