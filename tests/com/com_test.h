// What the COM test clients share: texts across the boundary, creating and
// querying objects, and the IDispatch boilerplate of the objects they implement.
#pragma once

#include <windows.h>

#include <cstdio>
#include <cstdlib>
#include <cwchar>
#include <string>

namespace comtest {

// The UTF-8 of `n` wide characters.
inline std::string utf8(const wchar_t* text, int n) {
    std::string s(static_cast<std::size_t>(WideCharToMultiByte(CP_UTF8, 0, text, n, nullptr, 0, nullptr, nullptr)), 0);
    WideCharToMultiByte(CP_UTF8, 0, text, n, s.data(), static_cast<int>(s.size()), nullptr, nullptr);
    return s;
}
inline std::string narrow(const wchar_t* s) { return s ? utf8(s, static_cast<int>(std::wcslen(s))) : ""; }
// The text of a BSTR the callee allocated, freed.
inline std::string take(BSTR b) {
    std::string s = utf8(b, static_cast<int>(SysStringLen(b)));
    SysFreeString(b);
    return s;
}
// An ASCII BSTR for the call's duration.
struct Bstr {
    BSTR b;
    explicit Bstr(const std::string& s) : b(SysAllocString(std::wstring(s.begin(), s.end()).c_str())) {}
    ~Bstr() { SysFreeString(b); }
    operator BSTR() const { return b; }
};

// A failed step the test cannot go on from.
inline void must(HRESULT hr, const char* what) {
    if (FAILED(hr)) std::fprintf(stderr, "%s failed: 0x%08lx\n", what, static_cast<unsigned long>(hr)), std::exit(2);
}
template <class T>
T* create(REFCLSID clsid, REFIID iid) {
    T* p = nullptr;
    must(CoCreateInstance(clsid, nullptr, CLSCTX_INPROC_SERVER, iid, reinterpret_cast<void**>(&p)),
         "CoCreateInstance (registered?)");
    return p;
}
template <class T>
T* query(IUnknown* p, REFIID iid) {
    T* q = nullptr;
    p->QueryInterface(iid, reinterpret_cast<void**>(&q));
    return q;
}

// An IDispatch of the test's own, on the test's stack (no reference counting), without type information.
struct Dispatch : IDispatch {
    IID also;  // the interface it answers besides IUnknown and IDispatch
    explicit Dispatch(REFIID iid = IID_IDispatch) : also(iid) {}
    virtual ~Dispatch() = default;
    STDMETHODIMP QueryInterface(REFIID riid, void** o) override {
        *o = riid == IID_IUnknown || riid == IID_IDispatch || riid == also ? this : nullptr;
        return *o ? S_OK : E_NOINTERFACE;
    }
    STDMETHODIMP_(ULONG) AddRef() override { return 2; }
    STDMETHODIMP_(ULONG) Release() override { return 1; }
    STDMETHODIMP GetTypeInfoCount(UINT* n) override { return *n = 0, S_OK; }
    STDMETHODIMP GetTypeInfo(UINT, LCID, ITypeInfo**) override { return E_NOTIMPL; }
    STDMETHODIMP GetIDsOfNames(REFIID, LPOLESTR*, UINT, LCID, DISPID*) override { return E_NOTIMPL; }
};

}  // namespace comtest
