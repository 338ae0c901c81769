// The CSV and JSON exports of the readings, both written from the one list readDatalog gives.
#include <nlohmann/json.hpp>

#include <cstdlib>
#include <cstring>

#include "exports/csv.h"
#include "varnel/readings.h"

namespace varnel {

namespace detail {

std::string csvField(const std::string& text) {
    const bool formula = !text.empty() && std::strchr("=+-@\t\r", text.front()) && !numberIn(text);
    std::string field;
    field.reserve(text.size() + 1);
    if (formula) field += '\'';
    field += text;
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

}  // namespace detail

namespace {

using Json = nlohmann::ordered_json;

// A number stays a number for the importing program; a level ("Trace", ">1000") stays text.
Json valueJson(const std::string& text) {
    const auto number = numberIn(text);
    if (!number) return text;
    if (text.find_first_of(".eE") == std::string::npos) return std::strtoll(text.c_str(), nullptr, 10);
    return *number;
}

}  // namespace

std::string readingsCsv(const DatalogReadings& log, GlucoseUnit unit) {
    using detail::csvLine;
    // The header says when glucose was converted, so a reader never takes mmol/L for the meter's own unit.
    // The meter and entry number close each line, so uploads of several meters can be merged and de-duplicated.
    std::string csv = csvLine({"date-time", "kind", "quantity",
                               unit == GlucoseUnit::mmol ? "value (glucose converted to mmol/L)" : "value", "unit",
                               "slot", "comments", "range", "ord", "serial", "model"});
    for (const Reading& r : inUnit(log.readings, unit)) {
        std::string comments;
        for (const std::string& c : readingNotes(r)) comments += (comments.empty() ? "" : "; ") + c;
        const auto line = [&](const std::string& quantity, const std::string& value, const std::string& valueUnit,
                              const std::string& range) {
            return csvLine(
                {r.time, r.kind, quantity, value, valueUnit, r.slot, comments, range, r.ord, log.serial, log.model});
        };
        if (r.values.empty()) csv += line("", "", "", "");
        for (const ReadingValue& v : r.values) csv += line(v.quantity, v.value, v.unit, v.range);
    }
    return csv;
}

std::string readingsJson(const DatalogReadings& log, GlucoseUnit unit) {
    Json doc;
    doc["format"] = "varnel-readings";
    doc["version"] = 1;
    doc["meter"] = {{"serial", log.serial}, {"model", log.model}, {"type", log.meterType}};
    doc["glucose_converted_to_mmol"] = unit == GlucoseUnit::mmol;
    auto& list = doc["readings"] = Json::array();
    for (const Reading& r : inUnit(log.readings, unit)) {
        Json item;
        item["ord"] = r.ord.empty() ? Json() : valueJson(r.ord);
        item["time"] = r.time.empty() ? Json() : Json(r.time);
        item["kind"] = r.kind;
        auto& values = item["values"] = Json::array();
        for (const ReadingValue& v : r.values) {
            Json value{{"quantity", v.quantity}, {"value", valueJson(v.value)}};
            if (!v.unit.empty()) value["unit"] = v.unit;
            if (!v.range.empty()) value["range"] = v.range;
            values.push_back(value);
        }
        for (const ReadingLimits& l : r.limits) {
            Json limit{{"name", l.name}, {"lower", valueJson(l.lower)}, {"upper", valueJson(l.upper)}};
            if (!l.unit.empty()) limit["unit"] = l.unit;
            item["limits"].push_back(limit);
        }
        if (!r.slot.empty()) item["slot"] = r.slot;
        item["comments"] = readingNotes(r);
        list.push_back(item);
    }
    return doc.dump(2) + "\n";
}

}  // namespace varnel
