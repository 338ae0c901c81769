// One meter as a client program drives it: discovery first, then the command's
// requests, then the meter is released.
#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <string>

#include "capture_control.h"
#include "progress.h"
#include "sim_control.h"
#include "varnel/dll_wrapper.h"
#include "varnel/records.h"
#include "varnel/xml_wrapper.h"

namespace varnel::cli {

// Exit statuses; no two kinds of failure share one. `varnel --help` lists them.
namespace exit_status {
inline constexpr int success = 0;
// 1-62: a request failed; its return code made positive (statusForCode).
// A request code that does not fit that range.
inline constexpr int other_code = 63;
// A wrong command line, or a command that refuses to act as given (clear without --yes).
inline constexpr int usage = 64;
// The input file is not a document varnel can use.
inline constexpr int bad_input = 65;
// The component raised ComponentError (an unexpected failure).
inline constexpr int component_error = 70;
// The -o file cannot be written; found before the meter is touched.
inline constexpr int cannot_create = 73;
// varnel itself failed while running: the simulated meter, writing the output.
inline constexpr int local_failure = 74;
// Stopped by SIGINT (Ctrl-C) or SIGTERM.
inline constexpr int interrupted = 130;
inline constexpr int terminated = 143;
}  // namespace exit_status

// The exit status for a failed request's return code: the code made positive.
int statusForCode(std::int32_t code);

// The options every meter command takes.
struct MeterOptions {
    int port = 1;
    std::string transport;  // empty: the simulated transport shipped with Varnel
    int simType = 0;        // 0: leave the simulated meter as the library starts it
    std::string simProfile;
    std::string simSave;
    std::string record;  // a capture file to write, around the transport
    std::string replay;  // a capture file to answer from, in place of a transport
    bool quiet = false;
};

// A text for the terminal: control characters and bytes that are not UTF-8 escaped (\xNN).
// Every text of a capture, a profile or a meter the command shows goes through it.
std::string printable(const std::string& text);

// Prints "varnel: <text>" on standard error, printable.
void say(const std::string& text);

// Ends a run early with an exit status; the reason was already printed.
struct RunEnd {
    int status;
};

class MeterSession {
public:
    explicit MeterSession(MeterOptions options);
    ~MeterSession();
    MeterSession(const MeterSession&) = delete;
    MeterSession& operator=(const MeterSession&) = delete;

    // Attaches the simulated meter asked for, discovers the meter, runs `work`
    // and releases the meter; returns the exit status.
    int run(const std::function<void(MeterSession&)>& work);

    // Runs one request, showing its progress under `label`, with a fresh status
    // document. A failure prints each description of the status document and
    // throws RunEnd with the code made positive; a ComponentError prints its
    // number and trace and throws RunEnd with exit_status::component_error.
    void request(const std::string& label, const std::function<std::int32_t(XMLWrapper& status)>& call);

    // Erases the meter found by discovery. Interrupted once the erase was sent, it says the
    // meter is erased before the run ends.
    void clearMeter();

    // Ends the run with 130 or 143 when a signal came; call it at each safe point.
    void stopIfInterrupted();

    DllWrapper& wrapper() { return *wrapper_; }
    METER_REC& record() { return record_; }
    XMLWrapper& deviceInfo() { return deviceInfo_; }
    const MeterOptions& options() const { return options_; }

private:
    // What the command line names and the run needs: a --sim-save file it can write, a
    // --transport library that loads. Ends the run before anything is loaded or attached.
    void checkBeforeTouching() const;
    void attachSimulatedMeter();
    // The transport library to load: the one asked for, or a capture library around or instead of it.
    std::string startCapture();
    // A capture that went wrong turns a success into a failure.
    int finishCapture(int status);
    void discover();
    // closeMeter at the end of a run; a failure to release turns a success into a failure.
    int release(int status);
    // Notes whether the request just run released the meter itself.
    void noteRelease();
    int saveSimulatedMeter(int status);

    MeterOptions options_;
    std::string transportPath_;
    Progress progress_;
    std::unique_ptr<SimulatorControls> simulator_;  // declared before wrapper_: outlives it
    std::unique_ptr<CaptureControls> capture_;      // likewise
    std::unique_ptr<DllWrapper> wrapper_;
    METER_REC record_{};
    XMLWrapper deviceInfo_;
    bool found_ = false;
    bool released_ = false;  // a failed request already released the meter
    bool stopNoted_ = false;
};

}  // namespace varnel::cli
