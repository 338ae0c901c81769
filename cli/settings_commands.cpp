#include "settings_commands.h"

#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <ctime>
#include <memory>
#include <string>
#include <vector>

#include "commands.h"
#include "documents.h"
#include "varnel/records.h"

namespace varnel::cli {

namespace {

struct SettingsLine {
    MeterOptions meter;
    std::string output;
    std::vector<std::string> items;
    bool sync = false;
};

// The major code of the first report in a status document; "" when there is none.
std::string firstMajor(XMLWrapper& status) {
    status.MoveToRoot();
    if (status.CountElements("ErrCode") == 0) return {};
    status.MoveToChild("ErrCode");
    std::string major = status.GetChildValue("Major");
    status.MoveToRoot();
    return major;
}

// Reads the listed items (all when none are listed) into a settings document.
// Items the meter does not offer go to notes; a request of which none is offered fails.
XMLWrapper readSettings(MeterSession& s, const std::vector<std::string>& items, std::vector<std::string>& notes) {
    XMLWrapper cfg = emptyDocument(doc_kind::device_settings);
    if (!items.empty()) {
        cfg.SelectElement("Settings");
        for (const std::string& item : items) cfg.AddElement(item);
        cfg.MoveToRoot();
    }
    bool checked = false;
    s.request("settings", [&](XMLWrapper& status) {
        const std::int32_t code =
            s.wrapper().getDeviceSettings(s.record(), s.deviceInfo(), cfg, items.empty(), status, checked);
        if (code != ME_SUCCESS) return code;
        // The request succeeds even when items were refused; its report tells.
        const std::string major = firstMajor(status);
        if (major == std::to_string(ME_FAIL)) return static_cast<std::int32_t>(ME_FAIL);
        if (major == std::to_string(ME_PARTIALSUCCESS)) notes = statusDescriptions(status);
        return code;
    });
    return cfg;
}

// A calendar time without a time zone, as both clocks show it.
struct LocalTime {
    int year = 0, month = 0, day = 0, hour = 0, minute = 0, second = 0;

    std::int64_t seconds() const {
        using namespace std::chrono;
        const sys_days date{std::chrono::year{year} / month / day};
        return date.time_since_epoch().count() * 86400LL + hour * 3600LL + minute * 60LL + second;
    }
    std::string text() const {
        char buf[80];
        std::snprintf(buf, sizeof buf, "%04d-%02d-%02d %02d:%02d:%02d", year, month, day, hour, minute, second);
        return buf;
    }
};

LocalTime computerClock() {
    const std::time_t now = std::time(nullptr);
    std::tm parts{};
    localtime_r(&now, &parts);
    return {parts.tm_year + 1900, parts.tm_mon + 1, parts.tm_mday, parts.tm_hour, parts.tm_min, parts.tm_sec};
}

// Date parts (and time parts, when present) of the Clock child `child`.
LocalTime clockChild(XMLWrapper& cfg, const char* child) {
    auto part = [&](const char* name) { return std::atoi(cfg.GetChildAttribute(child, name).c_str()); };
    return {part("Y"), part("MM"), part("D"), part("h"), part("m"), part("s")};
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

}  // namespace

void showClock(MeterSession& s) {
    std::vector<std::string> notes;
    XMLWrapper cfg = readSettings(s, {"Clock"}, notes);
    cfg.SelectElement("Clock");
    const LocalTime meter = clockChild(cfg, "Val");
    const LocalTime first = clockChild(cfg, "Min");
    const LocalTime last = clockChild(cfg, "Max");
    const LocalTime computer = computerClock();
    std::printf("Meter clock:    %s\n", meter.text().c_str());
    std::printf("Computer clock: %s\n", computer.text().c_str());
    std::printf("Difference:     %s\n", differenceText(meter.seconds() - computer.seconds()).c_str());
    std::printf("Meter accepts:  %s to %s\n", first.text().substr(0, 10).c_str(), last.text().substr(0, 10).c_str());
}

void addSettingsCommands(CLI::App& app, int& status, ClockSetter setClock) {
    auto line = std::make_shared<SettingsLine>();

    auto* settings =
        app.add_subcommand("settings", "Print the meter's settings document: every item, or those named by --item");
    addMeterOptions(settings, line->meter);
    addOutputOption(settings, line->output);
    settings
        ->add_option("--item", line->items,
                     "Read only this item (Clock, Beep, GlucUnit, Language, Insulins, Targets...); repeatable")
        ->type_name("NAME");
    settings->callback([line, &status] {
        status = MeterSession(line->meter).run([&](MeterSession& s) {
            std::vector<std::string> notes;
            emit(line->output, xmlText(readSettings(s, line->items, notes)));
            for (const std::string& note : notes) say(note);
        });
    });

    auto* clock = app.add_subcommand("clock", "Show the meter clock beside the computer clock, with the difference");
    addMeterOptions(clock, line->meter);
    if (setClock) clock->add_flag("--sync", line->sync, "First set the meter clock to the computer clock");
    clock->callback([line, &status, setClock] {
        status = MeterSession(line->meter).run([&](MeterSession& s) {
            if (line->sync) setClock(s);
            showClock(s);
        });
    });
}

}  // namespace varnel::cli
