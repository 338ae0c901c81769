#include "set_commands.h"

#include <cstdio>
#include <ctime>
#include <memory>
#include <string>

#include "commands.h"
#include "documents.h"
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
XMLWrapper clockDocument(MeterSession& s, const std::tm& now) {
    XMLWrapper doc = emptyDocument(doc_kind::device_settings);
    doc.SelectElement("DeviceInfo");
    doc.AddElement("SN", sectionValue(s.deviceInfo(), "DeviceInfo", "SN"));
    doc.AddElement("TypeID", sectionValue(s.deviceInfo(), "DeviceInfo", "TypeID"));
    doc.SelectElement("Settings");
    doc.AddElement("Clock");
    doc.AddChildElement("Val");
    const std::pair<const char*, int> parts[] = {{"D", now.tm_mday}, {"MM", now.tm_mon + 1}, {"Y", now.tm_year + 1900},
                                                 {"h", now.tm_hour}, {"m", now.tm_min},      {"s", now.tm_sec}};
    for (const auto& [name, value] : parts) doc.SetChildAttribute(name, std::to_string(value));
    doc.MoveToRoot();
    return doc;
}

}  // namespace

void syncMeterClock(MeterSession& s) {
    const std::time_t t = std::time(nullptr);
    std::tm now{};
    localtime_r(&t, &now);
    XMLWrapper doc = clockDocument(s, now);
    apply(s, doc, "clock");
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
            status = exit_status::usage;
            return;
        }
        if (!loaded) {
            say(line->file + ": not an XML document: " + cfg.LastLoadError());
            status = exit_status::usage;
            return;
        }
        status = MeterSession(line->meter).run([&](MeterSession& s) {
            apply(s, cfg, "set");
            std::printf("Wrote the settings of %s to meter %s on port %s.\n", line->file.c_str(),
                        sectionValue(s.deviceInfo(), "DeviceInfo", "SN").c_str(),
                        sectionValue(s.deviceInfo(), "PortInfo", "PortID").c_str());
        });
    });
}

}  // namespace varnel::cli
