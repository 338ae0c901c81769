#include "interrupt.h"

#include <csignal>

namespace varnel::cli {

namespace {

volatile std::sig_atomic_t received = 0;

// Async-signal-safe: one store, nothing else.
extern "C" void note(int signal) { received = signal; }

}  // namespace

void catchInterruptions() {
    struct sigaction action {};
    action.sa_handler = note;
    sigemptyset(&action.sa_mask);
    // SA_RESTART: the transport's waits and our writes go on; SA_RESETHAND: a second signal is not ignored.
    action.sa_flags = SA_RESTART | SA_RESETHAND;
    sigaction(SIGINT, &action, nullptr);
    sigaction(SIGTERM, &action, nullptr);
}

int interruption() { return received; }

int interruptedStatus(int signal) { return 128 + signal; }

}  // namespace varnel::cli
