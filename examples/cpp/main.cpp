// Finds the meter on port 1 (the simulated transport shipped with Varnel),
// prints what it is and one line per glucose reading, and releases it.
#include <varnel/component_error.h>
#include <varnel/dll_wrapper.h>
#include <varnel/return_codes.h>
#include <varnel/xml_wrapper.h>

#include <cstdint>
#include <iostream>
#include <string>

namespace {

varnel::XMLWrapper document(std::int32_t kind) {
    varnel::XMLWrapper doc;
    doc.InitDocument(kind);
    return doc;
}

std::string twoDigits(const std::string& text) { return text.size() == 1 ? "0" + text : text; }

// Says what a failed request reported in its status document.
int failed(const char* request, std::int32_t code, const varnel::XMLWrapper& status) {
    std::cerr << request << " failed (" << code << ": " << varnel::returnCodeText(code) << ")\n"
              << status.XML() << "\n";
    return 1;
}

}  // namespace

int main() {
    try {
        varnel::DllWrapper meter;
        METER_REC rec{};
        varnel::XMLWrapper status = document(varnel::doc_kind::status);

        varnel::XMLWrapper device = document(varnel::doc_kind::device_info);
        varnel::XMLWrapper connection = document(varnel::doc_kind::connection_info);
        connection.SelectElement("Ports");
        connection.AddElement("COM");
        connection.AddChildElement("PortsToSearch", "", "1");
        if (const std::int32_t code = meter.discoverDevice(rec, device, connection, status))
            return failed("discoverDevice", code, status);
        device.SelectElement("DeviceInfo");
        std::cout << "meter: " << device.GetChildValue("Name") << ", type " << device.GetChildValue("TypeID")
                  << ", serial number " << device.GetChildValue("SN") << "\n";

        varnel::XMLWrapper datalog = document(varnel::doc_kind::datalog);
        varnel::XMLWrapper filter = document(varnel::doc_kind::filter);
        bool checked = false;
        const std::int32_t code = meter.getReadings(rec, device, datalog, filter, status, checked);
        meter.closeMeter(rec);
        if (code != 0) return failed("getReadings", code, status);

        datalog.SelectElement("Records");
        for (std::int32_t i = 0; i < datalog.GetChildCount(); ++i) {
            if (datalog.GetChildName(i) != "Gluc") continue;
            const auto at = [&](const char* name) { return twoDigits(datalog.GetChildAttributeAt(i, name)); };
            std::cout << at("Y") << "-" << at("MM") << "-" << at("D") << " " << at("h") << ":" << at("m") << "  "
                      << datalog.GetChildAttributeAt(i, "Val") << "\n";
        }
        return 0;
    } catch (const varnel::ComponentError& e) {
        std::cerr << "unexpected error " << e.number() << ": " << e.what() << "\n";
        return 1;
    }
}
