// The XML document component on pugixml. The header says what
// each operation does; this file says how.
//
// Entities and DTDs. Nothing outside the document text is ever read:
//   - pugixml has no DTD processing at all. Without parse_doctype (we never set
//     it) a DOCTYPE, internal subset included, is skipped as markup and dropped
//     from the tree; its entity declarations are never read, so no entity, internal
//     or external (SYSTEM/PUBLIC), is ever expanded and no file or URL is opened.
//     A billion-laughs document therefore stays small.
//   - parse_escapes expands only the five predefined entities and character
//     references; any other reference (&xxe;) stays in the text exactly as
//     written, and is written back out as "&amp;xxe;".
//   - Our own well-formedness scan (checkWellFormed below) skips the internal
//     subset the same way without interpreting it.
// The tests in tests/contracts/xml_wrapper_test.cpp check all of this.
//
// Well-formedness. pugixml is lenient: it accepts several document elements,
// text outside the document element, duplicate attributes, "<" inside an
// attribute value and a bare "&". LoadXML first runs checkWellFormed, a scan of
// the XML 1.0 syntax (prolog, one element, matching tags, unique attributes,
// names, references, comments, CDATA, PIs), and only then lets pugixml build
// the tree. The scan is strict about structure and lenient about characters
// (texts are kept as bytes, and a character reference to a control character,
// which pugixml writes for one in a text, is accepted) so that everything this
// component writes reads back.
#include "varnel/xml_wrapper.h"

#include <cstddef>
#include <cstdio>
#include <deque>
#include <fstream>
#include <pugixml.hpp>
#include <set>
#include <sstream>
#include <string_view>
#include <utility>
#include <vector>

#include "varnel/component_error.h"

namespace varnel {

namespace {

// ---------------------------------------------------------------------------
// XML 1.0 (fifth edition) names

// Decodes one UTF-8 code point at s[i]; advances i. Returns -1 on a malformed
// sequence (overlong, surrogate, beyond U+10FFFF, truncated).
long decodeUtf8(std::string_view s, std::size_t& i) {
    auto c = static_cast<unsigned char>(s[i]);
    if (c < 0x80) {
        ++i;
        return c;
    }
    int len;
    long cp;
    long min;
    if ((c & 0xE0) == 0xC0) {
        len = 2, cp = c & 0x1F, min = 0x80;
    } else if ((c & 0xF0) == 0xE0) {
        len = 3, cp = c & 0x0F, min = 0x800;
    } else if ((c & 0xF8) == 0xF0) {
        len = 4, cp = c & 0x07, min = 0x10000;
    } else {
        return -1;
    }
    if (i + len > s.size()) return -1;
    for (int k = 1; k < len; ++k) {
        auto cc = static_cast<unsigned char>(s[i + k]);
        if ((cc & 0xC0) != 0x80) return -1;
        cp = (cp << 6) | (cc & 0x3F);
    }
    if (cp < min || cp > 0x10FFFF || (cp >= 0xD800 && cp <= 0xDFFF)) return -1;
    i += len;
    return cp;
}

bool isNameStartChar(long c) {
    return c == ':' || (c >= 'A' && c <= 'Z') || c == '_' || (c >= 'a' && c <= 'z') ||
           (c >= 0xC0 && c <= 0xD6) || (c >= 0xD8 && c <= 0xF6) || (c >= 0xF8 && c <= 0x2FF) ||
           (c >= 0x370 && c <= 0x37D) || (c >= 0x37F && c <= 0x1FFF) ||
           (c >= 0x200C && c <= 0x200D) || (c >= 0x2070 && c <= 0x218F) ||
           (c >= 0x2C00 && c <= 0x2FEF) || (c >= 0x3001 && c <= 0xD7FF) ||
           (c >= 0xF900 && c <= 0xFDCF) || (c >= 0xFDF0 && c <= 0xFFFD) ||
           (c >= 0x10000 && c <= 0xEFFFF);
}

bool isNameChar(long c) {
    return isNameStartChar(c) || c == '-' || c == '.' || (c >= '0' && c <= '9') || c == 0xB7 ||
           (c >= 0x300 && c <= 0x36F) || (c >= 0x203F && c <= 0x2040);
}

bool isXmlName(std::string_view s) {
    if (s.empty()) return false;
    std::size_t i = 0;
    bool first = true;
    while (i < s.size()) {
        long c = decodeUtf8(s, i);
        if (c < 0 || !(first ? isNameStartChar(c) : isNameChar(c))) return false;
        first = false;
    }
    return true;
}

// ---------------------------------------------------------------------------
// Well-formedness scan

// Deeper nesting is refused on load: no document of the component comes near
// it, and indented output of a deeper one grows with the square of the depth.
constexpr std::size_t kMaxDepth = 256;

class WellFormedScan {
public:
    explicit WellFormedScan(std::string_view s) : s_(s) {}

    // "" when well-formed, else the reason with its byte offset.
    std::string run() {
        try {
            document();
            return {};
        } catch (const std::string& why) {
            return why;
        }
    }

private:
    std::string_view s_;
    std::size_t p_ = 0;
    bool haveDoctype_ = false;

    [[noreturn]] void fail(const std::string& what) const {
        throw what + " at offset " + std::to_string(p_);
    }
    bool atEnd() const { return p_ >= s_.size(); }
    bool startsWith(std::string_view t) const { return s_.substr(p_, t.size()) == t; }
    static bool isSpace(char c) { return c == ' ' || c == '\t' || c == '\r' || c == '\n'; }
    bool skipSpace() {
        std::size_t from = p_;
        while (!atEnd() && isSpace(s_[p_])) ++p_;
        return p_ > from;
    }
    void expect(std::string_view t, const char* what) {
        if (!startsWith(t)) fail(std::string("expected ") + what);
        p_ += t.size();
    }
    std::string_view name() {
        std::size_t from = p_;
        while (!atEnd()) {
            char c = s_[p_];
            if (isSpace(c) || c == '/' || c == '>' || c == '=' || c == '<' || c == '?' ||
                c == ';' || c == '"' || c == '\'' || c == '[' || c == ']' || c == '&')
                break;
            ++p_;
        }
        std::string_view n = s_.substr(from, p_ - from);
        if (!isXmlName(n)) {
            p_ = from;
            fail("invalid name");
        }
        return n;
    }

    void document() {
        if (startsWith("\xEF\xBB\xBF")) p_ += 3;
        if (startsWith("<?xml") && p_ + 5 < s_.size() && (isSpace(s_[p_ + 5]) || s_[p_ + 5] == '?'))
            pi(true);
        misc();
        if (startsWith("<!DOCTYPE")) {
            doctype();
            misc();
        }
        if (atEnd() || s_[p_] != '<') fail("no document element");
        element();
        misc();
        if (!atEnd())
            fail(s_[p_] == '<' ? "content after the document element"
                               : "text outside the document element");
    }

    // Whitespace, comments and processing instructions.
    void misc() {
        for (;;) {
            skipSpace();
            if (startsWith("<!--"))
                comment();
            else if (startsWith("<?"))
                pi();
            else
                return;
        }
    }

    void comment() {
        p_ += 4;
        std::size_t end = s_.find("--", p_);
        if (end == std::string_view::npos) fail("unterminated comment");
        p_ = end;
        if (!startsWith("-->")) fail("\"--\" inside a comment");
        p_ += 3;
    }

    // A processing instruction; the XML declaration only where `declaration` is true.
    void pi(bool declaration = false) {
        p_ += 2;
        std::string_view target = name();
        if (target.size() == 3 && (target[0] | 0x20) == 'x' && (target[1] | 0x20) == 'm' &&
            (target[2] | 0x20) == 'l' && !declaration)
            fail("XML declaration not at the start");
        std::size_t end = s_.find("?>", p_);
        if (end == std::string_view::npos) fail("unterminated processing instruction");
        if (end != p_ && !isSpace(s_[p_])) fail("malformed processing instruction");
        p_ = end + 2;
    }

    // The DOCTYPE is checked for its brackets and quotes only; nothing in it is
    // interpreted (see the file comment).
    void doctype() {
        haveDoctype_ = true;
        p_ += 9;
        if (!skipSpace()) fail("malformed DOCTYPE");
        name();
        for (;;) {
            if (atEnd()) fail("unterminated DOCTYPE");
            char c = s_[p_];
            if (c == '>') {
                ++p_;
                return;
            }
            if (c == '"' || c == '\'') {
                quoted();
            } else if (c == '[') {
                ++p_;
                internalSubset();
            } else {
                ++p_;
            }
        }
    }

    void quoted() {
        char q = s_[p_++];
        std::size_t end = s_.find(q, p_);
        if (end == std::string_view::npos) fail("unterminated literal");
        p_ = end + 1;
    }

    void internalSubset() {
        for (;;) {
            if (atEnd()) fail("unterminated DOCTYPE internal subset");
            if (startsWith("<!--")) {
                comment();
                continue;
            }
            if (startsWith("<?")) {
                pi();
                continue;
            }
            char c = s_[p_];
            if (c == ']') {
                ++p_;
                return;
            }
            if (c == '"' || c == '\'')
                quoted();
            else
                ++p_;
        }
    }

    void element() {
        // An explicit stack instead of recursion, so deep nesting cannot exhaust it.
        std::vector<std::string_view> open;
        for (;;) {
            // At a '<' that opens a start tag.
            ++p_;
            std::string_view tag = name();
            std::set<std::string_view> attrs;
            bool empty = false;
            for (;;) {
                bool space = skipSpace();
                if (atEnd()) fail("unterminated start tag");
                if (startsWith("/>")) {
                    p_ += 2;
                    empty = true;
                    break;
                }
                if (s_[p_] == '>') {
                    ++p_;
                    break;
                }
                if (!space) fail("expected whitespace before an attribute");
                std::string_view an = name();
                if (!attrs.insert(an).second) fail("duplicate attribute " + std::string(an));
                skipSpace();
                expect("=", "'=' after an attribute name");
                skipSpace();
                attributeValue();
            }
            if (!empty) open.push_back(tag);
            if (open.size() > kMaxDepth)
                fail("elements nested deeper than " + std::to_string(kMaxDepth) + " levels");
            // Content until the next start tag, or the end of the element.
            for (;;) {
                if (open.empty()) return;
                if (atEnd()) fail("unterminated element " + std::string(open.back()));
                char c = s_[p_];
                if (c == '<') {
                    if (startsWith("</")) {
                        p_ += 2;
                        std::string_view endTag = name();
                        skipSpace();
                        expect(">", "'>' closing an end tag");
                        if (endTag != open.back())
                            fail("end tag " + std::string(endTag) + " does not match " +
                                 std::string(open.back()));
                        open.pop_back();
                    } else if (startsWith("<!--")) {
                        comment();
                    } else if (startsWith("<![CDATA[")) {
                        std::size_t end = s_.find("]]>", p_ + 9);
                        if (end == std::string_view::npos) fail("unterminated CDATA section");
                        p_ = end + 3;
                    } else if (startsWith("<?")) {
                        pi();
                    } else if (startsWith("<!")) {
                        fail("unexpected declaration in content");
                    } else {
                        break;  // a child start tag
                    }
                } else if (c == '&') {
                    reference();
                } else if (startsWith("]]>")) {
                    fail("\"]]>\" in text");
                } else {
                    ++p_;
                }
            }
        }
    }

    void attributeValue() {
        if (atEnd() || (s_[p_] != '"' && s_[p_] != '\'')) fail("expected a quoted attribute value");
        char q = s_[p_++];
        for (;;) {
            if (atEnd()) fail("unterminated attribute value");
            char c = s_[p_];
            if (c == q) {
                ++p_;
                return;
            }
            if (c == '<') fail("'<' in an attribute value");
            if (c == '&')
                reference();
            else
                ++p_;
        }
    }

    void reference() {
        ++p_;
        if (startsWith("#")) {
            ++p_;
            bool hex = startsWith("x");
            if (hex) ++p_;
            unsigned long value = 0;
            std::size_t digits = 0;
            while (!atEnd() && s_[p_] != ';') {
                char c = s_[p_];
                int d;
                if (c >= '0' && c <= '9')
                    d = c - '0';
                else if (hex && c >= 'a' && c <= 'f')
                    d = c - 'a' + 10;
                else if (hex && c >= 'A' && c <= 'F')
                    d = c - 'A' + 10;
                else
                    fail("malformed character reference");
                value = value * (hex ? 16 : 10) + d;
                if (value > 0x10FFFF) fail("character reference out of range");
                ++digits;
                ++p_;
            }
            if (digits == 0 || atEnd()) fail("malformed character reference");
            if (value == 0 || (value >= 0xD800 && value <= 0xDFFF))
                fail("character reference to a non-character");
            ++p_;
            return;
        }
        std::string_view n = name();
        if (atEnd() || s_[p_] != ';') fail("malformed entity reference");
        ++p_;
        // Without a DTD only the predefined entities exist (WFC: Entity Declared).
        // With one, the reference is accepted and kept as written, never expanded.
        if (!haveDoctype_ && n != "lt" && n != "gt" && n != "amp" && n != "apos" && n != "quot")
            fail("undeclared entity " + std::string(n));
    }
};

// ---------------------------------------------------------------------------

constexpr unsigned kParseOptions = pugi::parse_default | pugi::parse_ws_pcdata_single;

[[noreturn]] void raise(std::int32_t number, const std::string& description) {
    throw ComponentError(number, description);
}

std::string quote(const std::string& s) { return "'" + s + "'"; }

bool isElement(const pugi::xml_node& n) { return n.type() == pugi::node_element; }

// Positions of a node as offsets among its parent's children, from the document down.
std::vector<std::size_t> pathOf(pugi::xml_node n) {
    std::vector<std::size_t> path;
    while (n && n.parent()) {
        std::size_t k = 0;
        for (pugi::xml_node s = n.previous_sibling(); s; s = s.previous_sibling()) ++k;
        path.push_back(k);
        n = n.parent();
    }
    return {path.rbegin(), path.rend()};
}

pugi::xml_node nodeAt(const pugi::xml_document& doc, const std::vector<std::size_t>& path) {
    pugi::xml_node n = doc;
    for (std::size_t k : path) {
        n = n.first_child();
        for (std::size_t j = 0; j < k && n; ++j) n = n.next_sibling();
    }
    return n;
}

// Sets the text of a new element. A text of whitespace alone is written as a
// CDATA section: as plain text it would be taken for indentation when read
// back next to child elements, and dropped.
void setText(pugi::xml_node n, const std::string& text) {
    if (text.empty()) return;
    if (text.find_first_not_of(" \t\r\n") == std::string::npos)
        n.append_child(pugi::node_cdata).set_value(text.c_str());
    else
        n.text().set(text.c_str());
}

struct StringWriter : pugi::xml_writer {
    std::string out;
    void write(const void* data, std::size_t size) override {
        out.append(static_cast<const char*>(data), size);
    }
};

}  // namespace

struct XMLWrapper::Impl {
    pugi::xml_document doc;
    pugi::xml_node current;
    pugi::xml_node lastAdded;
    pugi::xml_node lastChild;
    std::string lastLoadError;

    Impl() = default;
    Impl(const Impl& other) : lastLoadError(other.lastLoadError) {
        doc.reset(other.doc);
        if (other.current) current = nodeAt(doc, pathOf(other.current));
        if (other.lastAdded) lastAdded = nodeAt(doc, pathOf(other.lastAdded));
        if (other.lastChild) lastChild = nodeAt(doc, pathOf(other.lastChild));
    }

    pugi::xml_node root() const { return doc.document_element(); }

    void resetPositions() {
        current = root();
        lastAdded = pugi::xml_node();
        lastChild = pugi::xml_node();
    }

    // The current element; raises missing_object for an empty document.
    pugi::xml_node cur(const char* op) const {
        if (!root()) raise(errc::missing_object, std::string(op) + ": the document is empty");
        return current;
    }

    pugi::xml_node childAt(const char* op, std::int32_t index) const {
        pugi::xml_node c = cur(op);
        std::int32_t k = 0;
        if (index >= 0) {
            for (pugi::xml_node n : c.children()) {
                if (!isElement(n)) continue;
                if (k == index) return n;
                ++k;
            }
        } else {
            for (pugi::xml_node n : c.children()) k += isElement(n) ? 1 : 0;
        }
        raise(errc::subscript_out_of_range, std::string(op) + ": index " + std::to_string(index) +
                                                " outside the " + std::to_string(k) +
                                                " children of " + quote(c.name()));
    }

    pugi::xml_node namedChild(pugi::xml_node parent, const std::string& name) const {
        for (pugi::xml_node n : parent.children())
            if (isElement(n) && name == n.name()) return n;
        return {};
    }

    // Builds a document from `text`; on success replaces ours and returns true.
    bool load(std::string_view text) {
        if (text.substr(0, 3) == "\xEF\xBB\xBF") text.remove_prefix(3);
        std::string why = WellFormedScan(text).run();
        pugi::xml_document fresh;
        if (why.empty()) {
            pugi::xml_parse_result r =
                fresh.load_buffer(text.data(), text.size(), kParseOptions, pugi::encoding_utf8);
            if (!r)
                why = std::string(r.description()) + " at offset " + std::to_string(r.offset);
            else if (!fresh.document_element())
                why = "no document element";
        }
        if (!why.empty()) {
            lastLoadError = why;
            return false;
        }
#ifdef PUGIXML_HAS_MOVE
        doc = std::move(fresh);
#else
        doc.reset(fresh);
#endif
        resetPositions();
        lastLoadError.clear();
        return true;
    }
};

static void checkName(const char* op, const std::string& name, const char* what) {
    if (!isXmlName(name))
        raise(errc::document_failure,
              std::string(op) + ": " + quote(name) + " is not a valid XML " + what + " name");
}

XMLWrapper::XMLWrapper() : impl_(std::make_unique<Impl>()) {}
XMLWrapper::~XMLWrapper() = default;
XMLWrapper::XMLWrapper(const XMLWrapper& other) : impl_(std::make_unique<Impl>(other.view())) {}
XMLWrapper& XMLWrapper::operator=(const XMLWrapper& other) {
    if (this != &other) impl_ = std::make_unique<Impl>(other.view());
    return *this;
}
XMLWrapper::XMLWrapper(XMLWrapper&& other) noexcept = default;
XMLWrapper& XMLWrapper::operator=(XMLWrapper&& other) noexcept = default;

// An object moved from has no Impl: reads see an empty document, writes make one.
XMLWrapper::Impl& XMLWrapper::edit() {
    if (!impl_) impl_ = std::make_unique<Impl>();
    return *impl_;
}

const XMLWrapper::Impl& XMLWrapper::view() const {
    static const Impl empty;
    return impl_ ? *impl_ : empty;
}

void XMLWrapper::AddElement(const std::string& name, const std::string& text) {
    checkName("AddElement", name, "element");
    Impl& d = edit();
    pugi::xml_node n;
    if (!d.root()) {
        n = d.doc.append_child(name.c_str());
        d.current = n;
    } else {
        n = d.current.append_child(name.c_str());
    }
    setText(n, text);
    d.lastAdded = n;
}

std::int32_t XMLWrapper::GetChildCount() const {
    pugi::xml_node c = view().cur("GetChildCount");
    std::int32_t k = 0;
    for (pugi::xml_node n : c.children()) k += isElement(n) ? 1 : 0;
    return k;
}

void XMLWrapper::SetAttribute(const std::string& name, const std::string& value) {
    Impl& d = edit();
    d.cur("SetAttribute");
    if (!d.lastAdded) raise(errc::missing_object, "SetAttribute: no element has been added");
    checkName("SetAttribute", name, "attribute");
    pugi::xml_attribute a = d.lastAdded.attribute(name.c_str());
    if (!a) a = d.lastAdded.append_attribute(name.c_str());
    a.set_value(value.c_str());
}

void XMLWrapper::AddChildElement(const std::string& name, const std::string& parentName,
                                 const std::string& text) {
    Impl& d = edit();
    d.cur("AddChildElement");
    if (!d.lastAdded) raise(errc::missing_object, "AddChildElement: no element has been added");
    checkName("AddChildElement", name, "element");
    pugi::xml_node parent = d.lastAdded;
    if (!parentName.empty()) {
        pugi::xml_node found;
        for (pugi::xml_node n : d.lastAdded.children())
            if (isElement(n) && parentName == n.name()) found = n;
        if (!found) {
            // Deeper: the last element of that name below, in document order.
            struct Last : pugi::xml_tree_walker {
                const std::string* name;
                pugi::xml_node hit;
                bool for_each(pugi::xml_node& n) override {
                    if (isElement(n) && *name == n.name()) hit = n;
                    return true;
                }
            } walker;
            walker.name = &parentName;
            d.lastAdded.traverse(walker);
            found = walker.hit;
        }
        if (!found)
            raise(errc::missing_object, "AddChildElement: no element " + quote(parentName) +
                                            " below " + quote(d.lastAdded.name()));
        parent = found;
    }
    pugi::xml_node n = parent.append_child(name.c_str());
    setText(n, text);
    d.lastChild = n;
}

void XMLWrapper::MoveToRoot() {
    Impl& d = edit();
    d.cur("MoveToRoot");
    d.current = d.root();
}

void XMLWrapper::MoveToChild(const std::string& name) {
    Impl& d = edit();
    pugi::xml_node c = d.cur("MoveToChild");
    pugi::xml_node n = d.namedChild(c, name);
    if (!n)
        raise(errc::missing_object,
              "MoveToChild: " + quote(c.name()) + " has no child " + quote(name));
    d.current = n;
}

std::string XMLWrapper::GetChildAttribute(const std::string& child,
                                          const std::string& attribute) const {
    const Impl& d = view();
    pugi::xml_node n = d.namedChild(d.cur("GetChildAttribute"), child);
    return n.attribute(attribute.c_str()).value();
}

std::string XMLWrapper::GetChildAttributeAt(std::int32_t index,
                                            const std::string& attribute) const {
    const Impl& d = view();
    return d.childAt("GetChildAttributeAt", index).attribute(attribute.c_str()).value();
}

std::string XMLWrapper::GetChildValue(const std::string& name) const {
    const Impl& d = view();
    return d.namedChild(d.cur("GetChildValue"), name).text().get();
}

std::string XMLWrapper::GetChildValueAt(std::int32_t index) const {
    const Impl& d = view();
    return d.childAt("GetChildValueAt", index).text().get();
}

std::string XMLWrapper::GetChildName(std::int32_t index) const {
    const Impl& d = view();
    return d.childAt("GetChildName", index).name();
}

void XMLWrapper::InitDocument(std::int32_t kind) {
    struct Skeleton {
        const char* root;
        std::vector<const char*> children;
    };
    Skeleton s;
    switch (kind) {
        case doc_kind::empty:
            s = {nullptr, {}};
            break;
        case doc_kind::device_info:
            s = {"Device", {"DeviceInfo", "PortInfo"}};
            break;
        case doc_kind::device_settings:
            s = {"DeviceSettings", {"DeviceInfo", "Settings"}};
            break;
        case doc_kind::connection_info:
            s = {"ConnectionInfo", {"Ports"}};
            break;
        case doc_kind::device_caps:
            s = {"DeviceCaps", {"DeviceInfo", "Settings", "Records"}};
            break;
        case doc_kind::datalog:
            s = {"Datalog", {"DeviceInfo", "TransferDetail", "Records"}};
            break;
        case doc_kind::filter:
            s = {"Filter", {}};
            break;
        case doc_kind::status:
            s = {"Status", {}};
            break;
        default:
            raise(errc::document_failure,
                  "InitDocument: unknown document kind " + std::to_string(kind));
    }
    Impl& d = edit();
    d.doc.reset();
    if (s.root) {
        pugi::xml_node r = d.doc.append_child(s.root);
        for (const char* c : s.children) r.append_child(c);
    }
    d.resetPositions();
}

std::int32_t XMLWrapper::CountElements(const std::string& name) const {
    const Impl& d = view();
    pugi::xml_node c = d.cur("CountElements");
    struct Counter : pugi::xml_tree_walker {
        const std::string* name;
        std::int32_t count = 0;
        bool for_each(pugi::xml_node& n) override {
            if (isElement(n) && *name == n.name()) ++count;
            return true;
        }
    } walker;
    walker.name = &name;
    c.traverse(walker);  // visits descendants only, not c itself
    return walker.count;
}

void XMLWrapper::SetChildAttribute(const std::string& name, const std::string& value) {
    Impl& d = edit();
    d.cur("SetChildAttribute");
    if (!d.lastChild)
        raise(errc::missing_object, "SetChildAttribute: no child element has been added");
    checkName("SetChildAttribute", name, "attribute");
    pugi::xml_attribute a = d.lastChild.attribute(name.c_str());
    if (!a) a = d.lastChild.append_attribute(name.c_str());
    a.set_value(value.c_str());
}

void XMLWrapper::SelectElement(const std::string& name) {
    Impl& d = edit();
    d.cur("SelectElement");
    std::deque<pugi::xml_node> level{d.root()};
    while (!level.empty()) {
        pugi::xml_node n = level.front();
        level.pop_front();
        if (name == n.name()) {
            d.current = n;
            return;
        }
        for (pugi::xml_node c : n.children())
            if (isElement(c)) level.push_back(c);
    }
    raise(errc::missing_object, "SelectElement: no element " + quote(name) + " in the document");
}

std::string XMLWrapper::GetRootName() const {
    const Impl& d = view();
    d.cur("GetRootName");
    return d.root().name();
}

bool XMLWrapper::LoadXML(const std::string& text) { return edit().load(text); }

std::string XMLWrapper::XML() const {
    if (!impl_ || !impl_->root()) return {};
    StringWriter w;
    impl_->doc.save(w, "  ", pugi::format_default | pugi::format_no_declaration,
                    pugi::encoding_utf8);
    return w.out;
}

bool XMLWrapper::LoadFile(const std::string& path) {
    std::FILE* f = std::fopen(path.c_str(), "rb");
    if (!f) raise(errc::document_failure, "LoadFile: cannot open " + quote(path));
    std::string text;
    char buffer[65536];
    std::size_t got;
    while ((got = std::fread(buffer, 1, sizeof buffer, f)) > 0) text.append(buffer, got);
    const bool failed = std::ferror(f) != 0;
    std::fclose(f);
    if (failed) raise(errc::document_failure, "LoadFile: cannot read " + quote(path));
    Impl& d = edit();
    // Files are read as UTF-8, the encoding SaveFile writes.
    if (text.substr(0, 2) == "\xFF\xFE" || text.substr(0, 2) == "\xFE\xFF") {
        d.lastLoadError = "only UTF-8 files are read; " + path + " is UTF-16";
        return false;
    }
    return d.load(text);
}

void XMLWrapper::SaveFile(const std::string& path) const {
    const Impl& d = view();
    d.cur("SaveFile");
    StringWriter w;
    d.doc.save(w, "  ", pugi::format_default, pugi::encoding_utf8);
    std::ofstream out(path, std::ios::binary | std::ios::trunc);
    if (out) out.write(w.out.data(), static_cast<std::streamsize>(w.out.size()));
    if (out) out.close();
    if (!out) raise(errc::document_failure, "SaveFile: cannot write " + quote(path));
}

std::string XMLWrapper::LastLoadError() const {
    return impl_ ? impl_->lastLoadError : std::string();
}

bool XMLWrapper::IsEmpty() const { return !impl_ || !impl_->root(); }

}  // namespace varnel
