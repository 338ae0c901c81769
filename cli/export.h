// The readings of a datalog document as one list, and the CSV and JSON exports written from it.
#pragma once

#include <optional>
#include <string>
#include <vector>

namespace varnel::cli {

// One measured or noted quantity of a reading (a blood pressure has two, a cholesterol entry up to four).
struct ReadingValue {
    std::string quantity;  // "glucose", "systolic", "LDL", ...
    std::string value;     // the datalog's text; a number for most quantities, a level for some ("Trace")
    std::string unit;      // "" when the datalog states none
    std::string range;     // "HI" or "LO" when the meter showed it; the value is then the meter's limit
};

// One entry of the datalog.
struct Reading {
    std::string time;  // ISO 8601 local date-time "2008-02-15T07:05:09"; "" when the entry has no date
    std::string kind;  // "glucose", "control", "check_strip", "insulin", ...; the element name for an unknown entry
    std::vector<ReadingValue> values;
    std::string slot;  // meal slot ("Before Lunch", "Snack"), "" when none
    std::vector<std::string> comments;
};

// What the datalog says of the meter and the transfer.
struct Datalog {
    std::string serial, model, meterType;
    std::vector<Reading> readings;
};

// Glucose as the exports show it.
enum class GlucoseUnit { meter, mmol };

// The readings of a datalog document, every entry in document order. Throws
// std::runtime_error for text that is not a datalog document.
Datalog readDatalog(const std::string& datalogXml);

// True for the kinds whose values are blood glucose (glucose, control solution, check strip).
bool isGlucoseKind(const std::string& kind);
// The value of a plain decimal number ("-12", "3.5"); nothing for any other text ("0x1A", " 12", "1e3", "Trace").
std::optional<double> numberIn(const std::string& text);
// mg/dL as mmol/L with one decimal.
std::string mmolText(double mgdl);
// The readings with glucose values in mmol/L (mg/dL / 18.0182, one decimal); other values unchanged.
std::vector<Reading> inUnit(std::vector<Reading> readings, GlucoseUnit unit);

// One field quoted as RFC 4180 asks (a comma, quote or line break puts the field in
// quotes, inner quotes doubled), with a leading apostrophe on text that would
// otherwise start a spreadsheet formula.
std::string csvField(const std::string& text);
// One line of fields, ended by CR LF.
std::string csvLine(const std::vector<std::string>& fields);

// The header and one line per value of every reading (a reading without a value gets one line).
std::string readingsCsv(const Datalog& log, GlucoseUnit unit);
// The readings as the JSON document docs/exports.md describes.
std::string readingsJson(const Datalog& log, GlucoseUnit unit);

}  // namespace varnel::cli
