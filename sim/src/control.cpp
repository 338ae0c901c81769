// The C controls of the simulator, for programs that load libvantrix32.
#include <new>
#include <string>

#include "simulator.h"
#include "varnel/vxsim.h"

namespace {

thread_local std::string t_lastError;

// Runs a control, turning its exception into a code and the thread's error text.
template <class Body>
int control(Body body) {
    try {
        body();
        t_lastError.clear();
        return ME_SUCCESS;
    } catch (const std::invalid_argument& e) {
        t_lastError = e.what();
        return ME_BAD_PARAMETER;
    } catch (const std::bad_alloc&) {
        t_lastError = "out of memory";
        return ME_NOMEM;
    } catch (const std::exception& e) {
        t_lastError = e.what();
        return ME_FAIL;
    }
}

std::string text(const char* s, const char* what) {
    if (!s) throw std::invalid_argument(std::string(what) + " is missing");
    return s;
}

}  // namespace

using namespace varnel::sim;

extern "C" {

VX_API int vxsim_load_profile(const char* path) {
    return control([&] { loadProfileFile(text(path, "profile path")); });
}

VX_API int vxsim_save_profile(const char* path) {
    return control([&] { writeProfileFile(meter(), text(path, "profile path")); });
}

VX_API int vxsim_reset(void) {
    return control([] { reset(); });
}

VX_API int vxsim_select_type(int type) {
    return control([&] { selectType(type); });
}

VX_API int vxsim_attach(void) {
    return control([] { attach(); });
}

VX_API int vxsim_detach(void) {
    return control([] { detach(); });
}

VX_API int vxsim_fail_call(const char* function, int nth, int code, int persistent) {
    return control([&] {
        if (code < -32768) throw std::invalid_argument("a failure code fits 16 bits");
        injectFault(text(function, "function name"), nth, static_cast<std::int16_t>(code), persistent != 0);
    });
}

VX_API int vxsim_clear_faults(void) {
    return control([] { clearFaults(); });
}

VX_API int vxsim_set_serial(const char* serial) {
    return control([&] { setSerial(text(serial, "serial number")); });
}

VX_API int vxsim_set_identity_serial(const char* serial) {
    return control([&] { setIdentitySerial(serial ? serial : ""); });
}

VX_API const char* vxsim_last_error(void) { return t_lastError.c_str(); }

}  // extern "C"
