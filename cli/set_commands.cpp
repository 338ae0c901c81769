#include "set_commands.h"

#include <pugixml.hpp>

#include <algorithm>
#include <cstdio>
#include <sstream>
#include <utility>
#include <memory>
#include <string>
#include <vector>

#include "commands.h"
#include "documents.h"
#include "validate.h"
#include "settings_commands.h"
#include "varnel/component_error.h"
#include "varnel/records.h"

namespace varnel::cli {

namespace {

struct SetLine {
    MeterOptions meter;
    std::string file;
    bool force = false;
};

// The words the component's refusals use for an item ("Invalid StripCalCode value"), and the
// element the document names it by. A word missing here is taken as an element name.
constexpr std::pair<const char*, const char*> kRefusalWords[] = {
    {"StripCalCode", "CC"},        {"Beeper", "Beep"},           {"GlucoseUnit", "GlucUnit"},
    {"Punctuation", "Decimal"},    {"DateMode", "DateFormat"},   {"TimeMode", "TimeFormat"},
    {"BaudRate", "Baud"},          {"EventAveraging", "EvtAvg"}, {"DisplayClock", "ShowClock"},
    {"Daylight", "DayLight"},      {"DaysBeginWeek", "WeekBegin"}, {"CholesterolUnits", "CholesUnit"},
    {"InsulinPumpUse", "PumpUse"}, {"InsPumpUse", "PumpUse"},    {"DeviceClock", "Clock"},
    {"Insulin", "Insulins"},       {"CustomInsulin", "Insulins"}, {"FavoriteInsulin", "Insulins"},
    {"OralMeds", "Pills"},         {"CustomOralMed", "Pills"},   {"FavoriteOralMed", "Pills"},
};

std::string trimmed(const std::string& text) {
    const auto first = text.find_first_not_of(" \t\r\n");
    if (first == std::string::npos) return {};
    return text.substr(first, text.find_last_not_of(" \t\r\n") - first + 1);
}

// One item the meter did not take: its path under Settings ("CC", "Targets/Hypo") and the
// reason that followed it in the report, if any.
struct Refusal {
    std::string path;
    std::string reason;
};

// The refused items of a setDeviceSettings report, in its order; `understood` turns false
// when a part of the report names no item of `settings` and explains none.
std::vector<Refusal> refusalsIn(const std::string& report, const pugi::xml_node& settings, bool& understood) {
    std::vector<Refusal> refused;
    understood = true;
    std::vector<std::string> pieces;
    for (std::size_t at = 0; at <= report.size();) {
        const std::size_t end = std::min(report.find(';', at), report.size());
        if (const std::string piece = trimmed(report.substr(at, end - at)); !piece.empty()) pieces.push_back(piece);
        at = end + 1;
    }
    for (std::size_t i = 1; i < pieces.size(); ++i) {  // the first is the summary ("Partial success")
        std::istringstream words(pieces[i]);
        std::string first, word, next;
        words >> first >> word >> next;
        if (first == "Too") word = next;  // "Too many FavoriteOralMed at index 3"
        if (first != "Invalid" && first != "Too") word = first;  // "Beeper value is read only"
        std::string element = word;
        for (const auto& [said, name] : kRefusalWords)
            if (word == said) element = name;
        if (settings.child(element.c_str())) {
            // "Invalid Targets Hypo value": the part of the item.
            if (settings.child(element.c_str()).child(next.c_str())) element += "/" + next;
            refused.push_back({element, ""});
        } else if (!refused.empty() && refused.back().reason.empty()) {
            refused.back().reason = pieces[i];
        } else {
            understood = false;
        }
    }
    return refused;
}

// "CC: 99 was not written (reason); it takes 1 to 16": the value given and what the
// document itself says the item takes.
std::string refusalText(const Refusal& r, const pugi::xml_node& settings) {
    const pugi::xml_node item = settings.first_element_by_path(r.path.c_str());
    std::string value = trimmed(item.text().get());
    if (value.empty()) value = item.attribute("Val").value();
    if (r.path == "Clock") {
        const pugi::xml_node val = item.child("Val");
        char text[64];
        std::snprintf(text, sizeof text, "%s-%s-%s %s:%s:%s", val.attribute("Y").value(), val.attribute("MM").value(),
                      val.attribute("D").value(), val.attribute("h").value(), val.attribute("m").value(),
                      val.attribute("s").value());
        value = text;
    }
    std::string text = r.path + ": " + (value.empty() ? "the value" : "\"" + value + "\"") + " was not written";
    if (!r.reason.empty()) text += " (" + r.reason + ")";
    if (item.attribute("Min") && item.attribute("Max")) {
        text += "; it takes " + std::string(item.attribute("Min").value()) + " to " + item.attribute("Max").value();
        std::string words;
        for (const pugi::xml_node& word : item.child("ValidLang").children())
            words += (words.empty() ? "" : ", ") + trimmed(word.text().get()) + " " + word.attribute("Txt").value();
        if (!words.empty()) text += " (" + words + ")";
    } else {
        const std::string top = r.path.substr(0, r.path.find('/'));
        text += "; 'varnel caps --item " + top + "' shows what it takes";
    }
    return text;
}

// What setDeviceSettings reported: its major code and description.
struct SetReport {
    std::string major, description;
};

// Writes cfg to the meter. The request succeeds whenever it walked the whole
// document; its one report says whether every setting was taken.
SetReport apply(MeterSession& s, XMLWrapper& cfg, const std::string& label) {
    SetReport report;
    s.request(label, [&](XMLWrapper& status) {
        const std::int32_t code = s.wrapper().setDeviceSettings(s.record(), s.deviceInfo(), cfg, status);
        status.MoveToRoot();
        if (status.CountElements("ErrCode") > 0) {
            status.MoveToChild("ErrCode");
            report.major = status.GetChildValue("Major");
            status.MoveToRoot();
            report.description = status.GetChildValue("ErrDesc");
        }
        return code;
    });
    return report;
}

int statusOf(const SetReport& report) {
    return report.major.empty() ? exit_status::other_code : statusForCode(std::stoi(report.major));
}

// Says, item by item, what the meter refused of cfg and, when the rest was taken, what it
// took; ends the run with the report's code made positive. The component's own line is said
// as well when part of it names no item.
void sayRefusals(const SetReport& report, const XMLWrapper& cfg) {
    pugi::xml_document doc;
    doc.load_string(cfg.XML().c_str());
    const pugi::xml_node settings = doc.document_element().child("Settings");
    bool understood = false;
    const std::vector<Refusal> refused = refusalsIn(report.description, settings, understood);
    if (!understood || refused.empty())
        say(report.description.empty() ? "set: the meter did not say how the settings went" : report.description);
    for (const Refusal& r : refused) say(refusalText(r, settings));
    if (report.major == std::to_string(ME_PARTIALSUCCESS) && !refused.empty()) {
        std::string written, notWritten;
        for (const pugi::xml_node& item : settings.children()) {
            const std::string name = item.name();
            const bool out = std::any_of(refused.begin(), refused.end(),
                                         [&](const Refusal& r) { return r.path.substr(0, r.path.find('/')) == name; });
            (out ? notWritten : written) += ((out ? notWritten : written).empty() ? "" : ", ") + name;
        }
        say("written: " + (written.empty() ? std::string("nothing") : written) + "; not written: " + notWritten);
    }
    throw RunEnd{statusOf(report)};
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
    const SetReport report = apply(s, doc, "clock");
    if (report.major == "0") return;
    // The meter's own refusal names no range; the person needs it to pick a time.
    const std::string accepts = "the meter clock accepts only " + range.first.dateText() + " to " +
                                range.last.dateText();
    const bool today = time.dateText() == computerNow().dateText();
    if (time.seconds() > range.last.seconds() + 86399 || time.seconds() < range.first.seconds())
        say(today ? accepts + ", so it cannot be set to today's date (" + time.dateText() + ")"
                  : accepts + ", so it cannot be set to " + time.text());
    else
        say(time.text() + " was refused (" + trimmed(report.description) + "); " + accepts);
    throw RunEnd{statusOf(report)};
}

void addSetCommand(CLI::App& app, int& status) {
    auto line = std::make_shared<SetLine>();
    auto* set = app.add_subcommand("set", "Write the settings of a device configuration document to the meter");
    addMeterOptions(set, line->meter);
    set->add_option("FILE", line->file, "The document, as 'varnel settings' writes it and you edited it")
        ->required()
        ->check(CLI::ExistingFile);
    set->add_flag("--force", line->force,
                  "Write the document even where it breaks its schema or the Min and Max it gives an item");
    set->callback([line, &status] {
        // The document is judged before the meter is touched: a file that breaks its schema changes nothing.
        XMLWrapper cfg;
        const DocumentCheck check = checkFile(line->file, cfg);
        status = exit_status::bad_input;
        using Verdict = DocumentCheck::Verdict;
        if (check.verdict == Verdict::unreadable) return say(line->file + ": cannot be read: " + check.problems.front());
        if (check.verdict == Verdict::not_xml)
            return say(line->file + ": not an XML document: " + check.problems.front());
        if (cfg.GetRootName() != "DeviceSettings")
            return say(line->file + " is a " + cfg.GetRootName() + " document, not a DeviceSettings document");
        if (!line->force && check.verdict != Verdict::valid) {
            if (check.verdict != Verdict::invalid) {
                say("cannot check " + line->file + ": no usable schema in " + schemaDirectory() +
                    "; nothing was written ('varnel set --force' writes it unchecked)");
                status = exit_status::local_failure;
                return;
            }
            for (const std::string& problem : check.problems) say(line->file + ": " + problem);
            say("nothing was written: correct the file ('varnel validate' checks it), or write it as it is "
                "with 'varnel set --force'");
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
            const SetReport report = apply(s, cfg, "set");
            if (report.major != "0") sayRefusals(report, cfg);
            std::printf("Wrote the settings of %s to meter %s on port %s.\n", printable(line->file).c_str(),
                        printable(sectionValue(s.deviceInfo(), "DeviceInfo", "SN")).c_str(),
                        sectionValue(s.deviceInfo(), "PortInfo", "PortID").c_str());
        });
    });
}

}  // namespace varnel::cli
