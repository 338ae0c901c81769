/* Finds the meter on port 1 (the simulated transport shipped with Varnel),
 * prints its device document and one line per glucose reading, and releases it.
 *   cc -std=c11 main.c $(pkg-config --cflags --libs varnel)
 */
#include <stdio.h>
#include <string.h>

#include <varnel/varnel.h>

enum { DEVICE_INFO = 1, DATALOG = 5, STATUS = 7 };

/* Copies the value of attribute name of the element starting at element into out. */
static const char* attribute(const char* element, const char* name, char* out, size_t size) {
    char key[32];
    snprintf(key, sizeof key, " %s=\"", name);
    const char* end = strchr(element, '>');
    const char* at = strstr(element, key);
    out[0] = '\0';
    if (at && end && at < end) {
        at += strlen(key);
        size_t n = strcspn(at, "\"");
        if (n >= size) n = size - 1;
        memcpy(out, at, n);
        out[n] = '\0';
    }
    return out;
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
        varnel_doc_load(conn, "<ConnectionInfo><Ports><COM><PortsToSearch>1</PortsToSearch></COM></Ports>"
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
        char y[8], mm[8], d[8], h[8], m[8], val[16];
        printf("%s-%s-%s %s:%s  %s\n", attribute(at, "Y", y, sizeof y), attribute(at, "MM", mm, sizeof mm),
               attribute(at, "D", d, sizeof d), attribute(at, "h", h, sizeof h), attribute(at, "m", m, sizeof m),
               attribute(at, "Val", val, sizeof val));
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
