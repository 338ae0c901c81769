/**
 * @file varnel.h
 * The component as a C interface, for C programs and any language with a C
 * foreign-function interface. One varnel_component stands for one DllWrapper
 * and one varnel_doc for one XMLWrapper; the requests, their documents and
 * their codes are those of include/varnel/dll_wrapper.h.
 *
 * Every request returns a ReturnValues_Enum code (records.h): 0 success,
 * negative failure, and writes its reports into the status document. A
 * request that fails unexpectedly returns ME_UNKNOWN (the code its status
 * report carries); varnel_error_number and varnel_error_text then say what
 * happened. No C++ exception ever leaves these functions.
 *
 * Required arguments: the component, the METER_REC and every document except
 * the readings filter. A call missing one returns ME_BAD_PARAMETER and touches
 * nothing. The filter may be NULL (it is never read), and so may check_meter
 * (it is only written, as the C++ flag is: set to 1 once the port is accepted,
 * on every exit after that, an unexpected failure included; left as it was
 * when the port is refused, so start it at 0).
 *
 * Like the component itself, a varnel_component is used by one thread at a time.
 */
#ifndef VARNEL_VARNEL_H
#define VARNEL_VARNEL_H

#include <stdint.h>

#include "export.h"
#include "records.h"

#ifdef __cplusplus
extern "C" {
#endif

/** One XML document (an XMLWrapper). */
typedef struct varnel_doc varnel_doc;
/** One component (a DllWrapper) with its transport library. */
typedef struct varnel_component varnel_component;

/** An empty document; NULL when out of memory. */
VARNEL_API varnel_doc* varnel_doc_new(void);
/** A document of that kind (XMLWrapper::InitDocument); NULL for an unknown kind. */
VARNEL_API varnel_doc* varnel_doc_new_kind(int32_t kind);
/** 0 loaded; non-zero when xml is not well-formed (or NULL), the document unchanged. */
VARNEL_API int varnel_doc_load(varnel_doc* doc, const char* xml);
/** The document as text, newly allocated ("" when empty); release with varnel_free.
   NULL for a NULL document or when out of memory. */
VARNEL_API char* varnel_doc_xml(const varnel_doc* doc);
/** The readings of a datalog document as the JSON of `varnel readings --json`
   (docs/exports.md), newly allocated; glucose in mmol/L when glucose_mmol is
   non-zero, else in the meter's unit. Release with varnel_free. NULL when the
   document is not a datalog (or NULL), or when out of memory. */
VARNEL_API char* varnel_doc_readings_json(const varnel_doc* datalog, int glucose_mmol);
/** Releases a document; NULL does nothing. */
VARNEL_API void varnel_doc_free(varnel_doc* doc);
/** Releases a text of varnel_doc_xml or varnel_doc_readings_json; NULL does nothing. */
VARNEL_API void varnel_free(void* text);

/** A component over the transport library at that path (loaded on the first
   request); NULL path: the simulated transport shipped with Varnel. NULL when out of memory. */
VARNEL_API varnel_component* varnel_new(const char* transport_path);
/** Releases a component; NULL does nothing. */
VARNEL_API void varnel_delete(varnel_component* c);

/** Finds a meter on the ports of conn_info and describes it in device_info; fills
   rec, which every later request on that meter takes. */
VARNEL_API int32_t varnel_discover_device(varnel_component* c, METER_REC* rec, varnel_doc* device_info,
                                          varnel_doc* conn_info, varnel_doc* status);
/** Writes the settings of device_cfg (a device settings document) to the meter. */
VARNEL_API int32_t varnel_set_device_settings(varnel_component* c, METER_REC* rec, varnel_doc* device_info,
                                              varnel_doc* device_cfg, varnel_doc* status);
/** Reads the meter's settings into device_cfg: all when fetch_all, else the items it lists. */
VARNEL_API int32_t varnel_get_device_settings(varnel_component* c, METER_REC* rec, varnel_doc* device_info,
                                              varnel_doc* device_cfg, int fetch_all, varnel_doc* status,
                                              int* check_meter);
/** Describes what the meter supports in device_caps: all when fetch_all, else the items it lists. */
VARNEL_API int32_t varnel_get_device_caps(varnel_component* c, METER_REC* rec, varnel_doc* device_info,
                                          varnel_doc* device_caps, int fetch_all, varnel_doc* status, int* check_meter);
/** Uploads the meter's readings into datalog; filter may be NULL. */
VARNEL_API int32_t varnel_get_readings(varnel_component* c, METER_REC* rec, varnel_doc* device_info,
                                       varnel_doc* datalog, varnel_doc* filter, varnel_doc* status, int* check_meter);
/** Erases the meter's memory. */
VARNEL_API int32_t varnel_clear_meter(varnel_component* c, METER_REC* rec, varnel_doc* device_info, varnel_doc* status);
/** Releases the meter. */
VARNEL_API int32_t varnel_close_meter(varnel_component* c, METER_REC* rec);

/** Progress of the running request (0-100) on the caller's thread; the handler
   may change *percent. NULL fn removes the handler. */
VARNEL_API void varnel_on_progress(varnel_component* c, void (*fn)(int16_t* percent, void* user), void* user);
/** Raised at the end of most exits of a request (dll_wrapper.h lists which); closeMeter raises it only
   when it fails unexpectedly. NULL fn removes the handler. */
VARNEL_API void varnel_on_complete(varnel_component* c, void (*fn)(void* user), void* user);

/** After a request that raised an unexpected error (a ComponentError in C++): its number
   (varnel::errc); 0 otherwise. */
VARNEL_API int32_t varnel_error_number(const varnel_component* c);
/** After a request that raised an unexpected error: a text with the description and the routine trace,
   valid until the next request on c; NULL otherwise. */
VARNEL_API const char* varnel_error_text(const varnel_component* c);

#ifdef __cplusplus
}
#endif

#endif /* VARNEL_VARNEL_H */
