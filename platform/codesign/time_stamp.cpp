#include "codesign/time_stamp.h"

#include <chrono>
#include <string>
#include <string_view>

#include "codesign/code_error.h"

namespace pinwell::codesign {

using ber::Reader;
using ber::Work;
using foundation::ByteView;
using foundation::Date;

namespace {

constexpr const char* kTimeStamp = "the time stamp";

[[noreturn]] void malformedTime() {
    refuse("the time stamp's time is malformed");
}

/// The digits of a time, from the start.
class TimeReader {
  public:
    explicit TimeReader(std::string_view text) : rest_(text) {}

    unsigned digits(std::size_t count) {
        unsigned value = 0;
        for (; count > 0; --count) {
            if (!isDigit()) malformedTime();
            value = 10 * value + static_cast<unsigned>(take() - '0');
        }
        return value;
    }

    // A fraction has at least one digit; trailing zeros are accepted.
    void fractionAndZone() {
        if (!rest_.empty() && rest_.front() == '.') {
            take();
            if (!isDigit()) malformedTime();
            while (isDigit()) take();
        }
        if (rest_ != "Z") malformedTime();
    }

  private:
    bool isDigit() const { return !rest_.empty() && rest_.front() >= '0' && rest_.front() <= '9'; }
    char take() {
        const char first = rest_.front();
        rest_.remove_prefix(1);
        return first;
    }

    std::string_view rest_;
};

Date parseTime(ByteView text) {
    using namespace std::chrono;
    const std::string characters = foundation::toString(text);
    TimeReader reader(characters);
    // Braces: they evaluate the parts in order.
    const year_month_day date{year(static_cast<int>(reader.digits(4))), month(reader.digits(2)),
                              day(reader.digits(2))};
    const unsigned hour = reader.digits(2);
    const unsigned minute = reader.digits(2);
    const unsigned second = reader.digits(2);
    reader.fractionAndZone();
    if (!date.ok() || hour > 23 || minute > 59 || second > 59) malformedTime();
    const auto moment = sys_days(date) + hours(hour) + minutes(minute) + seconds(second);
    return Date{moment.time_since_epoch().count()};
}

}  // namespace

TimeStamp parseTimeStamp(ByteView bytes) {
    Work work;
    Reader whole(bytes, work);
    Reader fields(whole.expect(ber::kSequence, kTimeStamp).contents, work);
    whole.finish(kTimeStamp);
    const ByteView version = fields.expect(ber::kInteger, kTimeStamp).contents;
    if (version.size() != 1 || version.front() != std::byte{1})
        refuse("the time stamp has an unknown version");
    fields.expect(ber::kObjectIdentifier, kTimeStamp);

    TimeStamp stamp;
    Reader imprint(fields.expect(ber::kSequence, kTimeStamp).contents, work);
    stamp.imprintAlgorithm = readAlgorithm(imprint, work, kTimeStamp);
    stamp.imprint = imprint.expect(ber::kOctetString, kTimeStamp).contents;
    imprint.finish(kTimeStamp);
    fields.expect(ber::kInteger, kTimeStamp);
    stamp.time = parseTime(fields.expect(ber::kGeneralizedTime, kTimeStamp).contents);
    while (!fields.atEnd()) fields.next(kTimeStamp);
    return stamp;
}

}  // namespace pinwell::codesign
