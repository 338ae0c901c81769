#include "varnel/dll_wrapper.h"

#include <dlfcn.h>

#include <climits>
#include <cmath>
#include <filesystem>
#include <string>
#include <vector>

#include "component/dll_impl.h"
#include "errors/err_propagator.h"
#include "requests/request_frame.h"
#include "requests/discovery.h"
#include "requests/readings_document.h"
#include "requests/settings_requests.h"
#include "varnel/clock.h"

namespace varnel {

using detail::Request;

namespace {

// Where the shipped transport library may be: beside libvarnel, in a varnel/
// directory beside it (install layouts), then wherever the loader's own search
// finds it. The shared library is located through a symbol only it defines (the
// clock slot), so programs that also link the component's units statically, and
// sanitizer runtimes that stand in for the loader's caller, look in the same place.
std::vector<std::string> transportCandidates() {
    std::vector<std::string> candidates;
    Dl_info info{};
    if (dladdr(reinterpret_cast<void*>(&threadClock), &info) && info.dli_fname) {
        std::error_code ec;
        std::filesystem::path dir = std::filesystem::path(info.dli_fname).parent_path();
        const std::filesystem::path absolute = std::filesystem::absolute(dir, ec);
        if (!ec) dir = absolute;
        candidates.push_back((dir / VARNEL_TRANSPORT_NAME).string());
        candidates.push_back((dir / "varnel" / VARNEL_TRANSPORT_NAME).string());
    }
    candidates.push_back(VARNEL_TRANSPORT_NAME);
    return candidates;
}

}  // namespace

DllWrapper::Impl::Impl(std::shared_ptr<detail::Transport> transport)
    : transport(transport), mobjMeterDll(std::move(transport)) {
    mobjMeterDll.onProgress = [this](std::int16_t& percent) { RaiseProgress(percent); };
}

void DllWrapper::Impl::PercentLimit(std::int16_t x) {
    if (x == 0) return;
    lowerLimit_ = lowerLimit_ == -1 ? 0 : upperLimit_;
    upperLimit_ = x;
}

void DllWrapper::Impl::resetPercentage() {
    lowerLimit_ = -1;
    upperLimit_ = 100;
}

void DllWrapper::Impl::RaiseProgress(std::int16_t percent) {
    // Progress is a courtesy: nothing here, not even the client's handler, may fail a request.
    try {
        if (percent <= 0) return;
        const int product = (upperLimit_ - lowerLimit_) * percent;
        if (product < SHRT_MIN || product > SHRT_MAX) return;
        const double value = lowerLimit_ + std::nearbyint(product / 100.0);
        if (value < SHRT_MIN || value > SHRT_MAX) return;
        std::int16_t done = static_cast<std::int16_t>(value);
        if (onProgress) onProgress(done);
    } catch (...) {
    }
}

void DllWrapper::Impl::raiseComplete() {
    if (onComplete) onComplete();
}

DllWrapper::DllWrapper() : DllWrapper(detail::loadTransport(transportCandidates())) {}

DllWrapper::DllWrapper(const std::string& transportPath)
    : DllWrapper(detail::loadTransport(transportPath)) {}

DllWrapper::DllWrapper(std::shared_ptr<detail::Transport> transport)
    : impl_(std::make_unique<Impl>(std::move(transport))) {}

DllWrapper::~DllWrapper() = default;

std::string DllWrapper::GetTrueString() const { return "true"; }

std::string DllWrapper::GetFalseString() const { return "false"; }

std::int32_t DllWrapper::discoverDevice(METER_REC& udtMeterRec, XMLWrapper& objDeviceInfoXMLWrapper,
                                        XMLWrapper& objConnInfoXMLWrapper, XMLWrapper& objStatusInfoXMLWrapper) {
    return detail::discoverDevice(*impl_, udtMeterRec, objDeviceInfoXMLWrapper, objConnInfoXMLWrapper,
                                  objStatusInfoXMLWrapper);
}

std::int32_t DllWrapper::setDeviceSettings(METER_REC& udtMeterRec, XMLWrapper& objDeviceInfoXMLWrapper,
                                           XMLWrapper& objDeviceCfgXMLWrapper, XMLWrapper& objStatusInfoXMLWrapper) {
    return detail::setDeviceSettings(*impl_, udtMeterRec, objDeviceInfoXMLWrapper, objDeviceCfgXMLWrapper,
                                     objStatusInfoXMLWrapper);
}

std::int32_t DllWrapper::getDeviceSettings(METER_REC& udtMeterRec, XMLWrapper& objDeviceInfoXMLWrapper,
                                           XMLWrapper& objDeviceCfgXMLWrapper, bool blnFetchAllInfo,
                                           XMLWrapper& objStatusInfoXMLWrapper, bool& blnCheckMeter) {
    return detail::getDeviceSettings(*impl_, udtMeterRec, objDeviceInfoXMLWrapper, objDeviceCfgXMLWrapper,
                                     blnFetchAllInfo, objStatusInfoXMLWrapper, blnCheckMeter);
}

std::int32_t DllWrapper::getDeviceCaps(METER_REC& udtMeterRec, XMLWrapper& objDeviceInfoXMLWrapper,
                                       XMLWrapper& objDeviceCapsXMLWrapper, bool blnFetchAllInfo,
                                       XMLWrapper& objStatusInfoXMLWrapper, bool& blnCheckMeter) {
    return detail::getDeviceCaps(*impl_, udtMeterRec, objDeviceInfoXMLWrapper, objDeviceCapsXMLWrapper,
                                 blnFetchAllInfo, objStatusInfoXMLWrapper, blnCheckMeter);
}

std::int32_t DllWrapper::getReadings(METER_REC& udtMeterRec, XMLWrapper& objDeviceInfoXMLWrapper,
                                     XMLWrapper& objDatalogXMLWrapper, XMLWrapper& objFilterXMLWrapper,
                                     XMLWrapper& objStatusInfoXMLWrapper, bool& blnCheckMeter) {
    return detail::getReadings(*impl_, udtMeterRec, objDeviceInfoXMLWrapper, objDatalogXMLWrapper,
                               objFilterXMLWrapper, objStatusInfoXMLWrapper, blnCheckMeter);
}

std::int32_t DllWrapper::clearMeter(METER_REC& udtMeterRec, XMLWrapper& objDeviceInfoXMLWrapper,
                                    XMLWrapper& objStatusInfoXMLWrapper) {
    Request req(*impl_, "doAction", udtMeterRec, &objStatusInfoXMLWrapper);
    return req.run([&]() -> std::int32_t {
        if (!req.readPort(objDeviceInfoXMLWrapper) || !req.readIdentity(objDeviceInfoXMLWrapper))
            return req.complete(ME_BAD_PARAMETER);
        req.session.initMeter(udtMeterRec);
        if (std::int32_t c = req.checkMeter()) return c;
        if (std::int32_t r = req.compareIdentity()) return req.complete(r);

        std::shared_ptr<detail::MeterModel> meter = req.session.Meter();
        // Every erase is one stage of 0-100, whatever an earlier request left.
        impl_->resetPercentage();
        impl_->PercentLimit(100);
        std::int32_t result = ME_SUCCESS;
        {
            detail::ProgressTimer timer;
            if (!meter) {
                req.fail(ME_FAIL);
                result = ME_FAIL;
            } else if (!req.session.clearMeter()) {
                // A failed erase is never a success, even when the transport left no code behind.
                const std::int32_t e = req.session.LastError();
                result = e != 0 ? e : ME_FAIL;
                req.fail(result);
            }
        }
        impl_->resetPercentage();
        meter.reset();
        if (result != ME_SUCCESS) req.close();
        return req.complete(result);
    });
}

std::int32_t DllWrapper::closeMeter(METER_REC& udtMeterRec) {
    Request req(*impl_, "doAction", udtMeterRec, nullptr);
    return req.run([&]() -> std::int32_t {
        if (req.session.MeterClose(udtMeterRec)) return ME_SUCCESS;
        return req.session.LastError();
    });
}

void DllWrapper::setOnProgress(std::function<void(std::int16_t& intPercentDone)> handler) {
    impl_->onProgress = std::move(handler);
}

void DllWrapper::setOnComplete(std::function<void()> handler) { impl_->onComplete = std::move(handler); }

std::string DllWrapper::defaultTransportPath() {
    const std::vector<std::string> candidates = transportCandidates();
    for (const std::string& path : candidates) {
        std::error_code ec;
        if (std::filesystem::is_regular_file(path, ec)) return path;
    }
    return candidates.back();
}

}  // namespace varnel
