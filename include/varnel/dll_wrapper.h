// The one class a client creates: it finds a meter, reads and writes its
// settings, describes its capabilities, uploads its readings, erases and
// releases it, one request at a time, on the caller's thread.
#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <string>

#include "export.h"
#include "records.h"
#include "xml_wrapper.h"

namespace varnel {

namespace detail {
class Transport;
}

// Every request returns a ReturnValues_Enum code (0 success, negative failure)
// and writes each failure it detects into the status document as an ErrCode
// (Major, Minor) and ErrDesc group. An unexpected failure is also written there
// and then raised as varnel::ComponentError carrying the routine trace.
class VARNEL_API DllWrapper {
public:
    // Uses the simulated transport library shipped with Varnel (libvantrix32 beside libvarnel).
    DllWrapper();
    // Uses the transport library at that path (loaded on the first request).
    explicit DllWrapper(const std::string& transportPath);
    // Uses a transport already in the process (tests and embedders).
    explicit DllWrapper(std::shared_ptr<detail::Transport> transport);
    ~DllWrapper();
    DllWrapper(const DllWrapper&) = delete;
    DllWrapper& operator=(const DllWrapper&) = delete;

    // "true"
    std::string GetTrueString() const;
    // "false"
    std::string GetFalseString() const;
    // Looks for a meter on the port of the connection document and describes it in deviceInfo.
    std::int32_t discoverDevice(METER_REC& udtMeterRec, XMLWrapper& objDeviceInfoXMLWrapper,
                                XMLWrapper& objConnInfoXMLWrapper,
                                XMLWrapper& objStatusInfoXMLWrapper);
    // Writes the settings of a device configuration document to the meter.
    std::int32_t setDeviceSettings(METER_REC& udtMeterRec, XMLWrapper& objDeviceInfoXMLWrapper,
                                   XMLWrapper& objDeviceCfgXMLWrapper,
                                   XMLWrapper& objStatusInfoXMLWrapper);
    // Reads the meter's settings into a device settings document (all, or the items listed).
    std::int32_t getDeviceSettings(METER_REC& udtMeterRec, XMLWrapper& objDeviceInfoXMLWrapper,
                                   XMLWrapper& objDeviceCfgXMLWrapper, bool blnFetchAllInfo,
                                   XMLWrapper& objStatusInfoXMLWrapper, bool& blnCheckMeter);
    // Describes the settings and record kinds the meter supports (all, or the items listed).
    std::int32_t getDeviceCaps(METER_REC& udtMeterRec, XMLWrapper& objDeviceInfoXMLWrapper,
                               XMLWrapper& objDeviceCapsXMLWrapper, bool blnFetchAllInfo,
                               XMLWrapper& objStatusInfoXMLWrapper, bool& blnCheckMeter);
    // Uploads the meter's readings into the datalog document; the filter is not read.
    std::int32_t getReadings(METER_REC& udtMeterRec, XMLWrapper& objDeviceInfoXMLWrapper,
                             XMLWrapper& objDatalogXMLWrapper, XMLWrapper& objFilterXMLWrapper,
                             XMLWrapper& objStatusInfoXMLWrapper, bool& blnCheckMeter);
    // Erases the meter's memory.
    std::int32_t clearMeter(METER_REC& udtMeterRec, XMLWrapper& objDeviceInfoXMLWrapper,
                            XMLWrapper& objStatusInfoXMLWrapper);
    // Releases the meter.
    std::int32_t closeMeter(METER_REC& udtMeterRec);

    // Progress of the running request, 1-100, raised on the caller's thread.
    void setOnProgress(std::function<void(std::int16_t& intPercentDone)> handler);
    // Raised at the end of most exits of a request.
    void setOnComplete(std::function<void()> handler);

    // Path of the simulated transport library shipped with Varnel, as the default constructor loads it.
    static std::string defaultTransportPath();

private:
    struct Impl;
    std::unique_ptr<Impl> impl_;
};

}  // namespace varnel
