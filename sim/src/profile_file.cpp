// Meter profiles as XML files (the format is described in docs/simulator.md).
// Reading is strict: text that is not a well-formed XML document in UTF-8, an
// unknown element or attribute, a malformed number or a value out of range is
// an error naming the file and the line.
#include <pugixml.hpp>

#include <algorithm>
#include <cctype>
#include <charconv>
#include <cstdio>
#include <fstream>
#include <limits>
#include <optional>
#include <set>
#include <sstream>

#include "record_fields.h"
#include "simulator.h"
#include "xml_check.h"

namespace varnel::sim {
namespace {

using detail::Field;
using detail::Width;

struct Source {
    std::string path;
    std::string text;

    [[noreturn]] void fail(pugi::xml_node node, const std::string& problem) const {
        const std::ptrdiff_t offset = node ? node.offset_debug() : -1;
        std::string where = path;
        if (offset >= 0) where += ":" + std::to_string(1 + std::count(text.begin(), text.begin() + offset, '\n'));
        throw std::runtime_error(where + ": " + problem);
    }
};

template <class T>
bool parseNumber(std::string_view s, T& v) {
    if (!s.empty() && s.front() == '+') s.remove_prefix(1);
    const auto [end, ec] = std::from_chars(s.data(), s.data() + s.size(), v);
    return ec == std::errc() && end == s.data() + s.size();
}

std::vector<std::string_view> words(std::string_view s) {
    std::vector<std::string_view> out;
    std::size_t i = 0;
    while (i < s.size()) {
        while (i < s.size() && std::isspace(static_cast<unsigned char>(s[i]))) ++i;
        const std::size_t start = i;
        while (i < s.size() && !std::isspace(static_cast<unsigned char>(s[i]))) ++i;
        if (i > start) out.push_back(s.substr(start, i - start));
    }
    return out;
}

// One element being read: every attribute must be taken, none twice.
class Element {
public:
    Element(const Source& src, pugi::xml_node node) : src_(src), node_(node) {}

    [[noreturn]] void fail(const std::string& problem) const { src_.fail(node_, problem); }

    const char* raw(const char* name) {
        used_.insert(name);
        pugi::xml_attribute a = node_.attribute(name);
        return a ? a.value() : nullptr;
    }

    template <class T>
    T number(const char* name, std::optional<T> fallback = T{}, long lo = std::numeric_limits<T>::min(),
             long hi = std::numeric_limits<T>::max()) {
        const char* text = raw(name);
        if (!text) {
            if (!fallback) fail(std::string("attribute ") + name + " is missing");
            return *fallback;
        }
        long v = 0;
        if (!parseNumber(std::string_view(text), v))
            fail(std::string(name) + " \"" + text + "\" is not a whole number");
        if (v < lo || v > hi)
            fail(std::string(name) + " " + text + " is outside " + std::to_string(lo) + ".." + std::to_string(hi));
        return static_cast<T>(v);
    }

    double real(const char* name) {
        const char* text = raw(name);
        if (!text) return 0.0;
        double v = 0;
        if (!parseNumber(std::string_view(text), v)) fail(std::string(name) + " \"" + text + "\" is not a number");
        return v;
    }

    std::string text(const char* name, bool required = false) {
        const char* t = raw(name);
        if (!t && required) fail(std::string("attribute ") + name + " is missing");
        return t ? t : "";
    }

    bool flag(const char* name, bool fallback) {
        const char* t = raw(name);
        if (!t) return fallback;
        const std::string s = t;
        if (s == "true" || s == "1") return true;
        if (s == "false" || s == "0") return false;
        fail(std::string(name) + " \"" + s + "\" is neither true nor false");
    }

    std::int32_t time(const char* name) {
        const std::string s = text(name, true);
        int y, mo, d, h, mi, se, n = -1;
        if (std::sscanf(s.c_str(), "%4d-%2d-%2d %2d:%2d:%2d%n", &y, &mo, &d, &h, &mi, &se, &n) != 6 ||
            n != int(s.size()))
            fail(std::string(name) + " \"" + s + "\" is not a time yyyy-mm-dd hh:mm:ss");
        const std::int32_t v = secondsOf(y, mo, d, h, mi, se);
        if (v < 0) fail(std::string(name) + " \"" + s + "\" is not a time from 1970 to 2037");
        return v;
    }

    std::vector<std::int16_t> list(const char* name, std::size_t count = 0) {
        std::vector<std::int16_t> out;
        const std::string all = text(name);
        for (std::string_view w : words(all)) {
            std::int16_t v = 0;
            if (!parseNumber(w, v)) fail(std::string(name) + ": \"" + std::string(w) + "\" is not a whole number");
            out.push_back(v);
        }
        if (count && !out.empty() && out.size() != count)
            fail(std::string(name) + " needs " + std::to_string(count) + " numbers");
        out.resize(std::max(out.size(), count));
        return out;
    }

    // Every attribute taken; no text where none belongs.
    void done(bool textAllowed = false) {
        for (pugi::xml_attribute a : node_.attributes())
            if (!used_.count(a.name()))
                fail(std::string("unknown attribute ") + a.name() + " on <" + node_.name() + ">");
        if (!textAllowed)
            for (pugi::xml_node c : node_.children())
                if (c.type() == pugi::node_pcdata || c.type() == pugi::node_cdata)
                    fail(std::string("<") + node_.name() + "> holds no text");
    }

private:
    const Source& src_;
    pugi::xml_node node_;
    std::set<std::string> used_;
};

std::vector<std::int16_t> numberList(const Source& src, pugi::xml_node n) {
    std::vector<std::int16_t> out;
    for (std::string_view w : words(n.child_value())) {
        std::int16_t v = 0;
        if (!parseNumber(w, v)) src.fail(n, "\"" + std::string(w) + "\" is not a whole number");
        out.push_back(v);
    }
    return out;
}

// Names are single bytes; in the file each byte is the character of that code (U+0000-U+00FF).
std::string bytesFromText(const Element& e, std::string_view utf8) {
    std::string out;
    for (std::size_t i = 0; i < utf8.size();) {
        const auto c = static_cast<unsigned char>(utf8[i]);
        if (c < 0x80) {
            out += char(c);
            ++i;
        } else if ((c & 0xE0) == 0xC0 && i + 1 < utf8.size() && c <= 0xC3) {
            out += char(((c & 0x1F) << 6) | (static_cast<unsigned char>(utf8[i + 1]) & 0x3F));
            i += 2;
        } else {
            e.fail("name \"" + std::string(utf8) + "\" has a character beyond U+00FF; use hex=");
        }
    }
    return out;
}

std::string textFromBytes(const std::string& bytes) {
    std::string out;
    for (unsigned char c : bytes) {
        if (c < 0x80) {
            out += char(c);
        } else {
            out += char(0xC0 | (c >> 6));
            out += char(0x80 | (c & 0x3F));
        }
    }
    return out;
}

bool printable(const std::string& bytes) {
    return std::all_of(bytes.begin(), bytes.end(), [](char c) {
        const auto u = static_cast<unsigned char>(c);
        return u >= 0x20 && u != 0x7F;
    });
}

std::string hexOf(const std::string& bytes) {
    static const char digits[] = "0123456789ABCDEF";
    std::string out;
    for (unsigned char c : bytes) {
        out += digits[c >> 4];
        out += digits[c & 15];
    }
    return out;
}

std::string bytesFromHex(const Element& e, const std::string& hex) {
    std::string out;
    if (hex.size() % 2) e.fail("hex \"" + hex + "\" has an odd number of digits");
    for (std::size_t i = 0; i < hex.size(); i += 2) {
        unsigned v = 0;
        const auto [end, ec] = std::from_chars(hex.data() + i, hex.data() + i + 2, v, 16);
        if (ec != std::errc() || end != hex.data() + i + 2) e.fail("hex \"" + hex + "\" is not hexadecimal");
        out += char(v);
    }
    return out;
}

void readNames(const Source& src, pugi::xml_node table, std::vector<NameSlot>& slots, int count, int firstCustom,
               std::span<std::int16_t> favorites) {
    Element t(src, table);
    const auto fav = t.list("favorites", favorites.size());
    std::copy(fav.begin(), fav.end(), favorites.begin());
    t.done();
    slots.assign(std::size_t(count), NameSlot{});
    for (int i = 0; i < count; ++i) slots[std::size_t(i)].fixed = i + 1 < firstCustom;
    std::set<int> seen;
    for (pugi::xml_node n : table.children()) {
        if (n.type() != pugi::node_element) continue;
        Element e(src, n);
        if (std::string(n.name()) != "name") e.fail(std::string("unknown element <") + n.name() + ">");
        const int position = e.number<int>("position", std::nullopt, 1, count);
        if (!seen.insert(position).second) e.fail("position " + std::to_string(position) + " named twice");
        const std::string hex = e.text("hex");
        slots[std::size_t(position - 1)].bytes = hex.empty() ? bytesFromText(e, n.child_value()) : bytesFromHex(e, hex);
        e.done(true);
    }
}

void readDatalog(const Source& src, pugi::xml_node log, std::vector<data_rec>& out) {
    Element(src, log).done();
    for (pugi::xml_node n : log.children()) {
        if (n.type() != pugi::node_element) continue;
        Element e(src, n);
        if (std::string(n.name()) != "entry") e.fail(std::string("unknown element <") + n.name() + ">");
        data_rec r{};
        r.D_Time = e.time("time");
        r.D_Type = e.number<std::int16_t>("dType", std::nullopt);
        r.Valid = e.number<std::int16_t>("valid");
        r.ResultApproximated = e.number<std::int16_t>("approx");
        r.Test.Result = e.number<std::int16_t>("result");
        r.Test.Sample_detected = e.number<std::int16_t>("sample");
        r.Test.Medication = e.real("medication");
        r.Test.Event_code = e.number<std::int16_t>("event");
        r.Test.Flags = e.number<std::int16_t>("flags");
        r.Test.T_Type = e.number<std::int16_t>("tType");
        e.done();
        out.push_back(r);
    }
}

// A record type by its word, or by its number as older files give it.
std::int16_t recordType(Element& e) {
    const std::string word = e.text("type", true);
    if (const auto named = detail::recordTypeNamed(word)) return *named;
    long number = 0;
    if (!parseNumber(std::string_view(word), number)) e.fail("record type \"" + word + "\" is unknown");
    return e.number<std::int16_t>("type", std::nullopt, 0, 255);
}

void readBinaryDatalog(const Source& src, pugi::xml_node log, MeterProfile& p) {
    Element l(src, log);
    for (std::int16_t i : l.list("corrupted")) p.corruptedRecords.push_back(i);
    l.done();
    for (pugi::xml_node n : log.children()) {
        if (n.type() != pugi::node_element) continue;
        Element e(src, n);
        if (std::string(n.name()) != "record") e.fail(std::string("unknown element <") + n.name() + ">");
        RECORD_DATA r{};
        r.recType = recordType(e);
        r.timeStamp = e.time("time");
        r.Ordinal = e.number<std::int16_t>("ordinal");
        for (const Field& f : detail::fieldsOf(r.recType)) {
            if (f.width == Width::Hundredths)
                f.setReal(r, e.real(f.name));
            else
                r.*f.integer = e.number<std::int16_t>(f.name);
        }
        e.done();
        p.binaryDatalog.push_back(r);
    }
}

std::string timeText(std::int32_t seconds) {
    TIME_REC t{};
    fromSeconds(seconds, t);
    char buf[64];
    std::snprintf(buf, sizeof buf, "%04d-%02d-%02d %02d:%02d:%02d", t.year, t.mon, t.mday, t.hour, t.min, t.sec);
    return buf;
}

std::string quarterText(std::int16_t q) {
    char buf[16];
    std::snprintf(buf, sizeof buf, "%02d:%02d", q / 4, q % 4 * 15);
    return buf;
}

std::string realText(double v) {
    char buf[32];
    const auto [end, ec] = std::to_chars(buf, buf + sizeof buf, v);
    return std::string(buf, end);
}

template <class C>
std::string joined(const C& values) {
    std::string out;
    for (auto v : values) out += (out.empty() ? "" : " ") + std::to_string(v);
    return out;
}

void writeNames(pugi::xml_node parent, const char* element, const std::vector<NameSlot>& slots,
                std::span<const std::int16_t> favorites) {
    pugi::xml_node t = parent.append_child(element);
    t.append_attribute("favorites") = joined(favorites).c_str();
    for (std::size_t i = 0; i < slots.size(); ++i) {
        if (slots[i].bytes.empty()) continue;
        pugi::xml_node n = t.append_child("name");
        n.append_attribute("position") = int(i + 1);
        if (printable(slots[i].bytes))
            n.text() = textFromBytes(slots[i].bytes).c_str();
        else
            n.append_attribute("hex") = hexOf(slots[i].bytes).c_str();
    }
}

void setIfNonZero(pugi::xml_node n, const char* name, long v) {
    if (v) n.append_attribute(name) = v;
}

}  // namespace

MeterProfile readProfileFile(const std::string& path) {
    Source src{path, {}};
    std::ifstream in(path, std::ios::binary);
    if (!in) throw std::runtime_error(path + ": cannot be read");
    std::ostringstream buf;
    buf << in.rdbuf();
    src.text = buf.str();

    // pugixml alone would take invalid UTF-8, "&#0;" (cutting a serial there)
    // and a duplicate attribute (the first winning); the shared check refuses them.
    const varnel::detail::XmlCheckResult check = varnel::detail::checkXmlDocument(src.text);
    if (!check.ok())
        throw std::runtime_error(path + ":" + std::to_string(check.line) + ": " + check.problem + " (offset " +
                                 std::to_string(check.offset) + ")");
    pugi::xml_document doc;
    const pugi::xml_parse_result parsed = doc.load_buffer(src.text.data(), src.text.size());
    if (!parsed) {
        const auto line =
            1 + std::count(src.text.begin(),
                           src.text.begin() + std::min<std::ptrdiff_t>(parsed.offset, std::ptrdiff_t(src.text.size())),
                           '\n');
        throw std::runtime_error(path + ":" + std::to_string(line) + ": " + parsed.description());
    }
    pugi::xml_node root = doc.document_element();
    if (std::string(root.name()) != "meter") src.fail(root, "the document element must be <meter>");

    MeterProfile p;
    Element m(src, root);
    p.type = m.number<std::int16_t>("type", std::nullopt, 1, 8);
    p.port = m.number<std::int16_t>("port", std::int16_t(1), 1, 255);
    p.serial = m.text("serial", true);
    p.identitySerial = m.text("identitySerial");
    p.firmware = m.text("firmware", true);
    p.name = m.text("name");
    p.wireBaud = m.number<std::int32_t>("wireBaud", 9600);
    p.maxRecords = m.number<std::int16_t>("maxRecords", std::int16_t(255));
    p.clock = m.time("clock");
    p.plasmaCalibrated = m.number<std::int16_t>("plasma");
    p.initializedFlag = m.number<std::int16_t>("initialized");
    p.attached = m.flag("attached", true);
    m.done();

    std::set<std::string> seen;
    for (pugi::xml_node n : root.children()) {
        if (n.type() != pugi::node_element) continue;
        const std::string name = n.name();
        if (!seen.insert(name).second) src.fail(n, "<" + name + "> appears twice");
        static const std::set<std::string> typeSevenOnly = {"insulins", "oralMeds", "schedule", "targets",
                                                            "binaryDatalog"};
        if (typeSevenOnly.count(name) && !p.usesBinaryDatalog())
            src.fail(n, "only a type-7 meter keeps <" + name + ">");
        if (name == "datalog" && p.usesBinaryDatalog())
            src.fail(n, "a type-7 meter keeps <binaryDatalog>, not <datalog>");
        if (name == "ranges") {
            Element e(src, n);
            p.checkStripLow = e.number<std::int16_t>("checkStripLow");
            p.checkStripHigh = e.number<std::int16_t>("checkStripHigh");
            p.checkStripApprox = e.number<std::int16_t>("checkStripApprox");
            p.glucoseLow = e.number<std::int16_t>("glucoseLow", std::nullopt);
            p.glucoseHigh = e.number<std::int16_t>("glucoseHigh", std::nullopt);
            p.glucoseErrorLow = e.number<std::int16_t>("errorLow", std::int16_t(-1));
            p.glucoseErrorHigh = e.number<std::int16_t>("errorHigh", std::int16_t(1023));
            e.done();
        } else if (name == "languages" || name == "events" || name == "insulinKinds") {
            Element(src, n).done(true);
            (name == "languages" ? p.languages : name == "events" ? p.events : p.insulinKinds) = numberList(src, n);
        } else if (name == "options") {
            Element(src, n).done();
            std::set<int> codes;
            for (pugi::xml_node o : n.children()) {
                if (o.type() != pugi::node_element) continue;
                Element e(src, o);
                if (std::string(o.name()) != "option") e.fail(std::string("unknown element <") + o.name() + ">");
                const int code = e.number<int>("code", std::nullopt, 0, kOptionCount - 1);
                if (!codes.insert(code).second) e.fail("option " + std::to_string(code) + " appears twice");
                OptionEntry& entry = p.options[std::size_t(code)];
                entry.availability = e.number<std::int16_t>("availability", std::nullopt, 0, 2);
                entry.value = e.number<std::int16_t>("value");
                entry.min = e.number<std::int16_t>("min");
                entry.max = e.number<std::int16_t>("max");
                e.done();
            }
        } else if (name == "insulins") {
            readNames(src, n, p.insulinNames, kInsulinSlots, kFirstCustomInsulin, p.favoriteInsulins);
        } else if (name == "oralMeds") {
            readNames(src, n, p.oralMedNames, kOralMedSlots, kFirstCustomOralMed, p.favoriteOralMeds);
        } else if (name == "schedule") {
            Element e(src, n);
            p.scheduleSelection = e.number<std::int16_t>("selection", std::nullopt, 0, 1);
            const std::string segments = e.text("segments", true);
            const auto times = words(segments);
            if (times.size() != 7) e.fail("segments needs seven start times hh:mm");
            for (std::size_t i = 0; i < 7; ++i) {
                const std::string t(times[i]);
                int h = -1, mi = -1, used = -1;
                if (std::sscanf(t.c_str(), "%2d:%2d%n", &h, &mi, &used) != 2 || used != int(t.size()) || h < 0 ||
                    h > 23 || mi < 0 || mi > 59 || mi % 15)
                    e.fail("segment start \"" + t + "\" is not a quarter hour hh:mm");
                p.mealSegments[i] = static_cast<std::int16_t>(h * 4 + mi / 15);
            }
            e.done();
        } else if (name == "targets") {
            Element e(src, n);
            p.targets.beforeLow = e.number<std::int16_t>("beforeLow", std::nullopt);
            p.targets.beforeHigh = e.number<std::int16_t>("beforeHigh", std::nullopt);
            p.targets.afterLow = e.number<std::int16_t>("afterLow", std::nullopt);
            p.targets.afterHigh = e.number<std::int16_t>("afterHigh", std::nullopt);
            p.targets.hypo = e.number<std::int16_t>("hypo", std::nullopt);
            e.done();
        } else if (name == "datalog") {
            readDatalog(src, n, p.datalog);
        } else if (name == "binaryDatalog") {
            readBinaryDatalog(src, n, p);
        } else {
            src.fail(n, "unknown element <" + name + ">");
        }
    }
    try {
        validateProfile(p);
    } catch (const std::invalid_argument& e) {
        throw std::runtime_error(path + ": " + e.what());
    }
    return p;
}

void writeProfileFile(const MeterProfile& p, const std::string& path) {
    // A file the reader would refuse is not written.
    for (const auto& [what, text] : {std::pair{"serial", &p.serial},
                                     {"identitySerial", &p.identitySerial},
                                     {"firmware", &p.firmware},
                                     {"name", &p.name}}) {
        const std::string problem = varnel::detail::xmlTextProblem(*text);
        if (!problem.empty())
            throw std::runtime_error(path + ": " + what + " cannot be written as XML text: " + problem);
    }
    pugi::xml_document doc;
    pugi::xml_node m = doc.append_child("meter");
    m.append_attribute("type") = p.type;
    m.append_attribute("port") = p.port;
    m.append_attribute("serial") = p.serial.c_str();
    if (!p.identitySerial.empty()) m.append_attribute("identitySerial") = p.identitySerial.c_str();
    m.append_attribute("firmware") = p.firmware.c_str();
    if (!p.name.empty()) m.append_attribute("name") = p.name.c_str();
    m.append_attribute("wireBaud") = p.wireBaud;
    m.append_attribute("maxRecords") = p.maxRecords;
    m.append_attribute("clock") = timeText(p.clock).c_str();
    m.append_attribute("plasma") = p.plasmaCalibrated;
    m.append_attribute("initialized") = p.initializedFlag;
    if (!p.attached) m.append_attribute("attached") = "false";

    pugi::xml_node r = m.append_child("ranges");
    r.append_attribute("checkStripLow") = p.checkStripLow;
    r.append_attribute("checkStripHigh") = p.checkStripHigh;
    r.append_attribute("checkStripApprox") = p.checkStripApprox;
    r.append_attribute("glucoseLow") = p.glucoseLow;
    r.append_attribute("glucoseHigh") = p.glucoseHigh;
    r.append_attribute("errorLow") = p.glucoseErrorLow;
    r.append_attribute("errorHigh") = p.glucoseErrorHigh;
    m.append_child("languages").text() = joined(p.languages).c_str();
    m.append_child("events").text() = joined(p.events).c_str();
    m.append_child("insulinKinds").text() = joined(p.insulinKinds).c_str();

    pugi::xml_node options = m.append_child("options");
    for (int i = 0; i < kOptionCount; ++i) {
        const OptionEntry& o = p.options[std::size_t(i)];
        if (o == OptionEntry{}) continue;
        pugi::xml_node n = options.append_child("option");
        n.append_attribute("code") = i;
        n.append_attribute("availability") = o.availability;
        n.append_attribute("value") = o.value;
        n.append_attribute("min") = o.min;
        n.append_attribute("max") = o.max;
    }
    if (p.usesBinaryDatalog()) {
        writeNames(m, "insulins", p.insulinNames, p.favoriteInsulins);
        writeNames(m, "oralMeds", p.oralMedNames, p.favoriteOralMeds);
        pugi::xml_node s = m.append_child("schedule");
        s.append_attribute("selection") = p.scheduleSelection;
        std::string segments;
        for (std::int16_t q : p.mealSegments) segments += (segments.empty() ? "" : " ") + quarterText(q);
        s.append_attribute("segments") = segments.c_str();
        pugi::xml_node t = m.append_child("targets");
        t.append_attribute("beforeLow") = p.targets.beforeLow;
        t.append_attribute("beforeHigh") = p.targets.beforeHigh;
        t.append_attribute("afterLow") = p.targets.afterLow;
        t.append_attribute("afterHigh") = p.targets.afterHigh;
        t.append_attribute("hypo") = p.targets.hypo;

        pugi::xml_node log = m.append_child("binaryDatalog");
        if (!p.corruptedRecords.empty()) log.append_attribute("corrupted") = joined(p.corruptedRecords).c_str();
        for (const RECORD_DATA& rd : p.binaryDatalog) {
            pugi::xml_node n = log.append_child("record");
            if (const char* name = detail::recordTypeName(rd.recType))
                n.append_attribute("type") = name;
            else
                n.append_attribute("type") = rd.recType;
            n.append_attribute("time") = timeText(rd.timeStamp).c_str();
            setIfNonZero(n, "ordinal", rd.Ordinal);
            for (const Field& f : detail::fieldsOf(rd.recType)) {
                if (f.width != Width::Hundredths)
                    setIfNonZero(n, f.name, rd.*f.integer);
                else if (f.real(rd) != 0.0)
                    n.append_attribute(f.name) = realText(f.real(rd)).c_str();
            }
        }
    } else {
        pugi::xml_node log = m.append_child("datalog");
        for (const data_rec& e : p.datalog) {
            pugi::xml_node n = log.append_child("entry");
            n.append_attribute("time") = timeText(e.D_Time).c_str();
            n.append_attribute("dType") = e.D_Type;
            setIfNonZero(n, "tType", e.Test.T_Type);
            setIfNonZero(n, "result", e.Test.Result);
            setIfNonZero(n, "flags", e.Test.Flags);
            setIfNonZero(n, "sample", e.Test.Sample_detected);
            setIfNonZero(n, "event", e.Test.Event_code);
            if (e.Test.Medication != 0.0) n.append_attribute("medication") = realText(e.Test.Medication).c_str();
            setIfNonZero(n, "valid", e.Valid);
            setIfNonZero(n, "approx", e.ResultApproximated);
        }
    }
    if (!doc.save_file(path.c_str(), "  ", pugi::format_default, pugi::encoding_utf8))
        throw std::runtime_error(path + ": cannot be written");
}

}  // namespace varnel::sim
