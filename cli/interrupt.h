// Ctrl-C and SIGTERM: noted by the signal handler, acted on by the command at its next safe point.
#pragma once

namespace varnel::cli {

// Installs the handlers for SIGINT and SIGTERM. They only note the signal; a second
// one of the same kind ends the process at once, as if varnel had no handler.
void catchInterruptions();

// The signal received so far (SIGINT, SIGTERM), or 0.
int interruption();

// The exit status for a run stopped by `signal`: 128 + its number (130, 143).
int interruptedStatus(int signal);

}  // namespace varnel::cli
