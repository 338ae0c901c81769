// A datalog document as comma-separated values, one line per entry, for spreadsheets.
#pragma once

#include <string>
#include <vector>

namespace varnel::cli {

// One field quoted as a spreadsheet reads it back: quotes around a field with
// a comma, quote or line break (inner quotes doubled), and a leading
// apostrophe on text that would otherwise start a formula.
std::string csvField(const std::string& text);

// One line of fields, ended by a line feed.
std::string csvLine(const std::vector<std::string>& fields);

// The header and one line per entry of the datalog's top-level Records:
// date-time, kind, value, unit, slot, comments. Throws std::runtime_error for
// text that is not a datalog document.
std::string datalogToCsv(const std::string& datalogXml);

}  // namespace varnel::cli
