/**
 * @file xml_wrapper.h
 * The XML document component: one document per object, read and written
 * through sixteen operations, that every request of DllWrapper takes its
 * documents in. docs/documents.md shows each document kind.
 */
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>

#include "export.h"

namespace varnel {

namespace detail {
class XmlAppender;
struct XmlDocumentAccess;
}

/**
 * Kinds of XMLWrapper::InitDocument. 2, 4 and 7 are fixed by the interface; the
 * others are this component's, for the documents a client passes in.
 */
namespace doc_kind {
/// No document element at all (the state of a new XMLWrapper).
inline constexpr std::int32_t empty = 0;
/// Device information: `<Device><DeviceInfo/><PortInfo/></Device>` (discoverDevice fills it).
inline constexpr std::int32_t device_info = 1;
/// Device settings: `<DeviceSettings><DeviceInfo/><Settings/></DeviceSettings>`.
inline constexpr std::int32_t device_settings = 2;
/// Connection information: `<ConnectionInfo><Ports/></ConnectionInfo>`.
inline constexpr std::int32_t connection_info = 3;
/// Capabilities: `<DeviceCaps><DeviceInfo/><Settings/><Records/></DeviceCaps>`.
inline constexpr std::int32_t device_caps = 4;
/// Datalog: `<Datalog><DeviceInfo/><TransferDetail/><Records/></Datalog>`.
inline constexpr std::int32_t datalog = 5;
/// Filter (accepted by getReadings and never read): `<Filter/>`.
inline constexpr std::int32_t filter = 6;
/// Status: `<Status/>`; requests append `ErrCode`/`ErrDesc` groups to it.
inline constexpr std::int32_t status = 7;
}  // namespace doc_kind

/**
 * @name Limits of a document
 * The same for text that is loaded and for a document built through the
 * operations (docs/documents.md). LoadXML/LoadFile refuse a text past a limit
 * (false, LastLoadError() says which); an operation that would pass one raises
 * errc::document_failure and changes nothing.
 * @{
 */
/// Elements nest at most this many levels (the document element is level 1).
inline constexpr std::size_t kXmlDocumentMaxDepth = 256;
/**
 * A document is at most this many bytes (64 MiB), both as text given to
 * LoadXML/LoadFile and as written by XML(). While building, each element,
 * attribute and text is counted at the most it can take when written (both
 * tags of an element on their own indented lines, every character at its
 * escaped length), so XML() of any document stays within the limit and loads
 * back.
 */
inline constexpr std::size_t kXmlDocumentMaxBytes = std::size_t(64) << 20;
/// @}

/**
 * One XML document and three positions in it:
 *   - the current element, moved by MoveToRoot, MoveToChild, SelectElement;
 *     AddElement appends under it and the reading operations look at its children;
 *   - the last added element, set by AddElement (SetAttribute writes on it,
 *     AddChildElement appends below it);
 *   - the last added child, set by AddChildElement (SetChildAttribute writes on it).
 *
 * The three positions are independent: AddElement does not forget the last
 * added child, navigation forgets neither. InitDocument, LoadXML, LoadFile and
 * assignment start all three afresh: the current element is then the document
 * element (none for an empty document) and nothing counts as added.
 *
 * Names compare exactly (case matters). "Children" are element children only;
 * text, comments and processing instructions are never counted or indexed.
 * Indexes count children from 0. Where several children share a name, the
 * named operations (MoveToChild, GetChildValue, GetChildAttribute) take the first.
 *
 * **Errors** are varnel::ComponentError, with a description naming the operation
 * and the element, name or index:
 *   - errc::missing_object: the document is empty (no document element) for any
 *     of the sixteen operations except AddElement and InitDocument; navigation
 *     to an element that is not there (MoveToChild, SelectElement); SetAttribute,
 *     AddChildElement or SetChildAttribute with nothing added yet; an
 *     AddChildElement parent name that is not found.
 *   - errc::subscript_out_of_range: an index outside the children of the current
 *     element (negative or >= GetChildCount()).
 *   - errc::document_failure: a name for a new element or attribute that is not
 *     an XML 1.0 Name; a text or attribute value that is not UTF-8 or holds a
 *     character XML 1.0 does not allow (a control character other than tab,
 *     line feed and carriage return, U+FFFE, U+FFFF); an element or a size past
 *     the limits (kXmlDocumentMaxDepth, kXmlDocumentMaxBytes); an InitDocument
 *     kind that varnel::doc_kind does not list; SaveFile, or LoadFile of a file
 *     that cannot be read.
 *   - errc::internal: memory ran out.
 *
 * No operation, XML() included, raises anything but ComponentError.
 * A failing operation changes nothing. Reading the text or an attribute of a
 * named child that is absent, or an attribute that is absent, gives "" (callers
 * rely on that); only a bad index or an empty document raises.
 *
 * **Texts** are UTF-8 made of XML 1.0 characters, so every document the component
 * writes is well-formed. A text or attribute value ends at its first zero byte. A
 * document written through these operations reads back the same through the
 * reading and navigation operations, also after a trip through XML()/LoadXML
 * or SaveFile/LoadFile, with one exception: a carriage return in an element
 * text comes back as a line feed (XML line-end normalisation).
 *
 * **Copies and threads.** XMLWrapper is copyable (a deep copy: the copy holds its
 * own document, with the three positions at the same places) and movable (the
 * moved-from object is an empty document). It is not thread-safe; an object is
 * used by one thread at a time, like everything of the component.
 */
class VARNEL_API XMLWrapper {
public:
    /// An empty document (kind doc_kind::empty).
    XMLWrapper();
    ~XMLWrapper();
    /// A deep copy: its own document, with the three positions at the same places.
    XMLWrapper(const XMLWrapper& other);
    /// Replaces the document by a deep copy of other's.
    XMLWrapper& operator=(const XMLWrapper& other);
    /// Takes other's document; other is left an empty document.
    XMLWrapper(XMLWrapper&& other) noexcept;
    /// Takes other's document in place of this one; other is left an empty document.
    XMLWrapper& operator=(XMLWrapper&& other) noexcept;

    /// @name The sixteen operations, in their interface order
    /// @{

    /// Appends element `name` (with `text`, none when empty) under the current
    /// element, which stays current; the new element becomes the last added
    /// element. On an empty document it creates the document element instead,
    /// which becomes current and the last added element.
    void AddElement(const std::string& name, const std::string& text = "");
    /// The number of element children of the current element.
    std::int32_t GetChildCount() const;
    /// Sets attribute `name` (replacing an attribute of that name) on the last
    /// added element.
    void SetAttribute(const std::string& name, const std::string& value);
    /// Appends element `name` (with `text`) and makes it the last added child.
    /// Where it goes:
    ///   - parentName empty: under the last added element;
    ///   - otherwise under the last child of the last added element called
    ///     parentName (Insulins/Custom/Insulin, Gluc/Comments/Event, Gluc/Strip/Lvl);
    ///     when no direct child has that name, under the last element called
    ///     parentName anywhere below the last added element (in document order),
    ///     so a caller can nest deeper: AddChildElement("Lvl", "Strip") then
    ///     AddChildElement("Note", "Lvl") puts Note under that Lvl;
    ///   - no element of that name below the last added element: missing_object.
    void AddChildElement(const std::string& name, const std::string& parentName = "", const std::string& text = "");
    /// The document element becomes current.
    void MoveToRoot();
    /// The first child called `name` of the current element becomes current.
    void MoveToChild(const std::string& name);
    /// Attribute `attribute` of the first child called `child` of the current
    /// element; "" when that child or that attribute is absent.
    std::string GetChildAttribute(const std::string& child, const std::string& attribute) const;
    /// Attribute `attribute` of the child at `index`; "" when the attribute is absent.
    std::string GetChildAttributeAt(std::int32_t index, const std::string& attribute) const;
    /// Text of the first child called `name` of the current element; "" when absent.
    std::string GetChildValue(const std::string& name) const;
    /// Text of the child at `index`.
    std::string GetChildValueAt(std::int32_t index) const;
    /// Name of the child at `index`.
    std::string GetChildName(std::int32_t index) const;
    /// Starts the document afresh as a document of `kind` (varnel::doc_kind);
    /// the document element becomes current.
    void InitDocument(std::int32_t kind);
    /// The number of elements called `name` anywhere below the current element
    /// (descendants at every depth; the current element itself is not counted).
    std::int32_t CountElements(const std::string& name) const;
    /// Sets attribute `name` on the last added child.
    void SetChildAttribute(const std::string& name, const std::string& value);
    /// Makes current the element called `name` nearest the document element:
    /// searched level by level (breadth-first) from the document element, which
    /// itself counts; within a level the first in document order wins. So with
    /// `<Datalog><TransferDetail><Records/></TransferDetail><Records/></Datalog>`,
    /// SelectElement("Records") finds the top-level Records.
    void SelectElement(const std::string& name);
    /// The name of the document element.
    std::string GetRootName() const;

    /// @}

    /// @name The document as text
    /// @{

    /// Replaces the document with `text` when it is well-formed XML 1.0 in
    /// UTF-8 with one document element, within the limits above, and returns
    /// true; otherwise returns false and leaves the document and its positions
    /// unchanged. LastLoadError() then says what and where ("... at line L,
    /// offset O"): invalid UTF-8, a character or character reference XML does
    /// not allow (`&#0;`, `&#xFFFE;`, a surrogate), a duplicate attribute, an
    /// undeclared entity, malformed markup, a limit passed, a declared encoding
    /// other than UTF-8 (every text is read as UTF-8).
    /// A DOCTYPE is accepted and dropped, and may name an external subset,
    /// which is never read: a reference to an entity it might declare stays in
    /// the text as it is written, e.g. <tt>\&ext;</tt>. A DOCTYPE with an internal
    /// subset ("[...]") is refused, so no entity is ever declared or expanded.
    /// Comments, processing instructions and the XML declaration are dropped.
    bool LoadXML(const std::string& text);
    /// The document as indented XML text without declaration; "" when empty.
    std::string XML() const;
    /// As LoadXML, from a file read as UTF-8 (a UTF-8 byte-order mark is
    /// skipped; a UTF-16 file gives false, and so does a declared encoding other than UTF-8).
    /// Returns false for text that is not well-formed; raises document_failure
    /// when the file cannot be opened or read (a missing file, a directory).
    bool LoadFile(const std::string& path);
    /// Writes the document to `path` as UTF-8 with an XML declaration; raises
    /// missing_object for an empty document and document_failure when the file
    /// cannot be written.
    void SaveFile(const std::string& path) const;
    /// Why the last LoadXML/LoadFile returned false; "" after a successful one.
    std::string LastLoadError() const;
    /// True when the document has no document element.
    bool IsEmpty() const;
    /// @}

private:
    friend class detail::XmlAppender;
    friend struct detail::XmlDocumentAccess;
    struct Impl;
    std::unique_ptr<Impl> impl_;  // null only after a move: an empty document
    Impl& edit();                 // makes an Impl for a moved-from object
    const Impl& view() const;     // a shared empty Impl for a moved-from object
};

}  // namespace varnel
