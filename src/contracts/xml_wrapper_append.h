// The component's own writers' way to build an XMLWrapper document: the four
// building operations with the same checks, errors and results as AddElement,
// SetAttribute, AddChildElement and SetChildAttribute, for names that are
// constants and values that need no std::string. A datalog writes a dozen of
// them for each of its thousands of entries.
#pragma once

#include <span>
#include <string_view>

#include "varnel/xml_wrapper.h"

namespace varnel::detail {

// Every name given here must be a constant: a string literal or an entry of a
// static table. Each is checked once, by its address.
class XmlAppender {
public:
    explicit XmlAppender(XMLWrapper& doc) : doc_(doc) {}

    void addElement(const char* name, std::string_view text = {});
    void setAttribute(const char* name, std::string_view value);
    // Several attributes on the last added element, as setAttribute one after another.
    struct Attribute {
        const char* name;
        std::string_view value;
    };
    void setAttributes(std::span<const Attribute> attributes);
    void addChildElement(const char* name, const char* parentName = "", std::string_view text = {});
    void setChildAttribute(const char* name, std::string_view value);

    XMLWrapper& document() { return doc_; }

private:
    XMLWrapper& doc_;
};

}  // namespace varnel::detail
