#include "sim_control.h"

#include "varnel/vxsim.h"

namespace varnel::cli {

SimulatorControls::SimulatorControls(const std::string& path) : path_(path), library_(path) {
    if (!library_) throw SimulatorError("cannot load the transport library " + path + ": " + library_.why());
}

SimulatorControls::~SimulatorControls() = default;

void* SimulatorControls::symbol(const char* name) const {
    void* fn = library_.find(name);
    if (!fn)
        throw SimulatorError("the transport library " + path_ + " has no simulated meters (" + name +
                             " is missing); --sim-type, --sim-profile and --sim-save need the simulated transport");
    return fn;
}

void SimulatorControls::check(int code, const std::string& what) const {
    if (code == 0) return;
    using LastError = decltype(&vxsim_last_error);
    const char* why = reinterpret_cast<LastError>(symbol("vxsim_last_error"))();
    throw SimulatorError(what + ": " + (why && *why ? why : "code " + std::to_string(code)));
}

void SimulatorControls::selectType(int type) {
    using Select = decltype(&vxsim_select_type);
    check(reinterpret_cast<Select>(symbol("vxsim_select_type"))(type),
          "cannot attach a simulated meter of type " + std::to_string(type));
}

void SimulatorControls::loadProfile(const std::string& file) {
    using Load = decltype(&vxsim_load_profile);
    check(reinterpret_cast<Load>(symbol("vxsim_load_profile"))(file.c_str()),
          "cannot load the simulated meter profile " + file);
}

void SimulatorControls::saveProfile(const std::string& file) {
    using Save = decltype(&vxsim_save_profile);
    check(reinterpret_cast<Save>(symbol("vxsim_save_profile"))(file.c_str()),
          "cannot save the simulated meter to " + file);
}

}  // namespace varnel::cli
