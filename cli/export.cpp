#include "export.h"

#include <nlohmann/json.hpp>
#include <pugixml.hpp>

#include <charconv>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <stdexcept>
#include <system_error>

namespace varnel::cli {

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
        r.comments.push_back("Strip range " + attr(lvl, "Lower") + "-" + attr(lvl, "Upper"));
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

// Everything but the date of an entry this table does not know, so nothing is dropped.
void fillUnknown(const pugi::xml_node& e, const Units&, Reading& r) {
    static constexpr const char* kDate[] = {"Y", "MM", "D", "h", "m", "s"};
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

constexpr double kMgdlPerMmol = 18.0182;

}  // namespace

Datalog readDatalog(const std::string& datalogXml) {
    pugi::xml_document doc;
    if (!doc.load_string(datalogXml.c_str()) || !doc.child("Datalog"))
        throw std::runtime_error("the component returned no datalog document");
    const pugi::xml_node datalog = doc.child("Datalog");
    const pugi::xml_node extra = datalog.child("TransferDetail").child("ExtraInfo");
    const Units units{attr(extra.child("GlucUnit"), "Txt"), attr(extra.child("InsUnit"), "Txt"),
                      attr(extra.child("OMedUnit"), "Txt"), attr(extra.child("CholesUnit"), "Txt")};
    const pugi::xml_node device = datalog.child("DeviceInfo");
    Datalog log{device.child_value("SN"), device.child_value("Name"), device.child_value("TypeID"), {}};
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
    return std::strtod(text.c_str(), nullptr);
}

namespace {

// A value as the JSON export carries it: a plain decimal as a number, anything else as its text.
nlohmann::ordered_json jsonValue(const std::string& text) {
    const auto number = numberIn(text);
    if (!number) return text;
    if (text.find('.') != std::string::npos) return *number;
    // A whole number stays whole; one beyond 64 bits is kept exactly, as its text.
    std::int64_t whole = 0;
    const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), whole);
    if (error != std::errc{} || end != text.data() + text.size()) return text;
    return whole;
}

}  // namespace

std::string mmolText(double mgdl) {
    char text[32];
    std::snprintf(text, sizeof text, "%.1f", mgdl / kMgdlPerMmol);
    return text;
}

std::vector<Reading> inUnit(std::vector<Reading> readings, GlucoseUnit unit) {
    if (unit == GlucoseUnit::meter) return readings;
    for (Reading& r : readings) {
        if (!isGlucoseKind(r.kind)) continue;
        for (ReadingValue& v : r.values) {
            const auto mgdl = numberIn(v.value);
            if (v.unit != "mg/dL" || !mgdl) continue;
            v.value = mmolText(*mgdl);
            v.unit = "mmol/L";
        }
    }
    return readings;
}

std::string csvField(const std::string& text) {
    std::string field = text;
    if (!field.empty() && std::strchr("=+-@\t\r", field.front()) && !numberIn(field)) field.insert(0, "'");
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
    return line + "\r\n";
}

std::string readingsCsv(const Datalog& log, GlucoseUnit unit) {
    // The header says when glucose was converted, so a reader never takes mmol/L for the meter's own unit.
    std::string csv = csvLine({"date-time", "kind", "quantity",
                               unit == GlucoseUnit::mmol ? "value (glucose converted to mmol/L)" : "value", "unit",
                               "slot", "comments", "range"});
    for (const Reading& r : inUnit(log.readings, unit)) {
        std::string comments;
        for (const std::string& c : r.comments) comments += (comments.empty() ? "" : "; ") + c;
        if (r.values.empty()) csv += csvLine({r.time, r.kind, "", "", "", r.slot, comments, ""});
        for (const ReadingValue& v : r.values)
            csv += csvLine({r.time, r.kind, v.quantity, v.value, v.unit, r.slot, comments, v.range});
    }
    return csv;
}

std::string readingsJson(const Datalog& log, GlucoseUnit unit) {
    nlohmann::ordered_json doc;
    doc["format"] = "varnel-readings";
    doc["version"] = 1;
    doc["meter"] = {{"serial", log.serial}, {"model", log.model}, {"type", log.meterType}};
    doc["glucose_converted_to_mmol"] = unit == GlucoseUnit::mmol;
    auto& list = doc["readings"] = nlohmann::ordered_json::array();
    for (const Reading& r : inUnit(log.readings, unit)) {
        nlohmann::ordered_json item;
        item["time"] = r.time.empty() ? nlohmann::ordered_json() : nlohmann::ordered_json(r.time);
        item["kind"] = r.kind;
        auto& values = item["values"] = nlohmann::ordered_json::array();
        for (const ReadingValue& v : r.values) {
            nlohmann::ordered_json value{{"quantity", v.quantity}};
            // A number stays a number for the importing program; a level ("Trace", ">1000") stays text.
            value["value"] = jsonValue(v.value);
            if (!v.unit.empty()) value["unit"] = v.unit;
            if (!v.range.empty()) value["range"] = v.range;
            values.push_back(value);
        }
        if (!r.slot.empty()) item["slot"] = r.slot;
        item["comments"] = r.comments;
        list.push_back(item);
    }
    return doc.dump(2) + "\n";
}

}  // namespace varnel::cli
