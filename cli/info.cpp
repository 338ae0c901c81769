#include "info.h"

#include <cstdio>
#include <memory>
#include <string>
#include <vector>

#include "commands.h"
#include "documents.h"
#include "meter_clock.h"
#include "session.h"
#include "settings_commands.h"
#include "varnel/records.h"

namespace varnel::cli {

namespace {

// The attribute `name` of the element at `section`/`child` of a document; "" when absent.
std::string attributeOf(XMLWrapper& doc, const char* section, const char* child, const char* name) {
    doc.MoveToRoot();
    doc.SelectElement(section);
    std::string value = doc.GetChildAttribute(child, name);
    doc.MoveToRoot();
    return value;
}

std::string firmwareText(XMLWrapper& device) {
    const std::string version = sectionValue(device, "DeviceInfo", "MasterSWVer");
    const std::string year = attributeOf(device, "DeviceInfo", "MasterSWVer", "Y");
    if (year.empty()) return version;
    return version + " of " + year + "-" + attributeOf(device, "DeviceInfo", "MasterSWVer", "MM") + "-" +
           attributeOf(device, "DeviceInfo", "MasterSWVer", "D");
}

// How many records the meter holds, of how many it can, from the transfer summary of an upload.
std::string recordsText(XMLWrapper& datalog) {
    datalog.MoveToRoot();
    datalog.SelectElement("TransferDetail");
    datalog.MoveToChild("Records");
    const std::string total = datalog.GetChildValue("Total");
    const std::string capacity = datalog.GetChildValue("Capacity");
    const std::string corrupted = datalog.GetChildValue("Corrupted");
    datalog.MoveToRoot();
    std::string text = total + " of " + capacity;
    if (!corrupted.empty() && corrupted != "0") text += " (" + corrupted + " damaged, left out of the datalog)";
    return text;
}

void fact(const char* name, const std::string& value) {
    std::printf("%-16s%s\n", (std::string(name) + ":").c_str(), printable(value).c_str());
}

// Describes the meter. Counting its records takes an upload (half a minute on a real meter),
// so only `countRecords` asks for one; the unit then comes from the upload, else from the settings.
void describe(MeterSession& s, bool countRecords) {
    std::vector<std::string> notes;
    XMLWrapper cfg = readSettings(s, {"Clock", "GlucUnit"}, notes, "clock");
    const MeterClock clock = meterClockIn(cfg);
    std::string unit = attributeOf(cfg, "Settings", "GlucUnit", "Txt");
    std::string records = "not counted ('varnel info --records' counts them by an upload)";
    if (countRecords) {
        XMLWrapper datalog = emptyDocument(doc_kind::datalog);
        XMLWrapper filter = emptyDocument(doc_kind::filter);
        bool checked = false;
        s.request("records", [&](XMLWrapper& status) {
            return s.wrapper().getReadings(s.record(), s.deviceInfo(), datalog, filter, status, checked);
        });
        records = recordsText(datalog);
        datalog.SelectElement("TransferDetail");
        datalog.MoveToChild("ExtraInfo");
        unit = datalog.GetChildAttribute("GlucUnit", "Txt");
    }
    const LocalTime computer = computerNow();
    XMLWrapper& device = s.deviceInfo();
    fact("Model", sectionValue(device, "DeviceInfo", "Name"));
    fact("Meter type", sectionValue(device, "DeviceInfo", "TypeID") + " (" +
                           attributeOf(device, "DeviceInfo", "Class", "Txt") + ")");
    fact("Serial number", sectionValue(device, "DeviceInfo", "SN"));
    fact("Firmware", firmwareText(device));
    fact("Port", sectionValue(device, "PortInfo", "PortID"));
    fact("Records", records);
    fact("Glucose unit", unit);
    fact("Meter clock", clock.now.text());
    fact("Computer clock", computer.text());
    fact("Difference", differenceText(clock.now.seconds() - computer.seconds()));
    fact("Meter accepts", clock.first.dateText() + " to " + clock.last.dateText());
    std::fflush(stdout);
    for (const std::string& note : notes) say(note);
    const std::string warning = clockWarning(clock, computer);
    if (!warning.empty()) say(warning);
}

}  // namespace

void addInfoCommand(CLI::App& app, int& status) {
    struct InfoLine {
        MeterOptions meter;
        bool records = false;
    };
    auto line = std::make_shared<InfoLine>();
    auto* info = app.add_subcommand(
        "info", "Describe the meter in plain words: model, serial, firmware, unit and its clock");
    addMeterOptions(info, line->meter);
    info->add_flag("--records", line->records,
                   "Also count the records the meter holds: an upload, about half a minute on a real meter");
    info->callback([line, &status] {
        status = MeterSession(line->meter).run([&](MeterSession& s) { describe(s, line->records); });
    });
}

}  // namespace varnel::cli
