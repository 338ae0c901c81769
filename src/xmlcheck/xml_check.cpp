// The XML text check: one scan over the text, no tree built.
#include "xml_check.h"
#include "printable.h"

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <string>
#include <string_view>
#include <vector>

namespace varnel::detail {

namespace {

// Decodes one UTF-8 code point at s[i] and advances i; -1 for a malformed
// sequence (overlong, surrogate, beyond U+10FFFF, truncated), i unchanged.
long decodeUtf8(std::string_view s, std::size_t& i) {
    const auto c = static_cast<unsigned char>(s[i]);
    if (c < 0x80) {
        ++i;
        return c;
    }
    std::size_t len;
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
    for (std::size_t k = 1; k < len; ++k) {
        const auto cc = static_cast<unsigned char>(s[i + k]);
        if ((cc & 0xC0) != 0x80) return -1;
        cp = (cp << 6) | (cc & 0x3F);
    }
    if (cp < min || cp > 0x10FFFF || (cp >= 0xD800 && cp <= 0xDFFF)) return -1;
    i += len;
    return cp;
}

// The characters an XML 1.0 document may hold.
bool isXmlChar(long c) {
    return c == 0x9 || c == 0xA || c == 0xD || (c >= 0x20 && c <= 0xD7FF) || (c >= 0xE000 && c <= 0xFFFD) ||
           (c >= 0x10000 && c <= 0x10FFFF);
}

bool isNameStartChar(long c) {
    return c == ':' || (c >= 'A' && c <= 'Z') || c == '_' || (c >= 'a' && c <= 'z') || (c >= 0xC0 && c <= 0xD6) ||
           (c >= 0xD8 && c <= 0xF6) || (c >= 0xF8 && c <= 0x2FF) || (c >= 0x370 && c <= 0x37D) ||
           (c >= 0x37F && c <= 0x1FFF) || (c >= 0x200C && c <= 0x200D) || (c >= 0x2070 && c <= 0x218F) ||
           (c >= 0x2C00 && c <= 0x2FEF) || (c >= 0x3001 && c <= 0xD7FF) || (c >= 0xF900 && c <= 0xFDCF) ||
           (c >= 0xFDF0 && c <= 0xFFFD) || (c >= 0x10000 && c <= 0xEFFFF);
}

bool isNameChar(long c) {
    return isNameStartChar(c) || c == '-' || c == '.' || (c >= '0' && c <= '9') || c == 0xB7 ||
           (c >= 0x300 && c <= 0x36F) || (c >= 0x203F && c <= 0x2040);
}

// The scan of one text, from its first byte to its end.
class XmlDocumentCheck {
public:
    explicit XmlDocumentCheck(std::string_view s) : s_(s) {}

    XmlCheckResult run() {
        XmlCheckResult r;
        try {
            if (s_.size() > kXmlMaxBytes)
                fail("text of " + std::to_string(s_.size()) + " bytes is larger than the " +
                     std::to_string(kXmlMaxBytes >> 20) + " MiB a document may have");
            std::string what;
            const std::size_t bad = findBadXmlChar(s_, &what);
            if (bad != s_.size()) {
                p_ = bad;
                fail(what);
            }
            document();
        } catch (const Failure& f) {
            r.problem = f.what;
            r.offset = p_;
            r.line = 1 + static_cast<std::size_t>(std::count(s_.begin(), s_.begin() + std::ptrdiff_t(p_), '\n'));
        }
        return r;
    }

private:
    struct Failure {
        std::string what;
    };

    std::string_view s_;
    std::size_t p_ = 0;
    bool externalSubset_ = false;  // undeclared entities may be declared there
    bool standalone_ = false;
    std::vector<std::string_view> attrs_;

    [[noreturn]] static void fail(const std::string& what) { throw Failure{what}; }
    bool atEnd() const { return p_ >= s_.size(); }
    bool startsWith(std::string_view t) const { return s_.substr(p_, t.size()) == t; }
    static bool isSpace(char c) { return c == ' ' || c == '\t' || c == '\r' || c == '\n'; }
    bool skipSpace() {
        const std::size_t from = p_;
        while (!atEnd() && isSpace(s_[p_])) ++p_;
        return p_ > from;
    }
    void expect(std::string_view t, const char* what) {
        if (!startsWith(t)) fail(std::string("expected ") + what);
        p_ += t.size();
    }
    std::string_view name() {
        const std::size_t from = p_;
        while (!atEnd()) {
            const char c = s_[p_];
            if (isSpace(c) || c == '/' || c == '>' || c == '=' || c == '<' || c == '?' || c == ';' || c == '"' ||
                c == '\'' || c == '[' || c == ']' || c == '&' || c == '!' || c == '%' || c == '(' || c == ')')
                break;
            ++p_;
        }
        const std::string_view n = s_.substr(from, p_ - from);
        if (!isXmlName(n)) {
            p_ = from;
            fail("invalid name");
        }
        return n;
    }
    // A quoted literal; returns its content.
    std::string_view literal(const char* what) {
        if (atEnd() || (s_[p_] != '"' && s_[p_] != '\'')) fail(std::string("expected a quoted ") + what);
        const char q = s_[p_++];
        const std::size_t end = s_.find(q, p_);
        if (end == std::string_view::npos) fail(std::string("unterminated ") + what);
        const std::string_view v = s_.substr(p_, end - p_);
        p_ = end + 1;
        return v;
    }
    // Eq: optional blanks, '=', optional blanks.
    void eq() {
        skipSpace();
        expect("=", "'='");
        skipSpace();
    }

    void document() {
        if (startsWith("\xEF\xBB\xBF")) p_ += 3;
        if (startsWith("<?xml") && p_ + 5 < s_.size() && (isSpace(s_[p_ + 5]) || s_[p_ + 5] == '?')) declaration();
        misc();
        if (startsWith("<!DOCTYPE")) {
            doctype();
            misc();
        }
        if (atEnd() || s_[p_] != '<' || startsWith("<!")) fail("no document element");
        element();
        misc();
        if (!atEnd()) fail(s_[p_] == '<' ? "content after the document element" : "text outside the document element");
    }

    // <?xml version="1.x" [encoding="name"] [standalone="yes|no"] ?>
    void declaration() {
        p_ += 5;
        bool space = skipSpace();
        if (!space || !startsWith("version")) fail("XML declaration without a version");
        p_ += 7;
        eq();
        const std::string_view version = literal("version");
        if (version.size() < 2 || version.substr(0, 2) != "1." ||
            version.find_first_not_of("0123456789", 2) != std::string_view::npos)
            fail("unsupported XML version");
        space = skipSpace();
        if (space && startsWith("encoding")) {
            p_ += 8;
            eq();
            const std::string_view enc = literal("encoding name");
            const auto alpha = [](char c) { return (c >= 'A' && c <= 'Z') || (c >= 'a' && c <= 'z'); };
            bool good = !enc.empty() && alpha(enc[0]);
            for (char c : enc) good = good && (alpha(c) || (c >= '0' && c <= '9') || c == '.' || c == '_' || c == '-');
            if (!good) fail("malformed encoding name");
            // Every text is read as UTF-8; a document declaring another encoding would be misread.
            const auto utf8 = [](std::string_view n) {
                std::string folded;
                for (char c : n) folded += (c >= 'a' && c <= 'z') ? char(c - 'a' + 'A') : c;
                return folded == "UTF-8" || folded == "UTF8";
            };
            if (!utf8(enc)) fail("encoding " + std::string(enc) + " is not supported: documents are UTF-8");
            skipSpace();
            space = true;  // strict parsers need no blank between encoding and standalone
        }
        if (space && startsWith("standalone")) {
            p_ += 10;
            eq();
            const std::string_view sd = literal("standalone value");
            if (sd != "yes" && sd != "no") fail("standalone must be yes or no");
            standalone_ = sd == "yes";
            skipSpace();
        }
        expect("?>", "'?>' closing the XML declaration");
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
        const std::size_t end = s_.find("--", p_);
        if (end == std::string_view::npos) fail("unterminated comment");
        p_ = end;
        if (!startsWith("-->")) fail("\"--\" inside a comment");
        p_ += 3;
    }

    void pi() {
        p_ += 2;
        const std::string_view target = name();
        if (target.size() == 3 && (target[0] | 0x20) == 'x' && (target[1] | 0x20) == 'm' && (target[2] | 0x20) == 'l')
            fail("XML declaration not at the start");
        const std::size_t end = s_.find("?>", p_);
        if (end == std::string_view::npos) fail("unterminated processing instruction");
        if (end != p_ && !isSpace(s_[p_])) fail("malformed processing instruction");
        p_ = end + 2;
    }

    // <!DOCTYPE name [SYSTEM "uri" | PUBLIC "id" "uri"]>; the external subset
    // is never read.
    void doctype() {
        p_ += 9;
        skipSpace();  // strict parsers take "<!DOCTYPEname" too
        name();
        bool space = skipSpace();
        if (space && startsWith("SYSTEM")) {
            p_ += 6;
            if (!skipSpace()) fail("malformed DOCTYPE");
            literal("system identifier");
            externalSubset_ = true;
        } else if (space && startsWith("PUBLIC")) {
            p_ += 6;
            if (!skipSpace()) fail("malformed DOCTYPE");
            const std::size_t at = p_ + 1;
            const char q = atEnd() ? '"' : s_[p_];
            const std::string_view id = literal("public identifier");
            for (std::size_t k = 0; k < id.size(); ++k) {
                const char c = id[k];
                const bool ok = (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9') ||
                                (c == '\'' && q == '"') ||
                                std::string_view(" \r\n-()+,./:=?;!*#@$_%").find(c) != std::string_view::npos;
                if (!ok) {
                    p_ = at + k;
                    fail("invalid character in a public identifier");
                }
            }
            if (!skipSpace()) fail("malformed DOCTYPE");
            literal("system identifier");
            externalSubset_ = true;
        }
        skipSpace();
        if (startsWith("[")) fail("a DOCTYPE with an internal subset is not accepted");
        expect(">", "'>' closing the DOCTYPE");
        // Strict parsers read a "[" right after the DOCTYPE as its internal subset.
        if (startsWith("[")) fail("a DOCTYPE with an internal subset is not accepted");
    }

    void element() {
        // An explicit stack instead of recursion, so deep nesting cannot exhaust it.
        std::vector<std::string_view> open;
        for (;;) {
            // At a '<' that opens a start tag.
            if (open.size() + 1 > kXmlMaxDepth)
                fail("elements nested deeper than " + std::to_string(kXmlMaxDepth) + " levels");
            ++p_;
            const std::string_view tag = name();
            attrs_.clear();
            bool empty = false;
            for (;;) {
                const bool space = skipSpace();
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
                const std::size_t at = p_;
                const std::string_view an = name();
                if (attrs_.size() < 16 && std::find(attrs_.begin(), attrs_.end(), an) != attrs_.end()) {
                    p_ = at;
                    fail("duplicate attribute " + std::string(an));
                }
                attrs_.push_back(an);
                eq();
                attributeValue();
            }
            if (attrs_.size() >= 16) {  // many attributes: sorted instead of compared pairwise
                std::sort(attrs_.begin(), attrs_.end());
                const auto dup = std::adjacent_find(attrs_.begin(), attrs_.end());
                if (dup != attrs_.end()) fail("duplicate attribute " + std::string(*dup));
            }
            if (!empty) open.push_back(tag);
            // Content until the next start tag, or the end of the element.
            for (;;) {
                if (open.empty()) return;
                if (atEnd()) fail("unterminated element " + std::string(open.back()));
                const char c = s_[p_];
                if (c == '<') {
                    if (startsWith("</")) {
                        p_ += 2;
                        const std::size_t at = p_;
                        const std::string_view endTag = name();
                        skipSpace();
                        expect(">", "'>' closing an end tag");
                        if (endTag != open.back()) {
                            p_ = at;
                            fail("end tag " + std::string(endTag) + " does not match " + std::string(open.back()));
                        }
                        open.pop_back();
                    } else if (startsWith("<!--")) {
                        comment();
                    } else if (startsWith("<![CDATA[")) {
                        const std::size_t end = s_.find("]]>", p_ + 9);
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
                } else if (c == ']' && startsWith("]]>")) {
                    fail("\"]]>\" in text");
                } else {
                    ++p_;
                }
            }
        }
    }

    void attributeValue() {
        if (atEnd() || (s_[p_] != '"' && s_[p_] != '\'')) fail("expected a quoted attribute value");
        const char q = s_[p_++];
        for (;;) {
            if (atEnd()) fail("unterminated attribute value");
            const char c = s_[p_];
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
        const std::size_t at = p_;
        ++p_;
        if (startsWith("#")) {
            ++p_;
            const bool hex = startsWith("x");
            if (hex) ++p_;
            unsigned long value = 0;
            std::size_t digits = 0;
            while (!atEnd() && s_[p_] != ';') {
                const char c = s_[p_];
                int d;
                if (c >= '0' && c <= '9')
                    d = c - '0';
                else if (hex && c >= 'a' && c <= 'f')
                    d = c - 'a' + 10;
                else if (hex && c >= 'A' && c <= 'F')
                    d = c - 'A' + 10;
                else
                    fail("malformed character reference");
                value = value * (hex ? 16 : 10) + static_cast<unsigned long>(d);
                if (value > 0x10FFFF) {
                    p_ = at;
                    fail("character reference beyond U+10FFFF");
                }
                ++digits;
                ++p_;
            }
            if (digits == 0 || atEnd()) fail("malformed character reference");
            if (!isXmlChar(static_cast<long>(value))) {
                p_ = at;
                char buf[64];
                std::snprintf(buf, sizeof buf, "character reference to U+%04lX, which XML does not allow", value);
                fail(buf);
            }
            ++p_;
            return;
        }
        const std::string_view n = name();
        if (atEnd() || s_[p_] != ';') fail("malformed entity reference");
        ++p_;
        // Only the predefined entities exist, unless an external subset (never
        // read) might declare others; such a reference stays as it is written.
        if ((!externalSubset_ || standalone_) && n != "lt" && n != "gt" && n != "amp" && n != "apos" && n != "quot") {
            p_ = at;
            fail("undeclared entity " + std::string(n));
        }
    }
};

}  // namespace

bool isXmlName(std::string_view s) {
    if (s.empty()) return false;
    std::size_t i = 0;
    bool first = true;
    while (i < s.size()) {
        const long c = decodeUtf8(s, i);
        if (c < 0 || !(first ? isNameStartChar(c) : isNameChar(c))) return false;
        first = false;
    }
    return true;
}

std::size_t findBadXmlChar(std::string_view s, std::string* what) {
    std::size_t i = 0;
    while (i < s.size()) {
        const auto b = static_cast<unsigned char>(s[i]);
        if (b >= 0x20 && b < 0x80) {  // the common case
            ++i;
            continue;
        }
        const std::size_t at = i;
        const long c = decodeUtf8(s, i);
        if (c < 0 || !isXmlChar(c)) {
            if (what) {
                char buf[64];
                if (c < 0)
                    std::snprintf(buf, sizeof buf, "invalid UTF-8 (byte 0x%02X)", b);
                else
                    std::snprintf(buf, sizeof buf, "character U+%04lX, which XML does not allow", c);
                *what = buf;
            }
            return at;
        }
    }
    return s.size();
}

std::string xmlTextProblem(std::string_view s) {
    std::string what;
    const std::size_t at = findBadXmlChar(s, &what);
    return at == s.size() ? std::string() : what + " at byte " + std::to_string(at);
}

XmlCheckResult checkXmlDocument(std::string_view text) { return XmlDocumentCheck(text).run(); }

std::string printableText(std::string_view s) {
    static constexpr char kHex[] = "0123456789abcdef";
    std::string out;
    out.reserve(s.size());
    auto escape = [&](std::size_t from, std::size_t to) {
        for (std::size_t k = from; k < to; ++k) {
            const auto b = static_cast<unsigned char>(s[k]);
            out += {'\\', 'x', kHex[b >> 4], kHex[b & 15]};
        }
    };
    for (std::size_t i = 0; i < s.size();) {
        const std::size_t at = i;
        const long c = decodeUtf8(s, i);
        if (c < 0)
            escape(at, i = at + 1);
        else if (c < 0x20 || (c >= 0x7f && c < 0xa0))
            escape(at, i);
        else
            out.append(s.substr(at, i - at));
    }
    return out;
}

}  // namespace varnel::detail
