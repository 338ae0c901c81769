#include "meter_clock.h"

#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <ctime>
#include <vector>

#include "documents.h"
#include "settings_commands.h"

namespace varnel::cli {

namespace {

// Beyond this the readings' times are noticeably wrong.
constexpr std::int64_t kDriftLimitSeconds = 5 * 60;

// Date parts (and time parts, when present) of the Clock child `child`.
LocalTime clockChild(XMLWrapper& cfg, const char* child) {
    auto part = [&](const char* name) { return std::atoi(cfg.GetChildAttribute(child, name).c_str()); };
    return {part("Y"), part("MM"), part("D"), part("h"), part("m"), part("s")};
}

}  // namespace

std::int64_t LocalTime::seconds() const {
    using namespace std::chrono;
    const sys_days date{std::chrono::year{year} / month / day};
    return date.time_since_epoch().count() * 86400LL + hour * 3600LL + minute * 60LL + second;
}

std::string LocalTime::text() const {
    char buf[80];
    std::snprintf(buf, sizeof buf, "%04d-%02d-%02d %02d:%02d:%02d", year, month, day, hour, minute, second);
    return buf;
}

std::optional<LocalTime> parseLocalTime(const std::string& text) {
    LocalTime t;
    int used = 0;
    if (std::sscanf(text.c_str(), "%4d-%2d-%2d %2d:%2d:%2d%n", &t.year, &t.month, &t.day, &t.hour, &t.minute,
                    &t.second, &used) != 6 ||
        static_cast<std::size_t>(used) != text.size() || text.size() != 19)
        return std::nullopt;
    const std::chrono::year_month_day date{std::chrono::year{t.year}, std::chrono::month(t.month),
                                           std::chrono::day(t.day)};
    if (!date.ok() || t.hour > 23 || t.minute > 59 || t.second > 59 || t.hour < 0 || t.minute < 0 || t.second < 0)
        return std::nullopt;
    return t;
}

LocalTime computerNow() {
    if (const char* fixed = std::getenv("VARNEL_NOW"))
        if (const auto t = parseLocalTime(fixed)) return *t;
    const std::time_t now = std::time(nullptr);
    std::tm parts{};
    localtime_r(&now, &parts);
    return {parts.tm_year + 1900, parts.tm_mon + 1, parts.tm_mday, parts.tm_hour, parts.tm_min, parts.tm_sec};
}

MeterClock readMeterClock(MeterSession& s) {
    std::vector<std::string> notes;
    XMLWrapper cfg = readSettings(s, {"Clock"}, notes, "clock");
    cfg.SelectElement("Clock");
    return {clockChild(cfg, "Val"), clockChild(cfg, "Min"), clockChild(cfg, "Max")};
}

std::string differenceText(std::int64_t meterAhead) {
    if (meterAhead == 0) return "none, the clocks agree";
    const std::int64_t span = meterAhead < 0 ? -meterAhead : meterAhead;
    char buf[64];
    const long long days = span / 86400;
    const int rest = static_cast<int>(span % 86400);
    std::snprintf(buf, sizeof buf, "%s%02d:%02d:%02d", days ? (std::to_string(days) + " days ").c_str() : "",
                  rest / 3600, rest / 60 % 60, rest % 60);
    return std::string("meter is ") + buf + (meterAhead < 0 ? " behind" : " ahead");
}

std::string clockWarning(const MeterClock& meter, const LocalTime& computer) {
    const std::string range = meter.first.dateText() + " to " + meter.last.dateText();
    // Syncing would be refused: say why instead of suggesting it.
    if (computer.seconds() > meter.last.seconds() + 86399 || computer.seconds() < meter.first.seconds())
        return "warning: the meter clock cannot hold today's date (" + computer.dateText() +
               "): it accepts only " + range + ", so its readings carry the meter's own dates";
    const std::int64_t ahead = meter.now.seconds() - computer.seconds();
    if (ahead <= kDriftLimitSeconds && ahead >= -kDriftLimitSeconds) return {};
    return "warning: the meter clock is off (" + differenceText(ahead) +
           "); 'varnel clock --sync' sets it to the computer clock";
}

void warnAboutMeterClock(MeterSession& s) {
    MeterClock clock;
    try {
        clock = readMeterClock(s);
    } catch (const RunEnd& end) {
        if (end.status >= exit_status::interrupted) throw;
        say("the meter clock could not be read; going on without checking it");
        return;
    }
    const std::string warning = clockWarning(clock, computerNow());
    if (!warning.empty()) say(warning);
}

}  // namespace varnel::cli
