#include "set_commands.h"

#include <cstdio>
#include <memory>
#include <string>
#include <vector>

#include "commands.h"
#include "documents.h"
#include "settings_commands.h"
#include "varnel/component_error.h"
#include "varnel/records.h"

namespace varnel::cli {

namespace {

struct SetLine {
    MeterOptions meter;
    std::string file;
};

// Writes cfg to the meter. The request succeeds whenever it walked the whole
// document; its one report says whether every setting was taken, and a
// refused setting ends the run with that report's code made positive.
void apply(MeterSession& s, XMLWrapper& cfg, const std::string& label) {
    std::string major;
    std::string description;
    s.request(label, [&](XMLWrapper& status) {
        const std::int32_t code = s.wrapper().setDeviceSettings(s.record(), s.deviceInfo(), cfg, status);
        status.MoveToRoot();
        if (status.CountElements("ErrCode") > 0) {
            status.MoveToChild("ErrCode");
            major = status.GetChildValue("Major");
            status.MoveToRoot();
            description = status.GetChildValue("ErrDesc");
        }
        return code;
    });
    if (major == "0") return;
    say(description.empty() ? label + ": the meter did not say how the settings went" : description);
    throw RunEnd{major.empty() ? exit_status::other_code : statusForCode(std::stoi(major))};
}

// A configuration document that holds only the clock, for the meter discovery found.
XMLWrapper clockDocument(MeterSession& s, const LocalTime& time) {
    XMLWrapper doc = emptyDocument(doc_kind::device_settings);
    doc.SelectElement("DeviceInfo");
    doc.AddElement("SN", sectionValue(s.deviceInfo(), "DeviceInfo", "SN"));
    doc.AddElement("TypeID", sectionValue(s.deviceInfo(), "DeviceInfo", "TypeID"));
    doc.SelectElement("Settings");
    doc.AddElement("Clock");
    doc.AddChildElement("Val");
    const std::pair<const char*, int> parts[] = {{"D", time.day},   {"MM", time.month},  {"Y", time.year},
                                                 {"h", time.hour}, {"m", time.minute}, {"s", time.second}};
    for (const auto& [name, value] : parts) doc.SetChildAttribute(name, std::to_string(value));
    doc.MoveToRoot();
    return doc;
}

}  // namespace

void setMeterClock(MeterSession& s, const LocalTime& time) {
    const MeterClock range = readMeterClock(s);
    XMLWrapper doc = clockDocument(s, time);
    try {
        apply(s, doc, "clock");
    } catch (const RunEnd& end) {
        if (end.status >= exit_status::interrupted) throw;
        // The meter's own refusal names no range; the person needs it to pick a time.
        const std::string accepts = "the meter clock accepts only " + range.first.dateText() + " to " +
                                    range.last.dateText();
        const bool today = time.dateText() == computerNow().dateText();
        if (time.seconds() > range.last.seconds() + 86399 || time.seconds() < range.first.seconds())
            say(today ? accepts + ", so it cannot be set to today's date (" + time.dateText() + ")"
                      : accepts + ", so it cannot be set to " + time.text());
        else
            say(time.text() + " was refused; " + accepts);
        throw;
    }
}

void addSetCommand(CLI::App& app, int& status) {
    auto line = std::make_shared<SetLine>();
    auto* set = app.add_subcommand("set", "Write the settings of a device configuration document to the meter");
    addMeterOptions(set, line->meter);
    set->add_option("FILE", line->file, "The document, as 'varnel settings' writes it and you edited it")
        ->required()
        ->check(CLI::ExistingFile);
    set->footer("Example: varnel settings -o cfg.xml; edit cfg.xml; varnel set cfg.xml");
    set->callback([line, &status] {
        // The document is read before the meter is touched: a broken file changes nothing.
        XMLWrapper cfg;
        bool loaded = false;
        try {
            loaded = cfg.LoadFile(line->file);
        } catch (const ComponentError& e) {
            say(line->file + ": " + e.description());
            status = exit_status::bad_input;
            return;
        }
        if (!loaded) {
            say(line->file + ": not an XML document: " + cfg.LastLoadError());
            status = exit_status::bad_input;
            return;
        }
        // What the meter only reports (GlucRange...) comes back from 'varnel settings'; it is no change.
        std::vector<std::string> skipped;
        cfg.LoadXML(withoutReadOnlyItems(cfg.XML(), skipped));
        if (!skipped.empty()) {
            std::string names;
            for (const std::string& name : skipped) names += (names.empty() ? "" : ", ") + name;
            say("skipped the items the meter only reports: " + names);
        }
        status = MeterSession(line->meter).run([&](MeterSession& s) {
            apply(s, cfg, "set");
            std::printf("Wrote the settings of %s to meter %s on port %s.\n", printable(line->file).c_str(),
                        printable(sectionValue(s.deviceInfo(), "DeviceInfo", "SN")).c_str(),
                        sectionValue(s.deviceInfo(), "PortInfo", "PortID").c_str());
        });
    });
}

}  // namespace varnel::cli
