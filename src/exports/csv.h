// CSV fields and lines as spreadsheets read them.
#pragma once

#include <string>
#include <vector>

namespace varnel::detail {

// One field quoted as RFC 4180 asks (a comma, quote or line break puts the field in
// quotes, inner quotes doubled), with a leading apostrophe on text that would
// otherwise start a spreadsheet formula.
std::string csvField(const std::string& text);
// One line of fields, ended by CR LF.
std::string csvLine(const std::vector<std::string>& fields);

}  // namespace varnel::detail
