// Reading one object: the request's checks, the store's read as root, and
// the requester's permission word on what was read.
#include <stdlib.h>
#include <sys/types.h>

#include <memory>
#include <string>

#include <quor/qlib.h>

#include "common/tessel_priv.h"
#include "common/tessel_report.h"
#include "object/object_get.h"
#include "object/object_perm.h"
#include "tessel_backend.h"
#include "tessel_conf.h"
#include "tessel_id.h"
#include "tesselobject.h"

static constexpr const char kTesselModule[] = "object/object_get";

namespace tessel {

uid_t RequesterOf(const Json::Value &jRequester) { return jRequester.isUInt() ? (uid_t)jRequester.asUInt() : UID_ERR; }

bool AskedForAcl(const Json::Value &jParm) {
    const Json::Value &jField = jParm["field"];
    return jField.isObject() && jField["acl"].isBool() && jField["acl"].asBool();
}

void ForceAclField(Json::Value &jParm) {
    if (!jParm["field"].isObject()) {
        jParm["field"] = Json::Value(Json::objectValue);
    }
    jParm["field"]["acl"] = true;
}

void HideAndDelegate(const Json::Value &jParm, bool blAskedAcl, std::string &strPerm, TESSEL_OBJECT *pObject) {
    // The sharing settings are the owner's business: nobody sees them by
    // accident, not even the owner.
    if (!blAskedAcl) {
        pObject->set_acl(Json::Value(Json::objectValue));
    }
    if (kPermOwner == strPerm && jParm.isMember("delegate_perm") && jParm["delegate_perm"].isString()) {
        strPerm = jParm["delegate_perm"].asString();
    }
}

void WithholdRecord(TESSEL_OBJECT *pObject) {
    const std::string strNs = pObject->get_ref_ns();
    const std::string strId = pObject->get_ref_id();
    Json::Value jErr = pObject->get_ref_err();
    pObject->clear();
    pObject->set_perm(std::string());
    pObject->set_ns(strNs);
    pObject->set_id(strId);
    pObject->swap_err(jErr);
}

}  // namespace tessel

bool TESSEL_OBJECT::Get(const Json::Value &jParmIn) {
    std::unique_ptr<TESSEL_BACKEND_OP> pBackendFs(RegisterBackend::New("fs"));
    if (NULL == pBackendFs) {
        clear();
    }
    TESSEL_CHECK(NULL == pBackendFs, TESSEL_ERR_NO_BACKEND, "NULL == pBackendFs", false);

    Json::Value jParm = jParmIn;
    TESSEL_CHECK(!jParm.isMember("ns") || !jParm["ns"].isString() || !jParm.isMember("id") || !jParm["id"].isString() ||
                     !jParm.isMember("requester") || !jParm["requester"].isIntegral(),
                 TESSEL_ERR_USER_INPUT,
                 "!jParm.isMember(\"ns\") || !jParm[\"ns\"].isString() || !jParm.isMember(\"id\") || "
                 "!jParm[\"id\"].isString() || !jParm.isMember(\"requester\") || !jParm[\"requester\"].isIntegral()",
                 false);
    // Wider values would wrap around to another user, 4294967296 to root.
    TESSEL_CHECK(!jParm["requester"].isUInt(), TESSEL_ERR_USER_INPUT, "!jParm[\"requester\"].isUInt()", false);
    TESSEL_CHECK(jParm.isMember("version") && !jParm["version"].isString(), TESSEL_ERR_USER_INPUT,
                 "jParm.isMember(\"version\") && !jParm[\"version\"].isString()", false);
    TESSEL_CHECK(jParm.isMember("field") && !jParm["field"].isObject(), TESSEL_ERR_USER_INPUT,
                 "jParm.isMember(\"field\") && !jParm[\"field\"].isObject()", false);

    const uid_t requester = tessel::RequesterOf(jParm["requester"]);
    if (UID_ROOT != requester) {
        TESSEL_CHECK_APPEND(FALSE == TesselAccessCheck(jParm["ns"].asCString()),
                            "FALSE == TesselAccessCheck(jParm[\"ns\"].asCString())", false);
    }
    // Also for root: an id without an owner names no object, and saying so
    // here is clearer than the store's "not found".
    unsigned int owner = UID_ERR;
    TESSEL_CHECK_APPEND(UID_ERR == (owner = TesselObjectGetOwnerByID(jParm["id"].asString())),
                        "UID_ERR == (owner = TesselObjectGetOwnerByID(jParm[\"id\"].asCString()))", false);
    if (UID_ROOT != requester) {
        TESSEL_CHECK_APPEND(FALSE == TesselObjectOwnerIsValid(owner), "FALSE == TesselObjectOwnerIsValid(owner)",
                            false);
        if (requester != owner) {
            TESSEL_CHECK_APPEND(FALSE == TesselSharingCheck(jParm["ns"].asCString(), owner),
                                "FALSE == TesselSharingCheck(jParm[\"ns\"].asCString(), owner)", false);
        }
    }

    // The calculation needs the acl whether or not the caller wants to see it.
    const bool blAskedAcl = tessel::AskedForAcl(jParm);
    tessel::ForceAclField(jParm);
    clear();
    // The word belongs to this read; an earlier one must not outlive a failure.
    set_perm(std::string());

    bool blRead = false;
    {
        TESSEL_AS_ROOT();
        blRead = pBackendFs->Get(jParm, this);
    }
    if (!blRead) {
        clear();
    }
    TESSEL_CHECK_APPEND(!blRead, "!pBackendFs->Get(jParm, this)", false);

    std::string strPerm;
    const bool blPerm = TesselObjectPermCalculate(requester, (unsigned int)get_owner(), get_ref_acl(), strPerm);
    if (!blPerm) {
        // Refused: nothing of the object stays with the caller.
        clear();
    }
    TESSEL_CHECK_APPEND(!blPerm,
                        "!TesselObjectPermCalculate((uid_t)jParm[\"requester\"].asInt64(), m_impl->owner, "
                        "m_impl->acl, m_impl->perm)",
                        false);
    tessel::HideAndDelegate(jParm, blAskedAcl, strPerm, this);
    set_perm(strPerm);
    return true;
}

int TesselObjectGet(QLIBSZHASH *pParmHash, TESSEL_OBJECT *pObject) {
    TESSEL_CHECK(NULL == pParmHash, TESSEL_ERR_BAD_PARAMETERS, "NULL == pParmHash", -1);
    TESSEL_CHECK(NULL == pObject, TESSEL_ERR_BAD_PARAMETERS, "NULL == pObject", -1);
    Json::Value jParm(Json::objectValue);
    const char *pParm = NULL;
    TESSEL_CHECK(NULL == (pParm = QLIBCSzHashGetValue(pParmHash, "ns")), TESSEL_ERR_USER_INPUT,
                 "NULL == (pParm = QLIBCSzHashGetValue(pParmHash, \"ns\"))", -1);
    jParm["ns"] = pParm;
    TESSEL_CHECK(NULL == (pParm = QLIBCSzHashGetValue(pParmHash, "id")), TESSEL_ERR_USER_INPUT,
                 "NULL == (pParm = QLIBCSzHashGetValue(pParmHash, \"id\"))", -1);
    jParm["id"] = pParm;
    TESSEL_CHECK(NULL == (pParm = QLIBCSzHashGetValue(pParmHash, "requester")), TESSEL_ERR_USER_INPUT,
                 "NULL == (pParm = QLIBCSzHashGetValue(pParmHash, \"requester\"))", -1);
    char *endPtr = NULL;
    const unsigned long requester = strtoul(pParm, &endPtr, 10);
    // An empty text would otherwise read as 0, which is root.
    TESSEL_CHECK(endPtr == pParm, TESSEL_ERR_USER_INPUT, "endPtr == pParm", -1);
    TESSEL_CHECK(endPtr && *endPtr, TESSEL_ERR_USER_INPUT, "endPtr && *endPtr", -1);
    TESSEL_CHECK(requester > UID_ERR, TESSEL_ERR_USER_INPUT, "requester > UID_ERR", -1);
    jParm["requester"] = (Json::UInt64)requester;
    if (NULL != (pParm = QLIBCSzHashGetValue(pParmHash, "version"))) {
        jParm["version"] = pParm;
    }
    // Kept as callers know it: 0 is a failed read, -1 a read (or a bad
    // request, which leaves the record untouched).
    if (!pObject->Get(jParm)) {
        return 0;
    }
    TESSEL_APPEND("pObject->Get(jParm)");
    return -1;
}
