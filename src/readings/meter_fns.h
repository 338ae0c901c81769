// The meter-functions object of one meter session: the session's meter record,
// the two datalog buffers, the datalog uploads and their conversion into
// result records, and the progress of both.
#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "contracts/meter_link.h"
#include "contracts/transport.h"
#include "platform/message_pump.h"
#include "readings/results.h"
#include "varnel/records.h"

namespace varnel::detail {

// The session record and transport are its MeterLink, which settings groups take.
class clsMeterFns : public MeterLink {
public:
    explicit clsMeterFns(std::shared_ptr<Transport> sessionTransport);
    clsMeterFns(const clsMeterFns&) = delete;
    clsMeterFns& operator=(const clsMeterFns&) = delete;

    // Uploads the binary datalog (records since 1 January 2000); 0, or the record's Error_code.
    std::int16_t GetFastmeterReading();
    // Uploads the record datalog; 0, or the record's Error_code.
    std::int16_t GetNonFastMeterReading();
    // Raises onProgress with intProgress when it is above 0.
    void updateProgress(std::int16_t intProgress);

    // Raised with a percentage during uploads, conversions and model set-up.
    std::function<void(std::int16_t&)> onProgress;

    // Counts of the last conversion.
    std::int32_t recordCount() const { return recordCount_; }
    std::int32_t corruptedCount() const { return corruptedCount_; }
    std::int32_t unmatchedCount() const { return unmatchedCount_; }
    std::int32_t maxRecordsForMeter() const { return maxRecordsForMeter_; }
    // Records of the last conversion that could not be decoded or dated (they gave no result),
    // and the failure code of the first of them (0 when every record was read).
    std::int32_t unreadableCount() const { return unreadableCount_; }
    std::int16_t unreadableCode() const { return unreadableCode_; }

    // The datalogs of the last uploads; conversions read them as they are.
    METER_DATALOG& recordDatalog() { return *recordDatalog_; }
    METER_BIN_DATALOG& binaryDatalog() { return *binaryDatalog_; }

    // Converts the record datalog into objresultcol.
    // A record that cannot be dated is counted as unreadable and skipped; false when any was.
    bool NonFastmeterUpload(ResultCollection& objresultcol);
    // Converts the binary datalog into objresultcol; the arrays are the meter's oral-medication
    // and insulin names, zero-based. A record that cannot be decoded or dated is counted as
    // unreadable and skipped, the others are still converted; false when any was.
    bool Fastmeterupload(ResultCollection& objresultcol, const std::vector<std::string>& OralMedsArray,
                         const std::vector<std::string>& InsulinsArray);
    // A health note of the decoded record taken at date, in the given groups.
    std::shared_ptr<HealthNotes> getNewHealthNote(std::int32_t groupId, std::int32_t meterGroupId,
                                                  const DateTime& date);

private:
    enum class UploadMode { Idle, Binary, Records };

    // The date of meter seconds: 0, or the failure code of the time conversion (date untouched).
    std::int16_t meterDate(std::int32_t seconds, DateTime& date);
    // Counts a record that gave no result because it could not be read.
    void unreadable(std::int16_t code);
    void timerTick();
    void conversionProgress(std::int32_t index, std::int32_t count, std::int32_t& last);
    void raiseProgress(std::int16_t percent);
    std::int16_t upload(UploadMode mode, const std::function<std::int16_t()>& call);
    void convertRecord(const data_rec& record, const DateTime& date, ResultCollection& out);

    // The datalogs are large; they live on the heap.
    std::unique_ptr<METER_DATALOG> recordDatalog_;
    std::unique_ptr<METER_BIN_DATALOG> binaryDatalog_;
    RECORD_DATA workRecord_{};
    UploadMode mode_ = UploadMode::Idle;
    std::int32_t recordCount_ = 0;
    std::int32_t corruptedCount_ = 0;
    std::int32_t unmatchedCount_ = 0;
    std::int32_t maxRecordsForMeter_ = 0;
    std::int32_t unreadableCount_ = 0;
    std::int16_t unreadableCode_ = 0;
    // Never reset: a later upload of the session reports only above what was reached.
    std::int32_t lastTimerProgress_ = 0;
    TimerControl& mobjTimer;
    TimerConnection timerConnection_;
};

}  // namespace varnel::detail
