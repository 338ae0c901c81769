// What both COM servers (varnel.dll, varnel_xml.dll) share: reference
// counting, IDispatch through the embedded type library, the class factory,
// self-registration, text conversion and the translation of errors into
// failed HRESULTs with IErrorInfo.
#pragma once

#include <ocidl.h>
#include <oleauto.h>
#include <windows.h>

#include <atomic>
#include <cstdint>
#include <new>
#include <span>
#include <string>

#include "errors/err_propagator.h"

namespace varnel::detail::com {

// Objects and locks alive in this module; DllCanUnloadNow answers from it.
std::atomic<long>& moduleUsers();

// The module this code is linked into (set by DllMain).
HMODULE& thisModule();

// UTF-8 and BSTR; a BSTR that is not valid UTF-16 gives U+FFFD where it breaks.
std::string toUtf8(const wchar_t* text, std::size_t length);
std::string toUtf8(BSTR text);
// A new BSTR, or null when memory ran out.
BSTR toBstr(const std::string& text);

// The HRESULT a client sees for an error number: small positive numbers are
// control errors (0x800Axxxx, whose low word is the number a Visual Basic
// client reads back); negative ones are HRESULTs already.
HRESULT hresultOf(std::int32_t number);
// The number an HRESULT stands for, the inverse of hresultOf.
std::int32_t numberOf(HRESULT hr);

// Sets the thread's IErrorInfo (source progId, interface iid) and returns
// hresultOf(number).
HRESULT reportError(const wchar_t* progId, REFIID iid, std::int32_t number, const std::string& description);

// Runs body; an exception leaving it becomes a failed HRESULT with IErrorInfo
// carrying its number and the client's error text (trace and reason).
template <class F>
HRESULT guardedCall(const wchar_t* progId, REFIID iid, F&& body) noexcept {
    try {
        return body();
    } catch (...) {
        try {
            const CaughtError caught = currentError();
            return reportError(progId, iid, caught.number, clientErrorText(caught));
        } catch (...) {
            return E_OUTOFMEMORY;  // describing the error ran out of memory
        }
    }
}

// The type information of one interface of the type library embedded in this
// module, loaded once; null with the HRESULT when it cannot be loaded.
HRESULT typeInfoOf(REFGUID guid, ITypeInfo** info);

// Reference counting of one COM object; the module counts it while it lives.
class RefCounted {
public:
    RefCounted() { ++moduleUsers(); }
    virtual ~RefCounted() { --moduleUsers(); }
    RefCounted(const RefCounted&) = delete;
    RefCounted& operator=(const RefCounted&) = delete;
    ULONG addRef() { return static_cast<ULONG>(++refs_); }
    ULONG release() {
        const long left = --refs_;
        if (left == 0) delete this;
        return static_cast<ULONG>(left);
    }

private:
    std::atomic<long> refs_{1};
};

// IUnknown and IDispatch of a dual interface I, the dispatch through its type
// information. Derived answers QueryInterface for anything else in extraInterface().
template <class I, const IID* Iid>
class DualObject : public I, public ISupportErrorInfo, public RefCounted {
public:
    STDMETHODIMP QueryInterface(REFIID riid, void** out) override {
        if (!out) return E_POINTER;
        *out = nullptr;
        if (riid == IID_IUnknown || riid == IID_IDispatch || riid == *Iid)
            *out = static_cast<I*>(this);
        else if (riid == IID_ISupportErrorInfo)
            *out = static_cast<ISupportErrorInfo*>(this);
        else
            *out = extraInterface(riid);
        if (!*out) return E_NOINTERFACE;
        static_cast<IUnknown*>(*out)->AddRef();
        return S_OK;
    }
    STDMETHODIMP_(ULONG) AddRef() override { return addRef(); }
    STDMETHODIMP_(ULONG) Release() override { return release(); }

    STDMETHODIMP GetTypeInfoCount(UINT* count) override {
        if (!count) return E_POINTER;
        *count = 1;
        return S_OK;
    }
    STDMETHODIMP GetTypeInfo(UINT index, LCID, ITypeInfo** info) override {
        if (!info) return E_POINTER;
        *info = nullptr;
        if (index != 0) return DISP_E_BADINDEX;
        return typeInfoOf(*Iid, info);
    }
    STDMETHODIMP GetIDsOfNames(REFIID, LPOLESTR* names, UINT count, LCID, DISPID* ids) override {
        ITypeInfo* info = nullptr;
        const HRESULT hr = typeInfoOf(*Iid, &info);
        if (FAILED(hr)) return hr;
        return info->GetIDsOfNames(names, count, ids);
    }
    STDMETHODIMP Invoke(DISPID id, REFIID, LCID, WORD flags, DISPPARAMS* params, VARIANT* result, EXCEPINFO* excep,
                        UINT* argErr) override {
        ITypeInfo* info = nullptr;
        const HRESULT hr = typeInfoOf(*Iid, &info);
        if (FAILED(hr)) return hr;
        // A script passes a variable by reference as a Variant, which the type information's
        // dispatch refuses for a typed parameter: such an argument goes in as the value it
        // refers to (a by-reference parameter then works on a copy).
        VARIANTARG args[16];
        DISPPARAMS own = params ? *params : DISPPARAMS{};
        if (params && params->rgvarg && params->cArgs <= 16) {
            for (UINT i = 0; i < params->cArgs; ++i) {
                args[i] = params->rgvarg[i];
                if (V_VT(&args[i]) == (VT_BYREF | VT_VARIANT) && V_VARIANTREF(&args[i]))
                    args[i] = *V_VARIANTREF(&args[i]);
            }
            own.rgvarg = args;
        }
        return info->Invoke(static_cast<I*>(this), id, flags, params ? &own : nullptr, result, excep, argErr);
    }

    STDMETHODIMP InterfaceSupportsErrorInfo(REFIID riid) override { return riid == *Iid ? S_OK : S_FALSE; }

protected:
    virtual void* extraInterface(REFIID) { return nullptr; }
};

// A class factory making T (whose constructor takes nothing) for any interface it has.
template <class T>
class ClassFactory final : public IClassFactory, public RefCounted {
public:
    STDMETHODIMP QueryInterface(REFIID riid, void** out) override {
        if (!out) return E_POINTER;
        *out = riid == IID_IUnknown || riid == IID_IClassFactory ? static_cast<IClassFactory*>(this) : nullptr;
        if (!*out) return E_NOINTERFACE;
        AddRef();
        return S_OK;
    }
    STDMETHODIMP_(ULONG) AddRef() override { return addRef(); }
    STDMETHODIMP_(ULONG) Release() override { return release(); }
    STDMETHODIMP CreateInstance(IUnknown* outer, REFIID riid, void** out) override {
        if (!out) return E_POINTER;
        *out = nullptr;
        if (outer) return CLASS_E_NOAGGREGATION;
        T* object = new (std::nothrow) T();
        if (!object) return E_OUTOFMEMORY;
        const HRESULT hr = object->QueryInterface(riid, out);
        object->Release();
        return hr;
    }
    STDMETHODIMP LockServer(BOOL lock) override {
        if (lock)
            ++moduleUsers();
        else
            --moduleUsers();
        return S_OK;
    }
};

// A class factory for T when clsid is T's class.
template <class T>
HRESULT factoryFor(REFIID riid, void** out) {
    auto* factory = new (std::nothrow) ClassFactory<T>();
    if (!factory) return E_OUTOFMEMORY;
    const HRESULT hr = factory->QueryInterface(riid, out);
    factory->Release();
    return hr;
}

// One class a server registers and makes.
struct ClassEntry {
    const CLSID* clsid;
    const wchar_t* name;    // the coclass name
    const wchar_t* progId;  // null: no ProgID
    HRESULT (*factory)(REFIID riid, void** out);
};

// What a server module is: its classes and its embedded type library. Each
// server defines thisServer(); com_support.cpp exports DllGetClassObject,
// DllCanUnloadNow, DllRegisterServer and DllUnregisterServer from it.
struct Server {
    std::span<const ClassEntry> classes;
    const GUID* libid;
};
const Server& thisServer();

// Registers the classes (InprocServer32 = this module, ThreadingModel
// Apartment, ProgID, TypeLib) and the embedded type library.
HRESULT registerServer(const Server& server);
// Removes every key registerServer wrote, and the type library's registration.
HRESULT unregisterServer(const Server& server);

}  // namespace varnel::detail::com
