#include "capture_control.h"

#include <filesystem>

#include "varnel/dll_wrapper.h"
#include "varnel/vxcapture.h"

namespace varnel::cli {

namespace {

// A capture library lies where the simulated transport does.
std::string besideTransport(const char* name) {
    return (std::filesystem::path(DllWrapper::defaultTransportPath()).parent_path() / name).string();
}

}  // namespace

CaptureControls::CaptureControls(std::string path, bool replaying)
    : path_(std::move(path)), replaying_(replaying), library_(path_) {
    if (!library_) throw CaptureError("cannot load the capture library " + path_ + ": " + library_.why());
}

CaptureControls::~CaptureControls() = default;

void* CaptureControls::symbol(const char* name) const {
    void* fn = library_.find(name);
    if (!fn) throw CaptureError("the capture library " + path_ + " has no " + name);
    return fn;
}

std::unique_ptr<CaptureControls> CaptureControls::record(const std::string& transport, const std::string& file) {
    std::unique_ptr<CaptureControls> c(new CaptureControls(besideTransport(VARNEL_RECORD_NAME), false));
    if (reinterpret_cast<decltype(&vxcap_record_start)>(c->symbol("vxcap_record_start"))(transport.c_str(),
                                                                                         file.c_str()) != 0)
        throw CaptureError("cannot record: " + c->lastError());
    return c;
}

std::unique_ptr<CaptureControls> CaptureControls::replay(const std::string& file) {
    std::unique_ptr<CaptureControls> c(new CaptureControls(besideTransport(VARNEL_REPLAY_NAME), true));
    if (reinterpret_cast<decltype(&vxcap_replay_start)>(c->symbol("vxcap_replay_start"))(file.c_str()) != 0)
        throw CaptureError("cannot replay: " + c->lastError());
    return c;
}

std::string CaptureControls::lastError() const {
    const char* why = reinterpret_cast<decltype(&vxcap_last_error)>(symbol("vxcap_last_error"))();
    return why ? why : "";
}

std::string CaptureControls::finish() {
    if (replaying_) reinterpret_cast<decltype(&vxcap_replay_finish)>(symbol("vxcap_replay_finish"))();
    return lastError();
}

}  // namespace varnel::cli
