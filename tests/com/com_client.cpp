// A COM client of the registered servers, under Wine: the type library's
// shapes, late binding through IDispatch, documents of another XML component
// (a tree of this test's own, reached only by name), errors as IErrorInfo, and
// bad input that must fail cleanly.
#include <windows.h>

#include <cstdio>
#include <functional>
#include <map>
#include <memory>
#include <string>
#include <vector>

#include "varnel/clock.h"
#include "varnel/records.h"

#include "varnel_com.h"
#include "varnel_xml_com.h"

namespace {

int failures = 0;
#define CHECK(cond)                                                                       \
    do {                                                                                  \
        if (!(cond)) {                                                                    \
            std::fprintf(stderr, "%s:%d: CHECK failed: %s\n", __FILE__, __LINE__, #cond); \
            ++failures;                                                                   \
        }                                                                                 \
    } while (0)

std::wstring wide(const std::string& s) { return std::wstring(s.begin(), s.end()); }
std::string narrow(const wchar_t* s) {
    std::string out;
    for (; s && *s; ++s) out += static_cast<char>(*s);
    return out;
}

template <class T>
T* create(REFCLSID clsid, REFIID iid) {
    T* p = nullptr;
    if (FAILED(CoCreateInstance(clsid, nullptr, CLSCTX_INPROC_SERVER, iid, reinterpret_cast<void**>(&p)))) {
        std::fprintf(stderr, "cannot create a class (registered?)\n");
        std::exit(2);
    }
    return p;
}

// Calls a method by name through IDispatch; the HRESULT, the result in `result`.
HRESULT invoke(IDispatch* d, const wchar_t* name, std::vector<VARIANT> args, VARIANT* result) {
    DISPID id = 0;
    LPOLESTR n = const_cast<LPOLESTR>(name);
    HRESULT hr = d->GetIDsOfNames(IID_NULL, &n, 1, LOCALE_USER_DEFAULT, &id);
    if (FAILED(hr)) return hr;
    std::vector<VARIANT> reversed(args.rbegin(), args.rend());
    DISPPARAMS params{reversed.data(), nullptr, static_cast<UINT>(reversed.size()), 0};
    EXCEPINFO excep{};
    UINT argErr = 0;
    VariantInit(result);
    hr = d->Invoke(id, IID_NULL, LOCALE_USER_DEFAULT, DISPATCH_METHOD, &params, result, &excep, &argErr);
    SysFreeString(excep.bstrSource);
    SysFreeString(excep.bstrDescription);
    SysFreeString(excep.bstrHelpFile);
    return hr;
}

VARIANT text(const wchar_t* s) {
    VARIANT v;
    VariantInit(&v);
    V_VT(&v) = VT_BSTR;
    V_BSTR(&v) = SysAllocString(s);
    return v;
}
VARIANT number(LONG n) {
    VARIANT v;
    VariantInit(&v);
    V_VT(&v) = VT_I4;
    V_I4(&v) = n;
    return v;
}

// --- another XML component: a plain tree, its sixteen operations by name only ---

struct Node {
    std::string name, text;
    std::map<std::string, std::string> attributes;
    std::vector<std::unique_ptr<Node>> children;
    Node* parent = nullptr;
    Node* add(const std::string& n, const std::string& t) {
        children.push_back(std::make_unique<Node>());
        Node* c = children.back().get();
        c->name = n, c->text = t, c->parent = this;
        return c;
    }
    Node* child(const std::string& n) const {
        for (auto& c : children)
            if (c->name == n) return c.get();
        return nullptr;
    }
};

class TreeDocument final : public IDispatch {
public:
    std::unique_ptr<Node> root;
    Node *current = nullptr, *added = nullptr, *addedChild = nullptr;
    int calls = 0;

    STDMETHODIMP QueryInterface(REFIID riid, void** o) override {
        *o = riid == IID_IUnknown || riid == IID_IDispatch ? this : nullptr;
        if (*o) AddRef();
        return *o ? S_OK : E_NOINTERFACE;
    }
    STDMETHODIMP_(ULONG) AddRef() override { return ++refs_; }
    STDMETHODIMP_(ULONG) Release() override { return --refs_; }  // lives on the test's stack
    STDMETHODIMP GetTypeInfoCount(UINT* n) override {
        *n = 0;
        return S_OK;
    }
    STDMETHODIMP GetTypeInfo(UINT, LCID, ITypeInfo**) override { return E_NOTIMPL; }
    STDMETHODIMP GetIDsOfNames(REFIID, LPOLESTR* names, UINT, LCID, DISPID* id) override {
        static const char* const ops[] = {
            "AddElement",    "GetChildCount",     "SetAttribute",      "AddChildElement",
            "MoveToRoot",    "MoveToChild",       "GetChildAttribute", "GetChildAttributeAt",
            "GetChildValue", "GetChildValueAt",   "GetChildName",      "InitDocument",
            "CountElements", "SetChildAttribute", "SelectElement",     "GetRootName"};
        for (DISPID i = 0; i < 16; ++i)
            if (narrow(names[0]) == ops[i]) return *id = 100 + i, S_OK;
        return DISP_E_UNKNOWNNAME;
    }
    STDMETHODIMP Invoke(DISPID id, REFIID, LCID, WORD, DISPPARAMS* p, VARIANT* result, EXCEPINFO* excep,
                        UINT*) override {
        ++calls;
        auto arg = [&](UINT i) -> VARIANT& { return p->rgvarg[p->cArgs - 1 - i]; };
        auto str = [&](UINT i) { return i < p->cArgs && V_VT(&arg(i)) == VT_BSTR ? narrow(V_BSTR(&arg(i))) : ""; };
        auto num = [&](UINT i) { return i < p->cArgs && V_VT(&arg(i)) == VT_I4 ? V_I4(&arg(i)) : -1; };
        auto ret = [&](const std::string& s) {
            if (result) V_VT(result) = VT_BSTR, V_BSTR(result) = SysAllocString(wide(s).c_str());
        };
        auto count = [&](LONG n) {
            if (result) V_VT(result) = VT_I4, V_I4(result) = n;
        };
        auto fail = [&](const wchar_t* why) {
            if (excep) excep->wCode = 91, excep->bstrDescription = SysAllocString(why);
            return DISP_E_EXCEPTION;
        };
        auto at = [&](LONG i) -> Node* {
            return current && i >= 0 && i < static_cast<LONG>(current->children.size()) ? current->children[i].get()
                                                                                        : nullptr;
        };
        switch (id - 100) {
        case 0:  // AddElement
            if (!root) {
                root = std::make_unique<Node>();
                root->name = str(0), root->text = str(1);
                current = added = root.get();
            } else {
                added = current->add(str(0), str(1));
            }
            return S_OK;
        case 1:
            return count(current ? static_cast<LONG>(current->children.size()) : 0), S_OK;
        case 2:
            if (!added) return fail(L"nothing added");
            added->attributes[str(0)] = str(1);
            return S_OK;
        case 3: {
            if (!added) return fail(L"nothing added");
            Node* parent = added;
            if (!str(1).empty()) {
                parent = nullptr;
                for (auto& c : added->children)
                    if (c->name == str(1)) parent = c.get();
                if (!parent) return fail(L"no such parent");
            }
            addedChild = parent->add(str(0), str(2));
            return S_OK;
        }
        case 4:
            return current = root.get(), S_OK;
        case 5: {
            Node* c = current ? current->child(str(0)) : nullptr;
            if (!c) return fail(L"no such child");
            return current = c, S_OK;
        }
        case 6: {
            Node* c = current ? current->child(str(0)) : nullptr;
            return ret(c && c->attributes.count(str(1)) ? c->attributes[str(1)] : ""), S_OK;
        }
        case 7: {
            Node* c = at(num(0));
            if (!c) return fail(L"index");
            return ret(c->attributes.count(str(1)) ? c->attributes[str(1)] : ""), S_OK;
        }
        case 8: {
            Node* c = current ? current->child(str(0)) : nullptr;
            return ret(c ? c->text : ""), S_OK;
        }
        case 9:
        case 10: {
            Node* c = at(num(0));
            if (!c) return fail(L"index");
            return ret(id - 100 == 9 ? c->text : c->name), S_OK;
        }
        case 11: {
            static const std::map<LONG, std::vector<std::string>> kinds = {
                {1, {"Device", "DeviceInfo", "PortInfo"}},
                {2, {"DeviceSettings", "DeviceInfo", "Settings"}},
                {3, {"ConnectionInfo", "Ports"}},
                {4, {"DeviceCaps", "DeviceInfo", "Settings", "Records"}},
                {5, {"Datalog", "DeviceInfo", "TransferDetail", "Records"}},
                {6, {"Filter"}},
                {7, {"Status"}}};
            auto k = kinds.find(num(0));
            if (k == kinds.end()) return fail(L"kind");
            root = std::make_unique<Node>();
            root->name = k->second[0];
            for (std::size_t i = 1; i < k->second.size(); ++i) root->add(k->second[i], "");
            current = root.get(), added = addedChild = nullptr;
            return S_OK;
        }
        case 12: {
            std::function<LONG(Node*)> below = [&](Node* n) {
                LONG k = 0;
                for (auto& c : n->children) k += (c->name == str(0)) + below(c.get());
                return k;
            };
            return count(current ? below(current) : 0), S_OK;
        }
        case 13:
            if (!addedChild) return fail(L"no child added");
            addedChild->attributes[str(0)] = str(1);
            return S_OK;
        case 14: {
            std::vector<Node*> level{root.get()};
            for (std::size_t i = 0; i < level.size() && level[i]; ++i) {
                if (level[i]->name == str(0)) return current = level[i], S_OK;
                for (auto& c : level[i]->children) level.push_back(c.get());
            }
            return fail(L"no such element");
        }
        case 15:
            return ret(root ? root->name : ""), S_OK;
        }
        return DISP_E_MEMBERNOTFOUND;
    }

private:
    ULONG refs_ = 1;
};

IDispatch* asDispatch(IUnknown* p) {
    IDispatch* d = nullptr;
    p->QueryInterface(IID_IDispatch, reinterpret_cast<void**>(&d));
    return d;
}

void connection(TreeDocument& conn) {
    VARIANT r;
    invoke(&conn, L"InitDocument", {number(3)}, &r);
    invoke(&conn, L"SelectElement", {text(L"Ports")}, &r);
    invoke(&conn, L"AddElement", {text(L"COM"), text(L"")}, &r);
    invoke(&conn, L"AddChildElement", {text(L"PortsToSearch"), text(L""), text(L"1")}, &r);
}

// The type library as a client written for the component expects it.
void typeLibraryShapes(_DllWrapper* wrapper) {
    ITypeInfo* info = nullptr;
    CHECK(SUCCEEDED(wrapper->GetTypeInfo(0, LOCALE_USER_DEFAULT, &info)));
    if (!info) return;
    const wchar_t* methods[] = {L"GetTrueString",     L"GetFalseString",    L"discoverDevice",
                                L"setDeviceSettings", L"getDeviceSettings", L"getDeviceCaps",
                                L"getReadings",       L"clearMeter",        L"closeMeter"};
    // The methods in vtable order, with ascending dispatch ids 1-9 (IDispatch's own have others).
    TYPEATTR* attr = nullptr;
    info->GetTypeAttr(&attr);
    std::map<SHORT, std::pair<MEMBERID, std::string>> byOffset;
    for (UINT i = 0; i < attr->cFuncs; ++i) {
        FUNCDESC* f = nullptr;
        if (FAILED(info->GetFuncDesc(i, &f))) continue;
        BSTR name = nullptr;
        UINT n = 0;
        info->GetNames(f->memid, &name, 1, &n);
        if (f->memid >= 1 && f->memid <= 100) byOffset[f->oVft] = {f->memid, narrow(name)};
        SysFreeString(name);
        info->ReleaseFuncDesc(f);
    }
    info->ReleaseTypeAttr(attr);
    CHECK(byOffset.size() == 9);
    int k = 0;
    for (const auto& [offset, f] : byOffset) {
        CHECK(k < 9 && f.second == narrow(methods[k]) && f.first == k + 1);
        ++k;
    }
    // The record the requests take, and records without a Double, as the binary interface lays them out
    // (widl aligns a Double of a type library record to 8 bytes, see docs/windows.md).
    ITypeLib* lib = nullptr;
    UINT index = 0;
    info->GetContainingTypeLib(&lib, &index);
    for (auto [name, size] : {std::pair{L"METER_REC", 2080u}, std::pair{L"PORT_REC", 40u},
                              std::pair{L"INSULIN_OR_ORAL_MED_NAME_TYPE", 14u}}) {
        ITypeInfo* rec = nullptr;
        MEMBERID id = 0;
        USHORT found = 1;
        lib->FindName(const_cast<LPOLESTR>(name), 0, &rec, &id, &found);
        CHECK(found == 1 && rec);
        if (!rec) continue;
        TYPEATTR* a = nullptr;
        rec->GetTypeAttr(&a);
        CHECK(a->typekind == TKIND_RECORD && a->cbSizeInstance == size);
        rec->ReleaseTypeAttr(a);
        rec->Release();
    }
    // The events: onProgress (dispatch id 1) with a 16-bit integer by reference, onComplete (2).
    ITypeInfo* events = nullptr;
    CHECK(SUCCEEDED(lib->GetTypeInfoOfGuid(DIID___DllWrapper, &events)));
    if (events) {
        LPOLESTR names[] = {const_cast<LPOLESTR>(L"onProgress"), const_cast<LPOLESTR>(L"onComplete")};
        MEMBERID ids[2] = {};
        events->GetIDsOfNames(&names[0], 1, &ids[0]);
        events->GetIDsOfNames(&names[1], 1, &ids[1]);
        CHECK(ids[0] == 1 && ids[1] == 2);
        FUNCDESC* f = nullptr;
        CHECK(SUCCEEDED(events->GetFuncDesc(0, &f)) && f->cParams == 1 && f->lprgelemdescParam[0].tdesc.vt == VT_PTR &&
              f->lprgelemdescParam[0].tdesc.lptdesc->vt == VT_I2);
        if (f) events->ReleaseFuncDesc(f);
        events->Release();
    }
    lib->Release();
    info->Release();
}

void lateBinding(_DllWrapper* wrapper) {
    IDispatch* d = asDispatch(wrapper);
    VARIANT r;
    CHECK(SUCCEEDED(invoke(d, L"GetTrueString", {}, &r)) && V_VT(&r) == VT_BSTR && narrow(V_BSTR(&r)) == "true");
    VariantClear(&r);
    CHECK(SUCCEEDED(invoke(d, L"GetFalseString", {}, &r)) && narrow(V_BSTR(&r)) == "false");
    VariantClear(&r);
    // closeMeter takes the record as a user-defined type, by reference.
    ITypeInfo* info = nullptr;
    wrapper->GetTypeInfo(0, 0, &info);
    ITypeLib* lib = nullptr;
    UINT index = 0;
    info->GetContainingTypeLib(&lib, &index);
    ITypeInfo* recInfo = nullptr;
    MEMBERID id = 0;
    USHORT found = 1;
    lib->FindName(const_cast<LPOLESTR>(L"METER_REC"), 0, &recInfo, &id, &found);
    IRecordInfo* record = nullptr;
    if (recInfo && SUCCEEDED(GetRecordInfoFromTypeInfo(recInfo, &record))) {
        METER_REC rec{};
        VARIANT v;
        VariantInit(&v);
        V_VT(&v) = VT_RECORD | VT_BYREF;
        V_RECORD(&v) = &rec;
        V_RECORDINFO(&v) = record;
        const HRESULT hr = invoke(d, L"closeMeter", {v}, &r);
        if (SUCCEEDED(hr))
            CHECK(V_VT(&r) == VT_I4);  // the transport's answer for a meter never found
        else
            std::printf(
                "Wine cannot pass a user-defined type through IDispatch (0x%08lx); "
                "the records are proven through the vtable\n",
                static_cast<unsigned long>(hr));
        record->Release();
    } else {
        std::printf("Wine gives no IRecordInfo for METER_REC; the records are proven through the vtable\n");
    }
    if (recInfo) recInfo->Release();
    lib->Release();
    info->Release();
    d->Release();
}

// Requests on documents of another component, called by name alone; the same content as on ours.
void otherComponentDocuments(_DllWrapper* wrapper) {
    TreeDocument device, conn, status, datalog, filter;
    VARIANT r;
    invoke(&device, L"InitDocument", {number(1)}, &r);
    invoke(&status, L"InitDocument", {number(7)}, &r);
    invoke(&datalog, L"InitDocument", {number(5)}, &r);
    invoke(&filter, L"InitDocument", {number(6)}, &r);
    connection(conn);
    METER_REC rec{};
    LONG result = 1;
    IDispatch *dev = &device, *con = &conn, *st = &status, *log = &datalog, *fil = &filter;
    CHECK(SUCCEEDED(wrapper->discoverDevice(&rec, &dev, &con, &st, &result)) && result == 0);
    CHECK(device.root && device.root->child("DeviceInfo") && device.root->child("DeviceInfo")->child("SN") &&
          !device.root->child("DeviceInfo")->child("SN")->text.empty());
    VARIANT_BOOL check = VARIANT_FALSE;
    CHECK(SUCCEEDED(wrapper->getReadings(&rec, &dev, &log, &fil, &st, &check, &result)) && result == 0);
    CHECK(check == VARIANT_TRUE);
    Node* records = datalog.root ? datalog.root->child("Records") : nullptr;
    CHECK(records && !records->children.empty());
    CHECK(status.root && status.root->children.empty());
    std::printf("another component's documents: %d calls by name\n", device.calls + datalog.calls + status.calls);
    wrapper->closeMeter(&rec, &result);
}

// An unexpected error: the status document written, onComplete raised, then a failed HRESULT with IErrorInfo.
void errors(_DllWrapper* wrapper) {
    _XMLWrapper* device = create<_XMLWrapper>(CLSID_XMLWrapper, IID__XMLWrapper);
    _XMLWrapper* status = create<_XMLWrapper>(CLSID_XMLWrapper, IID__XMLWrapper);
    device->InitDocument(7);  // no PortInfo
    status->InitDocument(7);
    METER_REC rec{};
    LONG result = 0;
    IDispatch *dev = device, *st = status;
    SetErrorInfo(0, nullptr);
    const HRESULT hr = wrapper->clearMeter(&rec, &dev, &st, &result);
    CHECK(hr == MAKE_HRESULT(SEVERITY_ERROR, FACILITY_CONTROL, 91));
    IErrorInfo* info = nullptr;
    CHECK(GetErrorInfo(0, &info) == S_OK && info);
    if (info) {
        BSTR d = nullptr, s = nullptr;
        info->GetDescription(&d);
        info->GetSource(&s);
        CHECK(narrow(d).rfind("doAction --> ", 0) == 0);
        CHECK(narrow(s) == "Varnel.DllWrapper");
        SysFreeString(d);
        SysFreeString(s);
        info->Release();
    }
    ISupportErrorInfo* supports = nullptr;
    wrapper->QueryInterface(IID_ISupportErrorInfo, reinterpret_cast<void**>(&supports));
    CHECK(supports && supports->InterfaceSupportsErrorInfo(IID__DllWrapper) == S_OK);
    if (supports) supports->Release();
    LONG groups = -1;
    BSTR major = nullptr;
    status->CountElements(SysAllocString(L"ErrCode"), &groups);
    status->SelectElement(SysAllocString(L"ErrCode"));
    status->GetChildValue(SysAllocString(L"Minor"), &major);
    CHECK(groups == 1 && narrow(major) == "-16");
    SysFreeString(major);

    // A null document: reported the same way, never a crash; a null record is E_POINTER.
    IDispatch* none = nullptr;
    CHECK(FAILED(wrapper->clearMeter(&rec, &none, &st, &result)));
    CHECK(FAILED(wrapper->clearMeter(&rec, &dev, &none, &result)));
    CHECK(wrapper->clearMeter(nullptr, &dev, &st, &result) == E_POINTER);
    CHECK(wrapper->discoverDevice(&rec, nullptr, nullptr, nullptr, &result) != S_OK);

    // A wrong VARIANT type through IDispatch.
    IDispatch* d = asDispatch(device);
    VARIANT r;
    CHECK(invoke(d, L"InitDocument", {text(L"not a number")}, &r) == DISP_E_TYPEMISMATCH);
    CHECK(invoke(d, L"GetChildName", {number(5)}, &r) == DISP_E_EXCEPTION);  // the error travels as EXCEPINFO
    d->Release();
    device->Release();
    status->Release();
}

void uniqueChecker() {
    _UniqueChecker* checker = create<_UniqueChecker>(CLSID_UniqueChecker, IID__UniqueChecker);
    BSTR a = SysAllocString(L"abc"), b = SysAllocString(L"ABC");
    VARIANT_BOOL added = 0;
    CHECK(SUCCEEDED(checker->AddValue(&a, &added)) && added == VARIANT_TRUE);
    CHECK(SUCCEEDED(checker->AddValue(&b, &added)) && added == VARIANT_FALSE);
    checker->Clear();
    CHECK(SUCCEEDED(checker->AddValue(&b, &added)) && added == VARIANT_TRUE);
    IDispatch* d = asDispatch(checker);
    VARIANT r, object;
    VariantInit(&object);
    V_VT(&object) = VT_DISPATCH;
    V_DISPATCH(&object) = d;
    CHECK(invoke(d, L"AddValue", {object}, &r) == DISP_E_TYPEMISMATCH);
    d->Release();
    SysFreeString(a);
    SysFreeString(b);
    checker->Release();
}

}  // namespace

int main() {
    if (FAILED(CoInitializeEx(nullptr, COINIT_APARTMENTTHREADED))) return 2;
    // Virtual time in the server's clock slot: the simulated line does not sleep for real.
    varnel::setThreadClock(std::make_shared<varnel::ManualClock>(1000));
    _DllWrapper* wrapper = create<_DllWrapper>(CLSID_DllWrapper, IID__DllWrapper);
    typeLibraryShapes(wrapper);
    lateBinding(wrapper);
    otherComponentDocuments(wrapper);
    errors(wrapper);
    uniqueChecker();
    wrapper->Release();
    varnel::setThreadClock(nullptr);
    CoUninitialize();
    std::printf("%s\n", failures ? "FAILED" : "passed");
    return failures ? 1 : 0;
}
