#include "contracts/transport.h"

#include <dlfcn.h>

#include <exception>
#include <functional>
#include <optional>
#include <thread>
#include <utility>
#include <vector>

#include "errors/err_propagator.h"
#include "platform/message_pump.h"

namespace varnel::detail {

namespace {

// Every function a transport must have, in the order of TransportFunctions.
#define VARNEL_REQUIRED_TRANSPORT_FUNCTIONS(X)                                                    \
    X(initialize_meter_structure) X(find_meter) X(initialize_meter_type_structure)               \
    X(vb_Chk4Meter) X(vb_Get_Meter_Firmware) X(vb_Tickle_Meter) X(close_meter)                   \
    X(vb_Clear_Meter_Datalog) X(vb_Read_Meter_Options) X(vb_Read_Meter_Option)                   \
    X(vb_Set_Meter_Option) X(vb_Set_Meter_Options) X(vb_Read_Meter_Clock) X(vb_Set_Meter_Clock)  \
    X(convert_to_seconds) X(convert_from_seconds) X(GetInitializedFlag) X(SetInitializedFlag)    \
    X(GetInsulinName) X(SetInsulinName) X(GetOralMedicationName) X(SetOralMedicationName)        \
    X(GetPredefinedInsulins) X(SetPredefinedInsulins) X(GetPredefinedOralMeds)                   \
    X(SetPredefinedOralMeds) X(GetMealSegments) X(SetMealSegments) X(GetScheduleSelection)       \
    X(SetScheduleSelection) X(GetTargetRange) X(SetTargetRange) X(GetMeterDatalog)               \
    X(GetMeterDatalogRecordData) X(vb_Upload_Meter_Datalog)

void requireComplete(const TransportFunctions& f) {
#define VARNEL_REQUIRE(name) \
    if (!f.name) raise(errc::transport_unavailable, "The transport has no function \"" #name "\"");
    VARNEL_REQUIRED_TRANSPORT_FUNCTIONS(VARNEL_REQUIRE)
#undef VARNEL_REQUIRE
}

// A transport over a table of functions, obtained on first use.
class TableTransport final : public Transport {
public:
    explicit TableTransport(std::function<TransportFunctions()> load) : load_(std::move(load)) {}

    std::int16_t initialize_meter_structure(METER_REC& rec) override {
        return call(&TransportFunctions::initialize_meter_structure, &rec);
    }
    std::int16_t find_meter(METER_REC& rec, std::int32_t found[11], std::int16_t ports[11]) override {
        return call(&TransportFunctions::find_meter, &rec, found, ports);
    }
    std::int16_t initialize_meter_type_structure(METER_REC& rec, std::int16_t type) override {
        return call(&TransportFunctions::initialize_meter_type_structure, &rec, type);
    }
    std::int16_t vb_Chk4Meter(METER_REC& rec) override { return call(&TransportFunctions::vb_Chk4Meter, &rec); }
    std::int16_t vb_Get_Meter_Firmware(METER_REC& rec) override {
        return call(&TransportFunctions::vb_Get_Meter_Firmware, &rec);
    }
    std::int16_t vb_Tickle_Meter(METER_REC& rec) override { return call(&TransportFunctions::vb_Tickle_Meter, &rec); }
    std::int16_t close_meter(METER_REC& rec) override { return call(&TransportFunctions::close_meter, &rec); }
    std::int16_t vb_Clear_Meter_Datalog(METER_REC& rec) override {
        return call(&TransportFunctions::vb_Clear_Meter_Datalog, &rec);
    }
    std::int16_t vb_Read_Meter_Options(METER_REC& rec) override {
        return call(&TransportFunctions::vb_Read_Meter_Options, &rec);
    }
    std::int16_t vb_Read_Meter_Option(METER_REC& rec, std::int16_t option) override {
        return call(&TransportFunctions::vb_Read_Meter_Option, &rec, option);
    }
    std::int16_t vb_Set_Meter_Option(METER_REC& rec, std::int16_t option, std::int16_t value) override {
        return call(&TransportFunctions::vb_Set_Meter_Option, &rec, option, value);
    }
    std::int16_t vb_Set_Meter_Options(METER_REC& rec, SETTINGS_REC& settings) override {
        return call(&TransportFunctions::vb_Set_Meter_Options, &rec, &settings);
    }
    std::int16_t vb_Read_Meter_Clock(METER_REC& rec, std::int32_t& seconds) override {
        return call(&TransportFunctions::vb_Read_Meter_Clock, &rec, &seconds);
    }
    std::int16_t vb_Set_Meter_Clock(METER_REC& rec, std::int32_t seconds) override {
        return call(&TransportFunctions::vb_Set_Meter_Clock, &rec, seconds);
    }
    std::int32_t convert_to_seconds(TIME_REC& time) override {
        return call(&TransportFunctions::convert_to_seconds, &time);
    }
    std::int16_t convert_from_seconds(std::int32_t seconds, TIME_REC& time) override {
        return call(&TransportFunctions::convert_from_seconds, seconds, &time);
    }
    std::int16_t GetInitializedFlag(METER_REC& rec, std::int16_t& flag) override {
        return call(&TransportFunctions::GetInitializedFlag, &rec, &flag);
    }
    std::int16_t SetInitializedFlag(METER_REC& rec, std::int16_t flag) override {
        return call(&TransportFunctions::SetInitializedFlag, &rec, flag);
    }
    std::int16_t GetInsulinName(METER_REC& rec, INSULIN_OR_ORAL_MED_NAME_TYPE& name) override {
        return call(&TransportFunctions::GetInsulinName, &rec, &name);
    }
    std::int16_t SetInsulinName(METER_REC& rec, INSULIN_OR_ORAL_MED_NAME_TYPE& name) override {
        return call(&TransportFunctions::SetInsulinName, &rec, &name);
    }
    std::int16_t GetOralMedicationName(METER_REC& rec, INSULIN_OR_ORAL_MED_NAME_TYPE& name) override {
        return call(&TransportFunctions::GetOralMedicationName, &rec, &name);
    }
    std::int16_t SetOralMedicationName(METER_REC& rec, INSULIN_OR_ORAL_MED_NAME_TYPE& name) override {
        return call(&TransportFunctions::SetOralMedicationName, &rec, &name);
    }
    std::int16_t GetPredefinedInsulins(METER_REC& rec, PREDEFINED_INSULINS_TYPE& v) override {
        return call(&TransportFunctions::GetPredefinedInsulins, &rec, &v);
    }
    std::int16_t SetPredefinedInsulins(METER_REC& rec, PREDEFINED_INSULINS_TYPE& v) override {
        return call(&TransportFunctions::SetPredefinedInsulins, &rec, &v);
    }
    std::int16_t GetPredefinedOralMeds(METER_REC& rec, PREDEFINED_ORAL_MEDS_TYPE& v) override {
        return call(&TransportFunctions::GetPredefinedOralMeds, &rec, &v);
    }
    std::int16_t SetPredefinedOralMeds(METER_REC& rec, PREDEFINED_ORAL_MEDS_TYPE& v) override {
        return call(&TransportFunctions::SetPredefinedOralMeds, &rec, &v);
    }
    std::int16_t GetMealSegments(METER_REC& rec, MEAL_SEGMENTS_TYPE& v) override {
        return call(&TransportFunctions::GetMealSegments, &rec, &v);
    }
    std::int16_t SetMealSegments(METER_REC& rec, MEAL_SEGMENTS_TYPE& v) override {
        return call(&TransportFunctions::SetMealSegments, &rec, &v);
    }
    std::int16_t GetScheduleSelection(METER_REC& rec, std::int16_t& selection) override {
        return call(&TransportFunctions::GetScheduleSelection, &rec, &selection);
    }
    std::int16_t SetScheduleSelection(METER_REC& rec, std::int16_t selection) override {
        return call(&TransportFunctions::SetScheduleSelection, &rec, selection);
    }
    std::int16_t GetTargetRange(METER_REC& rec, std::int16_t& befLow, std::int16_t& befHigh,
                                std::int16_t& aftLow, std::int16_t& aftHigh, std::int16_t& hypo) override {
        return call(&TransportFunctions::GetTargetRange, &rec, &befLow, &befHigh, &aftLow, &aftHigh, &hypo);
    }
    std::int16_t SetTargetRange(METER_REC& rec, std::int16_t befLow, std::int16_t befHigh,
                                std::int16_t aftLow, std::int16_t aftHigh, std::int16_t hypo) override {
        return call(&TransportFunctions::SetTargetRange, &rec, befLow, befHigh, aftLow, aftHigh, hypo);
    }
    std::int16_t GetMeterDatalog(METER_REC& rec, METER_BIN_DATALOG& datalog, std::int32_t startSeconds) override {
        return call(&TransportFunctions::GetMeterDatalog, &rec, &datalog, startSeconds);
    }
    std::int16_t GetMeterDatalogRecordData(METER_BIN_DATALOG& datalog, std::int16_t index,
                                           RECORD_DATA& record) override {
        return call(&TransportFunctions::GetMeterDatalogRecordData, &datalog, index, &record);
    }
    std::int16_t vb_Upload_Meter_Datalog(METER_REC& rec, METER_DATALOG& datalog) override {
        return call(&TransportFunctions::vb_Upload_Meter_Datalog, &rec, &datalog);
    }

private:
    // Runs one function; an error of a tick handler that ran while it yielded follows its return.
    template <class R, class... P, class... A>
    R call(R (*TransportFunctions::*member)(P...), A... args) {
        const R result = (functions().*member)(args...);
        if (auto error = takeYieldError()) std::rethrow_exception(error);
        return result;
    }

    const TransportFunctions& functions() {
        if (!table_) {
            TransportFunctions table = load_();
            requireComplete(table);
            table_ = table;
        }
        // The library keeps one hook per thread: give it this thread's pump.
        if (table_->vx_set_yield_hook && hookThread_ != std::this_thread::get_id()) {
            table_->vx_set_yield_hook(&pumpFromTransport, nullptr);
            hookThread_ = std::this_thread::get_id();
        }
        return *table_;
    }

    std::function<TransportFunctions()> load_;
    std::optional<TransportFunctions> table_;
    std::thread::id hookThread_;
};

// A library opened from the first of its candidate paths that loads; closed with the last transport over it.
class Library {
public:
    explicit Library(std::vector<std::string> paths) : paths_(std::move(paths)) {}
    ~Library() { close(); }
    Library(const Library&) = delete;
    Library& operator=(const Library&) = delete;

    // Opens the library and resolves every function; on failure it stays closed, so a later call retries.
    TransportFunctions open() {
        std::string tried;
        for (const std::string& path : paths_) {
            dlerror();
            handle_ = dlopen(path.c_str(), RTLD_NOW | RTLD_LOCAL);
            if (handle_) {
                path_ = path;
                break;
            }
            tried += (tried.empty() ? "\"" : "; \"") + path + "\": " + lastError();
        }
        if (!handle_) {
            // One path reads as before; several name each place looked at.
            const std::string what = paths_.size() == 1 ? "Cannot load the transport library "
                                                        : "Cannot find the transport library; tried ";
            raise(errc::transport_unavailable, what + tried);
        }
        TransportFunctions f{};
#define VARNEL_RESOLVE(name) f.name = reinterpret_cast<decltype(f.name)>(symbol(#name, true));
        VARNEL_REQUIRED_TRANSPORT_FUNCTIONS(VARNEL_RESOLVE)
#undef VARNEL_RESOLVE
        f.vx_set_yield_hook = reinterpret_cast<decltype(f.vx_set_yield_hook)>(symbol("vx_set_yield_hook", false));
        return f;
    }

private:
    void* symbol(const char* name, bool required) {
        dlerror();
        void* address = dlsym(handle_, name);
        if (!address && required) {
            const std::string reason = lastError();
            close();
            raise(errc::transport_unavailable, "The transport library \"" + path_ + "\" has no function \"" +
                                                   name + "\": " + reason);
        }
        return address;
    }

    void close() {
        if (handle_) dlclose(handle_);
        handle_ = nullptr;
    }

    static std::string lastError() {
        const char* text = dlerror();
        return text ? text : "unknown reason";
    }

    std::vector<std::string> paths_;
    std::string path_;  // the one opened
    void* handle_ = nullptr;
};

#undef VARNEL_REQUIRED_TRANSPORT_FUNCTIONS

}  // namespace

std::shared_ptr<Transport> loadTransport(const std::string& path) {
    return loadTransport(std::vector<std::string>{path});
}

std::shared_ptr<Transport> loadTransport(std::vector<std::string> candidates) {
    auto library = std::make_shared<Library>(std::move(candidates));
    return std::make_shared<TableTransport>([library] { return library->open(); });
}

std::shared_ptr<Transport> makeTransport(const TransportFunctions& functions) {
    return std::make_shared<TableTransport>([functions] { return functions; });
}

}  // namespace varnel::detail
