#include "readings/meter_fns.h"

#include <algorithm>
#include <cmath>
#include <iterator>
#include <optional>
#include <utility>

#include "contracts/meter_reads.h"
#include "errors/err_propagator.h"
#include "util/helpers.h"

namespace varnel::detail {

namespace {

constexpr const char* kClass = "clsMeterFns";

// Blood-test ResultType by T_Type: 10 normal test, 20 check strip, 21 control solution.
constexpr std::int32_t kTestTypes[16] = {10, 0, 20, 0, 0, 21, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0};

// Insulin names of the record datalog by T_Type (12 and 13 are pump and food records).
constexpr const char* kInsulinNames[15] = {"Regular", "NPH",   "Lente", "", "Ultralente", "80/20", "70/30", "60/40",
                                           "50/50",   "Mixed", "Other", "", "",           "",      ""};

// Health-note flags of a binary record, in the order their results are made.
constexpr std::pair<std::int16_t RECORD_DATA::*, std::int32_t> kHealthNotes[] = {
    {&RECORD_DATA::stressFlag, 170}, {&RECORD_DATA::feelHypoFlag, 171}, {&RECORD_DATA::illnessFlag, 172},
    {&RECORD_DATA::mensesFlag, 173}, {&RECORD_DATA::vacationFlag, 174}, {&RECORD_DATA::otherFlag, 175}};

// Glucose comment codes for the same flags, in the order they are added.
constexpr std::pair<std::int16_t RECORD_DATA::*, std::int32_t> kGlucoseFlagComments[] = {
    {&RECORD_DATA::stressFlag, 17}, {&RECORD_DATA::feelHypoFlag, 14}, {&RECORD_DATA::illnessFlag, 13},
    {&RECORD_DATA::mensesFlag, 18}, {&RECORD_DATA::vacationFlag, 19}, {&RECORD_DATA::otherFlag, 15}};

[[noreturn]] void subscriptError() { raise(errc::subscript_out_of_range, "Subscript out of range"); }

template <class T, std::size_t N>
const T& at(const T (&table)[N], long long index) {
    if (index < 0 || index >= static_cast<long long>(N)) subscriptError();
    return table[index];
}

const std::string& at(const std::vector<std::string>& names, long long index) {
    if (index < 0 || index >= static_cast<long long>(names.size())) subscriptError();
    return names[static_cast<std::size_t>(index)];
}

// A value field of a binary record that holds -1 has no value.
bool missing(double value) { return value == -1.0; }

// 1 above the meter's range, 2 below it, 3 within it.
std::int32_t rangeOfFlags(std::int16_t flags) { return flags == 1 || flags == 2 ? flags : 3; }

// Group numbering across the records of one binary conversion.
struct Grouping {
    std::int16_t group = 0;
    std::int16_t meterGroup = 0;
    bool open = false;
    bool placed = false;  // a value of the current record has taken its group
    DateTime date;
    std::optional<DateTime> lastFoodDate;
    std::optional<DateTime> lastCholesterolDate;

    // A new record starts with none of its values placed.
    void startRecord(const DateTime& recordDate) {
        date = recordDate;
        placed = false;
    }
    void newGroup() { group = toInt16(group + 1); }
    void newMeterGroup() { meterGroup = toInt16(meterGroup + 1); }

    // A value of a carbs-and-fats, LDL/HDL, blood-pressure or weight-and-height
    // record joins the open group or opens one.
    void join() {
        if (!open) {
            newGroup();
            open = true;
        }
    }

    // A value of a calories-and-protein or total-and-triglyceride record joins the
    // open group unless that holds values of another date. The record's second
    // value goes with its first.
    void joinDated(std::optional<DateTime>& kept, bool first, bool keepNewDate) {
        bool otherDate = kept && *kept != date;
        if (first) {
            if (!open) {
                newGroup();
                open = true;
            } else if (otherDate) {
                newGroup();
                if (keepNewDate) kept = date;
            }
        } else if (!placed && (!open || otherDate)) {
            newGroup();
        }
        placed = true;
    }

    void mark(Result& r) const {
        r.setGroupId(group);
        r.setMeterGroupId(meterGroup);
    }
};

// The decoded binary record being converted, and where its results go.
struct BinaryRecord {
    clsMeterFns& fns;
    const RECORD_DATA& w;
    Grouping& g;
    ResultCollection& out;
    std::int32_t& unmatched;
    const std::vector<std::string>& oralMeds;
    const std::vector<std::string>& insulins;

    // A result of this record, with its date and the meter's ordinal.
    template <class R>
    std::shared_ptr<R> stamped() const {
        auto r = std::make_shared<R>();
        r->setDateTime(g.date);
        r->setOrdinal(w.Ordinal);
        return r;
    }

    // A grouped result carrying one value of a two-value record.
    template <class R, class V>
    std::shared_ptr<R> grouped(V value, std::int32_t type) const {
        auto r = stamped<R>();
        r->setResultType(type);
        r->setValue(value);
        g.mark(*r);
        return r;
    }

    void food(std::int16_t value, std::int32_t type) const {
        // Segments 0-2 are the three meals; segment 3 is a snack, with its own types.
        if (w.mealSegment == 3) type += 5;
        auto r = grouped<Food>(std::int32_t(value), type);
        if (w.mealSegment >= 0 && w.mealSegment <= 2) r->setMealSlot(1 + 2 * w.mealSegment);
        out.Add(r);
    }

    void cholesterol(std::int16_t value, std::int32_t type, std::int32_t limit) const {
        auto r = grouped<Cholestrol>(double(value), type);
        r->setUnitType(0);
        r->setValueInMeterRange(value > limit ? 1 : 3);
        out.Add(r);
    }
};

void glucoseRecord(const BinaryRecord& r) {
    const RECORD_DATA& w = r.w;
    auto glucose = r.stamped<Glucose>();
    glucose->setUnitType(0);
    if (w.dietLabel != 0) glucose->setSlot(w.dietLabel);
    glucose->setCalibration(w.controlFlag == 1 ? 1 : 2);
    glucose->setValue(w.reading);
    glucose->setResultType(w.alternateSiteFlag == 1 ? 11 : w.controlFlag == 1 ? 21 : 10);
    // The comment list starts with the first comment.
    constexpr std::int32_t kExerciseComments[] = {11, 10, 12};
    if (w.exerciseLabel >= 1 && w.exerciseLabel <= 3)
        glucose->Comments()->Add(kExerciseComments[w.exerciseLabel - 1], 1);
    for (auto [flag, code] : kGlucoseFlagComments)
        if (w.*flag == 1) glucose->Comments()->Add(code, 1);
    r.out.Add(glucose);
}

void oralMedicationRecord(const BinaryRecord& r) {
    auto meds = r.stamped<OralMeds>();
    meds->setOralMedsName(at(r.oralMeds, r.w.oralMedType - 1));
    meds->setValue(r.w.oralMedDosage);
    r.out.Add(meds);
}

void insulinRecord(const BinaryRecord& r) {
    auto injection = r.stamped<InsulinInjection>();
    injection->setInsulinName(at(r.insulins, r.w.InsulinType - 1));
    injection->setValue(r.w.insulinDosage);
    r.out.Add(injection);
}

void pumpBolusRecord(const BinaryRecord& r) {
    auto pump = r.stamped<InsulinPump>();
    pump->setResultType(41);
    pump->setValue(r.w.bolusSetting);
    r.out.Add(pump);
}

void pumpDailyTotalRecord(const BinaryRecord& r) {
    auto pump = r.stamped<InsulinPump>();
    pump->setResultType(40);
    pump->setValue(r.w.dailyTotalSetting);
    r.out.Add(pump);
}

void carbsFatsRecord(const BinaryRecord& r) {
    const RECORD_DATA& w = r.w;
    Grouping& g = r.g;
    if (w.mealSegment == 4) {
        r.out.Add(r.stamped<Alcohol>());
        g.open = false;
        return;
    }
    g.newMeterGroup();
    for (auto [value, type] : {std::pair{w.carbs, 50}, std::pair{w.fats, 52}}) {
        if (missing(value)) continue;
        g.join();
        r.food(value, type);
    }
    if (g.open) g.lastFoodDate = g.date;
}

void caloriesProteinRecord(const BinaryRecord& r) {
    const RECORD_DATA& w = r.w;
    Grouping& g = r.g;
    if (w.mealSegment == 4) {
        if (g.open) ++r.unmatched;
        return;
    }
    g.newMeterGroup();
    for (auto [value, type] : {std::pair{w.calories, 51}, std::pair{w.protein, 53}}) {
        if (missing(value)) continue;
        g.joinDated(g.lastFoodDate, type == 51, true);
        r.food(value, type);
    }
    g.open = false;
}

void ketonesRecord(const BinaryRecord& r) {
    auto k = r.stamped<ketones>();
    if (r.w.ketones >= 0 && r.w.ketones <= 4) k->setResultType(110 + r.w.ketones);
    r.out.Add(k);
}

void hbA1cRecord(const BinaryRecord& r) {
    auto a1c = r.stamped<hbA1C>();
    a1c->setValue(r.w.hbA1C);
    r.out.Add(a1c);
}

void microalbuminRecord(const BinaryRecord& r) {
    const std::int16_t v = r.w.microalbumin;
    auto m = r.stamped<microalbumin>();
    m->setValue(v);
    m->setResultType(v == -1 ? 120 : v == 0 ? 121 : v == -2 ? 122 : 123);
    r.out.Add(m);
}

void cholesterolLdlHdlRecord(const BinaryRecord& r) {
    const RECORD_DATA& w = r.w;
    Grouping& g = r.g;
    g.newMeterGroup();
    for (auto [value, type] : {std::pair{w.cholesterolLDL, 130}, std::pair{w.cholesterolHDL, 131}}) {
        if (missing(value)) continue;
        g.join();
        r.cholesterol(value, type, 500);
    }
    if (g.open) g.lastCholesterolDate = g.date;
}

void cholesterolTotalTrigRecord(const BinaryRecord& r) {
    const RECORD_DATA& w = r.w;
    Grouping& g = r.g;
    g.newMeterGroup();
    if (!missing(w.cholesterolTotal)) {
        g.joinDated(g.lastCholesterolDate, true, false);
        r.cholesterol(w.cholesterolTotal, 140, 1000);
    }
    if (!missing(w.cholesterolTriglyceride)) {
        g.joinDated(g.lastCholesterolDate, false, false);
        r.cholesterol(w.cholesterolTriglyceride, 150, 3000);
    }
    g.open = false;
    g.lastCholesterolDate.reset();
}

void bloodPressureRecord(const BinaryRecord& r) {
    const RECORD_DATA& w = r.w;
    Grouping& g = r.g;
    g.newMeterGroup();
    for (auto [value, type] : {std::pair{w.bloodPressureSystole, 90}, std::pair{w.bloodPressureDiastole, 91}}) {
        if (missing(value)) continue;
        g.join();
        r.out.Add(r.grouped<BloodPressure>(std::int32_t(value), type));
    }
    g.open = false;
}

void weightHeightRecord(const BinaryRecord& r) {
    Grouping& g = r.g;
    g.newMeterGroup();
    // Copies: the packed record's doubles cannot be bound to references.
    const double weight = r.w.weight, height = r.w.height;
    for (auto [value, type] : {std::pair{weight, 100}, std::pair{height, 101}}) {
        if (missing(value)) continue;
        g.join();
        r.out.Add(r.grouped<BodyDimensions>(value, type));
    }
    g.open = false;
}

void healthNotesRecord(const BinaryRecord& r) {
    Grouping& g = r.g;
    g.newGroup();
    g.newMeterGroup();
    for (auto [flag, type] : kHealthNotes) {
        if (r.w.*flag != 1) continue;
        auto note = r.fns.getNewHealthNote(g.group, g.meterGroup, g.date);
        note->setResultType(type);
        r.out.Add(note);
    }
    g.open = false;
}

void lastVisitRecord(const BinaryRecord& r) {
    Grouping& g = r.g;
    g.newGroup();
    g.newMeterGroup();
    auto visit = r.stamped<LastVisits>();
    visit->setValue(0);
    if (r.w.visit >= 0 && r.w.visit <= 2) visit->setResultType(160 + r.w.visit);
    g.mark(*visit);
    r.out.Add(visit);
    g.open = false;
}

void exerciseRecord(const BinaryRecord& r) {
    const RECORD_DATA& w = r.w;
    auto exercise = r.stamped<Exercise>();
    if (w.ExerciseLevel >= 0 && w.ExerciseLevel <= 2) exercise->setResultType(60 + w.ExerciseLevel);
    exercise->setHours(w.exerciseDuration / 60);
    exercise->setMinutes(w.exerciseDuration % 60);
    r.out.Add(exercise);
    r.g.open = false;
}

void calCodeRecord(const BinaryRecord& r) {
    auto change = r.stamped<CalCode>();
    change->setFromValue(std::to_string(r.w.oldCalCode));
    change->setToValue(std::to_string(r.w.newCalCode));
    r.out.Add(change);
}

// The converter of each record type; a type outside the table gives no result.
constexpr std::pair<RecordType_Enum, void (*)(const BinaryRecord&)> kConverters[] = {
    {VX_REC_GLUCOSE, glucoseRecord},
    {VX_REC_ORAL_MEDICATION, oralMedicationRecord},
    {VX_REC_INSULIN, insulinRecord},
    {VX_REC_PUMP_BOLUS, pumpBolusRecord},
    {VX_REC_PUMP_DAILY_TOTAL, pumpDailyTotalRecord},
    {VX_REC_CARBS_FATS, carbsFatsRecord},
    {VX_REC_CALORIES_PROTEIN, caloriesProteinRecord},
    {VX_REC_KETONES, ketonesRecord},
    {VX_REC_HBA1C, hbA1cRecord},
    {VX_REC_MICROALBUMIN, microalbuminRecord},
    {VX_REC_CHOLESTEROL_LDL_HDL, cholesterolLdlHdlRecord},
    {VX_REC_CHOLESTEROL_TOTAL_TRIG, cholesterolTotalTrigRecord},
    {VX_REC_BLOOD_PRESSURE, bloodPressureRecord},
    {VX_REC_WEIGHT_HEIGHT, weightHeightRecord},
    {VX_REC_HEALTH_NOTES, healthNotesRecord},
    {VX_REC_LAST_VISIT, lastVisitRecord},
    {VX_REC_EXERCISE, exerciseRecord},
    {VX_REC_CAL_CODE, calCodeRecord},
};

void convertBinaryRecord(const BinaryRecord& r, const DateTime& date) {
    r.g.startRecord(date);
    for (auto [type, convert] : kConverters)
        if (r.w.recType == type) return convert(r);
}

}  // namespace

clsMeterFns::clsMeterFns(std::shared_ptr<Transport> sessionTransport)
    : MeterLink{{}, std::move(sessionTransport)},
      recordDatalog_(std::make_unique<METER_DATALOG>()),
      binaryDatalog_(std::make_unique<METER_BIN_DATALOG>()),
      mobjTimer(frmTimer().tmrStatus()) {
    timerConnection_ = mobjTimer.onTick([this] { timerTick(); });
}

std::int16_t clsMeterFns::upload(UploadMode mode, const std::function<std::int16_t()>& call) {
    struct Idle {
        UploadMode& mode;
        ~Idle() { mode = UploadMode::Idle; }
    } idle{mode_};
    mode_ = mode;
    std::int16_t code = call();
    if (code == 0) return 0;
    // A failure must never read as success, even when the library left Error_code at 0.
    return MeterRec.Error_code != 0 ? MeterRec.Error_code : code;
}

std::int16_t clsMeterFns::GetFastmeterReading() {
    return guarded(kClass, "GetFastmeterReading", [&]() -> std::int16_t {
        if (!GetContinueFlag()) return 0;
        TIME_REC start{0, 0, 0, 1, 1, 2000, 0, 0, 0};
        std::int32_t seconds = transport->convert_to_seconds(start);
        return upload(UploadMode::Binary,
                      [&] { return transport->GetMeterDatalog(MeterRec, *binaryDatalog_, seconds); });
    });
}

std::int16_t clsMeterFns::GetNonFastMeterReading() {
    return guarded(kClass, "GetNonFastMeterReading", [&]() -> std::int16_t {
        if (!GetContinueFlag()) return 0;
        return upload(UploadMode::Records,
                      [&] { return transport->vb_Upload_Meter_Datalog(MeterRec, *recordDatalog_); });
    });
}

void clsMeterFns::updateProgress(std::int16_t intProgress) {
    if (intProgress > 0) raiseProgress(intProgress);
}

void clsMeterFns::raiseProgress(std::int16_t percent) {
    if (onProgress) onProgress(percent);
}

void clsMeterFns::timerTick() {
    auto share = [](std::int32_t part, std::int32_t whole) {
        // A datalog that reports no capacity has made no measurable progress.
        return whole > 0 ? double(part) / whole * 100 : 0.0;
    };
    double percent = MeterRec.Percent_done;
    if (mode_ == UploadMode::Records)
        percent = share(recordDatalog_->ValidRecordCount, recordDatalog_->maxRecordsForMeter);
    else if (mode_ == UploadMode::Binary)
        percent = share(binaryDatalog_->recordCount, binaryDatalog_->maxRecordsForMeter);
    // Counts that run past the capacity still mean "done", not an overflow.
    std::int32_t p = roundToInt32(std::clamp(percent, 0.0, 100.0));
    if (p >= lastTimerProgress_ + 10) {
        lastTimerProgress_ = p;
        raiseProgress(static_cast<std::int16_t>(p));
    }
}

void clsMeterFns::conversionProgress(std::int32_t index, std::int32_t count, std::int32_t& last) {
    std::int32_t p = roundToInt32(double(index) / count * 100);
    if (p < last + 10) return;
    last = p;
    raiseProgress(toInt16(p));
    doEvents();
}

std::int16_t clsMeterFns::meterDate(std::int32_t seconds, DateTime& date) {
    TIME_REC t{};
    // A record the transport cannot date has no date at all; it never gets a made-up one.
    if (const std::int16_t code = meterTimeOf(*transport, seconds, t)) return code;
    // Two-digit years: 0-29 are 2000-2029, 30-99 are 1930-1999.
    int yy = (t.year % 100 + 100) % 100;
    int year = yy < 30 ? 2000 + yy : 1900 + yy;
    // Months and days past their ends roll over into the next month or year.
    int months = t.mon - 1;
    int monthsDown = months >= 0 ? months / 12 : (months - 11) / 12;
    auto first = DateTime::fromParts(year + monthsDown, months - monthsDown * 12 + 1, 1);
    if (!first) raise(errc::overflow, "Overflow");
    DateTime day = first->addSeconds((std::int64_t(t.mday) - 1) * 86400);
    DateTime time = DateTime::fromSeconds(std::int64_t(t.hour) * 3600 + t.min * 60 + t.sec);
    date = ToDateTime(day, time);
    return 0;
}

void clsMeterFns::unreadable(std::int16_t code) {
    if (unreadableCount_ == 0) unreadableCode_ = code;
    ++unreadableCount_;
}

bool clsMeterFns::NonFastmeterUpload(ResultCollection& objresultcol) {
    return guarded(kClass, "NonFastmeterUpload", [&] {
        const METER_DATALOG& log = *recordDatalog_;
        recordCount_ = log.recordCount;
        maxRecordsForMeter_ = log.maxRecordsForMeter;
        unmatchedCount_ = 0;
        unreadableCount_ = 0;
        unreadableCode_ = 0;
        // A transport reporting more valid records than records (or a negative count) damaged none.
        corruptedCount_ = std::max(0, std::int32_t(log.recordCount) - std::int32_t(log.ValidRecordCount));
        std::int32_t last = 0;
        for (std::int32_t i = 0; i < recordCount_; ++i) {
            if (i >= static_cast<std::int32_t>(std::size(log.DataLog))) subscriptError();
            const data_rec& record = log.DataLog[i];
            // Records the meter marks invalid give nothing and are counted as corrupted already.
            if (record.Valid == 0) {
                DateTime date;
                if (const std::int16_t code = meterDate(record.D_Time, date))
                    unreadable(code);
                else
                    convertRecord(record, date, objresultcol);
            }
            conversionProgress(i, recordCount_, last);
        }
        return unreadableCount_ == 0;
    });
}

void clsMeterFns::convertRecord(const data_rec& record, const DateTime& date, ResultCollection& out) {
    const TEST_REC& test = record.Test;
    auto make = [&](auto r) {
        r->setDateTime(date);
        return r;
    };

    if (record.D_Type == 1) {
        if (test.Flags == 3) {
            auto error = make(std::make_shared<Error>());
            error->setValue(test.Result);
            out.Add(error);
            return;
        }
        std::int32_t type = at(kTestTypes, test.T_Type);
        auto measured = [&](auto r) {
            r->setUnitType(0);
            r->setValueInMeterRange(rangeOfFlags(test.Flags));
            r->setValue(test.Result);
            return r;
        };
        if (type == 20) {
            out.Add(measured(make(std::make_shared<CheckStrip>())));
            return;
        }
        auto glucose = measured(make(std::make_shared<Glucose>()));
        glucose->setResultType(type);
        glucose->setCalibration(test.Sample_detected == 1 ? 2 : 1);
        glucose->Comments()->Add(test.Event_code, 1);
        out.Add(glucose);
    } else if (record.D_Type == 2) {
        if (test.T_Type < 0 || test.T_Type > 14 || test.Medication == 0) return;
        if (test.T_Type == 13) {
            auto food = make(std::make_shared<Food>());
            food->setResultType(50);
            food->setValue(roundToInt32(test.Medication));
            out.Add(food);
        } else if (test.T_Type == 12) {
            auto pump = make(std::make_shared<InsulinPump>());
            pump->setResultType(41);
            pump->setValue(test.Medication);
            out.Add(pump);
        } else {
            auto injection = make(std::make_shared<InsulinInjection>());
            injection->setValue(test.Medication);
            injection->setInsulinName(kInsulinNames[test.T_Type]);
            out.Add(injection);
        }
    }
}

bool clsMeterFns::Fastmeterupload(ResultCollection& objresultcol, const std::vector<std::string>& OralMedsArray,
                                  const std::vector<std::string>& InsulinsArray) {
    return guarded(kClass, "Fastmeterupload", [&] {
        METER_BIN_DATALOG& log = *binaryDatalog_;
        recordCount_ = log.recordCount;
        maxRecordsForMeter_ = log.maxRecordsForMeter;
        unmatchedCount_ = 0;
        unreadableCount_ = 0;
        unreadableCode_ = 0;
        corruptedCount_ = log.corruptedCount > 0 ? log.corruptedCount : 0;
        Grouping grouping;
        const BinaryRecord record{*this,           workRecord_,   grouping,     objresultcol,
                                  unmatchedCount_, OralMedsArray, InsulinsArray};
        std::int32_t last = 0;
        for (std::int32_t i = 0; i < recordCount_; ++i) {
            const std::int16_t index = toInt16(i);
            std::int16_t code = readTwice([&] {
                workRecord_.recType = 0;
                return transport->GetMeterDatalogRecordData(log, index, workRecord_);
            });
            DateTime date;
            if (code == 0) code = meterDate(workRecord_.timeStamp, date);
            // One record that cannot be read costs that record only, never the ones after it.
            if (code != 0)
                unreadable(code);
            else
                convertBinaryRecord(record, date);
            conversionProgress(i, recordCount_, last);
        }
        return unreadableCount_ == 0;
    });
}

std::shared_ptr<HealthNotes> clsMeterFns::getNewHealthNote(std::int32_t groupId, std::int32_t meterGroupId,
                                                           const DateTime& date) {
    return guarded(kClass, "getNewHealthNote", [&] {
        auto note = std::make_shared<HealthNotes>();
        note->setDateTime(date);
        note->setOrdinal(workRecord_.Ordinal);
        note->setGroupId(groupId);
        note->setMeterGroupId(meterGroupId);
        return note;
    });
}

}  // namespace varnel::detail
