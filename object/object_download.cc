// Sending one stored file of an object to a web client: the requester must be
// able to read the object, then the file-system store writes the response to
// standard output.
#include <ctype.h>
#include <stdlib.h>

#include <memory>
#include <string>

#include <quor/qlib.h>

#include "common/tessel_priv.h"
#include "common/tessel_report.h"
#include "tessel_backend.h"
#include "tessel_id.h"
#include "tesselobject.h"

static constexpr const char kTesselModule[] = "object/object_download";

namespace {

// Request members a web handler passes on as given: the file's place, the
// wanted encoding, the version and whether the client saves the file.
constexpr const char *const SZ_REQUIRED_KEYS[] = {"ns", "id", "segment", "field", "format"};
constexpr const char *const SZ_OPTIONAL_KEYS[] = {"version", "mode"};

}  // namespace

bool TESSEL_OBJECT::Download(const Json::Value &jParm) {
    TESSEL_CHECK(!jParm.isObject(), TESSEL_ERR_USER_INPUT, "!jParm.isObject()", false);
    TESSEL_CHECK(!jParm["ns"].isString() || !jParm["id"].isString() || !jParm["segment"].isString(),
                 TESSEL_ERR_USER_INPUT,
                 "!jParm[\"ns\"].isString() || !jParm[\"id\"].isString() || !jParm[\"segment\"].isString()", false);

    // Any permission word will do: whoever may read the object may read its
    // files. The read leaves out the version store, which it does not need.
    Json::Value jGetParm(Json::objectValue);
    jGetParm["ns"] = jParm["ns"];
    jGetParm["id"] = jParm["id"];
    jGetParm["requester"] = jParm["requester"];
    jGetParm["field"]["ver"] = false;
    jGetParm["field"]["mtime"] = false;
    TESSEL_OBJECT tmpObj;
    TESSEL_CHECK_APPEND(!tmpObj.Get(jGetParm), "!tmpObj.Get(jGetParm)", false);

    std::unique_ptr<TESSEL_BACKEND_OP> pBackendFs(RegisterBackend::New("fs"));
    TESSEL_CHECK(NULL == pBackendFs, TESSEL_ERR_NO_BACKEND, "NULL == pBackendFs", false);
    TESSEL_AS_ROOT();
    TESSEL_CHECK_APPEND(!pBackendFs->Download(jParm), "!pBackendFs->Download(jParm)", false);
    return true;
}

BOOL TesselObjectDownload(QLIBSZHASH *pParmHash) {
    TESSEL_CHECK(NULL == pParmHash, TESSEL_ERR_BAD_PARAMETERS, "NULL == pParmHash", FALSE);
    Json::Value jParm(Json::objectValue);
    const char *pParm = NULL;
    for (const char *szKey : SZ_REQUIRED_KEYS) {
        if (NULL == (pParm = QLIBCSzHashGetValue(pParmHash, szKey))) {
            TESSEL_RAISE(TESSEL_ERR_USER_INPUT, "NULL == (pParm = QLIBCSzHashGetValue(pParmHash, \"%s\"))", szKey);
            return FALSE;
        }
        jParm[szKey] = pParm;
    }
    TESSEL_CHECK(NULL == (pParm = QLIBCSzHashGetValue(pParmHash, "requester")), TESSEL_ERR_USER_INPUT,
                 "NULL == (pParm = QLIBCSzHashGetValue(pParmHash, \"requester\"))", FALSE);
    char *endPtr = NULL;
    const unsigned long long requester = strtoull(pParm, &endPtr, 10);
    // An empty text would otherwise read as 0, which is root; blanks and a
    // sign would let a negative number wrap around onto another user.
    TESSEL_CHECK(!isdigit((unsigned char)pParm[0]), TESSEL_ERR_USER_INPUT, "!isdigit(pParm[0])", FALSE);
    TESSEL_CHECK(endPtr && *endPtr, TESSEL_ERR_USER_INPUT, "endPtr && *endPtr", FALSE);
    TESSEL_CHECK(requester > UID_ERR, TESSEL_ERR_USER_INPUT, "requester > UID_ERR", FALSE);
    jParm["requester"] = (Json::UInt64)requester;
    for (const char *szKey : SZ_OPTIONAL_KEYS) {
        if (NULL != (pParm = QLIBCSzHashGetValue(pParmHash, szKey))) {
            jParm[szKey] = pParm;
        }
    }
    TESSEL_OBJECT object;
    TESSEL_CHECK_APPEND(!object.Download(jParm), "!object.Download(jParm)", FALSE);
    return TRUE;
}
