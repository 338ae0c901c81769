// Finds the meter on port 1 (the simulated transport shipped with Varnel),
// prints what it is and one line per glucose reading, and releases it.
#include <varnel/component_error.h>
#include <varnel/dll_wrapper.h>
#include <varnel/readings.h>
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

        // Blood glucose only: control-solution and check-strip readings test the meter, not the blood.
        for (const varnel::Reading& r : varnel::readDatalog(datalog.XML()).readings) {
            if (r.kind != "glucose" || r.values.empty() || r.time.size() < 16) continue;
            std::string time = r.time.substr(0, 16);  // "2008-02-15T07:05"
            time[10] = ' ';
            std::cout << time << "  " << r.values.front().value << "\n";
        }
        return 0;
    } catch (const varnel::ComponentError& e) {
        std::cerr << "unexpected error " << e.number() << ": " << e.what() << "\n";
        return 1;
    }
}
