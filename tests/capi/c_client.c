/* A C11 client of varnel.h: the header compiles as C and its functions link
 * from libvarnel by their C names. argv[1] is a transport path that does not exist. */
#include <stdio.h>
#include <string.h>

#include "varnel/varnel.h"

#include "../support/c_check.h"

int main(int argc, char** argv) {
    if (argc != 2) {
        fprintf(stderr, "usage: %s MISSING_TRANSPORT\n", argv[0]);
        return 2;
    }
    varnel_doc* status = varnel_doc_new_kind(7);
    varnel_doc* device = varnel_doc_new_kind(1);
    varnel_doc* conn = varnel_doc_new();
    CHECK(status && device && conn);
    CHECK(varnel_doc_load(conn,
                          "<ConnectionInfo><Ports><COM><PortsToSearch>1</PortsToSearch>"
                          "</COM></Ports></ConnectionInfo>") == 0);
    CHECK(varnel_doc_load(conn, "<ConnectionInfo>") != 0);
    char* xml = varnel_doc_xml(conn);
    CHECK(xml && strstr(xml, "<PortsToSearch>1</PortsToSearch>"));
    varnel_free(xml);

    METER_REC rec;
    memset(&rec, 0, sizeof rec);
    CHECK(varnel_discover_device(NULL, &rec, device, conn, status) == ME_BAD_PARAMETER);

    varnel_component* c = varnel_new(argv[1]);
    CHECK(c != NULL);
    CHECK(varnel_error_text(c) == NULL);
    CHECK(varnel_discover_device(c, &rec, device, conn, status) == ME_UNKNOWN);
    CHECK(varnel_error_number(c) == 453);
    const char* why = varnel_error_text(c);
    CHECK(why && strstr(why, argv[1]));
    CHECK(varnel_close_meter(c, NULL) == ME_BAD_PARAMETER);
    CHECK(varnel_error_text(c) == NULL);

    varnel_delete(c);
    varnel_doc_free(conn);
    varnel_doc_free(device);
    varnel_doc_free(status);
    printf("c_client: %d failed\n", failures);
    return failures ? 1 : 0;
}
