// The capture libraries shipped beside the simulated transport: a recorder
// around the transport a session uses, or a replayer in its place.
#pragma once

#include <memory>
#include <stdexcept>
#include <string>

#include "shared_library.h"

namespace varnel::cli {

// A capture library that could not be loaded or refused to start; what() says why.
class CaptureError : public std::runtime_error {
public:
    using std::runtime_error::runtime_error;
};

class CaptureControls {
public:
    // Starts recording every call to the transport at `transport` into `file`.
    static std::unique_ptr<CaptureControls> record(const std::string& transport, const std::string& file);
    // Starts answering from the capture `file`.
    static std::unique_ptr<CaptureControls> replay(const std::string& file);
    ~CaptureControls();
    CaptureControls(const CaptureControls&) = delete;
    CaptureControls& operator=(const CaptureControls&) = delete;

    // The library to load as the session's transport.
    const std::string& path() const { return path_; }
    // Why the capture stopped answering or recording ("" while it is fine).
    std::string lastError() const;
    // Empty when nothing went wrong; for a replay, also when every recorded call was asked for.
    std::string finish();

private:
    CaptureControls(std::string path, bool replaying);
    void* symbol(const char* name) const;

    std::string path_;
    bool replaying_;
    SharedLibrary library_;
};

}  // namespace varnel::cli
