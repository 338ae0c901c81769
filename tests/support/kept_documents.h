// Keeps the documents the suite's requests write, so that the schema test can
// check every one of them: when VARNEL_KEEP_DOCUMENTS names a directory, each
// document is saved there once (identical documents share a file).
#pragma once

#include <gtest/gtest.h>

#include <cstdint>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <functional>
#include <initializer_list>
#include <memory>
#include <string>
#include <unistd.h>

#include "component/wrapper_access.h"
#include "varnel/dll_wrapper.h"
#include "varnel/xml_wrapper.h"

namespace varnel::test {

// Saves each document that has a document element; nothing when VARNEL_KEEP_DOCUMENTS is unset.
inline void keepDocuments(std::initializer_list<const XMLWrapper*> docs) {
    const char* dir = std::getenv("VARNEL_KEEP_DOCUMENTS");
    if (!dir || !*dir) return;
    namespace fs = std::filesystem;
    fs::create_directories(dir);
    for (const XMLWrapper* doc : docs) {
        if (!doc || doc->IsEmpty()) continue;
        const std::string text = doc->XML();
        const fs::path path = fs::path(dir) / (std::to_string(std::hash<std::string>{}(text)) + ".xml");
        if (fs::exists(path)) continue;
        // Written aside and renamed, as test programs may run side by side.
        const fs::path part = path.string() + "." + std::to_string(::getpid());
        std::ofstream(part, std::ios::binary) << text;
        fs::rename(part, path);
    }
}

// A DllWrapper whose requests keep the status documents they write, also when a request
// fails unexpectedly, and the documents they answer in when they succeed (a failed
// request may leave a client's listing or a partial answer behind).
class RecordingWrapper {
public:
    explicit RecordingWrapper(std::shared_ptr<detail::Transport> transport)
        : inner_(detail::wrapperOver(std::move(transport))) {}

    operator DllWrapper&() { return inner_; }

    std::int32_t discoverDevice(METER_REC& rec, XMLWrapper& device, XMLWrapper& conn, XMLWrapper& status) {
        Keep keep{&status};
        return keep.answer(&device, inner_.discoverDevice(rec, device, conn, status));
    }
    std::int32_t setDeviceSettings(METER_REC& rec, XMLWrapper& device, XMLWrapper& cfg, XMLWrapper& status) {
        Keep keep{&status};
        return inner_.setDeviceSettings(rec, device, cfg, status);
    }
    std::int32_t getDeviceSettings(METER_REC& rec, XMLWrapper& device, XMLWrapper& cfg, bool all, XMLWrapper& status,
                                   bool& check) {
        Keep keep{&status};
        return keep.answer(&cfg, inner_.getDeviceSettings(rec, device, cfg, all, status, check));
    }
    std::int32_t getDeviceCaps(METER_REC& rec, XMLWrapper& device, XMLWrapper& caps, bool all, XMLWrapper& status,
                               bool& check) {
        Keep keep{&status};
        return keep.answer(&caps, inner_.getDeviceCaps(rec, device, caps, all, status, check));
    }
    std::int32_t getReadings(METER_REC& rec, XMLWrapper& device, XMLWrapper& log, XMLWrapper& filter,
                             XMLWrapper& status, bool& check) {
        Keep keep{&status};
        return keep.answer(&log, inner_.getReadings(rec, device, log, filter, status, check));
    }
    std::int32_t clearMeter(METER_REC& rec, XMLWrapper& device, XMLWrapper& status) {
        Keep keep{&status};
        return inner_.clearMeter(rec, device, status);
    }
    std::int32_t closeMeter(METER_REC& rec) { return inner_.closeMeter(rec); }
    void setOnProgress(std::function<void(std::int16_t&)> handler) { inner_.setOnProgress(std::move(handler)); }
    void setOnComplete(std::function<void()> handler) { inner_.setOnComplete(std::move(handler)); }

private:
    // Keeps the documents when the request returns or throws.
    struct Keep {
        const XMLWrapper* status;
        const XMLWrapper* answered = nullptr;
        std::int32_t answer(const XMLWrapper* doc, std::int32_t result) {
            if (result == ME_SUCCESS || result == ME_PARTIALSUCCESS) answered = doc;
            return result;
        }
        ~Keep() {
            try {
                keepDocuments({status, answered});
            } catch (const ComponentError&) {
                // A document of another XML component has no text of ours to keep.
            } catch (...) {
                ADD_FAILURE() << "could not keep a document in $VARNEL_KEEP_DOCUMENTS";
            }
        }
    };
    DllWrapper inner_;
};

}  // namespace varnel::test
