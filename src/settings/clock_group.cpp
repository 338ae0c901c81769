#include "settings/clock_group.h"

#include "contracts/meter_reads.h"
#include "errors/err_propagator.h"
#include "util/helpers.h"

namespace varnel::detail {

namespace {

constexpr const char* kClass = "Group_Clock";

int windowedYear(int year) {
    int yy = ((year % 100) + 100) % 100;
    return yy < 30 ? 2000 + yy : 1900 + yy;
}

}  // namespace

std::int16_t Group_Clock::readFromMeter() {
    return guarded(kClass, "readFromMeter", [&]() -> std::int16_t {
        std::int32_t seconds = 0;
        std::int16_t code = outcome(transport().vb_Read_Meter_Clock(rec_, seconds));
        if (code == 0) ClockInSeconds = seconds;
        return code;
    });
}

std::int16_t Group_Clock::saveToMeter() {
    return guarded(kClass, "saveToMeter",
                   [&] { return outcome(transport().vb_Set_Meter_Clock(rec_, ClockInSeconds)); });
}

DateTime Group_Clock::ClockTime() { return getTimeForSec(ClockInSeconds); }

std::int16_t Group_Clock::readClockTime(DateTime& clock) { return timeForSec(ClockInSeconds, clock); }

void Group_Clock::setClockTime(const DateTime& clock) { ClockInSeconds = getSecondsFor(clock); }

std::int32_t Group_Clock::getSecondsFor(const DateTime& clock) {
    return guarded(kClass, "getSecondsFor", [&] {
        TIME_REC t{};
        t.sec = toInt16(clock.second());
        t.min = toInt16(clock.minute());
        t.hour = toInt16(clock.hour());
        t.mday = toInt16(clock.day());
        t.mon = toInt16(clock.month());
        t.year = toInt16(clock.year());
        return transport().convert_to_seconds(t);
    });
}

// Transport seconds to date-time: 0, or the conversion's failure code.
std::int16_t Group_Clock::convertTime(std::int32_t seconds, DateTime& time) {
    TIME_REC t{};
    if (const std::int16_t code = meterTimeOf(transport(), seconds, t)) return code;
    auto date = DateTime::fromParts(windowedYear(t.year), t.mon, t.mday);
    auto clock = DateTime::fromParts(1899, 12, 30, t.hour, t.min, t.sec);
    if (!date || !clock) raise(errc::internal, "The meter clock is not a valid date and time");
    time = ToDateTime(*date, *clock);
    return 0;
}

DateTime Group_Clock::getTimeForSec(std::int32_t seconds) {
    return guarded(kClass, "getTimeForSec", [&] {
        DateTime time;
        if (const std::int16_t code = convertTime(seconds, time))
            raise(errc::internal, "The meter clock could not be converted (code " + std::to_string(code) + ")");
        return time;
    });
}

std::int16_t Group_Clock::timeForSec(std::int32_t seconds, DateTime& time) {
    return guarded(kClass, "getTimeForSec", [&] { return convertTime(seconds, time); });
}

}  // namespace varnel::detail
