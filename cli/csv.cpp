#include "csv.h"

#include <pugixml.hpp>

#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <stdexcept>

namespace varnel::cli {

namespace {

// Units the datalog states once in its transfer summary.
struct Units {
    std::string glucose, insulin, oralMed, cholesterol;
};

struct Row {
    std::string kind, value, unit, slot;
    std::vector<std::string> comments;
};

std::string attr(const pugi::xml_node& node, const char* name) { return node.attribute(name).value(); }

std::string joined(const std::vector<std::string>& parts, const char* separator) {
    std::string text;
    for (const std::string& part : parts) {
        if (part.empty()) continue;
        if (!text.empty()) text += separator;
        text += part;
    }
    return text;
}

void addPair(std::vector<std::string>& parts, const char* name, const std::string& value) {
    if (!value.empty()) parts.push_back(std::string(name) + "=" + value);
}

// "name=value" for each child in document order, except those named in `skip`.
std::string childPairs(const pugi::xml_node& entry, const char* skip = nullptr) {
    std::vector<std::string> parts;
    for (const pugi::xml_node& child : entry.children())
        if (!skip || std::strcmp(child.name(), skip) != 0) addPair(parts, child.name(), child.text().get());
    return joined(parts, "; ");
}

// A child's Txt attribute, or its name when it has none (Ill, Hypo, ...).
std::string label(const pugi::xml_node& node) {
    const std::string text = attr(node, "Txt");
    return text.empty() ? node.name() : text;
}

void fillGlucose(const pugi::xml_node& e, const Units& u, Row& r) {
    const std::string sample = attr(e, "Txt");
    if (sample == "Control")
        r.kind = "Glucose control";
    else if (sample == "Check Strip")
        r.kind = "Check strip";
    r.value = attr(e, "Val");
    r.unit = u.glucose;
    r.slot = attr(e.child("MealSlot"), "Txt");
    for (const pugi::xml_node& c : e.child("Comments").children()) r.comments.push_back(label(c));
    for (const pugi::xml_node& lvl : e.child("Strip").children("Lvl"))
        r.comments.push_back("range " + attr(lvl, "Lower") + "-" + attr(lvl, "Upper"));
}

void fillError(const pugi::xml_node& e, const Units&, Row& r) {
    r.value = e.child("Txt").text().get();
    r.comments = {e.child("Major").text().get(), e.child("Minor").text().get()};
}

void fillBloodPressure(const pugi::xml_node& e, const Units&, Row& r) {
    std::vector<std::string> parts;
    addPair(parts, "Syst", attr(e, "Syst"));
    addPair(parts, "Diast", attr(e, "Diast"));
    r.value = joined(parts, "; ");
}

void fillChildren(const pugi::xml_node& e, const Units&, Row& r) { r.value = childPairs(e); }

void fillCholesterol(const pugi::xml_node& e, const Units& u, Row& r) {
    r.value = childPairs(e);
    r.unit = u.cholesterol;
}

void fillChange(const pugi::xml_node& e, const Units&, Row& r) {
    r.value = attr(e, "To");
    r.comments = {"from " + attr(e, "From")};
}

void fillExercise(const pugi::xml_node& e, const Units&, Row& r) {
    r.value = attr(e, "Duration");
    r.unit = "min";
    r.comments = {attr(e.child("Intensity"), "Txt")};
}

void fillFood(const pugi::xml_node& e, const Units&, Row& r) {
    r.value = childPairs(e, "Slot");
    r.slot = attr(e.child("Slot"), "Txt");
}

void fillValue(const pugi::xml_node& e, const Units&, Row& r) { r.value = attr(e, "Val"); }

void fillHealthNotes(const pugi::xml_node& e, const Units&, Row& r) {
    for (const pugi::xml_node& c : e.children()) r.comments.push_back(c.name());
}

void fillInsulin(const pugi::xml_node& e, const Units& u, Row& r) {
    r.value = attr(e, "Val");
    r.unit = u.insulin;
    r.comments = {attr(e, "InsName")};
}

void fillText(const pugi::xml_node& e, const Units&, Row& r) { r.value = attr(e, "Txt"); }

void fillMicroAlbumin(const pugi::xml_node& e, const Units&, Row& r) {
    r.value = attr(e, "Val");
    if (r.value.empty()) r.value = attr(e, "Txt");
}

void fillOralMed(const pugi::xml_node& e, const Units& u, Row& r) {
    r.value = attr(e, "Val");
    r.unit = u.oralMed;
    r.comments = {e.child("OMedName").text().get()};
}

struct EntryKind {
    const char* element;
    const char* kind;
    void (*fill)(const pugi::xml_node&, const Units&, Row&);
};

constexpr EntryKind kEntryKinds[] = {
    {"Gluc", "Glucose", fillGlucose},
    {"Error", "Error", fillError},
    {"BP", "Blood pressure", fillBloodPressure},
    {"HtWt", "Height/weight", fillChildren},
    {"Change", "Calibration code change", fillChange},
    {"Choles", "Cholesterol", fillCholesterol},
    {"Ex", "Exercise", fillExercise},
    {"Food", "Food", fillFood},
    {"Alcohol", "Alcohol", fillValue},
    {"HbA1c", "HbA1c", fillValue},
    {"HNotes", "Health notes", fillHealthNotes},
    {"MBolus", "Insulin bolus", fillInsulin},
    {"MTDD", "Insulin total daily dose", fillInsulin},
    {"Ins", "Insulin injection", fillInsulin},
    {"Ketones", "Ketones", fillText},
    {"Visit", "Visit", fillText},
    {"MicroAlbumin", "Microalbumin", fillMicroAlbumin},
    {"OralMed", "Oral medication", fillOralMed},
};

int number(const pugi::xml_node& e, const char* name) { return std::atoi(attr(e, name).c_str()); }

// The entry's date attributes as a spreadsheet reads a date and time.
std::string dateTime(const pugi::xml_node& e) {
    if (!e.attribute("Y") || !e.attribute("MM") || !e.attribute("D")) return {};
    char text[40];
    std::snprintf(text, sizeof text, "%04d-%02d-%02d %02d:%02d:%02d", number(e, "Y"), number(e, "MM"), number(e, "D"),
                  number(e, "h"), number(e, "m"), number(e, "s"));
    return text;
}

Row rowFor(const pugi::xml_node& entry, const Units& units) {
    Row row;
    row.kind = entry.name();  // an entry kind this table does not know still gets its line
    for (const EntryKind& k : kEntryKinds) {
        if (std::strcmp(k.element, entry.name()) != 0) continue;
        row.kind = k.kind;
        k.fill(entry, units, row);
        break;
    }
    return row;
}

bool isNumber(const std::string& text) {
    if (text.empty()) return false;
    char* end = nullptr;
    std::strtod(text.c_str(), &end);
    return *end == '\0';
}

}  // namespace

std::string csvField(const std::string& text) {
    std::string field = text;
    if (!field.empty() && std::strchr("=+-@\t\r", field.front()) && !isNumber(field)) field.insert(0, "'");
    if (field.find_first_of(",\"\r\n") == std::string::npos) return field;
    std::string quoted = "\"";
    for (char c : field) {
        if (c == '"') quoted += '"';
        quoted += c;
    }
    return quoted + '"';
}

std::string csvLine(const std::vector<std::string>& fields) {
    std::string line;
    for (std::size_t i = 0; i < fields.size(); ++i) {
        if (i) line += ',';
        line += csvField(fields[i]);
    }
    return line + '\n';
}

std::string datalogToCsv(const std::string& datalogXml) {
    pugi::xml_document doc;
    if (!doc.load_string(datalogXml.c_str()) || !doc.child("Datalog"))
        throw std::runtime_error("the component returned no datalog document");
    const pugi::xml_node datalog = doc.child("Datalog");
    const pugi::xml_node extra = datalog.child("TransferDetail").child("ExtraInfo");
    const Units units{attr(extra.child("GlucUnit"), "Txt"), attr(extra.child("InsUnit"), "Txt"),
                      attr(extra.child("OMedUnit"), "Txt"), attr(extra.child("CholesUnit"), "Txt")};

    std::string csv = csvLine({"date-time", "kind", "value", "unit", "slot", "comments"});
    for (const pugi::xml_node& entry : datalog.child("Records").children()) {
        const Row row = rowFor(entry, units);
        csv += csvLine({dateTime(entry), row.kind, row.value, row.unit, row.slot, joined(row.comments, "; ")});
    }
    return csv;
}

}  // namespace varnel::cli
