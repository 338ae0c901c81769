// The entry elements of the datalog document: one per result record of an
// upload, with consecutive values of one meter entry merged into one element.
#pragma once

#include <cstdint>

#include "readings/results.h"
#include "varnel/unique_checker.h"
#include "varnel/xml_wrapper.h"

namespace varnel::detail {

// What the entry writer needs to know of the session and the transfer summary.
struct EntryContext {
    std::int16_t storedMeterType = 0;  // M_Type of the stored session record
    std::int16_t lastMeterType = 0;    // the session's LastMeterType (comment rewriting)
    std::int16_t checkStripLow = 0;    // the session's CheckStripLow / CheckStripHigh
    std::int16_t checkStripHigh = 0;
    bool cholesUnitWritten = false;  // true when the transfer summary already wrote CholesUnit
};

// Writes one entry element per result, merging the values of one meter entry, under the current Records.
void writeReadingsEntries(XMLWrapper& datalog, ResultCollection& results, EntryContext& context,
                          UniqueChecker& checker);

// Rewrites a glucose result's comments for the meter type before its entry is written; always true.
bool ProcessCommentsAsPerDeviceType(Glucose& result, std::int16_t deviceType);

}  // namespace varnel::detail
