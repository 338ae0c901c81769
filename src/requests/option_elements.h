// The general option elements of a device settings document: how the option
// values are fetched from the meter and how each one is written as an element.
#pragma once

#include <cstdint>
#include <string>

#include "session/meter_dll.h"
#include "varnel/records.h"
#include "varnel/xml_wrapper.h"

namespace varnel::detail {

// Fetches and writes the option elements of one settings request. The values
// come from the request's record copy; meters that read all options at once
// (types 1, 2, 3, 5, 7) are read in bulk, the others one option at a time.
class OptionElements {
public:
    // record and message belong to the request; message is its running description.
    OptionElements(MeterDll& session, METER_REC& record, std::string& message);

    // True when this meter type reads all its options in one call.
    bool bulk() const;
    // In bulk mode reads every option into the record: 0, or the transport's
    // code, already reported in status. Does nothing in single mode.
    std::int16_t fetch(XMLWrapper& status);
    // Appends the option's element under the current element of doc, reading
    // the option first in single mode: 0, or the failing read's code, reported
    // in status with the message extended.
    std::int16_t write(XMLWrapper& doc, MeterOptions_Enum option, XMLWrapper& status);

private:
    std::int16_t readSingle(MeterOptions_Enum option, XMLWrapper& status);

    MeterDll& session_;
    METER_REC& record_;
    std::string& message_;
    bool tickled_ = false;  // the last single read was preceded by a tickle
};

}  // namespace varnel::detail
