// The documents a client hands to the component, built the way every client builds them.
#pragma once

#include <string>
#include <vector>

#include "varnel/xml_wrapper.h"

namespace varnel::cli {

// A connection document that asks discovery to search one serial port.
XMLWrapper connectionDocument(int port);
// An empty document of `kind` (varnel::doc_kind) for a request to fill.
XMLWrapper emptyDocument(int kind);
// The ErrDesc texts of a status document, in the order they were written.
std::vector<std::string> statusDescriptions(XMLWrapper& status);
// Text of <section>/<name> (DeviceInfo/SN, PortInfo/PortID) in a device information
// or datalog document; "" when absent.
std::string sectionValue(XMLWrapper& document, const std::string& section, const std::string& name);

}  // namespace varnel::cli
