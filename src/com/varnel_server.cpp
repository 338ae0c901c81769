// varnel.dll as an in-process COM server: the classes of the type library
// Varnel over the component, its class factories and its self-registration.
#include <olectl.h>

#include <algorithm>
#include <memory>
#include <utility>
#include <vector>

#include "com/com_support.h"
#include "com/dispatch_document.h"
#include "varnel/dll_wrapper.h"
#include "varnel/records.h"
#include "varnel/unique_checker.h"

// The generated header declares the methods over the records of varnel/records.h.
#include "varnel_com.h"

namespace varnel::detail::com {
namespace {

constexpr const wchar_t* kWrapperProgId = L"Varnel.DllWrapper";
constexpr const wchar_t* kCheckerProgId = L"Varnel.UniqueChecker";

VARIANT_BOOL variantBool(bool value) { return value ? VARIANT_TRUE : VARIANT_FALSE; }

class WrapperObject;

// The one connection point of a DllWrapper: the sinks of __DllWrapper, called
// through IDispatch in the order they were advised.
class EventPoint final : public IConnectionPoint, public RefCounted {
public:
    explicit EventPoint(IConnectionPointContainer* owner) : owner_(owner) {}
    ~EventPoint() override {
        for (auto& s : sinks_) s.second->Release();
    }

    STDMETHODIMP QueryInterface(REFIID riid, void** out) override {
        if (!out) return E_POINTER;
        *out = riid == IID_IUnknown || riid == IID_IConnectionPoint ? static_cast<IConnectionPoint*>(this) : nullptr;
        if (!*out) return E_NOINTERFACE;
        AddRef();
        return S_OK;
    }
    STDMETHODIMP_(ULONG) AddRef() override { return addRef(); }
    STDMETHODIMP_(ULONG) Release() override { return release(); }

    STDMETHODIMP GetConnectionInterface(IID* iid) override {
        if (!iid) return E_POINTER;
        *iid = DIID___DllWrapper;
        return S_OK;
    }
    STDMETHODIMP GetConnectionPointContainer(IConnectionPointContainer** out) override {
        if (!out) return E_POINTER;
        *out = owner_;
        if (!owner_) return E_UNEXPECTED;
        owner_->AddRef();
        return S_OK;
    }
    STDMETHODIMP Advise(IUnknown* sink, DWORD* cookie) override {
        if (!sink || !cookie) return E_POINTER;
        *cookie = 0;
        IDispatch* events = nullptr;
        if (FAILED(sink->QueryInterface(DIID___DllWrapper, reinterpret_cast<void**>(&events))) &&
            FAILED(sink->QueryInterface(IID_IDispatch, reinterpret_cast<void**>(&events))))
            return CONNECT_E_CANNOTCONNECT;
        try {
            sinks_.emplace_back(++lastCookie_, events);
        } catch (...) {
            events->Release();
            return E_OUTOFMEMORY;
        }
        *cookie = lastCookie_;
        return S_OK;
    }
    STDMETHODIMP Unadvise(DWORD cookie) override {
        auto it = std::find_if(sinks_.begin(), sinks_.end(), [&](const auto& s) { return s.first == cookie; });
        if (it == sinks_.end()) return CONNECT_E_NOCONNECTION;
        IDispatch* events = it->second;
        sinks_.erase(it);
        events->Release();
        return S_OK;
    }
    STDMETHODIMP EnumConnections(IEnumConnections** out) override {
        if (out) *out = nullptr;
        return E_NOTIMPL;
    }

    // Calls dispid on every sink; a sink's failure is its own matter.
    void raise(DISPID id, DISPPARAMS& params) {
        // A handler may unadvise while it runs: call the sinks present now, held.
        std::vector<IDispatch*> now;
        for (auto& s : sinks_) {
            s.second->AddRef();
            now.push_back(s.second);
        }
        for (IDispatch* events : now) {
            events->Invoke(id, IID_NULL, LOCALE_USER_DEFAULT, DISPATCH_METHOD, &params, nullptr, nullptr, nullptr);
            events->Release();
        }
    }

    void detach() { owner_ = nullptr; }

private:
    IConnectionPointContainer* owner_;  // not held: the owner holds this point
    std::vector<std::pair<DWORD, IDispatch*>> sinks_;
    DWORD lastCookie_ = 0;
};

// Varnel.DllWrapper: each request forwards to a varnel::DllWrapper with the
// client's documents called by name; the events go to the advised sinks.
class WrapperObject final : public DualObject<_DllWrapper, &IID__DllWrapper>, public IConnectionPointContainer {
public:
    WrapperObject() : events_(new EventPoint(this)) {
        wrapper_.setOnProgress([this](std::int16_t& percent) {
            VARIANT arg;
            VariantInit(&arg);
            V_VT(&arg) = VT_I2 | VT_BYREF;
            V_I2REF(&arg) = &percent;
            DISPPARAMS params{&arg, nullptr, 1, 0};
            events_->raise(1, params);
        });
        wrapper_.setOnComplete([this] {
            DISPPARAMS params{nullptr, nullptr, 0, 0};
            events_->raise(2, params);
        });
    }
    ~WrapperObject() override {
        events_->detach();
        events_->Release();
    }

    STDMETHODIMP QueryInterface(REFIID riid, void** out) override { return DualObject::QueryInterface(riid, out); }
    STDMETHODIMP_(ULONG) AddRef() override { return addRef(); }
    STDMETHODIMP_(ULONG) Release() override { return release(); }

    STDMETHODIMP EnumConnectionPoints(IEnumConnectionPoints** out) override {
        if (out) *out = nullptr;
        return E_NOTIMPL;
    }
    STDMETHODIMP FindConnectionPoint(REFIID riid, IConnectionPoint** out) override {
        if (!out) return E_POINTER;
        *out = nullptr;
        if (riid != DIID___DllWrapper) return CONNECT_E_NOCONNECTION;
        events_->AddRef();
        *out = events_;
        return S_OK;
    }

    STDMETHODIMP GetTrueString(BSTR* result) override { return text(result, wrapper_.GetTrueString()); }
    STDMETHODIMP GetFalseString(BSTR* result) override { return text(result, wrapper_.GetFalseString()); }

    STDMETHODIMP discoverDevice(METER_REC* rec, IDispatch** device, IDispatch** conn, IDispatch** status,
                                LONG* result) override {
        return request(rec, result, {device, conn, status},
                       [&](std::vector<XMLWrapper>& d) { return wrapper_.discoverDevice(*rec, d[0], d[1], d[2]); });
    }
    STDMETHODIMP setDeviceSettings(METER_REC* rec, IDispatch** device, IDispatch** cfg, IDispatch** status,
                                   LONG* result) override {
        return request(rec, result, {device, cfg, status},
                       [&](std::vector<XMLWrapper>& d) { return wrapper_.setDeviceSettings(*rec, d[0], d[1], d[2]); });
    }
    STDMETHODIMP getDeviceSettings(METER_REC* rec, IDispatch** device, IDispatch** cfg, VARIANT_BOOL fetchAll,
                                   IDispatch** status, VARIANT_BOOL* checkMeter, LONG* result) override {
        return checking(checkMeter, [&](bool& check) {
            return request(rec, result, {device, cfg, status}, [&](std::vector<XMLWrapper>& d) {
                return wrapper_.getDeviceSettings(*rec, d[0], d[1], fetchAll != VARIANT_FALSE, d[2], check);
            });
        });
    }
    STDMETHODIMP getDeviceCaps(METER_REC* rec, IDispatch** device, IDispatch** caps, VARIANT_BOOL fetchAll,
                               IDispatch** status, VARIANT_BOOL* checkMeter, LONG* result) override {
        return checking(checkMeter, [&](bool& check) {
            return request(rec, result, {device, caps, status}, [&](std::vector<XMLWrapper>& d) {
                return wrapper_.getDeviceCaps(*rec, d[0], d[1], fetchAll != VARIANT_FALSE, d[2], check);
            });
        });
    }
    STDMETHODIMP getReadings(METER_REC* rec, IDispatch** device, IDispatch** datalog, IDispatch** filter,
                             IDispatch** status, VARIANT_BOOL* checkMeter, LONG* result) override {
        return checking(checkMeter, [&](bool& check) {
            return request(rec, result, {device, datalog, filter, status}, [&](std::vector<XMLWrapper>& d) {
                return wrapper_.getReadings(*rec, d[0], d[1], d[2], d[3], check);
            });
        });
    }
    STDMETHODIMP clearMeter(METER_REC* rec, IDispatch** device, IDispatch** status, LONG* result) override {
        return request(rec, result, {device, status},
                       [&](std::vector<XMLWrapper>& d) { return wrapper_.clearMeter(*rec, d[0], d[1]); });
    }
    STDMETHODIMP closeMeter(METER_REC* rec, LONG* result) override {
        return request(rec, result, {}, [&](std::vector<XMLWrapper>&) { return wrapper_.closeMeter(*rec); });
    }

private:
    void* extraInterface(REFIID riid) override {
        return riid == IID_IConnectionPointContainer ? static_cast<IConnectionPointContainer*>(this) : nullptr;
    }

    static HRESULT text(BSTR* result, const std::string& value) {
        if (!result) return E_POINTER;
        *result = toBstr(value);
        return *result ? S_OK : E_OUTOFMEMORY;
    }

    // Runs one request over the client's documents. A missing record or result
    // pointer is E_POINTER; a document pointer that is missing or holds null is
    // a document whose every operation fails, so the request reports it as an
    // unexpected error like any other failing document.
    template <class F>
    HRESULT request(METER_REC* rec, LONG* result, std::initializer_list<IDispatch**> objects, F&& body) {
        if (!rec || !result) return E_POINTER;
        *result = 0;
        return guardedCall(kWrapperProgId, IID__DllWrapper, [&] {
            std::vector<XMLWrapper> documents;
            documents.reserve(objects.size());
            for (IDispatch** o : objects) documents.push_back(dispatchDocument(o ? *o : nullptr));
            *result = body(documents);
            return S_OK;
        });
    }

    // Hands blnCheckMeter back as a VARIANT_BOOL; also when the request fails.
    template <class F>
    static HRESULT checking(VARIANT_BOOL* checkMeter, F&& call) {
        if (!checkMeter) return E_POINTER;
        bool check = false;
        const HRESULT hr = call(check);
        *checkMeter = variantBool(check);
        return hr;
    }

    DllWrapper wrapper_;
    EventPoint* events_;
};

// Varnel.UniqueChecker.
class CheckerObject final : public DualObject<_UniqueChecker, &IID__UniqueChecker> {
public:
    STDMETHODIMP AddValue(BSTR* value, VARIANT_BOOL* added) override {
        if (!value || !added) return E_POINTER;
        *added = VARIANT_FALSE;
        return guardedCall(kCheckerProgId, IID__UniqueChecker, [&] {
            *added = variantBool(checker_.AddValue(toUtf8(*value)));
            return S_OK;
        });
    }
    STDMETHODIMP Clear() override {
        checker_.Clear();
        return S_OK;
    }

private:
    UniqueChecker checker_;
};

// The classes without members.
class EnumsObject final : public DualObject<_Enums, &IID__Enums> {};
class MeterRecordObject final : public DualObject<_clsMeterRecord, &IID__clsMeterRecord> {};

constexpr ClassEntry kClasses[] = {
    {&CLSID_DllWrapper, L"DllWrapper", kWrapperProgId, factoryFor<WrapperObject>},
    {&CLSID_UniqueChecker, L"UniqueChecker", kCheckerProgId, factoryFor<CheckerObject>},
    {&CLSID_Enums, L"Enums", nullptr, factoryFor<EnumsObject>},
    {&CLSID_clsMeterRecord, L"clsMeterRecord", nullptr, factoryFor<MeterRecordObject>},
};

}  // namespace

const Server& thisServer() {
    static const Server server{kClasses, &LIBID_Varnel};
    return server;
}

}  // namespace varnel::detail::com
