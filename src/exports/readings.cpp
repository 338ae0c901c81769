#include "varnel/readings.h"

#include <pugixml.hpp>

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <stdexcept>

namespace varnel {

namespace {

// Units the datalog states once in its transfer summary.
struct Units {
    std::string glucose, insulin, oralMed, cholesterol;
};

std::string attr(const pugi::xml_node& node, const char* name) { return node.attribute(name).value(); }

// "High"/"Low" of the datalog as the meter shows it.
std::string rangeMark(const pugi::xml_node& node) {
    const std::string range = attr(node, "Range");
    return range == "High" ? "HI" : range == "Low" ? "LO" : range;
}

void add(Reading& r, const std::string& quantity, const std::string& value, const std::string& unit = "",
         const std::string& range = "") {
    if (!value.empty()) r.values.push_back({quantity, value, unit, range});
}

// A value-bearing child of the entry, each with its own unit and range mark.
void addChildren(Reading& r, const pugi::xml_node& e, const std::string& unit, const char* skip = "") {
    for (const pugi::xml_node& c : e.children())
        if (std::strcmp(c.name(), skip) != 0) add(r, c.name(), c.text().get(), unit, rangeMark(c));
}

void fillGlucose(const pugi::xml_node& e, const Units& u, Reading& r) {
    const std::string sample = attr(e, "Txt");
    r.kind = sample == "Control" ? "control" : sample == "Check Strip" ? "check_strip" : "glucose";
    add(r, r.kind == "glucose" ? "glucose" : r.kind, attr(e, "Val"), u.glucose, rangeMark(e));
    r.slot = attr(e.child("MealSlot"), "Txt");
    if (attr(e, "Site") == "1") r.comments.push_back("Alternate site");
    for (const pugi::xml_node& c : e.child("Comments").children()) {
        const std::string txt = attr(c, "Txt");
        const std::string name = c.name();
        // Exercise comments say only when ("Before"); the others name themselves.
        r.comments.push_back(txt.empty() ? name : name == "Ex" ? "Exercise " + txt : txt);
    }
    for (const pugi::xml_node& lvl : e.child("Strip").children("Lvl"))
        r.limits.push_back({"Strip range", attr(lvl, "Lower"), attr(lvl, "Upper"), u.glucose});
}

void fillError(const pugi::xml_node& e, const Units&, Reading& r) {
    add(r, "error", e.child("Txt").text().get());
    for (const char* part : {"Major", "Minor"})
        if (!e.child(part).text().empty()) r.comments.push_back(e.child(part).text().get());
}

void fillBloodPressure(const pugi::xml_node& e, const Units&, Reading& r) {
    add(r, "systolic", attr(e, "Syst"));
    add(r, "diastolic", attr(e, "Diast"));
}

void fillHeightWeight(const pugi::xml_node& e, const Units&, Reading& r) { addChildren(r, e, ""); }

void fillCholesterol(const pugi::xml_node& e, const Units& u, Reading& r) { addChildren(r, e, u.cholesterol); }

void fillChange(const pugi::xml_node& e, const Units&, Reading& r) {
    add(r, "from", attr(e, "From"));
    add(r, "to", attr(e, "To"));
}

void fillExercise(const pugi::xml_node& e, const Units&, Reading& r) {
    add(r, "duration", attr(e, "Duration"), "min");
    const std::string intensity = attr(e.child("Intensity"), "Txt");
    if (!intensity.empty()) r.comments.push_back(intensity);
}

void fillFood(const pugi::xml_node& e, const Units&, Reading& r) {
    addChildren(r, e, "", "Slot");
    r.slot = attr(e.child("Slot"), "Txt");
}

void fillAlcohol(const pugi::xml_node& e, const Units&, Reading& r) { add(r, "alcohol", attr(e, "Val")); }

void fillHbA1c(const pugi::xml_node& e, const Units&, Reading& r) { add(r, "HbA1c", attr(e, "Val"), "%"); }

void fillHealthNotes(const pugi::xml_node& e, const Units&, Reading& r) {
    for (const pugi::xml_node& c : e.children()) r.comments.push_back(c.name());
}

void fillInsulin(const pugi::xml_node& e, const Units& u, Reading& r) {
    add(r, "insulin", attr(e, "Val"), u.insulin);
    if (!attr(e, "InsName").empty()) r.comments.push_back(attr(e, "InsName"));
}

void fillKetones(const pugi::xml_node& e, const Units&, Reading& r) { add(r, "ketones", attr(e, "Txt")); }

void fillVisit(const pugi::xml_node& e, const Units&, Reading& r) { add(r, "visit", attr(e, "Txt")); }

// A measured microalbumin is the text of a Val child; a strip result names its level in a Type child.
void fillMicroAlbumin(const pugi::xml_node& e, const Units&, Reading& r) {
    add(r, "microalbumin", e.child("Val") ? e.child("Val").text().get() : attr(e.child("Type"), "Txt"));
}

void fillOralMed(const pugi::xml_node& e, const Units& u, Reading& r) {
    add(r, "dose", attr(e, "Val"), u.oralMed);
    if (!e.child("OMedName").text().empty()) r.comments.push_back(e.child("OMedName").text().get());
}

// Everything but the date and number of an entry this table does not know, so nothing is dropped.
void fillUnknown(const pugi::xml_node& e, const Units&, Reading& r) {
    static constexpr const char* kDate[] = {"Y", "MM", "D", "h", "m", "s", "Ord"};
    for (const pugi::xml_attribute& a : e.attributes()) {
        bool isDate = false;
        for (const char* d : kDate) isDate = isDate || std::strcmp(d, a.name()) == 0;
        if (!isDate) add(r, a.name(), a.value());
    }
    addChildren(r, e, "");
}

struct EntryKind {
    const char* element;
    const char* kind;
    void (*fill)(const pugi::xml_node&, const Units&, Reading&);
};

constexpr EntryKind kEntryKinds[] = {
    {"Gluc", "glucose", fillGlucose},
    {"Error", "error", fillError},
    {"BP", "blood_pressure", fillBloodPressure},
    {"HtWt", "weight_height", fillHeightWeight},
    {"Change", "calibration_change", fillChange},
    {"Choles", "cholesterol", fillCholesterol},
    {"Ex", "exercise", fillExercise},
    {"Food", "food", fillFood},
    {"Alcohol", "alcohol", fillAlcohol},
    {"HbA1c", "hba1c", fillHbA1c},
    {"HNotes", "health_notes", fillHealthNotes},
    {"MBolus", "pump_bolus", fillInsulin},
    {"MTDD", "pump_daily_total", fillInsulin},
    {"Ins", "insulin", fillInsulin},
    {"Ketones", "ketones", fillKetones},
    {"Visit", "visit", fillVisit},
    {"MicroAlbumin", "microalbumin", fillMicroAlbumin},
    {"OralMed", "oral_medication", fillOralMed},
};

// The entry's date attributes as an ISO 8601 local date-time.
std::string isoTime(const pugi::xml_node& e) {
    if (!e.attribute("Y") || !e.attribute("MM") || !e.attribute("D")) return {};
    auto n = [&](const char* name) { return e.attribute(name).as_int(); };
    char text[48];
    std::snprintf(text, sizeof text, "%04d-%02d-%02dT%02d:%02d:%02d", n("Y"), n("MM"), n("D"), n("h"), n("m"), n("s"));
    return text;
}

Reading readingFor(const pugi::xml_node& entry, const Units& units) {
    Reading r;
    r.ord = attr(entry, "Ord");
    r.time = isoTime(entry);
    r.kind = entry.name();
    for (const EntryKind& k : kEntryKinds) {
        if (std::strcmp(k.element, entry.name()) != 0) continue;
        r.kind = k.kind;
        k.fill(entry, units, r);
        return r;
    }
    fillUnknown(entry, units, r);
    return r;
}

}  // namespace

DatalogReadings readDatalog(const std::string& datalogXml) {
    pugi::xml_document doc;
    if (!doc.load_string(datalogXml.c_str()) || !doc.child("Datalog"))
        throw std::invalid_argument("not a datalog document");
    const pugi::xml_node datalog = doc.child("Datalog");
    const pugi::xml_node extra = datalog.child("TransferDetail").child("ExtraInfo");
    const Units units{attr(extra.child("GlucUnit"), "Txt"), attr(extra.child("InsUnit"), "Txt"),
                      attr(extra.child("OMedUnit"), "Txt"), attr(extra.child("CholesUnit"), "Txt")};
    const pugi::xml_node device = datalog.child("DeviceInfo");
    DatalogReadings log{device.child_value("SN"), device.child_value("Name"), device.child_value("TypeID"), {}};
    for (const pugi::xml_node& entry : datalog.child("Records").children())
        log.readings.push_back(readingFor(entry, units));
    return log;
}

bool isGlucoseKind(const std::string& kind) { return kind == "glucose" || kind == "control" || kind == "check_strip"; }

std::optional<double> numberIn(const std::string& text) {
    // Plain decimals only: "0x1A", " 12", "1e3", "+5" and "inf" are what a meter never writes as a value.
    const std::size_t start = text.starts_with('-') ? 1 : 0;
    const std::size_t point = text.find_first_not_of("0123456789", start);
    if (point == start || start == text.size()) return std::nullopt;
    if (point != std::string::npos &&
        (text[point] != '.' || point + 1 == text.size() ||
         text.find_first_not_of("0123456789", point + 1) != std::string::npos))
        return std::nullopt;
    // An integer is written as one, so it must fit one.
    if (point == std::string::npos) {
        errno = 0;
        std::strtoll(text.c_str(), nullptr, 10);
        if (errno == ERANGE) return std::nullopt;
    }
    return std::strtod(text.c_str(), nullptr);
}

namespace {

// mg/dL text as mmol/L with one decimal; text that is not a number stays as it is.
bool toMmol(std::string& value, std::string& unit) {
    const auto mgdl = numberIn(value);
    if (unit != "mg/dL" || !mgdl) return false;
    char text[32];
    std::snprintf(text, sizeof text, "%.1f", *mgdl / kMgdlPerMmol);
    value = text;
    return true;
}

}  // namespace

std::vector<Reading> inUnit(std::vector<Reading> readings, GlucoseUnit unit) {
    if (unit == GlucoseUnit::meter) return readings;
    for (Reading& r : readings) {
        if (!isGlucoseKind(r.kind)) continue;
        for (ReadingValue& v : r.values)
            if (toMmol(v.value, v.unit)) v.unit = "mmol/L";
        for (ReadingLimits& l : r.limits) {
            // Both ends or neither, so a range never mixes units.
            std::string lower = l.lower, upper = l.upper, mgdl = l.unit;
            if (toMmol(lower, mgdl) && toMmol(upper, mgdl)) l = {l.name, lower, upper, "mmol/L"};
        }
    }
    return readings;
}

std::vector<std::string> readingNotes(const Reading& reading) {
    std::vector<std::string> notes = reading.comments;
    for (const ReadingLimits& l : reading.limits)
        notes.push_back(l.name + " " + l.lower + "-" + l.upper + (l.unit.empty() ? "" : " " + l.unit));
    return notes;
}

}  // namespace varnel
