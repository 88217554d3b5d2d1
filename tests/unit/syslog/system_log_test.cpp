#include "syslog/system_log.h"

#include <gtest/gtest.h>
#include <syslog.h>

#include <cstdarg>
#include <cstdio>
#include <string>
#include <vector>

namespace {

// What reaches the C library's logger: these stand in for its functions in this program.
struct Entry {
    int priority;
    std::string text;
};
std::vector<Entry> entries;
std::string identity;

void record(int priority, const char* format, std::va_list arguments) {
    std::vector<char> text(1 << 16);
    std::vsnprintf(text.data(), text.size(), format, arguments);
    entries.push_back({priority, text.data()});
}

}  // namespace

extern "C" {
void openlog(const char* name, int, int) { identity = name; }
void closelog() {}
void syslog(int priority, const char* format, ...) {
    std::va_list arguments;
    va_start(arguments, format);
    record(priority, format, arguments);
    va_end(arguments);
}
// What a fortified build calls instead.
void __syslog_chk(int priority, int, const char* format, ...) {
    std::va_list arguments;
    va_start(arguments, format);
    record(priority, format, arguments);
    va_end(arguments);
}
}

namespace pinwell::syslog {
namespace {

class SystemLogEntries : public testing::Test {
  protected:
    void SetUp() override { entries.clear(); }
    std::unique_ptr<SystemLog> log = makeSystemLog();
};

TEST_F(SystemLogEntries, AreOfFacilityUserAndLevelErrorUnderTheToolsName) {
    log->error("something failed (%d): %@", -50, std::string("/a path"));
    ASSERT_EQ(entries.size(), 1U);
    EXPECT_EQ(entries[0].priority, LOG_USER | LOG_ERR);
    EXPECT_EQ(entries[0].text, "something failed (-50): /a path");
    EXPECT_EQ(identity, "pinwell");
}

TEST_F(SystemLogEntries, TakePercentSignsFromAFileAsTheyAre) {
    log->error("%@", std::string("100%s %n"));
    EXPECT_EQ(entries.at(0).text, "100%s %n");
}

TEST_F(SystemLogEntries, EscapeControlCharacters) {
    log->error("%@", std::string("a\nb\x1b[0m"));
    EXPECT_EQ(entries.at(0).text, "a\\nb\\x1b[0m");
}

TEST_F(SystemLogEntries, AreCutWhenVeryLong) {
    log->error("%@", std::string(100000, 'x'));
    EXPECT_EQ(entries.at(0).text, std::string(1000, 'x'));
}

}  // namespace
}  // namespace pinwell::syslog
