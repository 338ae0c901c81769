// What an XML document text must be before a parser builds a tree from it:
// well-formed XML 1.0 in UTF-8, within the document limits. A small static
// library of its own, so that the component and the simulator's profile
// reader share one checker without either linking the other.
//
// pugixml, which builds the trees, is lenient: it takes invalid UTF-8, control
// characters, references such as "&#0;", duplicate attributes (the first
// wins), several document elements, text after the document element and "<"
// in attribute values. This check refuses all of that, so a text is a document
// exactly when a strict parser would say so. Nothing in it is interpreted: a
// DOCTYPE may name an external subset, which is never read, and an internal
// subset (where entities would be declared) is refused, so no entity other
// than the five predefined ones ever has a meaning.
#pragma once

#include <cstddef>
#include <string>
#include <string_view>

namespace varnel::detail {

// Elements nest at most this deep (the document element is level 1).
inline constexpr std::size_t kXmlMaxDepth = 256;
// A document text, and a document as written out, is at most this many bytes.
inline constexpr std::size_t kXmlMaxBytes = std::size_t(64) << 20;

// True when s is an XML 1.0 Name (fifth edition).
bool isXmlName(std::string_view s);

// Where the first byte of s that is not valid UTF-8 or not an XML character
// starts, or s.size() when there is none; `what` then says which.
std::size_t findBadXmlChar(std::string_view s, std::string* what = nullptr);

// The first reason a text cannot be an element text or attribute value of a
// document, with its byte position; "" when it can.
std::string xmlTextProblem(std::string_view s);

// The outcome of checkXmlDocument: empty `problem` when the text is a document.
struct XmlCheckResult {
    std::string problem;
    std::size_t offset = 0;  // byte offset from the start of the text
    std::size_t line = 0;    // 1-based
    bool ok() const { return problem.empty(); }
    // "problem at line L, offset O".
    std::string message() const {
        return problem + " at line " + std::to_string(line) + ", offset " + std::to_string(offset);
    }
};

// Checks that `text` (UTF-8, with or without a byte-order mark) is one
// well-formed XML 1.0 document within the limits above.
XmlCheckResult checkXmlDocument(std::string_view text);

}  // namespace varnel::detail
