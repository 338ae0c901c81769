/*
 * Control of the simulated meters inside libvantrix32. Every function returns
 * 0 or a negative ReturnValues_Enum code (-19 for a bad argument, -17 for a
 * profile that could not be loaded or saved); vxsim_last_error() then tells
 * why, until the calling thread's next vxsim call.
 */
#ifndef VXSIM_H
#define VXSIM_H

#include "vantrix32.h"

#ifdef __cplusplus
extern "C" {
#endif

/* Replaces the meter by the one a profile file describes; on failure the old meter stays. */
VX_API int vxsim_load_profile(const char* path);
/* Writes what the meter holds now as a profile file. */
VX_API int vxsim_save_profile(const char* path);
/* The default meter: type 7 on port 1; faults cleared. */
VX_API int vxsim_reset(void);
/* The default meter of a type 1-8. */
VX_API int vxsim_select_type(int type);
/* Plugs the meter in or pulls it out. */
VX_API int vxsim_attach(void);
VX_API int vxsim_detach(void);
/* The nth call (1 = the next) of the named transport function returns code
 * (negative), once when persistent is 0, from then on otherwise. */
VX_API int vxsim_fail_call(const char* function, int nth, int code, int persistent);
VX_API int vxsim_clear_faults(void);
/* The meter's serial number, for identification and uploads. */
VX_API int vxsim_set_serial(const char* serial);
/* What identification alone answers (for example "00"); NULL or "" restores the serial. */
VX_API int vxsim_set_identity_serial(const char* serial);
/* Why the calling thread's last vxsim call failed; "" after a success. */
VX_API const char* vxsim_last_error(void);

#ifdef __cplusplus
}
#endif

#endif /* VXSIM_H */
