// The public requests as a client makes them, one call each, and the documents
// a client passes in: what the programs that drive whole sessions run.
#pragma once

#include <cstdint>
#include <string>

#include "varnel/dll_wrapper.h"
#include "varnel/xml_wrapper.h"

namespace varnel::test {

inline XMLWrapper newDoc(std::int32_t kind) {
    XMLWrapper doc;
    doc.InitDocument(kind);
    return doc;
}

inline XMLWrapper connectionDoc(const std::string& ports, const std::string& kind = "COM") {
    XMLWrapper doc = newDoc(doc_kind::connection_info);
    doc.SelectElement("Ports");
    doc.AddElement(kind);
    doc.AddChildElement("PortsToSearch", "", ports);
    return doc;
}

enum class Call { discover, settings, settingsListed, caps, capsListed, setSettings, readings, clear, close };

// Runs one request. Discovery searches the port and fills device; the others
// use device. out is the answer: a fresh document for the full requests, the
// listing or the settings to write as the client filled it, the device
// information after discovery, empty after an erase or a close.
inline std::int32_t makeCall(DllWrapper& w, Call call, METER_REC& rec, XMLWrapper& device, XMLWrapper& status,
                             XMLWrapper& out, int port = 1) {
    bool check = true;
    switch (call) {
    case Call::discover: {
        XMLWrapper conn = connectionDoc(std::to_string(port));
        const std::int32_t r = w.discoverDevice(rec, device, conn, status);
        out = device;
        return r;
    }
    case Call::settings:
        out = newDoc(doc_kind::device_settings);
        [[fallthrough]];
    case Call::settingsListed:
        return w.getDeviceSettings(rec, device, out, call == Call::settings, status, check);
    case Call::caps:
        out = newDoc(doc_kind::device_caps);
        [[fallthrough]];
    case Call::capsListed:
        return w.getDeviceCaps(rec, device, out, call == Call::caps, status, check);
    case Call::setSettings:
        return w.setDeviceSettings(rec, device, out, status);
    case Call::readings: {
        XMLWrapper filter = newDoc(doc_kind::filter);
        out = newDoc(doc_kind::datalog);
        return w.getReadings(rec, device, out, filter, status, check);
    }
    case Call::clear:
        out = XMLWrapper();
        return w.clearMeter(rec, device, status);
    case Call::close:
        out = XMLWrapper();
        return w.closeMeter(rec);
    }
    return ME_FAIL;
}

}  // namespace varnel::test
