// The XML document component on pugixml. The header says what
// each operation does; this file says how.
//
// Text that is read. pugixml builds the tree, but only from text that
// xmlcheck/xml_check.h has found to be one well-formed XML 1.0 document in
// UTF-8 within the limits (pugixml itself takes much that is not). No entity
// is ever expanded and nothing outside the text is read: pugixml has no DTD
// processing (parse_doctype is never set, so a DOCTYPE is skipped and dropped),
// the check refuses a DOCTYPE internal subset, and parse_escapes expands only
// the five predefined entities and character references; any other reference
// (possible only after a DOCTYPE naming an external subset) stays in the text
// exactly as written, and is written back out as "&amp;xxe;".
//
// Text that is written. Every text and attribute value a caller gives is
// checked to be UTF-8 made of XML characters, and every name to be an XML
// Name, so XML() is always a document the check accepts.
//
// Limits. The depth of an element and an upper bound of the document's
// written size (see writtenSize) are kept up to date by every operation that
// adds to the document and are computed for every tree that is loaded; an
// operation that would pass a limit is refused before it changes anything.
//
// Indexed access remembers the last child it reached, so reading the children
// in order costs one step each instead of a walk from the first child.
#include "varnel/xml_wrapper.h"

#include <array>
#include <cstddef>
#include <cstdio>
#include <deque>
#include <fstream>
#include <new>
#include <pugixml.hpp>
#include <string_view>
#include <utility>
#include <vector>

#include "contracts/xml_document.h"
#include "contracts/xml_index_steps.h"
#include "contracts/xml_wrapper_append.h"
#include "varnel/component_error.h"
#include "xmlcheck/xml_check.h"

namespace varnel {

namespace detail {
std::uint64_t& xmlIndexSteps() {
    // Per thread: components on other threads count their own steps.
    thread_local std::uint64_t steps = 0;
    return steps;
}
}  // namespace detail

static_assert(kXmlDocumentMaxBytes == detail::kXmlMaxBytes && kXmlDocumentMaxDepth == detail::kXmlMaxDepth);

namespace {

using detail::kXmlMaxBytes;
using detail::kXmlMaxDepth;

constexpr unsigned kParseOptions = pugi::parse_default | pugi::parse_ws_pcdata_single;

[[noreturn]] void raise(std::int32_t number, const std::string& description) {
    throw ComponentError(number, description);
}

// Runs one operation so that it raises nothing but ComponentError: running
// out of memory, or any other library failure, becomes errc::internal.
template <class F>
decltype(auto) shielded(const char* op, F&& body) {
    try {
        return std::forward<F>(body)();
    } catch (const ComponentError&) {
        throw;
    } catch (const std::bad_alloc&) {
        throw ComponentError(errc::internal, std::string(op) + ": out of memory");
    } catch (const std::exception& e) {
        throw ComponentError(errc::internal, std::string(op) + ": " + e.what());
    } catch (...) {
        throw ComponentError(errc::internal, std::string(op) + ": unknown failure");
    }
}

std::string quote(std::string_view s) { return "'" + std::string(s) + "'"; }

bool isElement(const pugi::xml_node& n) { return n.type() == pugi::node_element; }

pugi::xml_node nextElement(pugi::xml_node n) {
    do n = n.next_sibling();
    while (n && !isElement(n));
    return n;
}

pugi::xml_node previousElement(pugi::xml_node n) {
    do n = n.previous_sibling();
    while (n && !isElement(n));
    return n;
}

pugi::xml_node firstElement(pugi::xml_node parent) {
    pugi::xml_node n = parent.first_child();
    return !n || isElement(n) ? n : nextElement(n);
}

// A node that pugixml could not allocate comes back empty.
pugi::xml_node allocated(const char* op, pugi::xml_node n) {
    if (!n) raise(errc::internal, std::string(op) + ": out of memory");
    return n;
}

// Level of an element: the document element is 1.
std::size_t depthOf(pugi::xml_node n) {
    std::size_t d = 0;
    for (; n && isElement(n); n = n.parent()) ++d;
    return d;
}

// --- the written size ---
// An upper bound of the bytes XML() writes for each part of a tree: an
// element's two tags, each on its own indented line; a text or attribute
// value with every character at its escaped length. The same bound is summed
// for a loaded tree and kept up to date while building, so a document within
// the limit writes within it and loads back.

std::size_t elementSize(std::string_view name, std::size_t depth) {
    return 2 * (2 * (depth - 1)) + 2 * name.size() + 8;
}

std::size_t textSize(std::string_view text) {
    std::size_t n = 0;
    for (char c : text) n += c == '&' ? 5 : (c == '<' || c == '>') ? 4 : 1;
    return n;
}

std::size_t cdataSize(std::string_view text) {
    std::size_t n = text.size() + 12;
    for (std::size_t at = text.find("]]>"); at != std::string_view::npos; at = text.find("]]>", at + 1)) n += 12;
    return n;
}

std::size_t attributeSize(std::string_view name, std::string_view value) {
    std::size_t n = name.size() + 4;
    for (char c : value)
        n += c == '"' || c == '\''                               ? 6
             : (c == '&' || c == '\t' || c == '\n' || c == '\r') ? 5
             : (c == '<' || c == '>')                            ? 4
                                                                 : 1;
    return n;
}

std::size_t writtenSize(pugi::xml_node root) {
    std::size_t total = 0;
    if (!root) return total;
    std::vector<std::pair<pugi::xml_node, std::size_t>> todo{{root, 1}};
    while (!todo.empty()) {
        auto [n, depth] = todo.back();
        todo.pop_back();
        total += elementSize(n.name(), depth);
        for (pugi::xml_attribute a : n.attributes()) total += attributeSize(a.name(), a.value());
        for (pugi::xml_node c : n.children()) {
            if (isElement(c))
                todo.emplace_back(c, depth + 1);
            else if (c.type() == pugi::node_cdata)
                total += cdataSize(c.value());
            else if (c.type() == pugi::node_pcdata)
                total += textSize(c.value());
        }
    }
    return total;
}

std::string sizeLimitText() { return std::to_string(kXmlMaxBytes >> 20) + " MiB"; }

// A caller's text as it goes into the document: up to its first zero byte,
// UTF-8 made of XML characters.
// `plain` tells whether it is printable ASCII that is written unescaped, so its
// written size is its length: numbers and the writers' constants are.
std::string_view checkedText(const char* op, const char* what, std::string_view owner, std::string_view text,
                             bool* plain = nullptr) {
    bool unescaped = true;
    std::size_t i = 0;
    for (; i < text.size(); ++i) {
        const auto b = static_cast<unsigned char>(text[i]);
        if (b < 0x20 || b >= 0x7F) break;
        unescaped = unescaped && b != '&' && b != '<' && b != '>' && b != '"' && b != '\'';
    }
    if (plain) *plain = unescaped && i == text.size();
    if (i == text.size()) return text;
    const std::string_view v = text.substr(0, text.find('\0'));
    if (detail::findBadXmlChar(v) != v.size())
        raise(errc::document_failure,
              std::string(op) + ": the " + what + " for " + quote(owner) + " has " + detail::xmlTextProblem(v));
    return v;
}

// Nearly every name is ASCII, and the documents use a few dozen constant ones:
// those are told apart without decoding. Anything else takes the full check.
bool isAsciiXmlName(std::string_view name) {
    auto start = [](unsigned char c) { return (c | 0x20) >= 'a' && (c | 0x20) <= 'z' ? true : c == '_' || c == ':'; };
    if (name.empty() || !start(static_cast<unsigned char>(name[0]))) return false;
    for (std::size_t i = 1; i < name.size(); ++i) {
        const auto c = static_cast<unsigned char>(name[i]);
        if (!start(c) && !(c >= '0' && c <= '9') && c != '-' && c != '.') return false;
    }
    return true;
}

// Constants seen valid, by address, with their length: each is checked once,
// not on every call. npos for a name that is not an XML Name.
std::size_t constantNameSize(const char* name) {
    struct Seen {
        const char* name = nullptr;
        std::size_t size = 0;
    };
    // Per thread, so two components on two threads never share a slot.
    thread_local std::array<Seen, 1024> seen{};
    // Constants lie a few bytes apart: every address bit goes into the slot.
    Seen& slot = seen[(reinterpret_cast<std::uintptr_t>(name) * 0x9E3779B97F4A7C15u) >> 54];
    if (slot.name == name) return slot.size;
    const std::string_view text(name);
    if (!isAsciiXmlName(text) && !detail::isXmlName(text)) return std::string_view::npos;
    slot = Seen{name, text.size()};
    return text.size();
}

// A name as an operation takes it: a caller's text, or a writer's constant
// (a string literal or a static table entry, so its address names it for good).
struct Name {
    std::string_view text;  // zero-terminated
    bool constant = false;
    bool valid = false;  // known for a constant only
    Name(const std::string& s) : text(s) {}
    Name(const char* s, bool isConstant) : constant(isConstant) {
        const std::size_t size = isConstant ? constantNameSize(s) : std::string_view::npos;
        valid = size != std::string_view::npos;
        text = valid ? std::string_view(s, size) : std::string_view(s);
    }
    const char* c_str() const { return text.data(); }
};

void checkName(const char* op, const Name& name, const char* what) {
    if (name.constant ? !name.valid : !isAsciiXmlName(name.text) && !detail::isXmlName(name.text))
        raise(errc::document_failure,
              std::string(op) + ": " + quote(name.text) + " is not a valid XML " + what + " name");
}

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

// Writes into a string, refusing to pass the size limit.
struct StringWriter : pugi::xml_writer {
    std::string out;
    bool overflow = false;
    void write(const void* data, std::size_t size) override {
        if (overflow || out.size() + size > kXmlMaxBytes + 64) {  // 64: room for the declaration
            overflow = true;
            return;
        }
        out.append(static_cast<const char*>(data), size);
    }
};

}  // namespace

struct XMLWrapper::Impl {
    std::shared_ptr<detail::XmlDocument> foreign;  // set: every operation is its
    pugi::xml_document doc;
    pugi::xml_node current;
    pugi::xml_node lastAdded;
    pugi::xml_node lastChild;
    std::string lastLoadError;
    std::size_t size = 0;  // writtenSize of the document, kept up to date

    // The last child reached by index, and the child count, of one parent.
    struct Cursor {
        pugi::xml_node parent;
        std::int32_t index = -1;
        pugi::xml_node node;
        pugi::xml_node countParent;
        std::int32_t count = -1;
    };
    mutable Cursor cursor;

    // Attribute names set on the last added element and on the last added
    // child since they were added, a bit per name hash; all bits while that is
    // not known. An element starts with no attribute, so a name whose bit is
    // clear is new and needs no lookup before it is appended: the writers set
    // several attributes on each element they add.
    static constexpr std::uint64_t kUnknown = ~std::uint64_t(0);
    std::uint64_t addedNames = kUnknown;
    std::uint64_t childNames = kUnknown;
    // The depth of the last added element (0: not known) and of the last
    // parent measured, so appending below either needs no walk up the tree.
    std::size_t addedDepth = 0;
    mutable const void* measured = nullptr;
    mutable std::size_t measuredDepth = 0;

    static std::uint64_t nameBit(std::string_view name) {
        const std::size_t h =
            name.size() * 31 + static_cast<unsigned char>(name.front()) * 7 + static_cast<unsigned char>(name.back());
        return std::uint64_t(1) << (h % 64);
    }
    std::size_t depthOfParent(pugi::xml_node parent) const {
        if (!parent) return 0;
        if (addedDepth != 0 && parent == lastAdded) return addedDepth;
        const void* key = parent.internal_object();
        if (key != measured) {
            measured = key;
            measuredDepth = depthOf(parent);
        }
        return measuredDepth;
    }

    Impl() = default;
    Impl(const Impl& other) : foreign(other.foreign), lastLoadError(other.lastLoadError), size(other.size) {
        doc.reset(other.doc);
        // pugixml copies what it can allocate; a short copy means memory ran out.
        if (writtenSize(root()) != writtenSize(other.root())) throw std::bad_alloc();
        if (other.current) current = nodeAt(doc, pathOf(other.current));
        if (other.lastAdded) lastAdded = nodeAt(doc, pathOf(other.lastAdded));
        if (other.lastChild) lastChild = nodeAt(doc, pathOf(other.lastChild));
    }

    pugi::xml_node root() const { return doc.document_element(); }

    void resetPositions() {
        current = root();
        lastAdded = pugi::xml_node();
        lastChild = pugi::xml_node();
        cursor = Cursor{};
        addedNames = childNames = kUnknown;
        addedDepth = 0;
        measured = nullptr;
    }

    // The current element; raises missing_object for an empty document.
    pugi::xml_node cur(const char* op) const {
        if (!root()) raise(errc::missing_object, std::string(op) + ": the document is empty");
        return current;
    }

    std::int32_t childCount(pugi::xml_node c) const {
        if (cursor.countParent != c) {
            std::int32_t k = 0;
            for (pugi::xml_node n = firstElement(c); n; n = nextElement(n)) ++k;
            detail::xmlIndexSteps() += static_cast<std::uint64_t>(k);
            cursor.countParent = c;
            cursor.count = k;
        }
        return cursor.count;
    }

    // The child at `index`, reached from the nearest of the first child, the
    // last one reached and the last child.
    pugi::xml_node childAt(const char* op, std::int32_t index) const {
        pugi::xml_node c = cur(op);
        const std::int32_t count = childCount(c);
        if (index < 0 || index >= count)
            raise(errc::subscript_out_of_range, std::string(op) + ": index " + std::to_string(index) + " outside the " +
                                                    std::to_string(count) + " children of " + quote(c.name()));
        std::int32_t k = 0;
        pugi::xml_node n = firstElement(c);
        auto distance = [index](std::int32_t from) { return from > index ? from - index : index - from; };
        if (cursor.parent == c && distance(cursor.index) < distance(k)) k = cursor.index, n = cursor.node;
        if (distance(count - 1) < distance(k)) {
            k = count - 1;
            n = c.last_child();
            if (!isElement(n)) n = previousElement(n);
        }
        detail::xmlIndexSteps() += static_cast<std::uint64_t>(distance(k));
        for (; k < index; ++k) n = nextElement(n);
        for (; k > index; --k) n = previousElement(n);
        cursor.parent = c;
        cursor.index = index;
        cursor.node = n;
        return n;
    }

    pugi::xml_node namedChild(pugi::xml_node parent, const std::string& name) const {
        for (pugi::xml_node n = firstElement(parent); n; n = nextElement(n))
            if (name == n.name()) return n;
        return {};
    }

    // Refuses what would take the document past its size.
    void reserve(const char* op, std::size_t more, std::size_t less = 0) const {
        if (size - less + more > kXmlMaxBytes)
            raise(errc::document_failure, std::string(op) + ": the document would be larger than the " +
                                              sizeLimitText() + " a document may have");
    }

    // Appends element `name` with `text` under `parent`; checks everything first.
    std::size_t appendedDepth = 0;  // of the element append made last

    pugi::xml_node append(const char* op, pugi::xml_node parent, const Name& name, std::string_view text) {
        checkName(op, name, "element");
        bool plain = false;
        const std::string_view value = checkedText(op, "text", name.text, text, &plain);
        const std::size_t depth = depthOfParent(parent) + 1;
        if (depth > kXmlMaxDepth)
            raise(errc::document_failure, std::string(op) + ": " + quote(name.text) + " would be nested deeper than " +
                                              std::to_string(kXmlMaxDepth) + " levels");
        const bool blank = !value.empty() && value.find_first_not_of(" \t\r\n") == std::string_view::npos;
        const std::size_t more = elementSize(name.text, depth) + (blank   ? cdataSize(value)
                                                                  : plain ? value.size()
                                                                          : textSize(value));
        reserve(op, more);
        pugi::xml_node n = allocated(op, (parent ? parent : pugi::xml_node(doc)).append_child(name.c_str()));
        if (cursor.index >= 0 || cursor.count >= 0) cursor = Cursor{};  // forgets the children it knew
        // A text of whitespace alone is written as a CDATA section: as plain
        // text it would be taken for indentation when read back next to child
        // elements, and dropped.
        if (!value.empty()) {
            const bool stored =
                blank ? allocated(op, n.append_child(pugi::node_cdata)).set_value(value.data(), value.size())
                      : n.text().set(value.data(), value.size());
            if (!stored) {
                n.parent().remove_child(n);
                raise(errc::internal, std::string(op) + ": out of memory");
            }
        }
        size += more;
        appendedDepth = depth;
        return n;
    }

    // Sets attribute `name` to `value` on `element`; checks everything first.
    // `names`: the mask of the element (addedNames or childNames).
    void setAttribute(const char* op, pugi::xml_node element, std::uint64_t& names, const Name& name,
                      std::string_view value) {
        checkName(op, name, "attribute");
        bool plain = false;
        const std::string_view v = checkedText(op, "value", name.text, value, &plain);
        const std::uint64_t bit = nameBit(name.text);
        pugi::xml_attribute a = (names & bit) == 0 ? pugi::xml_attribute() : element.attribute(name.c_str());
        const std::size_t less = a ? attributeSize(name.text, a.value()) : 0;
        const std::size_t more = plain ? name.text.size() + 4 + v.size() : attributeSize(name.text, v);
        reserve(op, more, less);
        const bool added = !a;
        if (added) a = element.append_attribute(name.c_str());
        if (!a) raise(errc::internal, std::string(op) + ": out of memory");
        names |= bit;
        if (!a.set_value(v.data(), v.size())) {
            if (added) element.remove_attribute(a);
            raise(errc::internal, std::string(op) + ": out of memory");
        }
        size = size - less + more;
    }

    // The four building operations, for XMLWrapper's members and for XmlAppender.

    void addElement(const Name& name, std::string_view text) {
        Impl& d = *this;
        if (!d.root()) {
            d.current = d.lastAdded = d.append("AddElement", {}, name, text);
            d.addedNames = 0;
            d.addedDepth = d.appendedDepth;
        } else {
            d.lastAdded = d.append("AddElement", d.current, name, text);
            d.addedNames = 0;
            d.addedDepth = d.appendedDepth;
        }
    }

    // The element SetAttribute writes on; raises when there is none.
    pugi::xml_node attributeTarget() const {
        // An added element means a document element: only without one is the document looked at.
        if (lastAdded) return lastAdded;
        cur("SetAttribute");
        raise(errc::missing_object, "SetAttribute: no element has been added");
    }

    void setLastAttribute(const Name& name, std::string_view value) {
        setAttribute("SetAttribute", attributeTarget(), addedNames, name, value);
    }

    void addChildElement(const Name& name, std::string_view parentName, std::string_view text) {
        Impl& d = *this;
        if (!d.lastAdded) {
            d.cur("AddChildElement");
            raise(errc::missing_object, "AddChildElement: no element has been added");
        }
        checkName("AddChildElement", name, "element");
        pugi::xml_node parent = d.lastAdded;
        if (!parentName.empty()) {
            // The last direct child of that name, found from the end.
            pugi::xml_node found = d.lastAdded.last_child();
            while (found && !(isElement(found) && parentName == found.name())) found = found.previous_sibling();
            if (!found) {
                // Deeper: the last element of that name below, in document order.
                struct Last : pugi::xml_tree_walker {
                    std::string_view name;
                    pugi::xml_node hit;
                    bool for_each(pugi::xml_node& n) override {
                        if (isElement(n) && name == n.name()) hit = n;
                        return true;
                    }
                } walker;
                walker.name = parentName;
                d.lastAdded.traverse(walker);
                found = walker.hit;
            }
            if (!found)
                raise(errc::missing_object,
                      "AddChildElement: no element " + quote(parentName) + " below " + quote(d.lastAdded.name()));
            parent = found;
        }
        d.lastChild = d.append("AddChildElement", parent, name, text);
        d.childNames = 0;
    }

    void setChildAttribute(const Name& name, std::string_view value) {
        Impl& d = *this;
        if (!d.lastChild) {
            d.cur("SetChildAttribute");
            raise(errc::missing_object, "SetChildAttribute: no child element has been added");
        }
        d.setAttribute("SetChildAttribute", d.lastChild, d.childNames, name, value);
    }

    // Builds a document from `text`; on success replaces ours and returns true.
    bool load(std::string_view text) {
        const detail::XmlCheckResult check = detail::checkXmlDocument(text);
        if (!check.ok()) {
            lastLoadError = check.message();
            return false;
        }
        if (text.substr(0, 3) == "\xEF\xBB\xBF") text.remove_prefix(3);
        pugi::xml_document fresh;
        const pugi::xml_parse_result r =
            fresh.load_buffer(text.data(), text.size(), kParseOptions, pugi::encoding_utf8);
        if (r.status == pugi::status_out_of_memory) throw std::bad_alloc();
        if (!r || !fresh.document_element()) {
            // The check accepts only what pugixml reads; should they ever disagree, refuse.
            lastLoadError =
                std::string(r ? "no document element" : r.description()) + " at offset " + std::to_string(r.offset);
            return false;
        }
        const std::size_t written = writtenSize(fresh.document_element());
        if (written > kXmlMaxBytes) {
            lastLoadError =
                "the document would be larger than the " + sizeLimitText() + " a document may have when written out";
            return false;
        }
#ifdef PUGIXML_HAS_MOVE
        doc = std::move(fresh);
#else
        doc.reset(fresh);
#endif
        size = written;
        resetPositions();
        lastLoadError.clear();
        return true;
    }
};

namespace {
// The other component's document an XMLWrapper hands its operations to; null for a document of ours.
template <class I>
detail::XmlDocument* foreignOf(const std::unique_ptr<I>& impl) {
    return impl ? impl->foreign.get() : nullptr;
}

// Another component's document has only its sixteen operations.
void textOperation(const char* op, const detail::XmlDocument* foreign) {
    if (foreign) raise(errc::document_failure, std::string(op) + ": another component's document has no text here");
}
}  // namespace

XMLWrapper::XMLWrapper() : impl_(shielded("XMLWrapper", [] { return std::make_unique<Impl>(); })) {}
XMLWrapper::~XMLWrapper() = default;
XMLWrapper::XMLWrapper(const XMLWrapper& other)
    : impl_(shielded("XMLWrapper", [&] { return std::make_unique<Impl>(other.view()); })) {}
XMLWrapper& XMLWrapper::operator=(const XMLWrapper& other) {
    if (this != &other) impl_ = shielded("XMLWrapper", [&] { return std::make_unique<Impl>(other.view()); });
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
    shielded("AddElement", [&] {
        if (auto* f = foreignOf(impl_)) return f->AddElement(name, text);
        edit().addElement(name, text);
    });
}

namespace detail {

void XmlAppender::addElement(const char* name, std::string_view text) {
    shielded("AddElement", [&] {
        if (auto* f = foreignOf(doc_.impl_)) return f->AddElement(name, std::string(text));
        doc_.edit().addElement(Name(name, true), text);
    });
}

void XmlAppender::setAttribute(const char* name, std::string_view value) {
    shielded("SetAttribute", [&] {
        if (auto* f = foreignOf(doc_.impl_)) return f->SetAttribute(name, std::string(value));
        doc_.edit().setLastAttribute(Name(name, true), value);
    });
}

void XmlAppender::setAttributes(std::span<const Attribute> attributes) {
    shielded("SetAttribute", [&] {
        if (auto* f = foreignOf(doc_.impl_)) {
            for (const Attribute& a : attributes) f->SetAttribute(a.name, std::string(a.value));
            return;
        }
        XMLWrapper::Impl& d = doc_.edit();
        if (attributes.empty()) return;
        const pugi::xml_node element = d.attributeTarget();
        for (const Attribute& a : attributes)
            d.setAttribute("SetAttribute", element, d.addedNames, Name(a.name, true), a.value);
    });
}

void XmlAppender::addChildElement(const char* name, const char* parentName, std::string_view text) {
    shielded("AddChildElement", [&] {
        if (auto* f = foreignOf(doc_.impl_)) return f->AddChildElement(name, parentName, std::string(text));
        doc_.edit().addChildElement(Name(name, true), parentName, text);
    });
}

void XmlAppender::setChildAttribute(const char* name, std::string_view value) {
    shielded("SetChildAttribute", [&] {
        if (auto* f = foreignOf(doc_.impl_)) return f->SetChildAttribute(name, std::string(value));
        doc_.edit().setChildAttribute(Name(name, true), value);
    });
}

}  // namespace detail

std::int32_t XMLWrapper::GetChildCount() const {
    return shielded("GetChildCount", [&] {
        if (auto* f = foreignOf(impl_)) return f->GetChildCount();
        const Impl& d = view();
        return d.childCount(d.cur("GetChildCount"));
    });
}

void XMLWrapper::SetAttribute(const std::string& name, const std::string& value) {
    shielded("SetAttribute", [&] {
        if (auto* f = foreignOf(impl_)) return f->SetAttribute(name, value);
        edit().setLastAttribute(name, value);
    });
}

void XMLWrapper::AddChildElement(const std::string& name, const std::string& parentName, const std::string& text) {
    shielded("AddChildElement", [&] {
        if (auto* f = foreignOf(impl_)) return f->AddChildElement(name, parentName, text);
        edit().addChildElement(name, parentName, text);
    });
}

void XMLWrapper::MoveToRoot() {
    shielded("MoveToRoot", [&] {
        if (auto* f = foreignOf(impl_)) return f->MoveToRoot();
        Impl& d = edit();
        d.cur("MoveToRoot");
        d.current = d.root();
    });
}

void XMLWrapper::MoveToChild(const std::string& name) {
    shielded("MoveToChild", [&] {
        if (auto* f = foreignOf(impl_)) return f->MoveToChild(name);
        Impl& d = edit();
        pugi::xml_node c = d.cur("MoveToChild");
        pugi::xml_node n = d.namedChild(c, name);
        if (!n) raise(errc::missing_object, "MoveToChild: " + quote(c.name()) + " has no child " + quote(name));
        d.current = n;
    });
}

std::string XMLWrapper::GetChildAttribute(const std::string& child, const std::string& attribute) const {
    return shielded("GetChildAttribute", [&] {
        if (auto* f = foreignOf(impl_)) return f->GetChildAttribute(child, attribute);
        const Impl& d = view();
        return std::string(d.namedChild(d.cur("GetChildAttribute"), child).attribute(attribute.c_str()).value());
    });
}

std::string XMLWrapper::GetChildAttributeAt(std::int32_t index, const std::string& attribute) const {
    return shielded("GetChildAttributeAt", [&] {
        if (auto* f = foreignOf(impl_)) return f->GetChildAttributeAt(index, attribute);
        return std::string(view().childAt("GetChildAttributeAt", index).attribute(attribute.c_str()).value());
    });
}

std::string XMLWrapper::GetChildValue(const std::string& name) const {
    return shielded("GetChildValue", [&] {
        if (auto* f = foreignOf(impl_)) return f->GetChildValue(name);
        const Impl& d = view();
        return std::string(d.namedChild(d.cur("GetChildValue"), name).text().get());
    });
}

std::string XMLWrapper::GetChildValueAt(std::int32_t index) const {
    return shielded("GetChildValueAt", [&] {
        if (auto* f = foreignOf(impl_)) return f->GetChildValueAt(index);
        return std::string(view().childAt("GetChildValueAt", index).text().get());
    });
}

std::string XMLWrapper::GetChildName(std::int32_t index) const {
    return shielded("GetChildName", [&] {
        if (auto* f = foreignOf(impl_)) return f->GetChildName(index);
        return std::string(view().childAt("GetChildName", index).name());
    });
}

void XMLWrapper::InitDocument(std::int32_t kind) {
    struct Skeleton {
        std::int32_t kind;
        const char* root;
        std::vector<const char*> children;
    };
    static const Skeleton skeletons[] = {
        {doc_kind::empty, nullptr, {}},
        {doc_kind::device_info, "Device", {"DeviceInfo", "PortInfo"}},
        {doc_kind::device_settings, "DeviceSettings", {"DeviceInfo", "Settings"}},
        {doc_kind::connection_info, "ConnectionInfo", {"Ports"}},
        {doc_kind::device_caps, "DeviceCaps", {"DeviceInfo", "Settings", "Records"}},
        {doc_kind::datalog, "Datalog", {"DeviceInfo", "TransferDetail", "Records"}},
        {doc_kind::filter, "Filter", {}},
        {doc_kind::status, "Status", {}},
    };
    shielded("InitDocument", [&] {
        if (auto* f = foreignOf(impl_)) return f->InitDocument(kind);
        const Skeleton* s = nullptr;
        for (const Skeleton& k : skeletons)
            if (k.kind == kind) s = &k;
        if (!s) raise(errc::document_failure, "InitDocument: unknown document kind " + std::to_string(kind));
        Impl& d = edit();
        d.doc.reset();
        d.size = 0;
        d.resetPositions();
        if (s->root) {
            pugi::xml_node r = d.append("InitDocument", {}, Name(s->root, true), "");
            for (const char* c : s->children) d.append("InitDocument", r, Name(c, true), "");
        }
        d.resetPositions();
    });
}

std::int32_t XMLWrapper::CountElements(const std::string& name) const {
    return shielded("CountElements", [&] {
        if (auto* f = foreignOf(impl_)) return f->CountElements(name);
        pugi::xml_node c = view().cur("CountElements");
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
    });
}

void XMLWrapper::SetChildAttribute(const std::string& name, const std::string& value) {
    shielded("SetChildAttribute", [&] {
        if (auto* f = foreignOf(impl_)) return f->SetChildAttribute(name, value);
        edit().setChildAttribute(name, value);
    });
}

void XMLWrapper::SelectElement(const std::string& name) {
    shielded("SelectElement", [&] {
        if (auto* f = foreignOf(impl_)) return f->SelectElement(name);
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
            for (pugi::xml_node c = firstElement(n); c; c = nextElement(c)) level.push_back(c);
        }
        raise(errc::missing_object, "SelectElement: no element " + quote(name) + " in the document");
    });
}

std::string XMLWrapper::GetRootName() const {
    return shielded("GetRootName", [&] {
        if (auto* f = foreignOf(impl_)) return f->GetRootName();
        const Impl& d = view();
        d.cur("GetRootName");
        return std::string(d.root().name());
    });
}

bool XMLWrapper::LoadXML(const std::string& text) {
    return shielded("LoadXML", [&] {
        textOperation("LoadXML", foreignOf(impl_));
        return edit().load(text);
    });
}

namespace {
// `bound`: the document's written size bound, so the text grows in one step.
std::string written(const char* op, const pugi::xml_document& doc, unsigned flags, std::size_t bound) {
    StringWriter w;
    w.out.reserve(bound + 64);  // 64: room for the declaration
    doc.save(w, "  ", flags, pugi::encoding_utf8);
    if (w.overflow)
        raise(errc::document_failure,
              std::string(op) + ": the document is larger than the " + sizeLimitText() + " a document may have");
    return std::move(w.out);
}
}  // namespace

std::string XMLWrapper::XML() const {
    return shielded("XML", [&]() -> std::string {
        textOperation("XML", foreignOf(impl_));
        if (!impl_ || !impl_->root()) return {};
        return written("XML", impl_->doc, pugi::format_default | pugi::format_no_declaration, impl_->size);
    });
}

bool XMLWrapper::LoadFile(const std::string& path) {
    return shielded("LoadFile", [&] {
        textOperation("LoadFile", foreignOf(impl_));
        std::FILE* f = std::fopen(path.c_str(), "rb");
        if (!f) raise(errc::document_failure, "LoadFile: cannot open " + quote(path));
        std::string text;
        char buffer[65536];
        std::size_t got;
        bool tooBig = false;
        while ((got = std::fread(buffer, 1, sizeof buffer, f)) > 0) {
            if (text.size() + got > kXmlMaxBytes + 3) {  // 3: a byte-order mark
                tooBig = true;
                break;
            }
            text.append(buffer, got);
        }
        const bool failed = std::ferror(f) != 0;
        std::fclose(f);
        if (failed) raise(errc::document_failure, "LoadFile: cannot read " + quote(path));
        Impl& d = edit();
        if (tooBig) {
            d.lastLoadError = path + " is larger than the " + sizeLimitText() + " a document may have";
            return false;
        }
        // Files are read as UTF-8, the encoding SaveFile writes.
        if (text.substr(0, 2) == "\xFF\xFE" || text.substr(0, 2) == "\xFE\xFF") {
            d.lastLoadError = "only UTF-8 files are read; " + path + " is UTF-16";
            return false;
        }
        return d.load(text);
    });
}

void XMLWrapper::SaveFile(const std::string& path) const {
    shielded("SaveFile", [&] {
        textOperation("SaveFile", foreignOf(impl_));
        const Impl& d = view();
        d.cur("SaveFile");
        const std::string text = written("SaveFile", d.doc, pugi::format_default, d.size);
        std::ofstream out(path, std::ios::binary | std::ios::trunc);
        if (out) out.write(text.data(), static_cast<std::streamsize>(text.size()));
        if (out) out.close();
        if (!out) raise(errc::document_failure, "SaveFile: cannot write " + quote(path));
    });
}

std::string XMLWrapper::LastLoadError() const { return impl_ ? impl_->lastLoadError : std::string(); }

bool XMLWrapper::IsEmpty() const { return !impl_ || (!impl_->foreign && !impl_->root()); }

namespace detail {

struct XmlDocumentAccess {
    static XMLWrapper over(std::shared_ptr<XmlDocument> document) {
        XMLWrapper wrapper;
        wrapper.impl_->foreign = std::move(document);
        return wrapper;
    }
};

XMLWrapper documentOver(std::shared_ptr<XmlDocument> document) { return XmlDocumentAccess::over(std::move(document)); }

}  // namespace detail

}  // namespace varnel
