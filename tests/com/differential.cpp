// One client, two ways in: built for Linux it drives varnel::DllWrapper and
// varnel::XMLWrapper; built for Windows, Varnel.DllWrapper and
// Varnel.XMLWrapper through their COM interfaces (vtable calls). On every
// simulated meter type it runs every request, then a failing run of each
// through the simulator's fault injection, and prints every document, result,
// blnCheckMeter and event. The two outputs must be the same byte for byte.
// Only the thin call layer below differs between the two.
#include <cstdint>
#include <cstdio>
#include <cstring>
#include <functional>
#include <memory>
#include <sstream>
#include <stdexcept>
#include <string>
#include <vector>

#include "varnel/clock.h"
#include "varnel/records.h"
#include "varnel/vxsim.h"

#ifdef _WIN32
#include <fcntl.h>
#include <io.h>
#include <windows.h>

#include "com_test.h"
#include "varnel_com.h"
#include "varnel_xml_com.h"
#else
#include "varnel/component_error.h"
#include "varnel/dll_wrapper.h"
#include "varnel/xml_wrapper.h"
#endif

namespace {

std::vector<std::string> out;  // the events of the running request, then its report

// An unexpected error as both sides print it: its number and its routine trace.
std::string errorLine(std::int32_t number, const std::string& description) {
    const std::size_t end = description.rfind(" --> ");
    return "error " + std::to_string(number) + " " +
           (end == std::string::npos ? std::string() : description.substr(0, end + 5));
}

#ifdef _WIN32

using namespace comtest;

// Varnel.XMLWrapper through its vtable.
struct Doc {
    _XMLWrapper* p = nullptr;
    explicit Doc(std::int32_t kind) : p(create<_XMLWrapper>(CLSID_XMLWrapper, IID__XMLWrapper)) {
        must(p->InitDocument(kind), "InitDocument");
    }
    ~Doc() { p->Release(); }
    explicit Doc(const char* text) : Doc(1) {
        VARIANT_BOOL loaded = VARIANT_FALSE;
        must(p->LoadXML(Bstr(text), &loaded), "LoadXML");
        if (!loaded) must(E_FAIL, text);
    }
    std::string XML() {
        BSTR text = nullptr;
        must(p->get_XML(&text), "XML");
        return take(text);
    }
};

// The events of __DllWrapper, received through IDispatch.
struct Sink final : Dispatch {
    Sink() : Dispatch(DIID___DllWrapper) {}
    STDMETHODIMP Invoke(DISPID id, REFIID, LCID, WORD, DISPPARAMS* params, VARIANT*, EXCEPINFO*, UINT*) override {
        if (id == 1 && params->cArgs == 1 && V_VT(&params->rgvarg[0]) == (VT_I2 | VT_BYREF))
            out.push_back("progress " + std::to_string(*V_I2REF(&params->rgvarg[0])));
        else
            out.push_back(id == 2 && params->cArgs == 0 ? "complete" : "unexpected event " + std::to_string(id));
        return S_OK;
    }
};

// Varnel.DllWrapper through its vtable, with the sink advised.
struct Meter {
    _DllWrapper* p = nullptr;
    IConnectionPoint* point = nullptr;
    DWORD cookie = 0;
    Sink sink;
    Meter() : p(create<_DllWrapper>(CLSID_DllWrapper, IID__DllWrapper)) {
        auto* container = query<IConnectionPointContainer>(p, IID_IConnectionPointContainer);
        must(container ? container->FindConnectionPoint(DIID___DllWrapper, &point) : E_NOINTERFACE,
             "FindConnectionPoint");
        container->Release();
        must(point->Advise(&sink, &cookie), "Advise");
    }
    ~Meter() {
        point->Unadvise(cookie);
        point->Release();
        p->Release();
    }
    // The result, or the error line of a failed call.
    template <class F>
    std::string run(F&& call) {
        LONG result = 0;
        const HRESULT hr = call(&result);
        if (SUCCEEDED(hr)) return "result " + std::to_string(result);
        IErrorInfo* info = nullptr;
        BSTR description = nullptr;
        if (GetErrorInfo(0, &info) == S_OK) info->GetDescription(&description), info->Release();
        return errorLine(HRESULT_FACILITY(hr) == FACILITY_CONTROL ? HRESULT_CODE(hr) : static_cast<std::int32_t>(hr),
                         take(description));
    }
};
#define CALL(meter, method, ...) (meter).run([&](LONG* result) { return (meter).p->method(__VA_ARGS__, result); })

// The arguments as the interface takes them: the record and documents by reference, Booleans as VARIANT_BOOL.
METER_REC* R(METER_REC& r) { return &r; }
IDispatch** A(Doc& d) { return reinterpret_cast<IDispatch**>(&d.p); }
VARIANT_BOOL B(bool b) { return b ? VARIANT_TRUE : VARIANT_FALSE; }
using Flag = VARIANT_BOOL;
Flag* F(Flag& f) { return &f; }
// A VARIANT_BOOL is -1 or 0; anything else is printed as it is, and so differs.
std::string flagText(Flag f) { return f == VARIANT_TRUE ? "true" : f == VARIANT_FALSE ? "false" : std::to_string(f); }

#else

struct Doc : varnel::XMLWrapper {
    explicit Doc(std::int32_t kind) { InitDocument(kind); }
    explicit Doc(const char* text) {
        if (!LoadXML(text)) throw std::runtime_error(text);
    }
};

struct Meter {
    varnel::DllWrapper p;
    Meter() {
        p.setOnProgress([](std::int16_t& percent) { out.push_back("progress " + std::to_string(percent)); });
        p.setOnComplete([] { out.push_back("complete"); });
    }
    template <class F>
    std::string run(F&& call) {
        try {
            return "result " + std::to_string(call());
        } catch (const varnel::ComponentError& e) {
            return errorLine(e.number(), e.description());
        }
    }
};
#define CALL(meter, method, ...) (meter).run([&] { return (meter).p.method(__VA_ARGS__); })

METER_REC& R(METER_REC& r) { return r; }
Doc& A(Doc& d) { return d; }
bool B(bool b) { return b; }
using Flag = bool;
Flag& F(Flag& f) { return f; }
std::string flagText(Flag f) { return f ? "true" : "false"; }

#endif

void line(const std::string& text) { std::fputs((text + "\n").c_str(), stdout); }

int documents = 0;

// Prints what a request did: its events, its result, blnCheckMeter if it sets one, and its documents.
void report(const std::string& request, const std::string& result, std::initializer_list<Doc*> docs,
            const Flag* check = nullptr) {
    line("== " + request);
    for (const std::string& e : out) line(e);
    out.clear();
    line(result);
    if (check) line("blnCheckMeter " + flagText(*check));
    for (Doc* d : docs) line(d->XML()), ++documents;
}

std::string recordLine(const METER_REC& r) {
    const char* serial = reinterpret_cast<const char*>(r.Serial_number);
    return "M_Type " + std::to_string(r.M_Type) + " Error_code " + std::to_string(r.Error_code) + " Serial " +
           std::string(serial, strnlen(serial, sizeof r.Serial_number));
}

// Every transport function a request may need after discovery.
const char* const kFaults =
    "vb_Chk vb_Tickle_Meter vb_Get_Meter_Firmware vb_Read_Meter_Options vb_Read_Meter_Option vb_Set_Meter_Option "
    "vb_Set_Meter_Options vb_Read_Meter_Clock vb_Set_Meter_Clock vb_Upload_Meter_Datalog GetMeterDatalog "
    "vb_Clear_Meter_Datalog close_meter";

constexpr int kRequests = 8;  // after discovery, in the order they run
constexpr int kNoFailure = kRequests + 1;

// A session on the meter of `type`: discovery, then the requests up to `failing`
// (0 is discovery, kNoFailure none); the request `failing` runs with every transport call failing.
void session(int type, int failing) {
    vxsim_reset();
    vxsim_select_type(type);
    line("### type " + std::to_string(type) +
         (failing == kNoFailure ? "" : " failing request " + std::to_string(failing)));
    Meter meter;
    METER_REC rec{};
    Doc device(1), status(7),
        conn("<ConnectionInfo><Ports><COM><PortsToSearch>1</PortsToSearch></COM></Ports></ConnectionInfo>");
    if (failing == 0) vxsim_fail_call("find_meter", 1, ME_COM_ERROR, 1);
    report("discoverDevice", CALL(meter, discoverDevice, R(rec), A(device), A(conn), A(status)), {&device, &status});
    line(recordLine(rec));
    if (failing == 0) return;
    Doc all(2), caps(4), datalog(5), filter(6);
    Flag check{};
    // The requests in the order they run, each on a status document of its own, and the document each fills
    // (the listed modes take the items the calls in all mode read); all but setDeviceSettings set blnCheckMeter.
    const char* const names[kRequests] = {"getDeviceSettings all",
                                          "getDeviceSettings listed",
                                          "getDeviceCaps all",
                                          "getDeviceCaps listed",
                                          "setDeviceSettings",
                                          "getReadings",
                                          "clearMeter",
                                          "closeMeter"};
    const std::function<std::string(Doc&)> calls[kRequests] = {
        [&](Doc& st) { return CALL(meter, getDeviceSettings, R(rec), A(device), A(all), B(true), A(st), F(check)); },
        [&](Doc& st) { return CALL(meter, getDeviceSettings, R(rec), A(device), A(all), B(false), A(st), F(check)); },
        [&](Doc& st) { return CALL(meter, getDeviceCaps, R(rec), A(device), A(caps), B(true), A(st), F(check)); },
        [&](Doc& st) { return CALL(meter, getDeviceCaps, R(rec), A(device), A(caps), B(false), A(st), F(check)); },
        [&](Doc& st) { return CALL(meter, setDeviceSettings, R(rec), A(device), A(all), A(st)); },
        [&](Doc& st) { return CALL(meter, getReadings, R(rec), A(device), A(datalog), A(filter), A(st), F(check)); },
        [&](Doc& st) { return CALL(meter, clearMeter, R(rec), A(device), A(st)); },
        [&](Doc&) { return CALL(meter, closeMeter, R(rec)); }};
    Doc* const filled[kRequests] = {&all, &all, &caps, &caps, &all, &datalog, nullptr, nullptr};
    for (int r = 1; r <= kRequests; ++r) {
        std::istringstream faults(r == failing ? kFaults : "");
        for (std::string f; faults >> f;) vxsim_fail_call(f.c_str(), 1, ME_COM_ERROR, 1);
        Doc st(7);
        check = Flag{};
        const std::string result = calls[r - 1](st), name = names[r - 1];
        if (r == kRequests)
            report(name, result, {});
        else if (filled[r - 1])
            report(name, result, {filled[r - 1], &st}, name == "setDeviceSettings" ? nullptr : &check);
        else
            report(name, result, {&st});
        line(recordLine(rec));
        if (r == failing) {
            if (r != kRequests) report("closeMeter", calls[kRequests - 1](st), {});
            return;
        }
    }
}

}  // namespace

int main() {
#ifdef _WIN32
    _setmode(_fileno(stdout), _O_BINARY);  // lines end as on Linux
    if (FAILED(CoInitializeEx(nullptr, COINIT_APARTMENTTHREADED))) return 2;
#endif
    {
        // Virtual time: the simulated line and the progress timer advance only with the component's waits.
        varnel::setThreadClock(std::make_shared<varnel::ManualClock>(1000));
        for (int type = 1; type <= 8; ++type)
            for (int failing = 0; failing <= kNoFailure; ++failing) session(type, failing);
        varnel::setThreadClock(nullptr);
    }
    std::fprintf(stderr, "%d documents\n", documents);
#ifdef _WIN32
    CoUninitialize();
#endif
    return 0;
}
