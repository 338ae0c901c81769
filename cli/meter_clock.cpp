#include "meter_clock.h"

#include <cctype>
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

std::optional<LocalTime> parseLocalTime(const std::string& text, std::string* why) {
    // The exports write a 'T' between date and time; both forms are read, digits exactly where shown.
    static constexpr char kForm[] = "0000-00-00 00:00:00";
    bool fits = text.size() == sizeof kForm - 1;
    for (std::size_t i = 0; fits && i < text.size(); ++i)
        fits = kForm[i] == '0' ? std::isdigit(static_cast<unsigned char>(text[i])) != 0
                               : text[i] == kForm[i] || (i == 10 && text[i] == 'T');
    if (!fits) {
        if (why) *why = "expected \"YYYY-MM-DD hh:mm:ss\" or YYYY-MM-DDThh:mm:ss, got \"" + text + "\"";
        return std::nullopt;
    }
    auto number = [&](std::size_t at, std::size_t length) { return std::stoi(text.substr(at, length)); };
    const LocalTime t{number(0, 4), number(5, 2), number(8, 2), number(11, 2), number(14, 2), number(17, 2)};
    const std::chrono::year_month_day date{std::chrono::year{t.year}, std::chrono::month(t.month),
                                           std::chrono::day(t.day)};
    if (!date.ok()) {
        if (why) *why = "the date " + text.substr(0, 10) + " does not exist";
        return std::nullopt;
    }
    if (t.hour > 23 || t.minute > 59 || t.second > 59) {
        if (why) *why = "the time " + text.substr(11) + " does not exist";
        return std::nullopt;
    }
    return t;
}

std::string badStandInClock() {
    const char* fixed = std::getenv("VARNEL_NOW");
    std::string why;
    if (!fixed || parseLocalTime(fixed, &why)) return {};
    return "VARNEL_NOW stands in for the computer clock, but " + why + "; unset it or give a real time";
}

LocalTime computerNow() {
    if (const char* fixed = std::getenv("VARNEL_NOW"))
        if (const auto t = parseLocalTime(fixed)) return *t;
    const std::time_t now = std::time(nullptr);
    std::tm parts{};
    localtime_r(&now, &parts);
    return {parts.tm_year + 1900, parts.tm_mon + 1, parts.tm_mday, parts.tm_hour, parts.tm_min, parts.tm_sec};
}

MeterClock meterClockIn(XMLWrapper& cfg) {
    cfg.MoveToRoot();
    cfg.SelectElement("Clock");
    MeterClock clock{clockChild(cfg, "Val"), clockChild(cfg, "Min"), clockChild(cfg, "Max")};
    cfg.MoveToRoot();
    return clock;
}

MeterClock readMeterClock(MeterSession& s) {
    std::vector<std::string> notes;
    XMLWrapper cfg = readSettings(s, {"Clock"}, notes, "clock");
    return meterClockIn(cfg);
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
