#include "com/com_support.h"

#include <mutex>
#include <string>
#include <vector>

namespace varnel::detail::com {

std::atomic<long>& moduleUsers() {
    static std::atomic<long> users{0};
    return users;
}

HMODULE& thisModule() {
    static HMODULE module = nullptr;
    return module;
}

std::string toUtf8(const wchar_t* text, std::size_t length) {
    if (!text || length == 0) return {};
    const int wide = static_cast<int>(length);
    const int bytes = WideCharToMultiByte(CP_UTF8, 0, text, wide, nullptr, 0, nullptr, nullptr);
    std::string out(static_cast<std::size_t>(bytes), '\0');
    WideCharToMultiByte(CP_UTF8, 0, text, wide, out.data(), bytes, nullptr, nullptr);
    return out;
}

std::string toUtf8(BSTR text) { return toUtf8(text, text ? SysStringLen(text) : 0); }

BSTR toBstr(const std::string& text) {
    const int bytes = static_cast<int>(text.size());
    const int wide = MultiByteToWideChar(CP_UTF8, 0, text.data(), bytes, nullptr, 0);
    BSTR out = SysAllocStringLen(nullptr, static_cast<UINT>(wide));
    if (out && wide > 0) MultiByteToWideChar(CP_UTF8, 0, text.data(), bytes, out, wide);
    return out;
}

HRESULT hresultOf(std::int32_t number) {
    if (number < 0) return static_cast<HRESULT>(number);
    if (number > 0 && number <= 0xFFFF) return MAKE_HRESULT(SEVERITY_ERROR, FACILITY_CONTROL, number);
    return E_FAIL;
}

std::int32_t numberOf(HRESULT hr) {
    if (HRESULT_FACILITY(hr) == FACILITY_CONTROL && HRESULT_CODE(hr) != 0) return HRESULT_CODE(hr);
    return static_cast<std::int32_t>(hr);
}

HRESULT reportError(const wchar_t* progId, REFIID iid, std::int32_t number, const std::string& description) {
    ICreateErrorInfo* create = nullptr;
    if (SUCCEEDED(CreateErrorInfo(&create))) {
        std::wstring wide(description.size(), L'\0');
        wide.resize(static_cast<std::size_t>(MultiByteToWideChar(CP_UTF8, 0, description.data(),
                                                                 static_cast<int>(description.size()), wide.data(),
                                                                 static_cast<int>(wide.size()))));
        create->SetGUID(iid);
        create->SetSource(const_cast<LPOLESTR>(progId));
        create->SetDescription(const_cast<LPOLESTR>(wide.c_str()));
        IErrorInfo* info = nullptr;
        if (SUCCEEDED(create->QueryInterface(IID_IErrorInfo, reinterpret_cast<void**>(&info)))) {
            SetErrorInfo(0, info);
            info->Release();
        }
        create->Release();
    }
    return hresultOf(number);
}

HRESULT typeInfoOf(REFGUID guid, ITypeInfo** info) {
    // Loaded once per module and kept: the type information is read-only and
    // may be asked for from any thread.
    static std::mutex guard;
    static ITypeLib* library = nullptr;
    std::lock_guard<std::mutex> lock(guard);
    if (!library) {
        wchar_t path[MAX_PATH];
        const DWORD n = GetModuleFileNameW(thisModule(), path, MAX_PATH);
        if (n == 0 || n >= MAX_PATH) return HRESULT_FROM_WIN32(GetLastError());
        const HRESULT hr = LoadTypeLibEx(path, REGKIND_NONE, &library);
        if (FAILED(hr)) return hr;
    }
    return library->GetTypeInfoOfGuid(guid, info);
}

namespace {

std::wstring guidText(REFGUID guid) {
    wchar_t text[64];
    StringFromGUID2(guid, text, 64);
    return text;
}

LONG setValue(HKEY root, const std::wstring& key, const wchar_t* name, const std::wstring& value) {
    HKEY h = nullptr;
    LONG r = RegCreateKeyExW(root, key.c_str(), 0, nullptr, 0, KEY_WRITE, nullptr, &h, nullptr);
    if (r != ERROR_SUCCESS) return r;
    r = RegSetValueExW(h, name, 0, REG_SZ, reinterpret_cast<const BYTE*>(value.c_str()),
                       static_cast<DWORD>((value.size() + 1) * sizeof(wchar_t)));
    RegCloseKey(h);
    return r;
}

std::wstring modulePath() {
    std::vector<wchar_t> path(MAX_PATH);
    for (;;) {
        const DWORD n = GetModuleFileNameW(thisModule(), path.data(), static_cast<DWORD>(path.size()));
        if (n == 0) return {};
        if (n < path.size()) return std::wstring(path.data(), n);
        path.resize(path.size() * 2);
    }
}

}  // namespace

HRESULT registerServer(const Server& server) {
    std::wstring path = modulePath();
    if (path.empty()) return HRESULT_FROM_WIN32(GetLastError());
    ITypeLib* library = nullptr;
    HRESULT hr = LoadTypeLibEx(path.c_str(), REGKIND_NONE, &library);
    if (FAILED(hr)) return hr;
    hr = RegisterTypeLib(library, path.data(), nullptr);
    library->Release();
    if (FAILED(hr)) return hr;
    const std::wstring lib = guidText(*server.libid);
    for (const ClassEntry& c : server.classes) {
        const std::wstring key = L"CLSID\\" + guidText(*c.clsid);
        LONG r = setValue(HKEY_CLASSES_ROOT, key, nullptr, c.name);
        if (r == ERROR_SUCCESS) r = setValue(HKEY_CLASSES_ROOT, key + L"\\InprocServer32", nullptr, path);
        if (r == ERROR_SUCCESS)
            r = setValue(HKEY_CLASSES_ROOT, key + L"\\InprocServer32", L"ThreadingModel", L"Apartment");
        if (r == ERROR_SUCCESS) r = setValue(HKEY_CLASSES_ROOT, key + L"\\TypeLib", nullptr, lib);
        if (r == ERROR_SUCCESS && c.progId) {
            r = setValue(HKEY_CLASSES_ROOT, key + L"\\ProgID", nullptr, c.progId);
            if (r == ERROR_SUCCESS) r = setValue(HKEY_CLASSES_ROOT, c.progId, nullptr, c.name);
            if (r == ERROR_SUCCESS)
                r = setValue(HKEY_CLASSES_ROOT, std::wstring(c.progId) + L"\\CLSID", nullptr, guidText(*c.clsid));
        }
        if (r != ERROR_SUCCESS) {
            unregisterServer(server);
            return HRESULT_FROM_WIN32(r);
        }
    }
    return S_OK;
}

HRESULT unregisterServer(const Server& server) {
    HRESULT result = S_OK;
    auto remove = [&](const std::wstring& key) {
        const LONG r = RegDeleteTreeW(HKEY_CLASSES_ROOT, key.c_str());
        if (r == ERROR_SUCCESS) RegDeleteKeyW(HKEY_CLASSES_ROOT, key.c_str());
        if (r != ERROR_SUCCESS && r != ERROR_FILE_NOT_FOUND) result = HRESULT_FROM_WIN32(r);
    };
    for (const ClassEntry& c : server.classes) {
        remove(L"CLSID\\" + guidText(*c.clsid));
        if (c.progId) remove(c.progId);
    }
    // The version and locale the library was registered with, read from the library itself.
    ITypeLib* library = nullptr;
    if (SUCCEEDED(LoadTypeLibEx(modulePath().c_str(), REGKIND_NONE, &library))) {
        TLIBATTR* attr = nullptr;
        if (SUCCEEDED(library->GetLibAttr(&attr))) {
            const HRESULT hr =
                UnRegisterTypeLib(*server.libid, attr->wMajorVerNum, attr->wMinorVerNum, attr->lcid, attr->syskind);
            if (FAILED(hr) && hr != TYPE_E_REGISTRYACCESS) result = hr;
            library->ReleaseTLibAttr(attr);
        }
        library->Release();
    }
    return result;
}

}  // namespace varnel::detail::com

using varnel::detail::com::moduleUsers;
using varnel::detail::com::registerServer;
using varnel::detail::com::thisModule;
using varnel::detail::com::unregisterServer;

// What every server module exports.
extern "C" {

BOOL WINAPI DllMain(HINSTANCE instance, DWORD reason, LPVOID) {
    if (reason == DLL_PROCESS_ATTACH) {
        thisModule() = instance;
        DisableThreadLibraryCalls(instance);
    }
    return TRUE;
}

STDAPI DllGetClassObject(REFCLSID clsid, REFIID riid, void** out) {
    if (!out) return E_POINTER;
    *out = nullptr;
    for (const varnel::detail::com::ClassEntry& c : varnel::detail::com::thisServer().classes)
        if (clsid == *c.clsid) return c.factory(riid, out);
    return CLASS_E_CLASSNOTAVAILABLE;
}

STDAPI DllCanUnloadNow() { return moduleUsers() == 0 ? S_OK : S_FALSE; }

STDAPI DllRegisterServer() { return registerServer(varnel::detail::com::thisServer()); }

STDAPI DllUnregisterServer() { return unregisterServer(varnel::detail::com::thisServer()); }

}  // extern "C"
