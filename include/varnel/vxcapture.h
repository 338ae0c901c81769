/*
 * Capture and replay of a transport library's answers.
 *
 * libvarnel_record is a transport library that forwards every call to another
 * one and appends each call to a capture file; libvarnel_replay is a transport
 * library that answers from such a file, call by call. Load either by path
 * wherever a transport library is loaded. Both are configured by the
 * functions below or, when none was called before the first transport call,
 * by the environment: VARNEL_RECORD_FILE and VARNEL_RECORD_TRANSPORT (the
 * library to record; the simulated one beside libvarnel_record when unset),
 * VARNEL_REPLAY_FILE.
 *
 * Every function returns 0 or a negative ReturnValues_Enum code;
 * vxcap_last_error() then tells why. A transport call that fails for a reason
 * of the capture (a replay that diverges, a capture that cannot be written)
 * returns -17 and leaves the reason in vxcap_last_error(); every later call
 * fails the same way.
 */
#ifndef VXCAPTURE_H
#define VXCAPTURE_H

#include "vantrix32.h"

#ifdef __cplusplus
extern "C" {
#endif

/* libvarnel_record: loads the transport library at transport_path and starts a new capture file. */
VX_API int vxcap_record_start(const char* transport_path, const char* capture_path);

/* libvarnel_replay: reads a capture file; later transport calls are answered from it, from its first call. */
VX_API int vxcap_replay_start(const char* capture_path);
/* libvarnel_replay: 0 when every recorded call was replayed; -17 naming the next one otherwise. */
VX_API int vxcap_replay_finish(void);

/* Both: why the last call of the library failed ("" after a success). */
VX_API const char* vxcap_last_error(void);

#ifdef __cplusplus
}
#endif

#endif /* VXCAPTURE_H */
