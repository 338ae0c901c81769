#include "info.h"

#include <cstdio>
#include <memory>
#include <string>

#include "commands.h"
#include "documents.h"
#include "meter_clock.h"
#include "session.h"
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

void describe(MeterSession& s) {
    const MeterClock clock = readMeterClock(s);
    const LocalTime computer = computerNow();
    XMLWrapper datalog = emptyDocument(doc_kind::datalog);
    XMLWrapper filter = emptyDocument(doc_kind::filter);
    bool checked = false;
    s.request("records", [&](XMLWrapper& status) {
        return s.wrapper().getReadings(s.record(), s.deviceInfo(), datalog, filter, status, checked);
    });
    XMLWrapper& device = s.deviceInfo();
    fact("Model", sectionValue(device, "DeviceInfo", "Name"));
    fact("Meter type", sectionValue(device, "DeviceInfo", "TypeID") + " (" +
                           attributeOf(device, "DeviceInfo", "Class", "Txt") + ")");
    fact("Serial number", sectionValue(device, "DeviceInfo", "SN"));
    fact("Firmware", firmwareText(device));
    fact("Port", sectionValue(device, "PortInfo", "PortID"));
    fact("Records", recordsText(datalog));
    datalog.SelectElement("TransferDetail");
    datalog.MoveToChild("ExtraInfo");
    fact("Glucose unit", datalog.GetChildAttribute("GlucUnit", "Txt"));
    fact("Meter clock", clock.now.text());
    fact("Computer clock", computer.text());
    fact("Difference", differenceText(clock.now.seconds() - computer.seconds()));
    fact("Meter accepts", clock.first.dateText() + " to " + clock.last.dateText());
    std::fflush(stdout);
    const std::string warning = clockWarning(clock, computer);
    if (!warning.empty()) say(warning);
}

}  // namespace

void addInfoCommand(CLI::App& app, int& status) {
    auto options = std::make_shared<MeterOptions>();
    auto* info = app.add_subcommand(
        "info", "Describe the meter in plain words: model, serial, firmware, records (counted by an upload), "
        "units and its clock");
    addMeterOptions(info, *options);
    info->callback([options, &status] { status = MeterSession(*options).run(describe); });
}

}  // namespace varnel::cli
