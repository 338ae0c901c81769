// The meter session: the one connection through which DllWrapper reaches a
// meter. It finds or re-attaches the meter, remembers who it is, creates its
// model object, erases and closes it, and relays progress.
#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <string>

#include "contracts/transport.h"
#include "platform/message_pump.h"
#include "readings/meter_fns.h"
#include "readings/meter_models.h"
#include "varnel/records.h"

namespace varnel::detail {

// Two copies of the meter record live here: the working record, which every
// transport call of the session gets, and the stored record (meterFns().MeterRec),
// which every other part reads. After each transport call the working record
// is stored; every read of a record value goes through a copy of the stored one.
class MeterDll {
public:
    explicit MeterDll(std::shared_ptr<Transport> transport);
    ~MeterDll();
    MeterDll(const MeterDll&) = delete;
    MeterDll& operator=(const MeterDll&) = delete;

    // Searches the preferred port; on success fills udtMeterRec, identifies the meter and reads its firmware.
    std::int16_t findmeter(METER_REC& udtMeterRec);
    // Asks the meter on the record's port who it is.
    std::int16_t checkmeter(METER_REC& udtMeterRec);
    // Rebuilds the session from a record kept from an earlier discovery; the firmware read's code.
    std::int16_t initMeter(METER_REC& udtMeterRec);
    // Empties the working record; always true.
    bool initialise();
    // Releases the meter (on the caller's record, leaving ME_QUIT in its Error_code); false when
    // the library could not release it, its code then in LastError.
    bool MeterClose(METER_REC& udtMeterRec);
    // Erases the meter's memory, relaying its progress; true on success.
    bool clearMeter();
    // True when the meter now answering carries the last identified serial number.
    bool isSameMeterConnected();
    // The open port's handle, 0 when none.
    void GetHandle(std::int32_t& longHandle);

    // The meter's initialised flag, read from or written to the meter.
    std::int16_t DevInitialised();
    // Reads the initialised flag into value: 0, or the transport's code (value then untouched).
    std::int16_t readDevInitialised(std::int16_t& value);
    // The transport's code for the write.
    std::int16_t setDevInitialised(std::int16_t value);

    // Values of the stored record.
    std::int16_t Calibration() const { return storedRecord().Plasma_cal_flag; }
    std::int16_t GlucoseLow() const { return storedRecord().Lower_glucose_report_level; }
    std::int16_t GlucoseHigh() const { return storedRecord().Upper_glucose_report_level; }
    std::int16_t CheckStripLow() const { return storedRecord().Checkstrip_range_lower_limit; }
    std::int16_t CheckStripHigh() const { return storedRecord().Checkstrip_range_upper_limit; }
    std::int16_t LastError() const { return storedRecord().Error_code; }
    std::int16_t COMPort_Detected() const { return storedRecord().port.com_number; }

    bool isInitialised() const { return isInitialised_; }
    bool isProcessing() const { return isProcessing_; }
    std::int16_t COMPort_Pref() const { return COMPort_Pref_; }
    void setCOMPort_Pref(std::int16_t port) { COMPort_Pref_ = port; }
    bool CanContinue() const { return CanContinue_; }
    void setCanContinue(bool value) { CanContinue_ = value; }
    // The model object of the last identified meter, or null.
    std::shared_ptr<MeterModel> Meter() const { return Meter_; }
    void setMeter(std::shared_ptr<MeterModel> meter) { Meter_ = std::move(meter); }
    const std::string& LastMeterSerialNo() const { return LastMeterSerialNo_; }
    std::int16_t LastMeterType() const { return LastMeterType_; }
    // The code of the last firmware read of find or init: 0 when the stored Firmware_number is the meter's.
    std::int16_t FirmwareCode() const { return FirmwareCode_; }
    // The code of the upload that was to give the serial number of a meter identifying itself as "00"
    // and failed: 0 when LastMeterSerialNo is what the meter says.
    std::int16_t SerialCode() const { return SerialCode_; }

    // A copy of the stored record.
    METER_REC storedRecord() const { return mobjMeterFns->MeterRec; }
    clsMeterFns& meterFns() { return *mobjMeterFns; }
    Transport& transport() { return *transport_; }

    // Progress of the session's long operations, 0-100.
    std::function<void(std::int16_t&)> onProgress;

private:
    enum class Step { Find, Check, Init };

    // The identification skeleton of findmeter, checkmeter and initMeter.
    std::int16_t identify(Step step, METER_REC& udtMeterRec);
    void AssignMeter();
    void MeterSerialNumberFix();
    // Copies the working record into the stored record.
    void store() { mobjMeterFns->MeterRec = working_; }
    void relayProgress(std::int16_t& percent);
    void timerTick();

    std::int16_t DevInitialised_ = 0;
    bool isInitialised_ = false;
    bool isProcessing_ = false;
    std::int16_t COMPort_Pref_ = 0;
    std::shared_ptr<MeterModel> Meter_;
    bool CanContinue_ = true;
    std::string LastMeterSerialNo_;
    std::int16_t LastMeterType_ = 0;
    std::int16_t FirmwareCode_ = 0;
    std::int16_t SerialCode_ = 0;
    METER_REC working_{};
    std::shared_ptr<Transport> transport_;
    std::shared_ptr<clsMeterFns> mobjMeterFns;
    // Held only while clearMeter runs.
    TimerControl* mobjTimer = nullptr;
    TimerConnection timerConnection_;
};

}  // namespace varnel::detail
