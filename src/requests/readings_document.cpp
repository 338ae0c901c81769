#include "requests/readings_document.h"

#include <string>

#include "readings/results.h"
#include "requests/discovery.h"
#include "requests/readings_entries.h"
#include "requests/request_frame.h"
#include "util/helpers.h"
#include "varnel/unique_checker.h"

namespace varnel::detail {

namespace {

// Units of the transfer summary's ExtraInfo beyond the glucose calibration.
struct ExtraUnit {
    const char* element;
    const char* txt;
    bool (*writtenFor)(std::int16_t meterType);
};

constexpr ExtraUnit kExtraUnits[] = {
    {"GlucUnit", "mg/dL", [](std::int16_t) { return true; }},
    {"OMedUnit", "Each", [](std::int16_t t) { return t == eMorvex; }},
    {"InsUnit", "Units", [](std::int16_t t) { return t == eMorvex || t == eCVPellis; }},
    {"CholesUnit", "mg/dL", [](std::int16_t t) { return t == eMorvex; }},
};

struct RecordCounts {
    std::int32_t total, valid, corrupted;
};

RecordCounts recordCounts(MeterDll& session) {
    const clsMeterFns& fns = session.meterFns();
    // The binary datalog counts its corrupted records apart; the record datalog counts them in.
    // Records that could not be read or dated gave no entry: they are corrupted, not valid.
    const bool binary = session.storedRecord().M_Type == eMorvex;
    const std::int32_t total = binary ? fns.recordCount() + fns.corruptedCount() : fns.recordCount();
    const std::int32_t corrupted = fns.corruptedCount() + fns.unreadableCount();
    return {total, total - corrupted, corrupted};
}

// Record counts, calibration and units of the upload.
void writeTransferSummary(XMLWrapper& datalog, MeterDll& session) {
    const METER_REC stored = session.storedRecord();
    const clsMeterFns& fns = session.meterFns();
    const auto [total, valid, corrupted] = recordCounts(session);

    datalog.SelectElement("TransferDetail");
    datalog.AddElement("Records");
    datalog.AddChildElement("Total", "", std::to_string(total));
    datalog.AddChildElement("Valid", "", std::to_string(valid));
    datalog.AddChildElement("Corrupted", "", std::to_string(corrupted));
    datalog.AddChildElement("Capacity", "", std::to_string(fns.maxRecordsForMeter()));

    datalog.AddElement("ExtraInfo");
    const bool plasma = session.Calibration() != 0;
    datalog.AddChildElement("GlucCalib", "", plasma ? "1" : "0");
    datalog.SetChildAttribute("Txt", plasma ? "Plasma" : "Whole Blood");
    for (const ExtraUnit& unit : kExtraUnits) {
        if (!unit.writtenFor(stored.M_Type)) continue;
        datalog.SelectElement("TransferDetail");
        datalog.MoveToChild("ExtraInfo");
        datalog.AddElement(unit.element, "0");
        datalog.SetAttribute("Txt", unit.txt);
    }
}

}  // namespace

std::int32_t getReadings(RequestContext& owner, METER_REC& udtMeterRec, XMLWrapper& deviceInfo, XMLWrapper& datalog,
                         XMLWrapper&, XMLWrapper& status, bool& blnCheckMeter) {
    Request req(owner, "getReadings", udtMeterRec, &status);
    return req.run([&]() -> std::int32_t {
        MeterDll& session = req.session;
        if (!req.readPort(deviceInfo)) return req.complete(ME_BAD_PARAMETER);
        blnCheckMeter = true;
        session.initMeter(udtMeterRec);
        SetContinueFlag(true);
        if (!req.readIdentity(deviceInfo)) {
            req.close();
            return req.complete(ME_BAD_PARAMETER);
        }

        std::shared_ptr<MeterModel> meter = session.Meter();
        if (!meter) {
            req.fail(ME_FAIL);
            req.close();
            return req.complete(ME_FAIL);
        }

        // The upload reports 0-50, the conversion 50-100.
        owner.resetPercentage();
        owner.PercentLimit(50);
        std::int16_t uploaded;
        {
            ProgressTimer timer;
            uploaded = meter->GetReadingFromMeter();
        }
        if (uploaded != 0) {
            req.fail(uploaded, " ; GetReadingFromMeter failed");
            // The upload's own code: the name tables read after it fail on their own record copy,
            // so the session's Error_code may still hold an older code.
            req.close();
            return req.complete(uploaded);
        }

        owner.PercentLimit(100);
        ResultCollection results;
        // False only says some records were unreadable; that is reported below, after the identity checks.
        meter->MeterUpload(results);
        owner.resetPercentage();
        UniqueChecker checker;

        if (const IdentityFailure f = writeDeviceDescription(datalog, session)) {
            req.fail(f.code, f.context);
            req.close();
            return req.complete(f.code);
        }
        writeTransferSummary(datalog, session);
        datalog.SelectElement("Records");
        const METER_REC stored = session.storedRecord();
        EntryContext context{.storedMeterType = stored.M_Type,
                             .lastMeterType = session.LastMeterType(),
                             .checkStripLow = session.CheckStripLow(),
                             .checkStripHigh = session.CheckStripHigh(),
                             .cholesUnitWritten = stored.M_Type == eMorvex};
        writeReadingsEntries(datalog, results, context, checker);

        if (std::int32_t c = req.checkMeter()) return req.complete(c);
        SetContinueFlag(true);
        if (std::int32_t r = req.compareIdentity()) return req.complete(r);
        datalog.MoveToRoot();
        // Every entry that could be read is written, but the datalog is not all the meter holds.
        const clsMeterFns& fns = session.meterFns();
        if (const std::int32_t lost = fns.unreadableCount()) {
            const std::int16_t code = fns.unreadableCode();
            req.fail(code, " ; " + std::to_string(lost) + " of " + std::to_string(recordCounts(session).total) +
                               " records could not be read");
            return req.complete(code);
        }
        return req.complete(ME_SUCCESS);
    });
}

}  // namespace varnel::detail
