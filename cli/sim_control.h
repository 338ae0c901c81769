// The simulated meters' controls, reached inside the very transport library the component loads.
#pragma once

#include <stdexcept>
#include <string>

#include "shared_library.h"

namespace varnel::cli {

// A control that could not be reached or refused; what() says which and why.
class SimulatorError : public std::runtime_error {
public:
    using std::runtime_error::runtime_error;
};

class SimulatorControls {
public:
    // Opens the transport library at `path`; the process shares it with DllWrapper,
    // so what is set here is the meter the component then finds.
    explicit SimulatorControls(const std::string& path);
    ~SimulatorControls();
    SimulatorControls(const SimulatorControls&) = delete;
    SimulatorControls& operator=(const SimulatorControls&) = delete;

    // Attaches the default meter of a type (1-8).
    void selectType(int type);
    // Attaches the meter a profile file describes.
    void loadProfile(const std::string& file);
    // Writes the meter as it is now, so a later run can attach it again.
    void saveProfile(const std::string& file);

private:
    void* symbol(const char* name) const;
    // Turns a control's failure into SimulatorError, with the simulator's own reason.
    void check(int code, const std::string& what) const;

    std::string path_;
    SharedLibrary library_;
};

}  // namespace varnel::cli
