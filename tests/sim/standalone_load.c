/* A program that links nothing but the dynamic loader opens the simulated
 * transport library by path (argv[1]) and drives a meter through it on a clock
 * of its own: the library must need nothing from the component. */
#define _GNU_SOURCE
#include <dlfcn.h>
#include <link.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>

#include "varnel/vantrix32.h"

#include "../support/c_check.h"

/* Every function of the library, resolved by name. */
static struct {
#define POINTER(ret, name, ...) ret (*name)(VX_C_PARAMS(__VA_ARGS__));
    VX_TRANSPORT_FUNCTIONS(POINTER)
#undef POINTER
} vx;

/* A virtual clock: the library's waits move it, nothing sleeps. */
static uint32_t now_ms = 5000;
static int yields = 0;
static uint32_t tick(void* context) { return *(uint32_t*)context; }
static void wait_ms(void* context, uint32_t ms) { *(uint32_t*)context += ms; }
static void yielded(void* context) { ++*(int*)context; }

static int component_loaded(struct dl_phdr_info* info, size_t size, void* data) {
    (void)size, (void)data;
    return strstr(info->dlpi_name, "libvarnel") != NULL;
}

/* Finds the meter on port 1 and uploads its memory; returns the records received. */
static int upload(void* library, int type) {
    int (*select_type)(int) = (int (*)(int))dlsym(library, "vxsim_select_type");
    CHECK(select_type && select_type(type) == 0);
    static METER_REC rec;
    static METER_DATALOG records;
    static METER_BIN_DATALOG binary;
    int32_t found[VX_LIST_LENGTH] = {0};
    int16_t ports[VX_LIST_LENGTH] = {1};
    vx.initialize_meter_structure(&rec);
    CHECK(vx.find_meter(&rec, found, ports) == ME_SUCCESS);
    CHECK(rec.M_Type == type && found[0] == 1);
    const uint32_t start = now_ms;
    int received;
    if (type == 7) {
        CHECK(vx.GetMeterDatalog(&rec, &binary, 0) == ME_SUCCESS);
        received = binary.recordCount;
    } else {
        CHECK(vx.vb_Upload_Meter_Datalog(&rec, &records) == ME_SUCCESS);
        received = records.recordCount;
    }
    CHECK(rec.Percent_done == 100);
    CHECK(now_ms - start >= 100); /* the wire time passed on our clock */
    CHECK(vx.close_meter(&rec) == ME_SUCCESS);
    return received;
}

int main(int argc, char** argv) {
    if (argc != 2) {
        fprintf(stderr, "usage: %s LIBRARY\n", argv[0]);
        return 2;
    }
    void* library = dlopen(argv[1], RTLD_NOW | RTLD_LOCAL);
    if (!library) {
        fprintf(stderr, "%s\n", dlerror());
        return 1;
    }
#define RESOLVE(ret, name, ...)                \
    *(void**)&vx.name = dlsym(library, #name); \
    CHECK(vx.name != NULL);
    VX_TRANSPORT_FUNCTIONS(RESOLVE)
#undef RESOLVE
    if (failures) return 1;
    CHECK(dl_iterate_phdr(component_loaded, NULL) == 0);

    vx.vx_set_clock_hook(tick, wait_ms, &now_ms);
    vx.vx_set_yield_hook(yielded, &yields);
    CHECK(upload(library, 7) > 0);
    CHECK(upload(library, 2) > 0);
    CHECK(yields > 0);

    TIME_REC time;
    CHECK(vx.convert_from_seconds(86400 + 3661, &time) == ME_SUCCESS);
    CHECK(vx.convert_to_seconds(&time) == 86400 + 3661);

    CHECK(dl_iterate_phdr(component_loaded, NULL) == 0);
    printf("%s\n", failures ? "FAILED" : "ok");
    return failures ? 1 : 0;
}
