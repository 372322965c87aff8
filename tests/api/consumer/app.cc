// An application of libtessel as its users build one: only the umbrella
// header, flags from pkg-config or find_package(tessel).
#include <stdio.h>
#include <string.h>

#include <tessel/tessel.h>
#include <quor/platform.h>

int main() {
    TesselErrSetEx(1007, "consumer/app", 12, "%s", "!jParm.isObject()");
    if (1007 != TesselErrCodeGet()) {
        fprintf(stderr, "error code not kept: %d\n", TesselErrCodeGet());
        return 1;
    }
    if (0 != strcmp("Operation failed.", rgErrorString[0].message)) {
        fprintf(stderr, "unexpected first message: %s\n", rgErrorString[0].message);
        return 1;
    }
    QLIBSZHASH *pHash = QLIBCSzHashAlloc(4);
    if (NULL == pHash || 0 != QLIBCSzHashSetValue(pHash, "ns", "notes")) {
        fprintf(stderr, "platform hash failed\n");
        return 1;
    }
    const char *szNs = QLIBCSzHashGetValue(pHash, "ns");
    int ok = (NULL != szNs && 0 == strcmp("notes", szNs));
    QLIBCSzHashFree(pHash);
    puts(ok ? "consumer ok" : "consumer failed");
    return ok ? 0 : 1;
}
