// Service state. A service counts as running when it answers, not when a
// process of that name exists: a server that is still starting or already
// shutting down cannot serve the caller either.
#include <string.h>

#include <libpq-fe.h>

#include "quor/qlib.h"

namespace {

// The default connection, as QUORDBConnect(NULL, ...) would make it: libpq's
// environment (PGHOST, PGPORT, ...) and compiled-in defaults. PQping needs no
// credentials, so no user or database is named.
BOOL PgsqlAnswers() { return (PQPING_OK == PQping("")) ? TRUE : FALSE; }

}  // namespace

extern "C" {

BOOL QLIBServiceIsRunning(const char *szService) {
    if (NULL == szService || '\0' == szService[0]) {
        QLIBCErrSetEx(QLIBC_ERR_BAD_PARAMETERS, __FILE__, __LINE__);
        return FALSE;
    }
    if (0 == strcmp(szService, "pgsql")) {
        return PgsqlAnswers();
    }
    QLIBCErrSetEx(QLIBC_ERR_NOT_FOUND, __FILE__, __LINE__);
    return FALSE;
}

}  // extern "C"
