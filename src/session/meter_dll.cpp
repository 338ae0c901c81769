#include "session/meter_dll.h"

#include "errors/err_propagator.h"
#include "platform/wait.h"
#include "util/helpers.h"

namespace varnel::detail {

namespace {

constexpr const char* kClass = "MeterDll";
constexpr int kSerialBytes = 20;

std::string serialText(const METER_REC& rec) { return BytesToText(rec.Serial_number, kSerialBytes); }

// Some meters only tell their serial number with an upload.
bool serialUnknown(const std::string& serial) {
    const std::string s = Trim(serial);
    return s.empty() || s == "00";
}

}  // namespace

MeterDll::MeterDll(std::shared_ptr<Transport> transport)
    : transport_(std::move(transport)), mobjMeterFns(std::make_shared<clsMeterFns>(transport_)) {
    mobjMeterFns->onProgress = [this](std::int16_t& percent) { relayProgress(percent); };
}

MeterDll::~MeterDll() {
    Meter_.reset();
    timerConnection_.disconnect();
    mobjTimer = nullptr;
    mobjMeterFns.reset();
}

std::int16_t MeterDll::identify(Step step, METER_REC& udtMeterRec) {
    isProcessing_ = true;
    working_ = udtMeterRec;
    std::int16_t code = 0;
    if (step == Step::Find) {
        std::int32_t found[11] = {};
        std::int16_t ports[11] = {COMPort_Pref_, 0};
        code = transport_->find_meter(working_, found, ports);
    } else if (step == Step::Check) {
        transport_->initialize_meter_type_structure(working_, working_.M_Type);
        WaitSeconds(0.1f);
        code = transport_->vb_Chk4Meter(working_);
    }
    store();
    udtMeterRec = working_;
    if (code == 0) {
        const METER_REC stored = storedRecord();
        LastMeterSerialNo_ = serialText(stored);
        LastMeterType_ = stored.M_Type;
        isInitialised_ = true;
        AssignMeter();
        MeterSerialNumberFix();
        if (step != Step::Check) {
            const std::int16_t firmware = transport_->vb_Get_Meter_Firmware(working_);
            // A failed read leaves whatever the record held: remembered, so nobody takes it for the meter's.
            FirmwareCode_ = firmware == 0 ? std::int16_t{0} : working_.Error_code != 0 ? working_.Error_code : firmware;
            if (step == Step::Init) code = firmware;
            store();
        }
    } else {
        isInitialised_ = true;
        Meter_.reset();
    }
    isProcessing_ = false;
    return code;
}

std::int16_t MeterDll::findmeter(METER_REC& udtMeterRec) {
    return guarded(kClass, "findmeter", [&] { return identify(Step::Find, udtMeterRec); });
}

std::int16_t MeterDll::checkmeter(METER_REC& udtMeterRec) {
    return guarded(kClass, "checkmeter", [&] { return identify(Step::Check, udtMeterRec); });
}

std::int16_t MeterDll::initMeter(METER_REC& udtMeterRec) {
    return guarded(kClass, "initMeter", [&] { return identify(Step::Init, udtMeterRec); });
}

void MeterDll::AssignMeter() {
    guarded(kClass, "AssignMeter", [&] {
        std::shared_ptr<MeterModel> meter = createMeterModel(storedRecord().M_Type);
        Meter_ = meter;
        meter->initialise(mobjMeterFns);
    });
}

void MeterDll::MeterSerialNumberFix() {
    guarded(kClass, "MeterSerialNumberFix", [&] {
        SerialCode_ = 0;
        if (!serialUnknown(LastMeterSerialNo_)) return;
        if (!Meter_) raise(errc::missing_object, "The session has no meter model");
        const std::int16_t code = Meter_->GetReadingFromMeter();
        LastMeterSerialNo_ = serialText(storedRecord());
        // A failed upload leaves the serial number unknown; "00" is not to be passed off as the meter's.
        if (code != 0 && serialUnknown(LastMeterSerialNo_)) SerialCode_ = code;
    });
}

bool MeterDll::initialise() {
    return guarded(kClass, "MeterInit", [&] {
        transport_->initialize_meter_structure(working_);
        store();
        return true;
    });
}

bool MeterDll::MeterClose(METER_REC& udtMeterRec) {
    return guarded(kClass, "MeterClose", [&] {
        udtMeterRec.Error_code = ME_QUIT;
        transport_->vb_Tickle_Meter(udtMeterRec);
        WaitSeconds(1.0f);
        const std::int16_t closed = transport_->close_meter(udtMeterRec);
        WaitSeconds(2.0f);
        Meter_.reset();
        isInitialised_ = false;
        // A port the library could not release is a failure the caller must hear of; the code
        // goes to the stored record so that LastError tells it.
        if (closed != 0) mobjMeterFns->MeterRec.Error_code = closed;
        return closed == 0;
    });
}

bool MeterDll::clearMeter() {
    // The timer stops on every way out, so no tick outlives the erase.
    struct TimerHold {
        MeterDll& session;
        ~TimerHold() {
            if (session.mobjTimer) session.mobjTimer->setEnabled(false);
            session.timerConnection_.disconnect();
            session.mobjTimer = nullptr;
        }
    };
    return guarded(kClass, "clearMeter", [&] {
        TimerHold hold{*this};
        mobjTimer = &frmTimer().tmrStatus();
        timerConnection_ = mobjTimer->onTick([this] { timerTick(); });
        frmTimer().enableTimer();
        const std::int16_t code = transport_->vb_Clear_Meter_Datalog(working_);
        store();
        return code == 0;
    });
}

void MeterDll::timerTick() {
    // The transport advances Percent_done in the record it was given, the
    // working record; the stored copy only catches up after the call.
    std::int16_t percent = working_.Percent_done;
    if (onProgress) onProgress(percent);
}

void MeterDll::relayProgress(std::int16_t& percent) {
    guarded(kClass, "mobjMeterFns_onProgress", [&] {
        if (onProgress) onProgress(percent);
    });
}

bool MeterDll::isSameMeterConnected() {
    return guarded(kClass, "isSameMeterConnected", [&] {
        transport_->vb_Chk4Meter(working_);
        store();
        return LastMeterSerialNo_ == serialText(storedRecord());
    });
}

void MeterDll::GetHandle(std::int32_t& longHandle) {
    guarded(kClass, "CancelProgress", [&] {
        const std::int32_t id = storedRecord().port.Id;
        longHandle = id >= 1 ? id : 0;
    });
}

std::int16_t MeterDll::DevInitialised() {
    readDevInitialised(DevInitialised_);
    return DevInitialised_;
}

std::int16_t MeterDll::readDevInitialised(std::int16_t& value) {
    METER_REC copy = storedRecord();
    std::int16_t flag = DevInitialised_;
    const std::int16_t code = transport_->GetInitializedFlag(copy, flag);
    if (code != 0) return copy.Error_code != 0 ? copy.Error_code : code;
    DevInitialised_ = flag;
    value = flag;
    return 0;
}

std::int16_t MeterDll::setDevInitialised(std::int16_t value) {
    DevInitialised_ = value;
    METER_REC copy = storedRecord();
    return transport_->SetInitializedFlag(copy, value);
}

}  // namespace varnel::detail
