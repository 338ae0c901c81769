#include "session.h"

#include <cstdio>
#include <exception>
#include <utility>

#include "documents.h"
#include "interrupt.h"
#include "output.h"
#include "shared_library.h"
#include "printable.h"
#include "varnel/component_error.h"
#include "varnel/return_codes.h"

namespace varnel::cli {

int statusForCode(std::int32_t code) {
    if (code == 0) return exit_status::success;
    return code < 0 && code > -exit_status::other_code ? -code : exit_status::other_code;
}

namespace {

// An Error_code that asks a request to leave the meter open on its failure paths:
// the run releases it once, at its end.
constexpr std::int16_t kKeepMeterOpen = -50;

// What a ComponentError number means, for the one line a user reads.
std::string unexpected(const ComponentError& e, const std::string& during = "") {
    static const struct {
        std::int32_t number;
        const char* meaning;
    } kMeanings[] = {
        {errc::overflow, "a value does not fit its field"},
        {errc::subscript_out_of_range, "an index outside its array or collection"},
        {errc::missing_object, "a document element or meter model is missing"},
        {errc::document_failure, "a document could not be read or written"},
        {errc::transport_unavailable, "the transport library or one of its functions could not be loaded"},
        {errc::internal, "an internal failure"},
    };
    std::string text = "unexpected error " + std::to_string(e.number());
    for (const auto& m : kMeanings)
        if (m.number == e.number()) text += std::string(" (") + m.meaning + ")";
    return text + during + ", trace: " + e.description();
}

}  // namespace

std::string printable(const std::string& text) { return detail::printableText(text); }

void say(const std::string& text) {
    // Messages carry texts of captures, profiles and meters: none reaches the terminal raw.
    std::fprintf(stderr, "varnel: %s\n", printable(text).c_str());
    std::fflush(stderr);
}

MeterSession::MeterSession(MeterOptions options)
    : options_(std::move(options)),
      transportPath_(options_.transport.empty() ? DllWrapper::defaultTransportPath() : options_.transport),
      progress_(stderr, Progress::styleFor(stderr, options_.quiet)) {}

MeterSession::~MeterSession() = default;

int MeterSession::run(const std::function<void(MeterSession&)>& work) {
    int status = exit_status::success;
    try {
        checkBeforeTouching();
        attachSimulatedMeter();
        wrapper_ = std::make_unique<DllWrapper>(startCapture());
        wrapper_->setOnProgress([this](std::int16_t& percent) {
            // The handler only noted the signal; here, on our own thread, it is safe to say so.
            if (interruption() == 0) return progress_.update(percent);
            if (stopNoted_) return;
            stopNoted_ = true;
            progress_.finish();
            say("interrupted: stopping once the meter finishes its current step");
        });
        stopIfInterrupted();
        discover();
        stopIfInterrupted();
        work(*this);
        stopIfInterrupted();
    } catch (const RunEnd& end) {
        status = end.status;
    } catch (const ComponentError& e) {
        progress_.finish();
        say(unexpected(e));
        status = exit_status::component_error;
    } catch (const std::exception& e) {
        progress_.finish();
        say(e.what());
        status = exit_status::local_failure;
    }
    status = release(status);
    // A signal during the release stopped nothing: the command's work was done and stands.
    if (interruption() != 0 && !stopNoted_) say("interrupted while the meter was released; the command had finished");
    return finishCapture(saveSimulatedMeter(status));
}

void MeterSession::request(const std::string& label, const std::function<std::int32_t(XMLWrapper& status)>& call) {
    XMLWrapper status = emptyDocument(doc_kind::status);
    progress_.start(label);
    // Every request attaches the meter again, even one an earlier failure released.
    if (found_) record_.Error_code = kKeepMeterOpen;
    released_ = false;
    std::int32_t code = 0;
    try {
        code = call(status);
    } catch (const ComponentError& e) {
        noteRelease();
        progress_.finish();
        for (const std::string& text : statusDescriptions(status)) say(text);
        say(unexpected(e));
        throw RunEnd{exit_status::component_error};
    }
    noteRelease();
    if (code == 0) {
        // An interrupted request's bar stops where it was, not at 100%.
        stopIfInterrupted();
        return progress_.complete();
    }
    progress_.finish();
    const auto texts = statusDescriptions(status);
    for (const std::string& text : texts) say(text);
    // A failure always says something, even when the component wrote no description.
    if (texts.empty()) say(label + " failed: " + returnCodeText(code));
    throw RunEnd{statusForCode(code)};
}

void MeterSession::clearMeter() {
    stopIfInterrupted();
    try {
        request("clear", [this](XMLWrapper& status) { return wrapper_->clearMeter(record_, deviceInfo_, status); });
    } catch (const RunEnd& end) {
        // Once sent, the erase cannot be called back: a stop must not read as "not erased".
        if (end.status == exit_status::interrupted || end.status == exit_status::terminated)
            say("the erase had already been sent: meter " + sectionValue(deviceInfo_, "DeviceInfo", "SN") +
                " is erased");
        throw;
    }
}

void MeterSession::stopIfInterrupted() {
    const int signal = interruption();
    if (signal == 0) return;
    progress_.finish();
    if (!stopNoted_) say("interrupted");
    stopNoted_ = true;
    throw RunEnd{interruptedStatus(signal)};
}

void MeterSession::noteRelease() {
    // The component releases the meter on some failures whatever the client asked; its
    // release leaves ME_QUIT in the record. Releasing again would cost the close's waits twice.
    if (found_ && record_.Error_code == ME_QUIT) released_ = true;
}

void MeterSession::checkBeforeTouching() const {
    // Found now, a file that cannot be written would only fail once the meter was used.
    if (!options_.simSave.empty())
        if (const std::string why = unwritableReason(options_.simSave); !why.empty()) {
            say("cannot write " + options_.simSave + ": " + why);
            throw RunEnd{exit_status::cannot_create};
        }
    // The component would report a library it cannot load as an unexpected error, with its internals.
    if (!options_.transport.empty()) {
        const SharedLibrary library(options_.transport);
        if (!library) {
            std::string why = library.why();
            if (why.starts_with(options_.transport + ": ")) why.erase(0, options_.transport.size() + 2);
            say("cannot load the transport library " + options_.transport + ": " + why);
            throw RunEnd{exit_status::usage};
        }
    }
}

void MeterSession::attachSimulatedMeter() {
    if (options_.simType == 0 && options_.simProfile.empty() && options_.simSave.empty()) return;
    simulator_ = std::make_unique<SimulatorControls>(transportPath_);
    if (options_.simType != 0) simulator_->selectType(options_.simType);
    if (!options_.simProfile.empty()) simulator_->loadProfile(options_.simProfile);
}

std::string MeterSession::startCapture() {
    if (!options_.record.empty()) capture_ = CaptureControls::record(transportPath_, options_.record);
    if (!options_.replay.empty()) capture_ = CaptureControls::replay(options_.replay);
    return capture_ ? capture_->path() : transportPath_;
}

int MeterSession::finishCapture(int status) {
    if (!capture_) return status;
    // Where a replay parted from its capture, or why recording stopped, comes last.
    const std::string why = capture_->finish();
    if (why.empty()) return status;
    say(why);
    return status == exit_status::success ? exit_status::local_failure : status;
}

void MeterSession::discover() {
    XMLWrapper connection = connectionDocument(options_.port);
    deviceInfo_ = emptyDocument(doc_kind::device_info);
    request("discover", [&](XMLWrapper& status) {
        const std::int32_t code = wrapper_->discoverDevice(record_, deviceInfo_, connection, status);
        // Held from here on, even when a signal ends the run before the next request.
        found_ = code == 0;
        return code;
    });
}

int MeterSession::release(int status) {
    // Nothing was found, so nothing is held; a failed request may have released it already.
    if (!found_) return status;
    if (released_) {
        if (stopNoted_) say("meter released");
        return status;
    }
    try {
        const std::int32_t code = wrapper_->closeMeter(record_);
        if (code == 0) {
            if (stopNoted_) say("meter released");
            return status;
        }
        say("the meter could not be released: " + returnCodeText(code));
        return status == exit_status::success ? statusForCode(code) : status;
    } catch (const ComponentError& e) {
        say(unexpected(e, " releasing the meter"));
        return status == exit_status::success ? exit_status::component_error : status;
    }
}

int MeterSession::saveSimulatedMeter(int status) {
    if (!simulator_ || options_.simSave.empty()) return status;
    try {
        simulator_->saveProfile(options_.simSave);
        return status;
    } catch (const SimulatorError& e) {
        say(e.what());
        return status == exit_status::success ? exit_status::local_failure : status;
    }
}

}  // namespace varnel::cli
