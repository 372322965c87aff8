// Listing the versions of an object, newest first unless asked otherwise,
// a page at a time ("offset", "limit"), with the number of versions in all
// and the number the request could page through.
#include <memory>
#include <string>

#include "common/tessel_priv.h"
#include "common/tessel_report.h"
#include "tessel_backend.h"
#include "tessel_conf.h"
#include "tessel_id.h"
#include "tesselobject.h"
#include "tesselobjectversion.h"

static constexpr const char kTesselModule[] = "version/version_list";

#include "version/version_hash.h"

int TesselObjectVersionList(const Json::Value &jParm, TESSEL_OBJECT_VERSION **addrPHead, unsigned int &total,
                            unsigned int &listable_total) {
    std::unique_ptr<TESSEL_BACKEND_OP> pBackendFs(RegisterBackend::New("fs"));
    TESSEL_CHECK(NULL == pBackendFs, TESSEL_ERR_NO_BACKEND, "NULL == pBackendFs", -1);

    TESSEL_CHECK(!jParm.isMember("ns") || !jParm["ns"].isString() || !jParm.isMember("id") ||
                     !jParm["id"].isString() || !jParm.isMember("requester") || !jParm["requester"].isIntegral(),
                 TESSEL_ERR_USER_INPUT,
                 "!jParm.isMember(\"ns\") || !jParm[\"ns\"].isString() || !jParm.isMember(\"id\") || "
                 "!jParm[\"id\"].isString() || !jParm.isMember(\"requester\") || !jParm[\"requester\"].isIntegral()",
                 -1);
    TESSEL_CHECK(jParm.isMember("offset") && !jParm["offset"].isIntegral(), TESSEL_ERR_USER_INPUT,
                 "jParm.isMember(\"offset\") && !jParm[\"offset\"].isIntegral()", -1);
    TESSEL_CHECK(jParm.isMember("limit") && !jParm["limit"].isIntegral(), TESSEL_ERR_USER_INPUT,
                 "jParm.isMember(\"limit\") && !jParm[\"limit\"].isIntegral()", -1);
    // The store reads the offset as unsigned and the limit as int; a value
    // outside those would not convert.
    TESSEL_CHECK(jParm.isMember("offset") && !jParm["offset"].isUInt(), TESSEL_ERR_USER_INPUT,
                 "jParm.isMember(\"offset\") && !jParm[\"offset\"].isUInt()", -1);
    TESSEL_CHECK(jParm.isMember("limit") && !jParm["limit"].isInt(), TESSEL_ERR_USER_INPUT,
                 "jParm.isMember(\"limit\") && !jParm[\"limit\"].isInt()", -1);
    TESSEL_CHECK(NULL == addrPHead, TESSEL_ERR_BAD_PARAMETERS, "NULL == addrPHead", -1);

    TESSEL_CHECK_APPEND(FALSE == TesselAccessCheck(jParm["ns"].asCString()),
                        "FALSE == TesselAccessCheck(jParm[\"ns\"].asCString())", -1);
    TESSEL_CHECK_APPEND(FALSE == TesselObjectIDIsValid(jParm["id"].asCString()),
                        "FALSE == TesselObjectIDIsValid(jParm[\"id\"].asCString())", -1);

    // Whoever may not read the object may not read its history either.
    TESSEL_OBJECT tmpObj;
    Json::Value jGetParm(Json::objectValue);
    jGetParm["ns"] = jParm["ns"];
    jGetParm["id"] = jParm["id"];
    jGetParm["requester"] = jParm["requester"];
    TESSEL_CHECK_APPEND(!tmpObj.Get(jGetParm), "!tmpObj.Get(jGetParm)", -1);

    int count = -1;
    {
        // The version counters file belongs to the store, not to the caller.
        TESSEL_AS_ROOT();
        count = pBackendFs->VersionList(jParm, addrPHead, total, listable_total);
    }
    TESSEL_CHECK_APPEND(0 > count, "0 > (count = pBackendFs->VersionList(jParm, addrPHead, total, listable_total))",
                        -1);
    return count;
}

int TESSEL_OBJECT_VERSION_LIST::ListVersion(const Json::Value &jParm, unsigned int &total,
                                            unsigned int &listable_total) {
    TESSEL_OBJECT_VERSION *pHead = NULL;
    int count = TesselObjectVersionList(jParm, &pHead, total, listable_total);
    if (0 > count) {
        // Whatever the store chained before it failed goes; the list keeps
        // what it held.
        TesselObjectVersionFreeList(pHead);
        TESSEL_APPEND("0 > (count = TesselObjectVersionList(jParm, &pHead, total, listable_total))");
        return count;
    }
    clear();
    m_head = pHead;
    return count;
}

int TesselObjectVersionList(QLIBSZHASH *pParmHash, TESSEL_OBJECT_VERSION **addrPHead, unsigned int *pTotal,
                            unsigned int *pListableTotal) {
    TESSEL_CHECK(NULL == pParmHash, TESSEL_ERR_BAD_PARAMETERS, "NULL == pParmHash", -1);
    TESSEL_CHECK(NULL == pTotal || NULL == pListableTotal, TESSEL_ERR_BAD_PARAMETERS,
                 "NULL == pTotal || NULL == pListableTotal", -1);
    Json::Value jParm(Json::objectValue);
    if (!HashRequest(pParmHash, jParm)) {
        return -1;
    }
    for (const char *szKey : {"offset", "limit"}) {
        if (!HashOptionalInteger(pParmHash, szKey, jParm)) {
            return -1;
        }
    }
    int count = -1;
    TESSEL_CHECK_APPEND(0 > (count = TesselObjectVersionList(jParm, addrPHead, *pTotal, *pListableTotal)),
                        "0 > (count = TesselObjectVersionList(jParm, addrPHead, *pTotal, *pListableTotal))", -1);
    return count;
}
