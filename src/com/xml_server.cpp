// varnel_xml.dll as an in-process COM server: Varnel.XMLWrapper, the
// component's pugixml document, for clients that pass documents to
// Varnel.DllWrapper or use them on their own.
#include "com/com_support.h"
#include "varnel/xml_wrapper.h"
#include "varnel_xml_com.h"

namespace varnel::detail::com {
namespace {

constexpr const wchar_t* kProgId = L"Varnel.XMLWrapper";

class XmlObject final : public DualObject<_XMLWrapper, &IID__XMLWrapper> {
public:
    STDMETHODIMP AddElement(BSTR name, BSTR text) override {
        return run([&] { doc_.AddElement(toUtf8(name), toUtf8(text)); });
    }
    STDMETHODIMP GetChildCount(LONG* count) override {
        return out(count, [&] { return doc_.GetChildCount(); });
    }
    STDMETHODIMP SetAttribute(BSTR name, BSTR value) override {
        return run([&] { doc_.SetAttribute(toUtf8(name), toUtf8(value)); });
    }
    STDMETHODIMP AddChildElement(BSTR name, BSTR parentName, BSTR text) override {
        return run([&] { doc_.AddChildElement(toUtf8(name), toUtf8(parentName), toUtf8(text)); });
    }
    STDMETHODIMP MoveToRoot() override {
        return run([&] { doc_.MoveToRoot(); });
    }
    STDMETHODIMP MoveToChild(BSTR name) override {
        return run([&] { doc_.MoveToChild(toUtf8(name)); });
    }
    STDMETHODIMP GetChildAttribute(BSTR child, BSTR attribute, BSTR* value) override {
        return text(value, [&] { return doc_.GetChildAttribute(toUtf8(child), toUtf8(attribute)); });
    }
    STDMETHODIMP GetChildAttributeAt(LONG index, BSTR attribute, BSTR* value) override {
        return text(value, [&] { return doc_.GetChildAttributeAt(index, toUtf8(attribute)); });
    }
    STDMETHODIMP GetChildValue(BSTR name, BSTR* value) override {
        return text(value, [&] { return doc_.GetChildValue(toUtf8(name)); });
    }
    STDMETHODIMP GetChildValueAt(LONG index, BSTR* value) override {
        return text(value, [&] { return doc_.GetChildValueAt(index); });
    }
    STDMETHODIMP GetChildName(LONG index, BSTR* name) override {
        return text(name, [&] { return doc_.GetChildName(index); });
    }
    STDMETHODIMP InitDocument(LONG kind) override {
        return run([&] { doc_.InitDocument(kind); });
    }
    STDMETHODIMP CountElements(BSTR name, LONG* count) override {
        return out(count, [&] { return doc_.CountElements(toUtf8(name)); });
    }
    STDMETHODIMP SetChildAttribute(BSTR name, BSTR value) override {
        return run([&] { doc_.SetChildAttribute(toUtf8(name), toUtf8(value)); });
    }
    STDMETHODIMP SelectElement(BSTR name) override {
        return run([&] { doc_.SelectElement(toUtf8(name)); });
    }
    STDMETHODIMP GetRootName(BSTR* name) override {
        return text(name, [&] { return doc_.GetRootName(); });
    }
    STDMETHODIMP LoadXML(BSTR xml, VARIANT_BOOL* loaded) override {
        return out(loaded, [&] { return doc_.LoadXML(toUtf8(xml)) ? VARIANT_TRUE : VARIANT_FALSE; });
    }
    STDMETHODIMP get_XML(BSTR* xml) override {
        return text(xml, [&] { return doc_.XML(); });
    }
    STDMETHODIMP LoadFile(BSTR path, VARIANT_BOOL* loaded) override {
        return out(loaded, [&] { return doc_.LoadFile(toUtf8(path)) ? VARIANT_TRUE : VARIANT_FALSE; });
    }
    STDMETHODIMP SaveFile(BSTR path) override {
        return run([&] { doc_.SaveFile(toUtf8(path)); });
    }
    STDMETHODIMP get_LastLoadError(BSTR* text) override {
        return this->text(text, [&] { return doc_.LastLoadError(); });
    }

private:
    template <class F>
    static HRESULT run(F&& body) {
        return guardedCall(kProgId, IID__XMLWrapper, [&] {
            body();
            return S_OK;
        });
    }
    template <class T, class F>
    static HRESULT out(T* result, F&& body) {
        if (!result) return E_POINTER;
        return run([&] { *result = body(); });
    }
    template <class F>
    static HRESULT text(BSTR* result, F&& body) {
        if (!result) return E_POINTER;
        *result = nullptr;
        return run([&] {
            *result = toBstr(body());
            if (!*result) throw std::bad_alloc();
        });
    }

    XMLWrapper doc_;
};

constexpr ClassEntry kClasses[] = {{&CLSID_XMLWrapper, L"XMLWrapper", kProgId, factoryFor<XmlObject>}};

}  // namespace

const Server& thisServer() {
    static const Server server{kClasses, &LIBID_VarnelXML};
    return server;
}

}  // namespace varnel::detail::com
