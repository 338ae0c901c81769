// The frame every public request of DllWrapper is built from: the status
// report, the checks on the device information document, the identity check
// and the handler for unexpected errors. Each request picks its steps and
// says where its codes and exits differ.
#pragma once

#include <cstdint>
#include <string>

#include "platform/message_pump.h"
#include "requests/request_context.h"
#include "varnel/records.h"
#include "varnel/xml_wrapper.h"

namespace varnel::detail {

// Appends ErrCode (Major, Minor) and ErrDesc at the status document's current element.
void reportStatus(XMLWrapper& status, std::int32_t major, std::int32_t minor, const std::string& description);

// Reads every general option of the meter into udtMeterRec; on failure extends
// strError and reports it. The transport's code.
std::int16_t GetAllGeneralSettings(MeterDll& session, METER_REC& udtMeterRec, XMLWrapper& status,
                                   std::string& strError);

// The timer form's progress timer, running for as long as this lives.
struct ProgressTimer {
    ProgressTimer() { frmTimer().enableTimer(); }
    ~ProgressTimer() { frmTimer().disableTimer(); }
    ProgressTimer(const ProgressTimer&) = delete;
    ProgressTimer& operator=(const ProgressTimer&) = delete;
};

// The progress of a request that handles count items: each item done adds
// 100 / count (rounded, halves to even), capped at 100.
class ItemProgress {
public:
    explicit ItemProgress(std::int32_t count = 0);
    // Counts one more item done and raises the new percentage.
    void advance(RequestContext& owner);

private:
    std::int16_t step_;
    std::int16_t percent_ = 0;
};

// One public request in progress. Creating it starts the routine trace afresh.
class Request {
public:
    // status is null only for closeMeter, which reports nothing and closes whatever Error_code says.
    Request(RequestContext& owner, const char* traceName, METER_REC& udtMeterRec, XMLWrapper* status);

    // Runs body (which returns the request's code) under the unexpected-error
    // handler: status -17/-16 with the error and VBTrace, the session closed
    // unless Error_code is -50, onComplete, and the error raised again with the trace.
    template <class F>
    std::int32_t run(F&& body) {
        try {
            return body();
        } catch (...) {
            unexpected();
        }
    }

    // Initialises the session unless it already is.
    void ensureSession();
    // PortID of the device information into COMPort_Pref; false (reported) for a negative port.
    bool readPort(XMLWrapper& deviceInfo);
    // The PortID text of the device information, for a request that checks it later.
    static std::string portText(XMLWrapper& deviceInfo);
    // The port of portText into COMPort_Pref; false for a negative port, reported
    // as major with ME_BAD_PARAMETER and context.
    bool usePort(const std::string& text, std::int32_t major, const char* context);
    // SN and TypeID of the device information, kept for compareIdentity; false (reported) when invalid.
    bool readIdentity(XMLWrapper& deviceInfo);
    // Asks the meter who it is: 0, or its code (reported).
    std::int32_t checkMeter();
    // Compares the identified meter with the document: 0, or the result (reported) for a mismatch.
    std::int32_t compareIdentity();
    // Compares the identified meter's serial number or type with what a document
    // named source (e.g. "Device Info XML") claims; false (reported) for a mismatch.
    bool sameSerial(const std::string& claimed, const char* source);
    bool sameType(const std::string& claimed, const char* source);
    // A meter type text the component knows (1-8).
    static bool validType(const std::string& text);

    // Major -17, minor code, desc(code) followed by context.
    void fail(std::int32_t code, const std::string& context = {});
    void report(std::int32_t major, std::int32_t minor, const std::string& description);
    // Releases the meter unless the caller's Error_code is -50.
    void close();
    // Raises onComplete and gives result back.
    std::int32_t complete(std::int32_t result);

    RequestContext& owner;
    MeterDll& session;
    METER_REC& rec;

private:
    [[noreturn]] void unexpected();

    const char* traceName_;
    XMLWrapper* status_;
    std::string serialNumber_;
    std::string typeText_;
};

}  // namespace varnel::detail
