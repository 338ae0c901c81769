// A COM client of the registered servers, under Wine: the type library's
// shapes, late binding through IDispatch, documents of another XML component
// (a tree of this test's own, reached only by name), errors as IErrorInfo, and
// bad input that must fail cleanly.
#include <windows.h>

#include <cstdio>
#include <functional>
#include <map>
#include <memory>
#include <sstream>
#include <string>
#include <vector>

#include "varnel/clock.h"
#include "varnel/records.h"

#include "com_test.h"
#include "varnel_com.h"
#include "varnel_xml_com.h"

namespace {

int failures = 0;
void expect(bool ok, int line, const char* what) {
    if (!ok) std::fprintf(stderr, "%s:%d: CHECK failed: %s\n", __FILE__, line, what), ++failures;
}
#define CHECK(cond) expect((cond), __LINE__, #cond)

using namespace comtest;

VARIANT var(const std::string& s) {
    VARIANT v{};
    V_VT(&v) = VT_BSTR, V_BSTR(&v) = SysAllocString(std::wstring(s.begin(), s.end()).c_str());
    return v;
}
VARIANT var(LONG n) {
    VARIANT v{};
    V_VT(&v) = VT_I4, V_I4(&v) = n;
    return v;
}

// Calls a method by name through IDispatch; the HRESULT, and in `text` the result's text (its type if not a text).
HRESULT invoke(IDispatch* d, const wchar_t* name, std::vector<VARIANT> args, std::string* text = nullptr) {
    DISPID id = 0;
    LPOLESTR n = const_cast<LPOLESTR>(name);
    HRESULT hr = d->GetIDsOfNames(IID_NULL, &n, 1, LOCALE_USER_DEFAULT, &id);
    if (FAILED(hr)) return hr;
    std::vector<VARIANT> reversed(args.rbegin(), args.rend());
    DISPPARAMS params{reversed.data(), nullptr, static_cast<UINT>(reversed.size()), 0};
    EXCEPINFO excep{};
    UINT argErr = 0;
    VARIANT result{};
    hr = d->Invoke(id, IID_NULL, LOCALE_USER_DEFAULT, DISPATCH_METHOD, &params, &result, &excep, &argErr);
    if (text) *text = V_VT(&result) == VT_BSTR ? narrow(V_BSTR(&result)) : "type " + std::to_string(V_VT(&result));
    VariantClear(&result);
    SysFreeString(excep.bstrSource), SysFreeString(excep.bstrDescription), SysFreeString(excep.bstrHelpFile);
    return hr;
}

// --- another XML component: a plain tree, its sixteen operations by name only ---

struct Node {
    std::string name, text;
    std::map<std::string, std::string> attributes;
    std::vector<std::unique_ptr<Node>> children;
    Node* add(const std::string& n, const std::string& t) {
        children.push_back(std::make_unique<Node>(Node{n, t, {}, {}}));
        return children.back().get();
    }
    Node* child(const std::string& n) const {
        for (auto& c : children)
            if (c->name == n) return c.get();
        return nullptr;
    }
    Node* at(LONG i) const { return i >= 0 && i < LONG(children.size()) ? children[std::size_t(i)].get() : nullptr; }
    LONG count(const std::string& n) const {
        LONG k = 0;
        for (auto& c : children) k += (c->name == n) + c->count(n);
        return k;
    }
};

// One call: its arguments, and how it answers.
struct Call {
    DISPPARAMS* p;
    VARIANT* result;
    EXCEPINFO* excep;
    VARIANT* arg(UINT i) const { return i < p->cArgs ? &p->rgvarg[p->cArgs - 1 - i] : nullptr; }
    std::string str(UINT i) const { return arg(i) && V_VT(arg(i)) == VT_BSTR ? narrow(V_BSTR(arg(i))) : ""; }
    LONG num(UINT i) const { return arg(i) && V_VT(arg(i)) == VT_I4 ? V_I4(arg(i)) : -1; }
    template <class T>
    HRESULT ret(const T& value) const {
        if (result) *result = var(value);
        return S_OK;
    }
    HRESULT fail(const wchar_t* why) const {
        if (excep) excep->wCode = 91, excep->bstrDescription = SysAllocString(why);
        return DISP_E_EXCEPTION;
    }
};

struct TreeDocument final : Dispatch {
    std::unique_ptr<Node> root;
    Node *current = nullptr, *added = nullptr, *addedChild = nullptr;
    int calls = 0;

    Node* child(const Call& c) const { return current ? current->child(c.str(0)) : nullptr; }
    Node* at(const Call& c) const { return current ? current->at(c.num(0)) : nullptr; }
    static std::string attribute(Node* n, const std::string& name) {
        return n && n->attributes.count(name) ? n->attributes.at(name) : "";
    }
    static HRESULT setAttribute(Node* n, const Call& c) {
        if (!n) return c.fail(L"nothing added");
        return n->attributes[c.str(0)] = c.str(1), S_OK;
    }
    // The roots and top elements of the seven kinds of document.
    static constexpr const char* kinds[] = {"Device DeviceInfo PortInfo",
                                            "DeviceSettings DeviceInfo Settings",
                                            "ConnectionInfo Ports",
                                            "DeviceCaps DeviceInfo Settings Records",
                                            "Datalog DeviceInfo TransferDetail Records",
                                            "Filter",
                                            "Status"};
    const std::vector<std::pair<std::string, std::function<HRESULT(const Call&)>>> ops = {
        {"InitDocument",
         [this](const Call& c) {
             if (c.num(0) < 1 || c.num(0) > 7) return c.fail(L"kind");
             std::istringstream names(kinds[c.num(0) - 1]);
             std::string name;
             names >> name;
             root = std::make_unique<Node>(Node{name, "", {}, {}});
             while (names >> name) root->add(name, "");
             return current = root.get(), added = addedChild = nullptr, S_OK;
         }},
        {"AddElement",
         [this](const Call& c) {
             if (root) return added = current->add(c.str(0), c.str(1)), S_OK;
             root = std::make_unique<Node>(Node{c.str(0), c.str(1), {}, {}});
             return current = added = root.get(), S_OK;
         }},
        {"AddChildElement",
         [this](const Call& c) {
             Node* parent = !added || c.str(1).empty() ? added : added->child(c.str(1));
             return parent ? (addedChild = parent->add(c.str(0), c.str(2)), S_OK) : c.fail(L"no such parent");
         }},
        {"SetAttribute", [this](const Call& c) { return setAttribute(added, c); }},
        {"SetChildAttribute", [this](const Call& c) { return setAttribute(addedChild, c); }},
        {"MoveToRoot", [this](const Call&) { return current = root.get(), S_OK; }},
        {"MoveToChild", [this](const Call& c) { return child(c) ? (current = child(c), S_OK) : c.fail(L"no child"); }},
        {"SelectElement",
         [this](const Call& c) {
             std::vector<Node*> level{root.get()};  // breadth first: the first of that name
             for (std::size_t i = 0; i < level.size() && level[i]; ++i) {
                 if (level[i]->name == c.str(0)) return current = level[i], S_OK;
                 for (auto& n : level[i]->children) level.push_back(n.get());
             }
             return c.fail(L"no such element");
         }},
        {"GetRootName", [this](const Call& c) { return c.ret(root ? root->name : ""); }},
        {"GetChildCount", [this](const Call& c) { return c.ret(current ? LONG(current->children.size()) : 0); }},
        {"CountElements", [this](const Call& c) { return c.ret(current ? current->count(c.str(0)) : 0); }},
        {"GetChildValue", [this](const Call& c) { return c.ret(child(c) ? child(c)->text : ""); }},
        {"GetChildAttribute", [this](const Call& c) { return c.ret(attribute(child(c), c.str(1))); }},
        {"GetChildValueAt", [this](const Call& c) { return at(c) ? c.ret(at(c)->text) : c.fail(L"index"); }},
        {"GetChildName", [this](const Call& c) { return at(c) ? c.ret(at(c)->name) : c.fail(L"index"); }},
        {"GetChildAttributeAt",
         [this](const Call& c) { return at(c) ? c.ret(attribute(at(c), c.str(1))) : c.fail(L"index"); }},
    };

    STDMETHODIMP GetIDsOfNames(REFIID, LPOLESTR* names, UINT, LCID, DISPID* id) override {
        for (std::size_t i = 0; i < ops.size(); ++i)
            if (narrow(names[0]) == ops[i].first) return *id = DISPID(100 + i), S_OK;
        return DISP_E_UNKNOWNNAME;
    }
    STDMETHODIMP Invoke(DISPID id, REFIID, LCID, WORD, DISPPARAMS* p, VARIANT* result, EXCEPINFO* excep,
                        UINT*) override {
        ++calls;
        const std::size_t op = std::size_t(id - 100);
        return op < ops.size() ? ops[op].second(Call{p, result, excep}) : DISP_E_MEMBERNOTFOUND;
    }
};

ITypeInfo* find(ITypeLib* lib, const wchar_t* name) {
    ITypeInfo* info = nullptr;
    MEMBERID id = 0;
    USHORT found = 1;
    lib->FindName(const_cast<LPOLESTR>(name), 0, &info, &id, &found);
    return found == 1 ? info : nullptr;
}

// The type library as a client written for the component expects it, and late binding through IDispatch.
void typeLibrary(_DllWrapper* wrapper) {
    ITypeInfo* info = nullptr;
    ITypeLib* lib = nullptr;
    UINT index = 0;
    CHECK(SUCCEEDED(wrapper->GetTypeInfo(0, LOCALE_USER_DEFAULT, &info)) &&
          SUCCEEDED(info->GetContainingTypeLib(&lib, &index)));
    if (!lib) return;
    // The methods in vtable order, with ascending dispatch ids 1-9 (IDispatch's own have others).
    TYPEATTR* attr = nullptr;
    info->GetTypeAttr(&attr);
    std::map<SHORT, std::string> byOffset;
    for (UINT i = 0; i < attr->cFuncs; ++i) {
        FUNCDESC* f = nullptr;
        BSTR name = nullptr;
        UINT n = 0;
        if (FAILED(info->GetFuncDesc(i, &f))) continue;
        info->GetNames(f->memid, &name, 1, &n);
        const std::string method = std::to_string(f->memid) + " " + take(name) + " ";
        if (f->memid >= 1 && f->memid <= 100) byOffset[f->oVft] = method;
        info->ReleaseFuncDesc(f);
    }
    info->ReleaseTypeAttr(attr);
    std::string order;
    for (const auto& [offset, method] : byOffset) order += method;
    CHECK(order ==
          "1 GetTrueString 2 GetFalseString 3 discoverDevice 4 setDeviceSettings 5 getDeviceSettings "
          "6 getDeviceCaps 7 getReadings 8 clearMeter 9 closeMeter ");
    // The record the requests take, and records without a Double, as the binary interface lays them out
    // (widl aligns a Double of a type library record to 8 bytes, see docs/windows.md).
    for (auto [name, size] : {std::pair{L"METER_REC", 2080u}, std::pair{L"PORT_REC", 40u},
                              std::pair{L"INSULIN_OR_ORAL_MED_NAME_TYPE", 14u}}) {
        ITypeInfo* rec = find(lib, name);
        TYPEATTR* a = nullptr;
        CHECK(rec && SUCCEEDED(rec->GetTypeAttr(&a)) && a->typekind == TKIND_RECORD && a->cbSizeInstance == size);
        if (a) rec->ReleaseTypeAttr(a);
        if (rec) rec->Release();
    }
    // The events: onProgress (dispatch id 1) with a 16-bit integer by reference, onComplete (2).
    ITypeInfo* events = nullptr;
    FUNCDESC* f = nullptr;
    LPOLESTR names[] = {const_cast<LPOLESTR>(L"onProgress"), const_cast<LPOLESTR>(L"onComplete")};
    MEMBERID ids[2] = {};
    CHECK(SUCCEEDED(lib->GetTypeInfoOfGuid(DIID___DllWrapper, &events)) &&
          SUCCEEDED(events->GetIDsOfNames(&names[0], 1, &ids[0])) &&
          SUCCEEDED(events->GetIDsOfNames(&names[1], 1, &ids[1])) && ids[0] == 1 && ids[1] == 2 &&
          SUCCEEDED(events->GetFuncDesc(0, &f)) && f->cParams == 1 && f->lprgelemdescParam[0].tdesc.vt == VT_PTR &&
          f->lprgelemdescParam[0].tdesc.lptdesc->vt == VT_I2);
    if (f) events->ReleaseFuncDesc(f);
    if (events) events->Release();

    IDispatch* d = query<IDispatch>(wrapper, IID_IDispatch);
    std::string text;
    CHECK(SUCCEEDED(invoke(d, L"GetTrueString", {}, &text)) && text == "true");
    CHECK(SUCCEEDED(invoke(d, L"GetFalseString", {}, &text)) && text == "false");
    // closeMeter takes the record as a user-defined type, by reference.
    ITypeInfo* recInfo = find(lib, L"METER_REC");
    IRecordInfo* record = nullptr;
    METER_REC rec{};
    VARIANT v{};
    HRESULT hr = recInfo ? GetRecordInfoFromTypeInfo(recInfo, &record) : E_FAIL;
    if (SUCCEEDED(hr)) {
        V_VT(&v) = VT_RECORD | VT_BYREF, V_RECORD(&v) = &rec, V_RECORDINFO(&v) = record;
        hr = invoke(d, L"closeMeter", {v}, &text);
        record->Release();
    }
    if (SUCCEEDED(hr))
        CHECK(text == "type " + std::to_string(VT_I4));  // the transport's answer for a meter never found
    else
        std::printf(
            "Wine cannot pass a user-defined type through IDispatch (0x%08lx); "
            "the records are proven through the vtable\n",
            static_cast<unsigned long>(hr));
    if (recInfo) recInfo->Release();
    d->Release();
    lib->Release();
    info->Release();
}

// Requests on documents of another component, called by name alone; the same content as on ours.
void otherComponentDocuments(_DllWrapper* wrapper) {
    TreeDocument device, conn, status, datalog, filter;
    const std::pair<TreeDocument*, LONG> kinds[] = {
        {&device, 1}, {&conn, 3}, {&datalog, 5}, {&filter, 6}, {&status, 7}};
    for (auto [doc, kind] : kinds) invoke(doc, L"InitDocument", {var(kind)});
    conn.root->child("Ports")->add("COM", "")->add("PortsToSearch", "1");
    METER_REC rec{};
    LONG result = 1;
    IDispatch *dev = &device, *con = &conn, *st = &status, *log = &datalog, *fil = &filter;
    CHECK(SUCCEEDED(wrapper->discoverDevice(&rec, &dev, &con, &st, &result)) && result == 0);
    Node* info = device.root ? device.root->child("DeviceInfo") : nullptr;
    CHECK(info && info->child("SN") && !info->child("SN")->text.empty());
    VARIANT_BOOL check = VARIANT_FALSE;
    CHECK(SUCCEEDED(wrapper->getReadings(&rec, &dev, &log, &fil, &st, &check, &result)) && result == 0);
    CHECK(check == VARIANT_TRUE);
    Node* records = datalog.root ? datalog.root->child("Records") : nullptr;
    CHECK(records && !records->children.empty());
    Node* detail = datalog.root ? datalog.root->child("TransferDetail") : nullptr;
    Node* total = detail && detail->child("Records") ? detail->child("Records")->child("Total") : nullptr;
    CHECK(total && std::atoi(total->text.c_str()) > 0);  // a text written through AddChildElement
    CHECK(status.root && status.root->children.empty());
    std::printf("another component's documents: %d calls by name\n", device.calls + datalog.calls + status.calls);
    wrapper->closeMeter(&rec, &result);
}

// An unexpected error: the status document written, onComplete raised, then a failed HRESULT with IErrorInfo;
// bad input: a reported failure or DISP_E_TYPEMISMATCH, never a crash.
void errors(_DllWrapper* wrapper) {
    _XMLWrapper* device = create<_XMLWrapper>(CLSID_XMLWrapper, IID__XMLWrapper);
    _XMLWrapper* status = create<_XMLWrapper>(CLSID_XMLWrapper, IID__XMLWrapper);
    device->InitDocument(7);  // no PortInfo
    status->InitDocument(7);
    METER_REC rec{};
    LONG result = 0;
    IDispatch *dev = device, *st = status;
    SetErrorInfo(0, nullptr);
    CHECK(wrapper->clearMeter(&rec, &dev, &st, &result) == MAKE_HRESULT(SEVERITY_ERROR, FACILITY_CONTROL, 91));
    IErrorInfo* info = nullptr;
    BSTR description = nullptr, source = nullptr;
    CHECK(GetErrorInfo(0, &info) == S_OK && SUCCEEDED(info->GetDescription(&description)) &&
          SUCCEEDED(info->GetSource(&source)));
    CHECK(take(description).rfind("doAction --> ", 0) == 0 && take(source) == "Varnel.DllWrapper");
    if (info) info->Release();
    ISupportErrorInfo* supports = query<ISupportErrorInfo>(wrapper, IID_ISupportErrorInfo);
    CHECK(supports && supports->InterfaceSupportsErrorInfo(IID__DllWrapper) == S_OK);
    if (supports) supports->Release();
    LONG groups = -1;
    BSTR minor = nullptr;
    status->CountElements(Bstr("ErrCode"), &groups);
    status->SelectElement(Bstr("ErrCode"));
    status->GetChildValue(Bstr("Minor"), &minor);
    CHECK(groups == 1 && take(minor) == "-16");

    // A null document: reported the same way; a null record is E_POINTER.
    IDispatch* none = nullptr;
    CHECK(FAILED(wrapper->clearMeter(&rec, &none, &st, &result)));
    CHECK(FAILED(wrapper->clearMeter(&rec, &dev, &none, &result)));
    CHECK(wrapper->clearMeter(nullptr, &dev, &st, &result) == E_POINTER);
    CHECK(wrapper->discoverDevice(&rec, nullptr, nullptr, nullptr, &result) != S_OK);

    // A wrong VARIANT type through IDispatch, on the documents and on UniqueChecker.
    IDispatch* d = query<IDispatch>(device, IID_IDispatch);
    CHECK(invoke(d, L"InitDocument", {var("not a number")}) == DISP_E_TYPEMISMATCH);
    CHECK(invoke(d, L"GetChildName", {var(5)}) == DISP_E_EXCEPTION);  // the error travels as EXCEPINFO
    _UniqueChecker* checker = create<_UniqueChecker>(CLSID_UniqueChecker, IID__UniqueChecker);
    IDispatch* c = query<IDispatch>(checker, IID_IDispatch);
    VARIANT object{};
    V_VT(&object) = VT_DISPATCH, V_DISPATCH(&object) = c;
    CHECK(invoke(c, L"AddValue", {object}) == DISP_E_TYPEMISMATCH);
    for (IUnknown* p : std::initializer_list<IUnknown*>{c, checker, d, device, status}) p->Release();
}

}  // namespace

int main() {
    if (FAILED(CoInitializeEx(nullptr, COINIT_APARTMENTTHREADED))) return 2;
    // Virtual time in the server's clock slot: the simulated line does not sleep for real.
    varnel::setThreadClock(std::make_shared<varnel::ManualClock>(1000));
    _DllWrapper* wrapper = create<_DllWrapper>(CLSID_DllWrapper, IID__DllWrapper);
    typeLibrary(wrapper);
    otherComponentDocuments(wrapper);
    errors(wrapper);
    wrapper->Release();
    varnel::setThreadClock(nullptr);
    CoUninitialize();
    std::printf("%s\n", failures ? "FAILED" : "passed");
    return failures ? 1 : 0;
}
