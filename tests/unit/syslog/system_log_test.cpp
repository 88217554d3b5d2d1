#include "syslog/system_log.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <syslog.h>

#include <array>
#include <cstdarg>
#include <cstdio>
#include <string>
#include <thread>
#include <vector>

#include "support/fake_system_log.h"

namespace {

// The calls to syslog(3). The functions below replace the C library's: a program's own functions take
// precedence.
struct Recorded {
    std::vector<std::string> opened;
    std::vector<int> facilities;
    std::vector<int> priorities;
    std::vector<std::string> entries;
    int closed = 0;
};

Recorded& recorded() {
    static Recorded instance;
    return instance;
}

void record(int priority, const char* format, std::va_list arguments) {
    std::array<char, 8192> text{};
    std::vsnprintf(text.data(), text.size(), format, arguments);
    recorded().priorities.push_back(priority);
    recorded().entries.emplace_back(text.data());
}

}  // namespace

extern "C" {

void openlog(const char* identity, int, int facility) {
    recorded().opened.emplace_back(identity);
    recorded().facilities.push_back(facility);
}

void closelog() {
    ++recorded().closed;
}

void syslog(int priority, const char* format, ...) {
    std::va_list arguments;
    va_start(arguments, format);
    record(priority, format, arguments);
    va_end(arguments);
}

// The same under the name that a fortified build calls.
void __syslog_chk(int priority, int flag, const char* format, ...);
void __syslog_chk(int priority, int, const char* format, ...) {
    std::va_list arguments;
    va_start(arguments, format);
    record(priority, format, arguments);
    va_end(arguments);
}

}  // extern "C"

namespace pinwell::syslog {
namespace {

using testing::ElementsAre;
using testing::EndsWith;
using testing::IsEmpty;

class SystemLogTest : public testing::Test {
  protected:
    SystemLogTest() { recorded() = {}; }
};

TEST_F(SystemLogTest, WritesAtErrorLevelUnderItsIdentity) {
    const auto log = makeSystemLog();
    log->error("one");
    log->error("two");
    EXPECT_THAT(recorded().opened, ElementsAre("pinwell"));
    EXPECT_THAT(recorded().facilities, ElementsAre(LOG_USER));
    EXPECT_THAT(recorded().priorities, ElementsAre(LOG_USER | LOG_ERR, LOG_USER | LOG_ERR));
    EXPECT_THAT(recorded().entries, ElementsAre("one", "two"));
}

TEST_F(SystemLogTest, IsNotOpenedBeforeTheFirstEntryNorLeftOpen) {
    makeSystemLog().reset();
    EXPECT_THAT(recorded().opened, IsEmpty());
    EXPECT_EQ(recorded().closed, 0);
    makeSystemLog()->error("x");
    EXPECT_EQ(recorded().closed, 1);
}

TEST_F(SystemLogTest, DoesNotReadTextAsAFormat) {
    makeSystemLog()->error("%s%n%d 100%");
    EXPECT_THAT(recorded().entries, ElementsAre("%s%n%d 100%"));
}

TEST_F(SystemLogTest, FormatsArguments) {
    makeSystemLog()->error("%@: %d of %s", std::string("a\n"), 5, "%d");
    EXPECT_THAT(recorded().entries, ElementsAre("a\\n: 5 of %d"));
}

TEST_F(SystemLogTest, EscapesControlCharacters) {
    makeSystemLog()->error("one\ntwo\x1B[0m");
    EXPECT_THAT(recorded().entries, ElementsAre("one\\ntwo\\x1b[0m"));
}

TEST_F(SystemLogTest, KeepsTheLongestEntryWhole) {
    const std::string longest(kLongestEntry, 'x');
    makeSystemLog()->error(longest);
    EXPECT_THAT(recorded().entries, ElementsAre(longest));
}

TEST_F(SystemLogTest, CutsALongerEntry) {
    makeSystemLog()->error(std::string(1'000'000, 'x'));
    ASSERT_EQ(recorded().entries.size(), 1U);
    EXPECT_EQ(recorded().entries[0].size(), kLongestEntry);
    EXPECT_THAT(recorded().entries[0], EndsWith("xxx..."));
}

TEST_F(SystemLogTest, DoesNotCutACharacterInHalf) {
    std::string text(kLongestEntry - 4, 'x');
    for (int i = 0; i < 10; ++i) text += "\xE2\x82\xAC";
    makeSystemLog()->error(text);
    EXPECT_THAT(recorded().entries, ElementsAre(std::string(kLongestEntry - 4, 'x') + "..."));
}

TEST_F(SystemLogTest, TakesEntriesFromSeveralThreads) {
    const auto log = makeSystemLog();
    std::vector<std::thread> threads;
    for (int t = 0; t < 4; ++t)
        threads.emplace_back([&] {
            for (int i = 0; i < 100; ++i) log->error("%d", i);
        });
    for (std::thread& thread : threads) thread.join();
    EXPECT_EQ(recorded().entries.size(), 400U);
    EXPECT_EQ(recorded().opened.size(), 1U);
}

TEST(FakeSystemLog, KeepsEntries) {
    test::FakeSystemLog log;
    log.error("plain %d");
    log.error("%d", 5);
    EXPECT_THAT(log.entries(), ElementsAre("plain %d", "5"));
}

}  // namespace
}  // namespace pinwell::syslog
