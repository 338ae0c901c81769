/* Finds the meter on port 1 (the simulated transport shipped with Varnel),
 * prints its device document and one line per glucose reading, and releases it.
 *   cc -std=c11 main.c $(pkg-config --cflags --libs varnel)
 */
#include <stdio.h>
#include <stdlib.h>
#include <string.h>

#include <varnel/varnel.h>

enum { DEVICE_INFO = 1, DATALOG = 5, STATUS = 7 };

/* The number in attribute name of the element starting at element (0 when absent). */
static int attribute(const char* element, const char* name) {
    char key[32];
    snprintf(key, sizeof key, " %s=\"", name);
    const char* end = strchr(element, '>');
    const char* at = strstr(element, key);
    return at && end && at < end ? atoi(at + strlen(key)) : 0;
}

/* True when the element starting at element has attribute name with that exact text. */
static int has_text(const char* element, const char* name, const char* text) {
    char key[64];
    snprintf(key, sizeof key, " %s=\"%s\"", name, text);
    const char* end = strchr(element, '>');
    const char* at = strstr(element, key);
    return at && end && at < end;
}

static int failed(const char* request, int32_t code, varnel_component* c, const varnel_doc* status) {
    char* text = varnel_doc_xml(status);
    fprintf(stderr, "%s failed (%d)\n%s\n", request, (int)code, text ? text : "");
    if (varnel_error_text(c)) fprintf(stderr, "unexpected error: %s\n", varnel_error_text(c));
    varnel_free(text);
    return 1;
}

int main(void) {
    int result = 1;
    METER_REC rec;
    memset(&rec, 0, sizeof rec);
    varnel_component* c = varnel_new(NULL);
    varnel_doc* device = varnel_doc_new_kind(DEVICE_INFO);
    varnel_doc* conn = varnel_doc_new();
    varnel_doc* status = varnel_doc_new_kind(STATUS);
    varnel_doc* datalog = varnel_doc_new_kind(DATALOG);
    if (!c || !device || !conn || !status || !datalog ||
        varnel_doc_load(conn,
                        "<ConnectionInfo><Ports><COM><PortsToSearch>1</PortsToSearch></COM></Ports>"
                        "</ConnectionInfo>") != 0)
        goto done;

    int32_t code = varnel_discover_device(c, &rec, device, conn, status);
    if (code != 0) {
        result = failed("discover", code, c, status);
        goto done;
    }
    char* text = varnel_doc_xml(device);
    printf("%s\n", text ? text : "");
    varnel_free(text);

    code = varnel_get_readings(c, &rec, device, datalog, NULL, status, NULL);
    varnel_close_meter(c, &rec);
    if (code != 0) {
        result = failed("readings", code, c, status);
        goto done;
    }
    text = varnel_doc_xml(datalog);
    for (const char* at = text ? strstr(text, "<Gluc ") : NULL; at; at = strstr(at + 1, "<Gluc ")) {
        /* Blood glucose only: control-solution and check-strip readings test the meter, not the blood. */
        if (!has_text(at, "Txt", "Blood")) continue;
        printf("%04d-%02d-%02d %02d:%02d  %d\n", attribute(at, "Y"), attribute(at, "MM"), attribute(at, "D"),
               attribute(at, "h"), attribute(at, "m"), attribute(at, "Val"));
    }
    varnel_free(text);
    result = 0;

done:
    varnel_doc_free(datalog);
    varnel_doc_free(status);
    varnel_doc_free(conn);
    varnel_doc_free(device);
    varnel_delete(c);
    return result;
}
