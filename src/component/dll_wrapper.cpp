#include "varnel/dll_wrapper.h"

#include <string>
#include <vector>

#include "component/wrapper_access.h"
#include "platform/native.h"
#include "requests/discovery.h"
#include "requests/meter_actions.h"
#include "requests/readings_document.h"
#include "requests/request_context.h"
#include "requests/settings_requests.h"

namespace varnel {

namespace {

// Where the shipped transport library may be: beside the module holding the
// component (libvarnel, the COM server, or a program linking the units
// statically), in a varnel/ directory beside it where the installed layout has
// one, then wherever the system's own search finds it.
std::vector<std::string> transportCandidates() {
    std::vector<std::string> candidates;
    const std::string dir = detail::native::ownModuleDirectory();
    const auto beside = [&](const std::string& name) {
        return dir.empty() ? name : dir + detail::native::pathSeparator() + name;
    };
    candidates.push_back(beside(VARNEL_TRANSPORT_NAME));
    if (*VARNEL_TRANSPORT_SUBDIR)
        candidates.push_back(beside(std::string(VARNEL_TRANSPORT_SUBDIR) + detail::native::pathSeparator() +
                                    VARNEL_TRANSPORT_NAME));
    candidates.push_back(VARNEL_TRANSPORT_NAME);
    return candidates;
}

}  // namespace

// What a DllWrapper keeps between requests. Only inline members, so nothing of
// it is exported with the class it is nested in.
struct DllWrapper::Impl {
    explicit Impl(std::shared_ptr<detail::Transport> transport) : context(std::move(transport)) {}
    detail::RequestContext context;
};

DllWrapper::DllWrapper() : impl_(std::make_unique<Impl>(detail::loadTransport(transportCandidates()))) {}

DllWrapper::DllWrapper(const std::string& transportPath)
    : impl_(std::make_unique<Impl>(detail::loadTransport(transportPath))) {}

DllWrapper::DllWrapper(std::unique_ptr<Impl> impl) : impl_(std::move(impl)) {}

DllWrapper detail::WrapperAccess::over(std::shared_ptr<Transport> transport) {
    return DllWrapper(std::make_unique<DllWrapper::Impl>(std::move(transport)));
}

DllWrapper::~DllWrapper() = default;

std::string DllWrapper::GetTrueString() const { return "true"; }

std::string DllWrapper::GetFalseString() const { return "false"; }

std::int32_t DllWrapper::discoverDevice(METER_REC& udtMeterRec, XMLWrapper& objDeviceInfoXMLWrapper,
                                        XMLWrapper& objConnInfoXMLWrapper, XMLWrapper& objStatusInfoXMLWrapper) {
    return detail::discoverDevice(impl_->context, udtMeterRec, objDeviceInfoXMLWrapper, objConnInfoXMLWrapper,
                                  objStatusInfoXMLWrapper);
}

std::int32_t DllWrapper::setDeviceSettings(METER_REC& udtMeterRec, XMLWrapper& objDeviceInfoXMLWrapper,
                                           XMLWrapper& objDeviceCfgXMLWrapper, XMLWrapper& objStatusInfoXMLWrapper) {
    return detail::setDeviceSettings(impl_->context, udtMeterRec, objDeviceInfoXMLWrapper, objDeviceCfgXMLWrapper,
                                     objStatusInfoXMLWrapper);
}

std::int32_t DllWrapper::getDeviceSettings(METER_REC& udtMeterRec, XMLWrapper& objDeviceInfoXMLWrapper,
                                           XMLWrapper& objDeviceCfgXMLWrapper, bool blnFetchAllInfo,
                                           XMLWrapper& objStatusInfoXMLWrapper, bool& blnCheckMeter) {
    return detail::getDeviceSettings(impl_->context, udtMeterRec, objDeviceInfoXMLWrapper, objDeviceCfgXMLWrapper,
                                     blnFetchAllInfo, objStatusInfoXMLWrapper, blnCheckMeter);
}

std::int32_t DllWrapper::getDeviceCaps(METER_REC& udtMeterRec, XMLWrapper& objDeviceInfoXMLWrapper,
                                       XMLWrapper& objDeviceCapsXMLWrapper, bool blnFetchAllInfo,
                                       XMLWrapper& objStatusInfoXMLWrapper, bool& blnCheckMeter) {
    return detail::getDeviceCaps(impl_->context, udtMeterRec, objDeviceInfoXMLWrapper, objDeviceCapsXMLWrapper,
                                 blnFetchAllInfo, objStatusInfoXMLWrapper, blnCheckMeter);
}

std::int32_t DllWrapper::getReadings(METER_REC& udtMeterRec, XMLWrapper& objDeviceInfoXMLWrapper,
                                     XMLWrapper& objDatalogXMLWrapper, XMLWrapper& objFilterXMLWrapper,
                                     XMLWrapper& objStatusInfoXMLWrapper, bool& blnCheckMeter) {
    return detail::getReadings(impl_->context, udtMeterRec, objDeviceInfoXMLWrapper, objDatalogXMLWrapper,
                               objFilterXMLWrapper, objStatusInfoXMLWrapper, blnCheckMeter);
}

std::int32_t DllWrapper::clearMeter(METER_REC& udtMeterRec, XMLWrapper& objDeviceInfoXMLWrapper,
                                    XMLWrapper& objStatusInfoXMLWrapper) {
    return detail::clearMeter(impl_->context, udtMeterRec, objDeviceInfoXMLWrapper, objStatusInfoXMLWrapper);
}

std::int32_t DllWrapper::closeMeter(METER_REC& udtMeterRec) { return detail::closeMeter(impl_->context, udtMeterRec); }

void DllWrapper::setOnProgress(std::function<void(std::int16_t& intPercentDone)> handler) {
    impl_->context.onProgress = std::move(handler);
}

void DllWrapper::setOnComplete(std::function<void()> handler) { impl_->context.onComplete = std::move(handler); }

std::string DllWrapper::defaultTransportPath() {
    const std::vector<std::string> candidates = transportCandidates();
    for (const std::string& path : candidates)
        if (detail::native::isFile(path)) return path;
    return candidates.back();
}

}  // namespace varnel
