// Reading one version of an object: the request's checks, the requester's
// right to read the object, then the file-system store.
#include <memory>
#include <new>
#include <string>

#include "common/tessel_report.h"
#include "tessel_backend.h"
#include "tessel_conf.h"
#include "tessel_id.h"
#include "tesselobject.h"
#include "tesselobjectversion.h"

static constexpr const char kTesselModule[] = "version/version_get";

#include "version/version_hash.h"

bool TESSEL_OBJECT_VERSION::Get(const Json::Value &jParm) {
    std::unique_ptr<TESSEL_BACKEND_OP> pBackendFs(RegisterBackend::New("fs"));
    TESSEL_CHECK(NULL == pBackendFs, TESSEL_ERR_NO_BACKEND, "NULL == pBackendFs", false);

    TESSEL_CHECK(!jParm.isMember("ns") || !jParm["ns"].isString() || !jParm.isMember("id") ||
                     !jParm["id"].isString() || !jParm.isMember("requester") || !jParm["requester"].isIntegral(),
                 TESSEL_ERR_USER_INPUT,
                 "!jParm.isMember(\"ns\") || !jParm[\"ns\"].isString() || !jParm.isMember(\"id\") || "
                 "!jParm[\"id\"].isString() || !jParm.isMember(\"requester\") || !jParm[\"requester\"].isIntegral()",
                 false);
    TESSEL_CHECK(jParm.isMember("version") && !jParm["version"].isString(), TESSEL_ERR_USER_INPUT,
                 "jParm.isMember(\"version\") && !jParm[\"version\"].isString()", false);

    TESSEL_CHECK_APPEND(FALSE == TesselAccessCheck(jParm["ns"].asCString()),
                        "FALSE == TesselAccessCheck(jParm[\"ns\"].asCString())", false);
    TESSEL_CHECK_APPEND(FALSE == TesselObjectIDIsValid(jParm["id"].asCString()),
                        "FALSE == TesselObjectIDIsValid(jParm[\"id\"].asCString())", false);

    // Whoever may not read the object may not read its history either.
    TESSEL_OBJECT tmpObj;
    Json::Value jGetParm(Json::objectValue);
    jGetParm["ns"] = jParm["ns"];
    jGetParm["id"] = jParm["id"];
    jGetParm["requester"] = jParm["requester"];
    TESSEL_CHECK_APPEND(!tmpObj.Get(jGetParm), "!tmpObj.Get(jGetParm)", false);

    // The store sets only what the version has; nothing of an earlier use
    // of this record may show through.
    clear();
    TESSEL_CHECK_APPEND(!pBackendFs->VersionGet(jParm, this), "!pBackendFs->VersionGet(jParm, this)", false);
    return true;
}

bool TESSEL_OBJECT_VERSION_LIST::GetVersion(const Json::Value &jParm) {
    // A record without its data block could hold nothing: the same as no record.
    std::unique_ptr<TESSEL_OBJECT_VERSION> pVer(new (std::nothrow) TESSEL_OBJECT_VERSION);
    TESSEL_CHECK(NULL == pVer || NULL == pVer->m_impl, TESSEL_ERR_OUT_OF_MEMORY,
                 "NULL == (pVer = new TESSEL_OBJECT_VERSION)", false);
    // On failure the list keeps what it held.
    TESSEL_CHECK_APPEND(!pVer->Get(jParm), "!pVer->Get(jParm)", false);
    clear();
    m_head = pVer.release();
    return true;
}

int TesselObjectVersionGet(QLIBSZHASH *pParmHash, TESSEL_OBJECT_VERSION *pVersion) {
    TESSEL_CHECK(NULL == pParmHash, TESSEL_ERR_BAD_PARAMETERS, "NULL == pParmHash", -1);
    TESSEL_CHECK(NULL == pVersion, TESSEL_ERR_BAD_PARAMETERS, "NULL == pVersion", -1);
    Json::Value jParm(Json::objectValue);
    if (!HashRequest(pParmHash, jParm)) {
        return -1;
    }
    HashOptionalText(pParmHash, "version", jParm);
    TESSEL_CHECK_APPEND(!pVersion->Get(jParm), "!pVersion->Get(jParm)", -1);
    return 0;
}
