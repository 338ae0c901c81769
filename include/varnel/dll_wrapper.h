/**
 * @file dll_wrapper.h
 * The one class a client creates: it finds a meter, reads and writes its
 * settings, describes its capabilities, uploads its readings, erases and
 * releases it, one request at a time, on the caller's thread.
 */
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
struct WrapperAccess;
}

/**
 * Talks to one meter through a transport library.
 *
 * A session runs discoverDevice first, then any of the other requests, then
 * closeMeter:
 *
 * @code
 * varnel::DllWrapper meter;                      // the shipped simulated transport
 * METER_REC rec{};                               // filled by discoverDevice, passed to every later request
 * varnel::XMLWrapper device, conn, status, log, filter;
 * device.InitDocument(varnel::doc_kind::device_info);
 * conn.InitDocument(varnel::doc_kind::connection_info);
 * conn.SelectElement("Ports");
 * conn.AddElement("COM");
 * conn.AddChildElement("PortsToSearch", "", "1");
 * status.InitDocument(varnel::doc_kind::status);
 * if (meter.discoverDevice(rec, device, conn, status) == 0) {
 *     log.InitDocument(varnel::doc_kind::datalog);
 *     filter.InitDocument(varnel::doc_kind::filter);
 *     bool checked = false;
 *     meter.getReadings(rec, device, log, filter, status, checked);
 *     meter.closeMeter(rec);
 * }
 * @endcode
 *
 * **Results.** Every request returns a ReturnValues_Enum code: 0 success,
 * negative failure, -31 partial success; returnCodeText() names each. Each
 * failure a request detects is appended to the status document at its current
 * element as an `ErrCode` group (`Major`, `Minor`) followed by `ErrDesc`; pass
 * a status document started with `InitDocument(doc_kind::status)`.
 *
 * **Unexpected failures** (a document without an element the request needs, a
 * transport library that cannot be loaded, a fault inside the component) are
 * appended to the status document as Major -17, Minor -16 with the error and a
 * `VBTrace` element; the meter is released (unless `Error_code` is -50, see
 * below), `onComplete` is raised, and the request then throws
 * varnel::ComponentError whose description is the trace of routines, for
 * example "getReadings --> Fastmeterupload --> ".
 *
 * **The meter record.** The METER_REC that discoverDevice fills describes the
 * meter found; pass that same record, unchanged, to every later request and to
 * closeMeter. The requests update it as they talk to the meter.
 *
 * **Keeping the meter open.** With `udtMeterRec.Error_code` set to -50 when a
 * request is called, its failure paths and its unexpected-error handler leave
 * the meter open instead of releasing it (closeMeter still releases it).
 *
 * **Documents.** Each XMLWrapper argument is a document of one kind, started
 * with `InitDocument(kind)` (varnel::doc_kind): a request reads the documents
 * the client fills and appends to or rebuilds the ones it answers in.
 *
 * **Threads.** One thread: requests and events run on the caller's thread and
 * must not be called from inside an event handler. Waits go through the
 * calling thread's varnel::Clock.
 */
class VARNEL_API DllWrapper {
public:
    /**
     * Uses the simulated transport library shipped with Varnel: libvantrix32
     * beside libvarnel or in a `varnel/` directory beside it (defaultTransportPath()).
     * Loaded when the first request needs it; when no candidate loads, that request fails
     * unexpectedly with a ComponentError naming every path tried.
     */
    DllWrapper();
    /**
     * Uses the transport library at that path: any library exporting the C
     * functions of vantrix32.h. Loaded when the first request needs it; a
     * library or function that cannot be loaded fails that request unexpectedly
     * (ComponentError naming the path).
     */
    explicit DllWrapper(const std::string& transportPath);
    ~DllWrapper();
    DllWrapper(const DllWrapper&) = delete;
    DllWrapper& operator=(const DllWrapper&) = delete;

    /// "true"
    std::string GetTrueString() const;
    /// "false"
    std::string GetFalseString() const;

    /**
     * Looks for a meter on the port the connection document names and describes it.
     *
     * @param udtMeterRec receives the meter found; every later request and closeMeter take this record.
     * @param objDeviceInfoXMLWrapper started with `InitDocument(doc_kind::device_info)`; the request
     *        appends the description (SN, MasterSWVer, Name, TypeID, Class, CommState under `DeviceInfo`;
     *        PortID and PortType under `PortInfo`). Start it afresh for each call: a second call appends
     *        a second block. Every later request reads this document.
     * @param objConnInfoXMLWrapper filled by the client: `InitDocument(doc_kind::connection_info)`, then
     *        under `Ports` a `COM` element whose `PortsToSearch` holds the port number (0-255; of a
     *        comma-separated list only the first is searched).
     * @param objStatusInfoXMLWrapper the status document (see the class description).
     * @return 0 when a meter answered; otherwise its failure code, reported in the status document.
     *
     * Raises `onComplete` only when it fails unexpectedly.
     */
    std::int32_t discoverDevice(METER_REC& udtMeterRec, XMLWrapper& objDeviceInfoXMLWrapper,
                                XMLWrapper& objConnInfoXMLWrapper, XMLWrapper& objStatusInfoXMLWrapper);

    /**
     * Writes the settings of a device settings document to the meter.
     *
     * @param udtMeterRec the record discoverDevice filled.
     * @param objDeviceInfoXMLWrapper the device document discoverDevice wrote (PortID, SN and TypeID are read).
     * @param objDeviceCfgXMLWrapper filled by the client: a device settings document as getDeviceSettings
     *        returned it, edited; its `DeviceInfo` must name the same meter. Only read.
     * @param objStatusInfoXMLWrapper the status document; besides the failures it receives one summary
     *        group (0/0 when every item was written, else the items refused).
     * @return 0 when the request ran (refused items are in the status summary), or a failure code.
     *
     * Raises `onComplete` once on every exit.
     */
    std::int32_t setDeviceSettings(METER_REC& udtMeterRec, XMLWrapper& objDeviceInfoXMLWrapper,
                                   XMLWrapper& objDeviceCfgXMLWrapper, XMLWrapper& objStatusInfoXMLWrapper);

    /**
     * Reads the meter's settings into a device settings document.
     *
     * @param udtMeterRec the record discoverDevice filled.
     * @param objDeviceInfoXMLWrapper the device document discoverDevice wrote.
     * @param objDeviceCfgXMLWrapper with blnFetchAllInfo false, filled by the client: a
     *        `doc_kind::device_settings` document whose `Settings` children name the items wanted.
     *        Either way the request rebuilds it with `InitDocument(doc_kind::device_settings)` and writes
     *        the device description and the items read; what the client had in it is gone.
     * @param blnFetchAllInfo true: every item the meter offers; false: the items listed.
     * @param objStatusInfoXMLWrapper the status document; a success writes the summary group 0/0.
     * @param blnCheckMeter only written, never read: set to true once the port is accepted and the
     *        request starts talking to the meter.
     * @return 0 when the items were read (listed items the meter does not offer are named in the
     *         status summary: -31 when others were read, -17 when none was), or a failure code.
     *
     * Raises `onComplete` once on every exit.
     */
    std::int32_t getDeviceSettings(METER_REC& udtMeterRec, XMLWrapper& objDeviceInfoXMLWrapper,
                                   XMLWrapper& objDeviceCfgXMLWrapper, bool blnFetchAllInfo,
                                   XMLWrapper& objStatusInfoXMLWrapper, bool& blnCheckMeter);

    /**
     * Describes the settings (with their ranges) and the record kinds the meter supports.
     *
     * @param udtMeterRec the record discoverDevice filled.
     * @param objDeviceInfoXMLWrapper the device document discoverDevice wrote.
     * @param objDeviceCapsXMLWrapper with blnFetchAllInfo false, filled by the client: a
     *        `doc_kind::device_caps` document with exactly one `Settings` and one `Records`, whose
     *        children name the items wanted. The request rebuilds it with
     *        `InitDocument(doc_kind::device_caps)` once the meter is known and writes the description.
     * @param blnFetchAllInfo true: everything the meter supports; false: the items listed.
     * @param objStatusInfoXMLWrapper the status document. Restarted with
     *        `InitDocument(doc_kind::status)` once the meter is known; a success writes the summary 0/0.
     * @param blnCheckMeter only written, never read: set to true once the port is accepted.
     * @return 0; -31 when some listed items are unknown to the meter and others were described;
     *         or a failure code.
     *
     * Raises `onComplete` once on every exit except one: when the meter does not answer the final
     * identity check, the request returns that code without it.
     */
    std::int32_t getDeviceCaps(METER_REC& udtMeterRec, XMLWrapper& objDeviceInfoXMLWrapper,
                               XMLWrapper& objDeviceCapsXMLWrapper, bool blnFetchAllInfo,
                               XMLWrapper& objStatusInfoXMLWrapper, bool& blnCheckMeter);

    /**
     * Uploads the meter's readings into the datalog document.
     *
     * @param udtMeterRec the record discoverDevice filled.
     * @param objDeviceInfoXMLWrapper the device document discoverDevice wrote.
     * @param objDatalogXMLWrapper started with `InitDocument(doc_kind::datalog)`; the request appends
     *        the device description, the transfer summary (`TransferDetail`) and one entry per reading
     *        under `Records`.
     * @param objFilterXMLWrapper a `doc_kind::filter` document; accepted and never read.
     * @param objStatusInfoXMLWrapper the status document.
     * @param blnCheckMeter only written, never read: set to true once the port is accepted.
     * @return 0; a failure code. When some records could not be read, every readable one is still
     *         written and the result is a failure code naming how many were lost.
     *
     * Raises `onComplete` once on every exit.
     */
    std::int32_t getReadings(METER_REC& udtMeterRec, XMLWrapper& objDeviceInfoXMLWrapper,
                             XMLWrapper& objDatalogXMLWrapper, XMLWrapper& objFilterXMLWrapper,
                             XMLWrapper& objStatusInfoXMLWrapper, bool& blnCheckMeter);

    /**
     * Erases the meter's memory.
     *
     * @param udtMeterRec the record discoverDevice filled.
     * @param objDeviceInfoXMLWrapper the device document discoverDevice wrote; the meter must still
     *        be the one it describes (serial number and type).
     * @param objStatusInfoXMLWrapper the status document.
     * @return 0 when erased, else a failure code (a failed erase is never reported as 0).
     *
     * Raises `onComplete` once on every exit except one: when the meter does not answer the identity
     * check, the request returns that code without it.
     */
    std::int32_t clearMeter(METER_REC& udtMeterRec, XMLWrapper& objDeviceInfoXMLWrapper,
                            XMLWrapper& objStatusInfoXMLWrapper);

    /**
     * Releases the meter (whatever `Error_code` holds) and its port.
     *
     * @param udtMeterRec the record discoverDevice filled.
     * @return 0, or the transport's failure code. Writes no status document.
     *
     * Raises no `onComplete` when it returns; only an unexpected failure, before it throws, raises it.
     */
    std::int32_t closeMeter(METER_REC& udtMeterRec);

    /**
     * Sets the handler of progress events: the running request's progress, 0-100, on the caller's
     * thread. The handler receives a copy it may change without effect on the request; anything it
     * throws is dropped (progress never fails a request). An empty function removes the handler.
     */
    void setOnProgress(std::function<void(std::int16_t& intPercentDone)> handler);
    /**
     * Sets the handler raised when a request ends (see each request for its exits). An empty
     * function removes the handler.
     */
    void setOnComplete(std::function<void()> handler);

    /// Path of the simulated transport library shipped with Varnel, as the default constructor loads it.
    static std::string defaultTransportPath();

private:
    struct Impl;
    friend struct detail::WrapperAccess;
    explicit DllWrapper(std::unique_ptr<Impl> impl);
    std::unique_ptr<Impl> impl_;
};

}  // namespace varnel
