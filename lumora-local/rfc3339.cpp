#include "rfc3339.h"

#include <chrono>
#include <cstdint>

#include "values/format.h"

namespace pinwell::lumora {
namespace {

using std::chrono::days;
using std::chrono::seconds;
using std::chrono::sys_days;
using std::chrono::year_month_day;
using values::Date;

constexpr std::int64_t kSecondsPerDay = 86'400;

/// A cursor over the text; the first thing that does not fit ends it.
class Scanner {
  public:
    explicit Scanner(std::string_view text) : rest_(text) {}

    bool failed() const noexcept { return failed_; }
    bool atEnd() const noexcept { return rest_.empty(); }

    /// Exactly `digits` decimal digits, with a value of at most `maximum`.
    int number(std::size_t digits, int maximum) {
        int value = 0;
        for (std::size_t i = 0; i < digits; ++i) value = value * 10 + digit();
        if (value > maximum) failed_ = true;
        return value;
    }

    /// One of the characters.
    char oneOf(std::string_view characters) {
        if (rest_.empty() || characters.find(rest_.front()) == std::string_view::npos) {
            failed_ = true;
            return '\0';
        }
        const char found = rest_.front();
        rest_.remove_prefix(1);
        return found;
    }

    /// A fraction of a second, if there is one.
    void skipFraction() {
        if (rest_.empty() || rest_.front() != '.') return;
        rest_.remove_prefix(1);
        digit();
        while (!failed_ && !rest_.empty() && rest_.front() >= '0' && rest_.front() <= '9') {
            rest_.remove_prefix(1);
        }
    }

  private:
    int digit() {
        const char found = oneOf("0123456789");
        return failed_ ? 0 : found - '0';
    }

    std::string_view rest_;
    bool failed_ = false;
};

/// Seconds that local time is ahead of UTC.
std::int64_t scanOffset(Scanner& scanner) {
    const char sign = scanner.oneOf("Zz+-");
    if (sign != '+' && sign != '-') return 0;
    const int hours = scanner.number(2, 23);
    scanner.oneOf(":");
    const int minutes = scanner.number(2, 59);
    const std::int64_t offset = hours * 3600 + minutes * 60;
    return sign == '+' ? offset : -offset;
}

}  // namespace

std::string toRfc3339(Date date) {
    const std::chrono::sys_seconds time{seconds(date.seconds)};
    const sys_days day = std::chrono::floor<days>(time);
    const year_month_day calendar(day);
    const std::int64_t rest = (time - day).count();
    return values::format("%04d-%02u-%02uT%02d:%02d:%02dZ", static_cast<int>(calendar.year()),
                          static_cast<unsigned>(calendar.month()), static_cast<unsigned>(calendar.day()),
                          static_cast<int>(rest / 3600), static_cast<int>(rest / 60 % 60),
                          static_cast<int>(rest % 60));
}

std::optional<Date> parseRfc3339(std::string_view text) {
    Scanner scanner(text);
    const int year = scanner.number(4, 9999);
    scanner.oneOf("-");
    const int month = scanner.number(2, 12);
    scanner.oneOf("-");
    const int day = scanner.number(2, 31);
    const year_month_day date(std::chrono::year(year), std::chrono::month(static_cast<unsigned>(month)),
                              std::chrono::day(static_cast<unsigned>(day)));
    if (scanner.failed() || !date.ok()) return std::nullopt;
    const std::int64_t midnight = sys_days(date).time_since_epoch().count() * kSecondsPerDay;
    if (scanner.atEnd()) return Date{midnight};

    scanner.oneOf("Tt ");
    const int hour = scanner.number(2, 23);
    scanner.oneOf(":");
    const int minute = scanner.number(2, 59);
    scanner.oneOf(":");
    const int second = scanner.number(2, 60);  // a leap second counts as the next minute's first
    scanner.skipFraction();
    const std::int64_t offset = scanOffset(scanner);
    if (scanner.failed() || !scanner.atEnd()) return std::nullopt;
    return Date{midnight + hour * 3600 + minute * 60 + second - offset};
}

}  // namespace pinwell::lumora
