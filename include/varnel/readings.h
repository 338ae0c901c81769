// The readings of a datalog document as one list, and the CSV and JSON written
// from it (docs/exports.md describes both).
#pragma once

#include <optional>
#include <string>
#include <vector>

#include "export.h"

namespace varnel {

// One measured or noted quantity of a reading (a blood pressure has two, a cholesterol entry up to four).
struct ReadingValue {
    std::string quantity;  // "glucose", "systolic", "LDL", ...
    std::string value;     // the datalog's text; a number for most quantities, a level for some ("Trace")
    std::string unit;      // "" when the datalog states none
    std::string range;     // "HI" or "LO" when the meter showed it; the value is then the meter's limit
};

// A range a reading carries besides its values, such as the range a check strip must read within.
struct ReadingLimits {
    std::string name;          // "Strip range"
    std::string lower, upper;  // numbers as text, in `unit`
    std::string unit;          // "" when the datalog states none
};

// One entry of the datalog.
struct Reading {
    std::string ord;   // the meter's own number of the entry; "" for meters that number none
    std::string time;  // ISO 8601 local date-time "2008-02-15T07:05:09"; "" when the entry has no date
    std::string kind;  // "glucose", "control", "check_strip", "insulin", ...; the element name for an unknown entry
    std::vector<ReadingValue> values;
    std::vector<ReadingLimits> limits;
    std::string slot;  // meal slot ("Before Lunch", "Snack"), "" when none
    std::vector<std::string> comments;
};

// The meter a datalog comes from and its readings.
struct DatalogReadings {
    std::string serial, model, meterType;
    std::vector<Reading> readings;
};

// Glucose as the exports show it: in the meter's unit, or converted to mmol/L.
enum class GlucoseUnit { meter, mmol };

// mg/dL per mmol/L of glucose.
inline constexpr double kMgdlPerMmol = 18.0182;

// The readings of a datalog document, every entry in document order. Throws
// std::invalid_argument for text that is not a datalog document.
VARNEL_API DatalogReadings readDatalog(const std::string& datalogXml);

// True for the kinds whose values are blood glucose (glucose, control solution, check strip).
VARNEL_API bool isGlucoseKind(const std::string& kind);

// The value of a plain decimal number ("-12", "3.5", "1e3"), or nothing for any other
// text: hexadecimal, leading blanks, integers beyond 64 bits, "inf" stay text.
VARNEL_API std::optional<double> numberIn(const std::string& text);

// The readings with glucose values and limits in mmol/L (mg/dL / 18.0182, one decimal); the rest unchanged.
VARNEL_API std::vector<Reading> inUnit(std::vector<Reading> readings, GlucoseUnit unit);

// The texts of a reading: its comments, then each of its limits ("Strip range 87-137 mg/dL").
VARNEL_API std::vector<std::string> readingNotes(const Reading& reading);

// The header and one line per value of every reading (a reading without a value gets one line).
VARNEL_API std::string readingsCsv(const DatalogReadings& log, GlucoseUnit unit);

// The readings as a JSON document.
VARNEL_API std::string readingsJson(const DatalogReadings& log, GlucoseUnit unit);

}  // namespace varnel
