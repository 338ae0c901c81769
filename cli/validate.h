// `varnel validate FILE`: checks a document as the component reads it, against the schema
// of its document element and against the limits it carries itself.
#pragma once

#include <CLI/CLI.hpp>

#include <string>

#include "document_check.h"
#include "varnel/xml_wrapper.h"

namespace varnel::cli {

// The file as `validate` and `set` both judge it: loaded into `doc` as the component loads
// it (what the component refuses, no schema passes), then checked by checkDocument.
// Verdict not_xml carries the component's reason as its one problem; unreadable, the reason
// the file could not be read.
DocumentCheck checkFile(const std::string& file, XMLWrapper& doc);

void addValidateCommand(CLI::App& app, int& status);

}  // namespace varnel::cli
