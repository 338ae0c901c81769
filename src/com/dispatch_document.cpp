#include "com/dispatch_document.h"

#include <array>
#include <initializer_list>
#include <memory>
#include <string>

#include "com/com_support.h"
#include "contracts/xml_document.h"
#include "errors/err_propagator.h"

namespace varnel::detail::com {
namespace {

// The operations in their interface order; their dispatch ids are asked for once per object.
enum Op {
    AddElement,
    GetChildCount,
    SetAttribute,
    AddChildElement,
    MoveToRoot,
    MoveToChild,
    GetChildAttribute,
    GetChildAttributeAt,
    GetChildValue,
    GetChildValueAt,
    GetChildName,
    InitDocument,
    CountElements,
    SetChildAttribute,
    SelectElement,
    GetRootName,
    OpCount
};
constexpr std::array<const wchar_t*, OpCount> kNames = {
    L"AddElement",    L"GetChildCount",     L"SetAttribute",      L"AddChildElement",
    L"MoveToRoot",    L"MoveToChild",       L"GetChildAttribute", L"GetChildAttributeAt",
    L"GetChildValue", L"GetChildValueAt",   L"GetChildName",      L"InitDocument",
    L"CountElements", L"SetChildAttribute", L"SelectElement",     L"GetRootName"};

// One argument as the call passes it: a text or a number.
struct Arg {
    VARIANT v;
    Arg(const std::string& text) {
        VariantInit(&v);
        V_VT(&v) = VT_BSTR;
        V_BSTR(&v) = toBstr(text);
        if (!V_BSTR(&v)) throw std::bad_alloc();
    }
    Arg(std::int32_t number) {
        VariantInit(&v);
        V_VT(&v) = VT_I4;
        V_I4(&v) = number;
    }
    ~Arg() { VariantClear(&v); }
    Arg(const Arg&) = delete;
    Arg& operator=(const Arg&) = delete;
};

class DispatchDocument final : public XmlDocument {
public:
    explicit DispatchDocument(IDispatch* object) : object_(object) {
        if (object_) object_->AddRef();
        ids_.fill(DISPID_UNKNOWN);
    }
    ~DispatchDocument() override {
        if (object_) object_->Release();
    }
    DispatchDocument(const DispatchDocument&) = delete;
    DispatchDocument& operator=(const DispatchDocument&) = delete;

    void AddElement(const std::string& name, const std::string& text) override {
        call(Op::AddElement, {Arg(name), Arg(text)});
    }
    std::int32_t GetChildCount() override { return number(call(Op::GetChildCount, {}), Op::GetChildCount); }
    void SetAttribute(const std::string& name, const std::string& value) override {
        call(Op::SetAttribute, {Arg(name), Arg(value)});
    }
    void AddChildElement(const std::string& name, const std::string& parentName, const std::string& text) override {
        call(Op::AddChildElement, {Arg(name), Arg(parentName), Arg(text)});
    }
    void MoveToRoot() override { call(Op::MoveToRoot, {}); }
    void MoveToChild(const std::string& name) override { call(Op::MoveToChild, {Arg(name)}); }
    std::string GetChildAttribute(const std::string& child, const std::string& attribute) override {
        return text(call(Op::GetChildAttribute, {Arg(child), Arg(attribute)}), Op::GetChildAttribute);
    }
    std::string GetChildAttributeAt(std::int32_t index, const std::string& attribute) override {
        return text(call(Op::GetChildAttributeAt, {Arg(index), Arg(attribute)}), Op::GetChildAttributeAt);
    }
    std::string GetChildValue(const std::string& name) override {
        return text(call(Op::GetChildValue, {Arg(name)}), Op::GetChildValue);
    }
    std::string GetChildValueAt(std::int32_t index) override {
        return text(call(Op::GetChildValueAt, {Arg(index)}), Op::GetChildValueAt);
    }
    std::string GetChildName(std::int32_t index) override {
        return text(call(Op::GetChildName, {Arg(index)}), Op::GetChildName);
    }
    void InitDocument(std::int32_t kind) override { call(Op::InitDocument, {Arg(kind)}); }
    std::int32_t CountElements(const std::string& name) override {
        return number(call(Op::CountElements, {Arg(name)}), Op::CountElements);
    }
    void SetChildAttribute(const std::string& name, const std::string& value) override {
        call(Op::SetChildAttribute, {Arg(name), Arg(value)});
    }
    void SelectElement(const std::string& name) override { call(Op::SelectElement, {Arg(name)}); }
    std::string GetRootName() override { return text(call(Op::GetRootName, {}), Op::GetRootName); }

private:
    // The result of one call, released when it goes.
    struct Result {
        VARIANT v;
        Result() { VariantInit(&v); }
        ~Result() { VariantClear(&v); }
        Result(Result&& other) noexcept : v(other.v) { VariantInit(&other.v); }
        Result(const Result&) = delete;
    };

    static std::string opName(Op op) { return toUtf8(kNames[op], wcslen(kNames[op])); }

    DISPID idOf(Op op) {
        if (ids_[op] == DISPID_UNKNOWN) {
            LPOLESTR name = const_cast<LPOLESTR>(kNames[op]);
            DISPID id = DISPID_UNKNOWN;
            const HRESULT hr = object_->GetIDsOfNames(IID_NULL, &name, 1, LOCALE_USER_DEFAULT, &id);
            if (FAILED(hr)) raise(numberOf(hr), opName(op) + ": the XMLWrapper object has no such operation");
            ids_[op] = id;
        }
        return ids_[op];
    }

    // Calls op with args (in their order); a failure is the object's error number and description.
    Result call(Op op, std::initializer_list<Arg> args) {
        if (!object_) raise(errc::missing_object, opName(op) + ": Object variable not set");
        const DISPID id = idOf(op);
        VARIANT reversed[3];
        UINT n = 0;
        for (auto it = args.end(); it != args.begin();) reversed[n++] = (--it)->v;
        DISPPARAMS params{n ? reversed : nullptr, nullptr, n, 0};
        Result result;
        EXCEPINFO excep{};
        UINT argErr = 0;
        const HRESULT hr =
            object_->Invoke(id, IID_NULL, LOCALE_USER_DEFAULT, DISPATCH_METHOD, &params, &result.v, &excep, &argErr);
        if (FAILED(hr)) fail(op, hr, excep);
        return result;
    }

    [[noreturn]] static void fail(Op op, HRESULT hr, EXCEPINFO& excep) {
        if (hr == DISP_E_EXCEPTION && excep.pfnDeferredFillIn) excep.pfnDeferredFillIn(&excep);
        std::int32_t number = numberOf(hr);
        std::string description = opName(op) + " failed";
        if (hr == DISP_E_EXCEPTION) {
            number = excep.wCode ? excep.wCode : numberOf(excep.scode);
            if (excep.bstrDescription) description = toUtf8(excep.bstrDescription);
        }
        SysFreeString(excep.bstrSource);
        SysFreeString(excep.bstrDescription);
        SysFreeString(excep.bstrHelpFile);
        raise(number, description);
    }

    static std::string text(Result r, Op op) {
        if (V_VT(&r.v) != VT_BSTR && FAILED(VariantChangeType(&r.v, &r.v, 0, VT_BSTR)))
            raise(errc::document_failure, opName(op) + ": the result is not a text");
        return toUtf8(V_BSTR(&r.v));
    }

    static std::int32_t number(Result r, Op op) {
        if (V_VT(&r.v) != VT_I4 && FAILED(VariantChangeType(&r.v, &r.v, 0, VT_I4)))
            raise(errc::document_failure, opName(op) + ": the result is not a number");
        return V_I4(&r.v);
    }

    IDispatch* object_;
    std::array<DISPID, OpCount> ids_;
};

}  // namespace

XMLWrapper dispatchDocument(IDispatch* object) { return documentOver(std::make_shared<DispatchDocument>(object)); }

}  // namespace varnel::detail::com
