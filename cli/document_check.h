// Checks a document against the schema named by its document element, with
// libxml2; the varnel validate command and the schema tests share it.
#pragma once

#include <string>
#include <vector>

namespace varnel::cli {

// What a check found.
struct DocumentCheck {
    enum class Verdict { valid, invalid, not_xml, no_schema, schema_unusable, unreadable };
    Verdict verdict = Verdict::not_xml;
    std::string schema;                 // path of the schema used; "" when none applies
    std::vector<std::string> problems;  // each "line N: message"
};

// Where the schemas are: $VARNEL_SCHEMAS, else share/varnel/schemas beside the program's bin/.
std::string schemaDirectory();

// Checks the XML text against <document element>.xsd in schemaDir and each value against
// the Min and Max the document gives it (attributes of an item; the clock's Min and Max dates).
DocumentCheck checkDocument(const std::string& xml, const std::string& schemaDir);

}  // namespace varnel::cli
