// One client, two ways in: built for Linux it drives varnel::DllWrapper and
// varnel::XMLWrapper; built for Windows, Varnel.DllWrapper and
// Varnel.XMLWrapper through their COM interfaces (vtable calls). On every
// simulated meter type it runs every request, then a failing run of each
// through the simulator's fault injection, and prints every document, result,
// blnCheckMeter and event. The two outputs must be the same byte for byte.
#include <cstdint>
#include <cstdio>
#include <cstring>
#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "varnel/clock.h"
#include "varnel/records.h"
#include "varnel/vxsim.h"

#ifdef _WIN32
#include <fcntl.h>
#include <io.h>
#include <windows.h>

#include "varnel_com.h"
#include "varnel_xml_com.h"
#else
#include "varnel/component_error.h"
#include "varnel/dll_wrapper.h"
#include "varnel/xml_wrapper.h"
#endif

namespace {

std::vector<std::string> out;  // the events of the running request, then its report

void line(const std::string& text) { std::fputs((text + "\n").c_str(), stdout); }

// An unexpected error as both sides print it: its number and its routine trace.
std::string errorLine(std::int32_t number, const std::string& description) {
    const std::size_t end = description.rfind(" --> ");
    return "error " + std::to_string(number) + " " +
           (end == std::string::npos ? std::string() : description.substr(0, end + 5));
}

#ifdef _WIN32

std::string utf8(BSTR text) {
    if (!text) return {};
    const int n =
        WideCharToMultiByte(CP_UTF8, 0, text, static_cast<int>(SysStringLen(text)), nullptr, 0, nullptr, nullptr);
    std::string s(static_cast<std::size_t>(n), '\0');
    WideCharToMultiByte(CP_UTF8, 0, text, static_cast<int>(SysStringLen(text)), s.data(), n, nullptr, nullptr);
    return s;
}

// A BSTR for the call's duration.
struct Bstr {
    BSTR b;
    explicit Bstr(const char* text) {
        const int n = MultiByteToWideChar(CP_UTF8, 0, text, -1, nullptr, 0);
        b = SysAllocStringLen(nullptr, static_cast<UINT>(n - 1));
        MultiByteToWideChar(CP_UTF8, 0, text, -1, b, n);
    }
    ~Bstr() { SysFreeString(b); }
};

void must(HRESULT hr, const char* what) {
    if (FAILED(hr)) {
        std::fprintf(stderr, "%s failed: 0x%08lx\n", what, static_cast<unsigned long>(hr));
        std::exit(2);
    }
}

// Varnel.XMLWrapper through its vtable.
class Doc {
public:
    explicit Doc(std::int32_t kind) {
        must(CoCreateInstance(CLSID_XMLWrapper, nullptr, CLSCTX_INPROC_SERVER, IID__XMLWrapper,
                              reinterpret_cast<void**>(&p_)),
             "CoCreateInstance(Varnel.XMLWrapper)");
        must(p_->InitDocument(kind), "InitDocument");
    }
    ~Doc() { p_->Release(); }
    void SelectElement(const char* name) { must(p_->SelectElement(Bstr(name).b), "SelectElement"); }
    void AddElement(const char* name) { must(p_->AddElement(Bstr(name).b, Bstr("").b), "AddElement"); }
    void AddChildElement(const char* name, const char* text) {
        must(p_->AddChildElement(Bstr(name).b, Bstr("").b, Bstr(text).b), "AddChildElement");
    }
    std::string XML() {
        BSTR text = nullptr;
        must(p_->get_XML(&text), "XML");
        std::string s = utf8(text);
        SysFreeString(text);
        return s;
    }
    IDispatch** arg() { return reinterpret_cast<IDispatch**>(&p_); }

private:
    _XMLWrapper* p_ = nullptr;
};

// The events of __DllWrapper, received through IDispatch.
class Sink final : public IDispatch {
public:
    STDMETHODIMP QueryInterface(REFIID riid, void** o) override {
        *o = riid == IID_IUnknown || riid == IID_IDispatch || riid == DIID___DllWrapper ? this : nullptr;
        return *o ? S_OK : E_NOINTERFACE;
    }
    STDMETHODIMP_(ULONG) AddRef() override { return 2; }
    STDMETHODIMP_(ULONG) Release() override { return 1; }
    STDMETHODIMP GetTypeInfoCount(UINT* n) override {
        *n = 0;
        return S_OK;
    }
    STDMETHODIMP GetTypeInfo(UINT, LCID, ITypeInfo**) override { return E_NOTIMPL; }
    STDMETHODIMP GetIDsOfNames(REFIID, LPOLESTR*, UINT, LCID, DISPID*) override { return E_NOTIMPL; }
    STDMETHODIMP Invoke(DISPID id, REFIID, LCID, WORD, DISPPARAMS* params, VARIANT*, EXCEPINFO*, UINT*) override {
        if (id == 1 && params->cArgs == 1 && V_VT(&params->rgvarg[0]) == (VT_I2 | VT_BYREF))
            out.push_back("progress " + std::to_string(*V_I2REF(&params->rgvarg[0])));
        else if (id == 2 && params->cArgs == 0)
            out.push_back("complete");
        else
            out.push_back("unexpected event " + std::to_string(id));
        return S_OK;
    }
};

// Varnel.DllWrapper through its vtable, with the sink advised.
class Meter {
public:
    Meter() {
        must(CoCreateInstance(CLSID_DllWrapper, nullptr, CLSCTX_INPROC_SERVER, IID__DllWrapper,
                              reinterpret_cast<void**>(&p_)),
             "CoCreateInstance(Varnel.DllWrapper)");
        IConnectionPointContainer* container = nullptr;
        must(p_->QueryInterface(IID_IConnectionPointContainer, reinterpret_cast<void**>(&container)), "container");
        must(container->FindConnectionPoint(DIID___DllWrapper, &point_), "FindConnectionPoint");
        container->Release();
        must(point_->Advise(&sink_, &cookie_), "Advise");
    }
    ~Meter() {
        point_->Unadvise(cookie_);
        point_->Release();
        p_->Release();
    }
    using Call = std::function<HRESULT(_DllWrapper*, LONG*)>;
    // The result, or the error line of a failed call.
    std::string run(const Call& call) {
        LONG result = 0;
        const HRESULT hr = call(p_, &result);
        if (SUCCEEDED(hr)) return "result " + std::to_string(result);
        IErrorInfo* info = nullptr;
        std::string description;
        if (GetErrorInfo(0, &info) == S_OK) {
            BSTR text = nullptr;
            info->GetDescription(&text);
            description = utf8(text);
            SysFreeString(text);
            info->Release();
        }
        const std::int32_t number =
            HRESULT_FACILITY(hr) == FACILITY_CONTROL ? HRESULT_CODE(hr) : static_cast<std::int32_t>(hr);
        return errorLine(number, description);
    }

    std::string discover(METER_REC& r, Doc& dev, Doc& conn, Doc& st) {
        return run(
            [&](_DllWrapper* m, LONG* res) { return m->discoverDevice(&r, dev.arg(), conn.arg(), st.arg(), res); });
    }
    std::string setSettings(METER_REC& r, Doc& dev, Doc& cfg, Doc& st) {
        return run(
            [&](_DllWrapper* m, LONG* res) { return m->setDeviceSettings(&r, dev.arg(), cfg.arg(), st.arg(), res); });
    }
    std::string getSettings(METER_REC& r, Doc& dev, Doc& cfg, bool all, Doc& st, bool& check) {
        VARIANT_BOOL c = VARIANT_FALSE;
        std::string s = run([&](_DllWrapper* m, LONG* res) {
            return m->getDeviceSettings(&r, dev.arg(), cfg.arg(), all ? VARIANT_TRUE : VARIANT_FALSE, st.arg(), &c,
                                        res);
        });
        check = flag(c);
        return s;
    }
    std::string getCaps(METER_REC& r, Doc& dev, Doc& caps, bool all, Doc& st, bool& check) {
        VARIANT_BOOL c = VARIANT_FALSE;
        std::string s = run([&](_DllWrapper* m, LONG* res) {
            return m->getDeviceCaps(&r, dev.arg(), caps.arg(), all ? VARIANT_TRUE : VARIANT_FALSE, st.arg(), &c, res);
        });
        check = flag(c);
        return s;
    }
    std::string readings(METER_REC& r, Doc& dev, Doc& log, Doc& filter, Doc& st, bool& check) {
        VARIANT_BOOL c = VARIANT_FALSE;
        std::string s = run([&](_DllWrapper* m, LONG* res) {
            return m->getReadings(&r, dev.arg(), log.arg(), filter.arg(), st.arg(), &c, res);
        });
        check = flag(c);
        return s;
    }
    std::string clear(METER_REC& r, Doc& dev, Doc& st) {
        return run([&](_DllWrapper* m, LONG* res) { return m->clearMeter(&r, dev.arg(), st.arg(), res); });
    }
    std::string close(METER_REC& r) {
        return run([&](_DllWrapper* m, LONG* res) { return m->closeMeter(&r, res); });
    }

private:
    // A VARIANT_BOOL is -1 or 0; anything else would be printed as such.
    static bool flag(VARIANT_BOOL c) {
        if (c != VARIANT_TRUE && c != VARIANT_FALSE)
            out.push_back("blnCheckMeter not a VARIANT_BOOL: " + std::to_string(c));
        return c == VARIANT_TRUE;
    }
    _DllWrapper* p_ = nullptr;
    IConnectionPoint* point_ = nullptr;
    DWORD cookie_ = 0;
    Sink sink_;
};

#else

class Doc : public varnel::XMLWrapper {
public:
    explicit Doc(std::int32_t kind) { InitDocument(kind); }
    void AddChildElement(const char* name, const char* text) { XMLWrapper::AddChildElement(name, "", text); }
};

class Meter {
public:
    Meter() {
        m_.setOnProgress([](std::int16_t& p) { out.push_back("progress " + std::to_string(p)); });
        m_.setOnComplete([] { out.push_back("complete"); });
    }
    template <class F>
    std::string run(F&& call) {
        try {
            return "result " + std::to_string(call());
        } catch (const varnel::ComponentError& e) {
            return errorLine(e.number(), e.description());
        }
    }
    std::string discover(METER_REC& r, Doc& dev, Doc& conn, Doc& st) {
        return run([&] { return m_.discoverDevice(r, dev, conn, st); });
    }
    std::string setSettings(METER_REC& r, Doc& dev, Doc& cfg, Doc& st) {
        return run([&] { return m_.setDeviceSettings(r, dev, cfg, st); });
    }
    std::string getSettings(METER_REC& r, Doc& dev, Doc& cfg, bool all, Doc& st, bool& check) {
        return run([&] { return m_.getDeviceSettings(r, dev, cfg, all, st, check); });
    }
    std::string getCaps(METER_REC& r, Doc& dev, Doc& caps, bool all, Doc& st, bool& check) {
        return run([&] { return m_.getDeviceCaps(r, dev, caps, all, st, check); });
    }
    std::string readings(METER_REC& r, Doc& dev, Doc& log, Doc& filter, Doc& st, bool& check) {
        return run([&] { return m_.getReadings(r, dev, log, filter, st, check); });
    }
    std::string clear(METER_REC& r, Doc& dev, Doc& st) {
        return run([&] { return m_.clearMeter(r, dev, st); });
    }
    std::string close(METER_REC& r) {
        return run([&] { return m_.closeMeter(r); });
    }

private:
    varnel::DllWrapper m_;
};

#endif

int documents = 0;

// Prints what a request did: its events, its result, and the documents it was given.
void report(const std::string& request, const std::string& result, std::initializer_list<Doc*> docs,
            const bool* check = nullptr) {
    line("== " + request);
    for (const std::string& e : out) line(e);
    out.clear();
    line(result);
    if (check) line(std::string("blnCheckMeter ") + (*check ? "true" : "false"));
    for (Doc* d : docs) {
        line(d->XML());
        ++documents;
    }
}

std::string recordLine(const METER_REC& r) {
    return "M_Type " + std::to_string(r.M_Type) + " Error_code " + std::to_string(r.Error_code) + " Serial " +
           std::string(reinterpret_cast<const char*>(r.Serial_number),
                       strnlen(reinterpret_cast<const char*>(r.Serial_number), sizeof r.Serial_number));
}

void connection(Doc& conn) {
    conn.SelectElement("Ports");
    conn.AddElement("COM");
    conn.AddChildElement("PortsToSearch", "1");
}

// Every transport function a request may need after discovery fails from now on.
const char* const kFaults[] = {"vb_Chk",
                               "vb_Tickle_Meter",
                               "vb_Get_Meter_Firmware",
                               "vb_Read_Meter_Options",
                               "vb_Read_Meter_Option",
                               "vb_Set_Meter_Option",
                               "vb_Set_Meter_Options",
                               "vb_Read_Meter_Clock",
                               "vb_Set_Meter_Clock",
                               "vb_Upload_Meter_Datalog",
                               "GetMeterDatalog",
                               "vb_Clear_Meter_Datalog",
                               "close_meter"};

enum Request { Discover, SettingsAll, SettingsListed, CapsAll, CapsListed, SetSettings, Readings, Clear, Close, End };

// A session on the meter of `type`: discovery, then the requests up to `failing`
// (all when End); the request `failing` runs with every transport call failing.
void session(int type, Request failing) {
    vxsim_reset();
    vxsim_select_type(type);
    line("### type " + std::to_string(type) + (failing == End ? "" : " failing request " + std::to_string(failing)));
    Meter meter;
    METER_REC rec{};
    Doc device(1), conn(3), status(7);
    connection(conn);
    if (failing == Discover) vxsim_fail_call("find_meter", 1, ME_COM_ERROR, 1);
    report("discoverDevice", meter.discover(rec, device, conn, status), {&device, &status});
    line(recordLine(rec));
    if (failing == Discover) return;
    Doc all(2), capsAll(4), datalog(5), filter(6);
    bool check = false;
    for (int r = SettingsAll; r <= Close; ++r) {
        if (r == failing)
            for (const char* f : kFaults) vxsim_fail_call(f, 1, ME_COM_ERROR, 1);
        Doc st(7);
        check = false;
        switch (static_cast<Request>(r)) {
        case SettingsAll:
            report("getDeviceSettings all", meter.getSettings(rec, device, all, true, st, check), {&all, &st}, &check);
            break;
        case SettingsListed:
            // The items are those the first call read.
            report("getDeviceSettings listed", meter.getSettings(rec, device, all, false, st, check), {&all, &st},
                   &check);
            break;
        case CapsAll:
            report("getDeviceCaps all", meter.getCaps(rec, device, capsAll, true, st, check), {&capsAll, &st}, &check);
            break;
        case CapsListed:
            report("getDeviceCaps listed", meter.getCaps(rec, device, capsAll, false, st, check), {&capsAll, &st},
                   &check);
            break;
        case SetSettings:
            report("setDeviceSettings", meter.setSettings(rec, device, all, st), {&all, &st});
            break;
        case Readings:
            report("getReadings", meter.readings(rec, device, datalog, filter, st, check), {&datalog, &st}, &check);
            break;
        case Clear:
            report("clearMeter", meter.clear(rec, device, st), {&st});
            break;
        case Close:
            report("closeMeter", meter.close(rec), {});
            break;
        default:
            break;
        }
        line(recordLine(rec));
        if (r == failing) {
            if (r != Close) report("closeMeter", meter.close(rec), {});
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
            for (int failing = Discover; failing <= End; ++failing) session(type, static_cast<Request>(failing));
        varnel::setThreadClock(nullptr);
    }
    std::fprintf(stderr, "%d documents\n", documents);
#ifdef _WIN32
    CoUninitialize();
#endif
    return 0;
}
