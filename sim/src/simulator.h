// The simulated meters behind libvantrix32: a meter is described by a
// MeterProfile; the process holds one simulator with one meter at a time.
// Tests link this library statically; clients reach the same controls through
// the C functions of varnel/vxsim.h.
#pragma once

#include <array>
#include <cstdint>
#include <stdexcept>
#include <string>
#include <vector>

#include "varnel/records.h"

namespace varnel::sim {

// One general option as the meter holds it (Availability: 0 none, 1 read-only, 2 writable).
struct OptionEntry {
    std::int16_t availability = 0;
    std::int16_t value = 0;
    std::int16_t min = 0;
    std::int16_t max = 0;
    bool operator==(const OptionEntry&) const = default;
};

// One slot of the insulin or oral-medication name table; the name is the
// meter's bytes up to the first zero (at most 10), kept without conversion.
struct NameSlot {
    std::string bytes;
    bool fixed = false;  // positions the meter does not let anyone rename
    bool operator==(const NameSlot&) const = default;
};

// Glucose target limits, in the order the transport passes them.
struct TargetLimits {
    std::int16_t beforeLow = 0, beforeHigh = 0, afterLow = 0, afterHigh = 0, hypo = 0;
    bool operator==(const TargetLimits&) const = default;
};

inline constexpr int kOptionCount = 19;
inline constexpr int kInsulinSlots = 21;  // 1-10 fixed, 11-21 custom
inline constexpr int kOralMedSlots = 15;  // 1-5 fixed, 6-15 custom
inline constexpr int kFirstCustomInsulin = 11;
inline constexpr int kFirstCustomOralMed = 6;

// Everything one simulated meter holds and how it talks.
struct MeterProfile {
    std::int16_t type = eMorvex;
    std::int16_t port = 1;
    std::string serial;            // the serial number the meter's uploads carry
    std::string identitySerial;    // what identification answers; empty: serial
    std::string firmware;          // "version mm/dd/yy"
    std::string name;              // Meter_name
    std::int32_t wireBaud = 9600;  // simulated line speed of long operations
    std::array<OptionEntry, kOptionCount> options{};
    std::vector<std::int16_t> languages;     // langMap, at most 20
    std::vector<std::int16_t> events;        // eventMap, at most 16
    std::vector<std::int16_t> insulinKinds;  // insulinMap, at most 14
    std::int16_t checkStripLow = 0, checkStripHigh = 0, checkStripApprox = 0;
    std::int16_t glucoseLow = 20, glucoseHigh = 600;
    std::int16_t glucoseErrorLow = -1, glucoseErrorHigh = 1023;
    std::int16_t plasmaCalibrated = 0;  // Plasma_cal_flag: 0 whole blood, 1 plasma
    std::int32_t clock = 0;             // meter clock, transport seconds
    std::int16_t initializedFlag = 0;
    std::int16_t maxRecords = 255;           // memory capacity in records
    std::vector<data_rec> datalog;           // record datalog (every type but 7)
    std::vector<RECORD_DATA> binaryDatalog;  // binary datalog (type 7)
    std::vector<int> corruptedRecords;       // binary records damaged in the meter's memory
    // Type 7 only: medication names, favourites, meal schedule and targets.
    std::vector<NameSlot> insulinNames;  // kInsulinSlots entries, position p at p - 1
    std::vector<NameSlot> oralMedNames;  // kOralMedSlots entries
    std::array<std::int16_t, 3> favoriteInsulins{};
    std::array<std::int16_t, 5> favoriteOralMeds{};
    std::int16_t scheduleSelection = 0;
    std::array<std::int16_t, 7> mealSegments{};  // quarter hours after midnight
    TargetLimits targets;
    bool attached = true;

    bool usesBinaryDatalog() const { return type == eMorvex; }
    // Field by field, datalog records included.
    bool operator==(const MeterProfile&) const;
};

// The believable default meter of a type 1-8; throws std::invalid_argument otherwise.
MeterProfile defaultProfile(int type);

// Throws std::invalid_argument describing the first thing the meter could not hold.
void validateProfile(const MeterProfile& profile);

// Reads a profile file; throws std::runtime_error naming the file and the problem.
MeterProfile readProfileFile(const std::string& path);
// Writes a profile file that readProfileFile reads back equal; throws std::runtime_error.
void writeProfileFile(const MeterProfile& profile, const std::string& path);

// Transport seconds (from 1 January 1970 00:00:00, local meter time) and calendar time.
std::int32_t toSeconds(const TIME_REC& time);            // -1 when the record is not a valid time
bool fromSeconds(std::int32_t seconds, TIME_REC& time);  // false for negative seconds
std::int32_t secondsOf(int year, int month, int day, int hour = 0, int minute = 0, int second = 0);

// The binary datalog encoding. encodeBinaryDatalog fills binBuf and recordCount
// (corruptedCount and maxRecordsForMeter are left alone); it throws
// std::length_error when the records do not fit and std::invalid_argument when
// a value cannot be held (both name the record).
void encodeBinaryDatalog(const std::vector<RECORD_DATA>& records, METER_BIN_DATALOG& datalog);
// Bytes the records take in binBuf.
std::size_t encodedSize(const std::vector<RECORD_DATA>& records);
// Bytes one record takes in binBuf after the header and offset table.
std::size_t encodedRecordSize(const RECORD_DATA& record);
// 0 and the record, or ME_BAD_PARAMETER (index), ME_CHKSUM_ERROR (damaged), ME_VALIDATION_ERROR (malformed).
std::int16_t decodeBinaryRecord(const METER_BIN_DATALOG& datalog, int index, RECORD_DATA& record);
// Damages record index in place so that decoding it fails; the others stay readable.
void corruptBinaryRecord(METER_BIN_DATALOG& datalog, int index);

// Controls of the process's one simulator. Each is safe to call from any thread.
void loadProfile(const MeterProfile& profile);  // validates first; throws std::invalid_argument
void loadProfileFile(const std::string& path);  // throws std::runtime_error; old meter kept on failure
void reset();                                   // default type 7 on port 1, faults cleared
void selectType(int type);                      // default profile of that type
void attach();
void detach();
void setSerial(const std::string& serial);          // identification and uploads
void setIdentitySerial(const std::string& serial);  // identification only ("00"); empty restores
// Makes the nth call (1 = the next) of the named transport function return code,
// once or from then on; the call then changes nothing but Error_code.
// Throws std::invalid_argument for an unknown function name, nth < 1 or code >= 0.
void injectFault(const std::string& function, int nth, std::int16_t code, bool persistent);
void clearFaults();

// What the meter holds now (the clock as it reads at this moment).
MeterProfile meter();
bool portOpen();
// Calls of the named transport function since the last reset or profile load.
int callCount(const std::string& function);
// The names injectFault accepts: every transport function that reports a status.
std::vector<std::string> faultableFunctions();

}  // namespace varnel::sim
