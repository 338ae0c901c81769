// The C interface: each function forwards to DllWrapper or XMLWrapper, and
// no exception leaves it.
#include "varnel/varnel.h"

#include <cstdlib>
#include <cstring>
#include <memory>
#include <new>
#include <string>
#include <utility>

#include "errors/err_propagator.h"
#include "varnel/dll_wrapper.h"
#include "varnel/readings.h"
#include "varnel/xml_wrapper.h"

struct varnel_doc {
    varnel::XMLWrapper xml;
};

struct varnel_component {
    explicit varnel_component(const char* path)
        : wrapper(path ? varnel::DllWrapper(std::string(path)) : varnel::DllWrapper()) {}
    varnel::DllWrapper wrapper;
    std::int32_t errorNumber = 0;
    std::string errorText;
    bool hasError = false;
};

namespace varnel::detail {
namespace {

// Runs one request on c: a missing argument is ME_BAD_PARAMETER; an error
// leaving the request is kept on c and answered with the code the request's
// handler reports (ME_UNKNOWN).
template <class F>
std::int32_t request(varnel_component* c, bool argumentsPresent, F&& body) {
    if (!c) return ME_BAD_PARAMETER;
    c->errorNumber = 0;
    c->errorText.clear();
    c->hasError = false;
    if (!argumentsPresent) return ME_BAD_PARAMETER;
    try {
        return body(c->wrapper);
    } catch (...) {
        try {
            const CaughtError caught = currentError();
            c->errorNumber = caught.number;
            c->errorText = clientErrorText(caught);
        } catch (...) {
            // Memory ran out while describing the error: the number alone still tells.
            c->errorNumber = errc::internal;
            c->errorText.clear();
        }
        c->hasError = true;
        return ME_UNKNOWN;
    }
}

// Runs body; any exception becomes `failed`.
template <class R, class F>
R shielded(R failed, F&& body) noexcept {
    try {
        return body();
    } catch (...) {
        return failed;
    }
}

// Runs a request that says whether the meter should be checked again, and hands that to the
// caller when it asked (check_meter may be null) exactly as the C++ flag is left: written
// (1) once the port is accepted, on every exit, an unexpected error included; untouched
// when the port is refused.
template <class F>
std::int32_t reportingCheck(int* check_meter, F&& call) {
    struct HandOver {
        int* to;
        bool check = false;
        ~HandOver() {
            if (to && check) *to = 1;
        }
    } flag{check_meter};
    return call(flag.check);
}

// A text the client releases with varnel_free; NULL when out of memory.
char* copyOf(const std::string& text) {
    char* copy = static_cast<char*>(std::malloc(text.size() + 1));
    if (copy) std::memcpy(copy, text.c_str(), text.size() + 1);
    return copy;
}

}  // namespace
}  // namespace varnel::detail

using varnel::DllWrapper;
using varnel::XMLWrapper;
using varnel::detail::copyOf;
using varnel::detail::reportingCheck;
using varnel::detail::request;
using varnel::detail::shielded;

extern "C" {

varnel_doc* varnel_doc_new(void) { return new (std::nothrow) varnel_doc; }

varnel_doc* varnel_doc_new_kind(int32_t kind) {
    return shielded<varnel_doc*>(nullptr, [&] {
        auto doc = std::make_unique<varnel_doc>();
        doc->xml.InitDocument(kind);
        return doc.release();
    });
}

int varnel_doc_load(varnel_doc* doc, const char* xml) {
    if (!doc || !xml) return 1;
    return shielded(1, [&] { return doc->xml.LoadXML(xml) ? 0 : 1; });
}

char* varnel_doc_xml(const varnel_doc* doc) {
    if (!doc) return nullptr;
    return shielded<char*>(nullptr, [&] { return copyOf(doc->xml.XML()); });
}

char* varnel_doc_readings_json(const varnel_doc* datalog, int glucose_mmol) {
    if (!datalog) return nullptr;
    return shielded<char*>(nullptr, [&] {
        const auto unit = glucose_mmol ? varnel::GlucoseUnit::mmol : varnel::GlucoseUnit::meter;
        return copyOf(varnel::readingsJson(varnel::readDatalog(datalog->xml.XML()), unit));
    });
}

void varnel_doc_free(varnel_doc* doc) { delete doc; }

void varnel_free(void* text) { std::free(text); }

varnel_component* varnel_new(const char* transport_path) {
    return shielded<varnel_component*>(nullptr, [&] { return new varnel_component(transport_path); });
}

void varnel_delete(varnel_component* c) {
    // Releasing the transport library runs no request; nothing it raises reaches the caller.
    shielded(0, [&] {
        delete c;
        return 0;
    });
}

int32_t varnel_discover_device(varnel_component* c, METER_REC* rec, varnel_doc* device_info, varnel_doc* conn_info,
                               varnel_doc* status) {
    return request(c, rec && device_info && conn_info && status, [&](DllWrapper& w) {
        return w.discoverDevice(*rec, device_info->xml, conn_info->xml, status->xml);
    });
}

int32_t varnel_set_device_settings(varnel_component* c, METER_REC* rec, varnel_doc* device_info, varnel_doc* device_cfg,
                                   varnel_doc* status) {
    return request(c, rec && device_info && device_cfg && status, [&](DllWrapper& w) {
        return w.setDeviceSettings(*rec, device_info->xml, device_cfg->xml, status->xml);
    });
}

int32_t varnel_get_device_settings(varnel_component* c, METER_REC* rec, varnel_doc* device_info, varnel_doc* device_cfg,
                                   int fetch_all, varnel_doc* status, int* check_meter) {
    return request(c, rec && device_info && device_cfg && status, [&](DllWrapper& w) {
        return reportingCheck(check_meter, [&](bool& check) {
            return w.getDeviceSettings(*rec, device_info->xml, device_cfg->xml, fetch_all != 0, status->xml, check);
        });
    });
}

int32_t varnel_get_device_caps(varnel_component* c, METER_REC* rec, varnel_doc* device_info, varnel_doc* device_caps,
                               int fetch_all, varnel_doc* status, int* check_meter) {
    return request(c, rec && device_info && device_caps && status, [&](DllWrapper& w) {
        return reportingCheck(check_meter, [&](bool& check) {
            return w.getDeviceCaps(*rec, device_info->xml, device_caps->xml, fetch_all != 0, status->xml, check);
        });
    });
}

int32_t varnel_get_readings(varnel_component* c, METER_REC* rec, varnel_doc* device_info, varnel_doc* datalog,
                            varnel_doc* filter, varnel_doc* status, int* check_meter) {
    return request(c, rec && device_info && datalog && status, [&](DllWrapper& w) {
        XMLWrapper noFilter;
        return reportingCheck(check_meter, [&](bool& check) {
            return w.getReadings(*rec, device_info->xml, datalog->xml, filter ? filter->xml : noFilter, status->xml,
                                 check);
        });
    });
}

int32_t varnel_clear_meter(varnel_component* c, METER_REC* rec, varnel_doc* device_info, varnel_doc* status) {
    return request(c, rec && device_info && status,
                   [&](DllWrapper& w) { return w.clearMeter(*rec, device_info->xml, status->xml); });
}

int32_t varnel_close_meter(varnel_component* c, METER_REC* rec) {
    return request(c, rec != nullptr, [&](DllWrapper& w) { return w.closeMeter(*rec); });
}

void varnel_on_progress(varnel_component* c, void (*fn)(int16_t* percent, void* user), void* user) {
    if (!c) return;
    shielded(0, [&] {
        if (fn)
            c->wrapper.setOnProgress([fn, user](std::int16_t& percent) { fn(&percent, user); });
        else
            c->wrapper.setOnProgress(nullptr);
        return 0;
    });
}

void varnel_on_complete(varnel_component* c, void (*fn)(void* user), void* user) {
    if (!c) return;
    shielded(0, [&] {
        if (fn)
            c->wrapper.setOnComplete([fn, user] { fn(user); });
        else
            c->wrapper.setOnComplete(nullptr);
        return 0;
    });
}

int32_t varnel_error_number(const varnel_component* c) { return c && c->hasError ? c->errorNumber : 0; }

const char* varnel_error_text(const varnel_component* c) { return c && c->hasError ? c->errorText.c_str() : nullptr; }

}  // extern "C"
