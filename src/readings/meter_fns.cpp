#include "readings/meter_fns.h"

#include <algorithm>
#include <cmath>
#include <iterator>
#include <optional>
#include <utility>

#include "component/err_propagator.h"
#include "readings/meter_reads.h"
#include "util/helpers.h"

namespace varnel::detail {

namespace {

constexpr const char* kClass = "clsMeterFns";

// Blood-test ResultType by T_Type: 10 normal test, 20 check strip, 21 control solution.
constexpr std::int32_t kTestTypes[16] = {10, 0, 20, 0, 0, 21, 0, 0, 0, 0, 0, 0, 0, 0, 0, 0};

// Insulin names of the record datalog by T_Type (12 and 13 are pump and food records).
constexpr const char* kInsulinNames[15] = {"Regular", "NPH",   "Lente", "",      "Ultralente",
                                           "80/20",   "70/30", "60/40", "50/50", "Mixed",
                                           "Other",   "",      "",      "",      ""};

// Health-note flags of a binary record, in the order their results are made.
constexpr std::pair<std::int16_t RECORD_DATA::*, std::int32_t> kHealthNotes[] = {
    {&RECORD_DATA::stressFlag, 170},  {&RECORD_DATA::feelHypoFlag, 171},
    {&RECORD_DATA::illnessFlag, 172}, {&RECORD_DATA::mensesFlag, 173},
    {&RECORD_DATA::vacationFlag, 174}, {&RECORD_DATA::otherFlag, 175}};

// Glucose comment codes for the same flags, in the order they are added.
constexpr std::pair<std::int16_t RECORD_DATA::*, std::int32_t> kGlucoseFlagComments[] = {
    {&RECORD_DATA::stressFlag, 17},  {&RECORD_DATA::feelHypoFlag, 14},
    {&RECORD_DATA::illnessFlag, 13}, {&RECORD_DATA::mensesFlag, 18},
    {&RECORD_DATA::vacationFlag, 19}, {&RECORD_DATA::otherFlag, 15}};

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

}  // namespace

// Group numbering across the records of one binary conversion.
struct clsMeterFns::Grouping {
    std::int16_t group = 0;
    std::int16_t meterGroup = 0;
    bool open = false;
    bool placed = false;  // a value of the current record has taken its group
    DateTime date;
    std::optional<DateTime> lastFoodDate;
    std::optional<DateTime> lastCholesterolDate;

    void newGroup() { group = toInt16(group + 1); }
    void newMeterGroup() { meterGroup = toInt16(meterGroup + 1); }

    // A value of types 20, 33, 35, 36 joins the open group or opens one.
    void join() {
        if (!open) {
            newGroup();
            open = true;
        }
    }

    // A value of types 21 and 34 joins the open group unless that holds values
    // of another date. The record's second value goes with its first.
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

clsMeterFns::clsMeterFns(std::shared_ptr<Transport> sessionTransport)
    : transport(std::move(sessionTransport)),
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

bool clsMeterFns::NonFastmeterUpload(std::string&, std::int16_t&, ResultCollection& objresultcol) {
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
        glucose->Comments()->Add(test.Event_code, 1, 1);
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

bool clsMeterFns::Fastmeterupload(std::string&, std::int16_t&, ResultCollection& objresultcol,
                                  const std::vector<std::string>& OralMedsArray,
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
                convertBinaryRecord(grouping, date, objresultcol, OralMedsArray, InsulinsArray);
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

void clsMeterFns::convertBinaryRecord(Grouping& g, const DateTime& date, ResultCollection& out,
                                      const std::vector<std::string>& OralMedsArray,
                                      const std::vector<std::string>& InsulinsArray) {
    const RECORD_DATA& w = workRecord_;
    g.date = date;
    g.placed = false;
    auto stamp = [&](auto r) {
        r->setDateTime(g.date);
        r->setOrdinal(w.Ordinal);
        return r;
    };
    // A grouped result carrying one value of a two-value record.
    auto grouped = [&](auto r, auto value, std::int32_t type) {
        stamp(r);
        r->setResultType(type);
        r->setValue(value);
        g.mark(*r);
        return r;
    };
    auto food = [&](std::int16_t value, std::int32_t type) {
        // Segments 0-2 are the three meals; segment 3 is a snack, with its own types.
        if (w.mealSegment == 3) type += 5;
        auto r = grouped(std::make_shared<Food>(), std::int32_t(value), type);
        if (w.mealSegment >= 0 && w.mealSegment <= 2) r->setMealSlot(1 + 2 * w.mealSegment);
        out.Add(r);
    };
    auto cholesterol = [&](std::int16_t value, std::int32_t type, std::int32_t limit) {
        auto r = grouped(std::make_shared<Cholestrol>(), double(value), type);
        r->setUnitType(0);
        r->setValueInMeterRange(value > limit ? 1 : 3);
        out.Add(r);
    };

    switch (w.recType) {
    case 0: {
        auto glucose = stamp(std::make_shared<Glucose>());
        glucose->setUnitType(0);
        if (w.dietLabel != 0) glucose->setSlot(w.dietLabel);
        glucose->setCalibration(w.controlFlag == 1 ? 1 : 2);
        glucose->setValue(w.reading);
        glucose->setResultType(w.alternateSiteFlag == 1 ? 11 : w.controlFlag == 1 ? 21 : 10);
        auto comments = glucose->Comments();
        constexpr std::int32_t kExerciseComments[] = {11, 10, 12};
        if (w.exerciseLabel >= 1 && w.exerciseLabel <= 3) comments->Add(kExerciseComments[w.exerciseLabel - 1], 1, 1);
        for (auto [flag, code] : kGlucoseFlagComments)
            if (w.*flag == 1) comments->Add(code, 1, 1);
        out.Add(glucose);
        break;
    }
    case 10: {
        auto meds = stamp(std::make_shared<OralMeds>());
        meds->setOralMedsName(at(OralMedsArray, w.oralMedType - 1));
        meds->setValue(w.oralMedDosage);
        out.Add(meds);
        break;
    }
    case 11: {
        auto injection = stamp(std::make_shared<InsulinInjection>());
        injection->setInsulinName(at(InsulinsArray, w.InsulinType - 1));
        injection->setValue(w.insulinDosage);
        out.Add(injection);
        break;
    }
    case 12:
    case 13: {
        auto pump = stamp(std::make_shared<InsulinPump>());
        pump->setResultType(w.recType == 12 ? 41 : 40);
        pump->setValue(w.recType == 12 ? w.bolusSetting : w.dailyTotalSetting);
        out.Add(pump);
        break;
    }
    case 20:
        if (w.mealSegment == 4) {
            out.Add(stamp(std::make_shared<Alcohol>()));
            g.open = false;
            break;
        }
        g.newMeterGroup();
        for (auto [value, type] : {std::pair{w.carbs, 50}, std::pair{w.fats, 52}}) {
            if (missing(value)) continue;
            g.join();
            food(value, type);
        }
        if (g.open) g.lastFoodDate = g.date;
        break;
    case 21:
        if (w.mealSegment == 4) {
            if (g.open) ++unmatchedCount_;
            break;
        }
        g.newMeterGroup();
        for (auto [value, type] : {std::pair{w.calories, 51}, std::pair{w.protein, 53}}) {
            if (missing(value)) continue;
            g.joinDated(g.lastFoodDate, type == 51, true);
            food(value, type);
        }
        g.open = false;
        break;
    case 30: {
        auto r = stamp(std::make_shared<ketones>());
        if (w.ketones >= 0 && w.ketones <= 4) r->setResultType(110 + w.ketones);
        out.Add(r);
        break;
    }
    case 31: {
        auto r = stamp(std::make_shared<hbA1C>());
        r->setValue(w.hbA1C);
        out.Add(r);
        break;
    }
    case 32: {
        auto r = stamp(std::make_shared<microalbumin>());
        r->setValue(w.microalbumin);
        r->setResultType(w.microalbumin == -1 ? 120 : w.microalbumin == 0 ? 121 : w.microalbumin == -2 ? 122 : 123);
        out.Add(r);
        break;
    }
    case 33:
        g.newMeterGroup();
        for (auto [value, type] : {std::pair{w.cholesterolLDL, 130}, std::pair{w.cholesterolHDL, 131}}) {
            if (missing(value)) continue;
            g.join();
            cholesterol(value, type, 500);
        }
        if (g.open) g.lastCholesterolDate = g.date;
        break;
    case 34:
        g.newMeterGroup();
        if (!missing(w.cholesterolTotal)) {
            g.joinDated(g.lastCholesterolDate, true, false);
            cholesterol(w.cholesterolTotal, 140, 1000);
        }
        if (!missing(w.cholesterolTriglyceride)) {
            g.joinDated(g.lastCholesterolDate, false, false);
            cholesterol(w.cholesterolTriglyceride, 150, 3000);
        }
        g.open = false;
        g.lastCholesterolDate.reset();
        break;
    case 35:
        g.newMeterGroup();
        for (auto [value, type] : {std::pair{w.bloodPressureSystole, 90}, std::pair{w.bloodPressureDiastole, 91}}) {
            if (missing(value)) continue;
            g.join();
            out.Add(grouped(std::make_shared<BloodPressure>(), std::int32_t(value), type));
        }
        g.open = false;
        break;
    case 36: {
        g.newMeterGroup();
        // Copies: the packed record's doubles cannot be bound to references.
        const double weight = w.weight, height = w.height;
        for (auto [value, type] : {std::pair{weight, 100}, std::pair{height, 101}}) {
            if (missing(value)) continue;
            g.join();
            out.Add(grouped(std::make_shared<BodyDimensions>(), value, type));
        }
        g.open = false;
        break;
    }
    case 37:
        g.newGroup();
        g.newMeterGroup();
        for (auto [flag, type] : kHealthNotes) {
            if (w.*flag != 1) continue;
            auto note = getNewHealthNote(g.group, g.meterGroup, g.date);
            note->setResultType(type);
            out.Add(note);
        }
        g.open = false;
        break;
    case 38: {
        g.newGroup();
        g.newMeterGroup();
        auto visit = stamp(std::make_shared<LastVisits>());
        visit->setValue(0);
        if (w.visit >= 0 && w.visit <= 2) visit->setResultType(160 + w.visit);
        g.mark(*visit);
        out.Add(visit);
        g.open = false;
        break;
    }
    case 45: {
        auto exercise = stamp(std::make_shared<Exercise>());
        if (w.ExerciseLevel >= 0 && w.ExerciseLevel <= 2) exercise->setResultType(60 + w.ExerciseLevel);
        exercise->setHours(w.exerciseDuration / 60);
        exercise->setMinutes(w.exerciseDuration % 60);
        out.Add(exercise);
        g.open = false;
        break;
    }
    case 52: {
        auto change = stamp(std::make_shared<CalCode>());
        change->setFromValue(std::to_string(w.oldCalCode));
        change->setToValue(std::to_string(w.newCalCode));
        out.Add(change);
        break;
    }
    default:
        break;
    }
}

}  // namespace varnel::detail
