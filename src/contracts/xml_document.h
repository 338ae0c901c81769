// A document of another XML document component, reached through its sixteen
// operations alone. An XMLWrapper made by documentOver() hands each of them to
// it, so the requests work on such a document unchanged.
#pragma once

#include <cstdint>
#include <memory>
#include <string>

#include "varnel/xml_wrapper.h"

namespace varnel::detail {

// The operations as XMLWrapper declares them; a failure is a ComponentError.
class XmlDocument {
public:
    virtual ~XmlDocument() = default;
    virtual void AddElement(const std::string& name, const std::string& text) = 0;
    virtual std::int32_t GetChildCount() = 0;
    virtual void SetAttribute(const std::string& name, const std::string& value) = 0;
    virtual void AddChildElement(const std::string& name, const std::string& parentName, const std::string& text) = 0;
    virtual void MoveToRoot() = 0;
    virtual void MoveToChild(const std::string& name) = 0;
    virtual std::string GetChildAttribute(const std::string& child, const std::string& attribute) = 0;
    virtual std::string GetChildAttributeAt(std::int32_t index, const std::string& attribute) = 0;
    virtual std::string GetChildValue(const std::string& name) = 0;
    virtual std::string GetChildValueAt(std::int32_t index) = 0;
    virtual std::string GetChildName(std::int32_t index) = 0;
    virtual void InitDocument(std::int32_t kind) = 0;
    virtual std::int32_t CountElements(const std::string& name) = 0;
    virtual void SetChildAttribute(const std::string& name, const std::string& value) = 0;
    virtual void SelectElement(const std::string& name) = 0;
    virtual std::string GetRootName() = 0;
};

// An XMLWrapper whose sixteen operations are document's. Its copies share
// document; the text operations (XML, LoadXML, LoadFile, SaveFile) raise
// errc::document_failure, and IsEmpty is false.
XMLWrapper documentOver(std::shared_ptr<XmlDocument> document);

}  // namespace varnel::detail
