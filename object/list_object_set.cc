// Changing many objects in one call: every record read and checked first,
// then written by up to 30 workers, read back and indexed together.
#include <syslog.h>

#include <memory>
#include <string>
#include <vector>

#include "common/tessel_priv.h"
#include "common/tessel_report.h"
#include "object/object_ops.h"
#include "object/object_set.h"
#include "tessel_backend.h"
#include "tessel_conf.h"
#include "tessel_hook.h"
#include "tessel_id.h"
#include "tessel_index.h"
#include "tessel_lock.h"
#include "tesselobject.h"

static constexpr const char kTesselModule[] = "object/list_object_set";

namespace {

constexpr char SZ_PERM_RW[] = "rw";
constexpr char SZ_PERM_OWNER[] = "owner";
constexpr char SZ_ACTION_SET[] = "set";

bool PrepareList(const Json::Value &jParm, TESSEL_OBJECT **ppHead) {
    TESSEL_CHECK(!jParm.isMember("id"), TESSEL_ERR_USER_INPUT, "!jParm.isMember(\"id\")", false);
    TESSEL_CHECK(!jParm["id"].isArray(), TESSEL_ERR_USER_INPUT, "!jParm[\"id\"].isArray()", false);
    TESSEL_OBJECT **ppObj = ppHead;
    for (const Json::Value &jId : jParm["id"]) {
        TESSEL_CHECK_APPEND(NULL == (*ppObj = TesselObjectAlloc()), "NULL == (*ppObj = TesselObjectAlloc())", false);
        (*ppObj)->set_id(jId.isString() ? jId.asString() : std::string());
        ppObj = &(*ppObj)->next;
    }
    return true;
}

// The records' objects as they stand, each of which the requester must be
// allowed to change.
bool PreCheck(const Json::Value &jParm, TESSEL_OBJECT_LIST *pList, Json::Value &jsResult) {
    if (0 != tessel::UidOf(jParm["requester"])) {
        TESSEL_CHECK_APPEND(FALSE == TesselAccessCheck(jParm["ns"].asCString()),
                            "FALSE == TesselAccessCheck(jParm[\"ns\"].asCString())", false);
    }
    for (TESSEL_OBJECT *pObj = pList->m_head; pObj; pObj = pObj->next) {
        TESSEL_CHECK_APPEND(FALSE == TesselObjectIDIsValid(pObj->get_ref_id().c_str()),
                            "FALSE == TesselObjectIDIsValid(pObj->get_ref_id().c_str())", false);
    }
    Json::Value jGetParm(Json::objectValue);
    jGetParm["ns"] = jParm["ns"];
    jGetParm["requester"] = jParm["requester"];
    if (jParm.isMember("version")) {
        jGetParm["version"] = jParm["version"];
    }
    jGetParm["field"] = TesselObjectFieldAll();
    TESSEL_CHECK_APPEND(!TesselSettingsIndexGetFromCache(jGetParm["ns"].asString(), jGetParm["field_filter"]),
                        "!TesselSettingsIndexGetFromCache(jGetParm[\"ns\"].asString(), jGetParm[\"field_filter\"])",
                        false);
    TESSEL_CHECK_APPEND(!pList->Get(jGetParm, jsResult), "!pList->Get(jGetParm, jsResult)", false);
    for (TESSEL_OBJECT **ppObj = &pList->m_head; *ppObj; ppObj = &(*ppObj)->next) {
        // Root may read an id that has no object; there is nothing to change.
        TESSEL_CHECK(!jsResult[(*ppObj)->get_ref_id()].asBool(), TESSEL_ERR_NOT_EXISTS,
                     "!jsResult[(*ppObj)->get_ref_id()].asBool()", false);
        if (SZ_PERM_RW != (*ppObj)->get_ref_perm() && SZ_PERM_OWNER != (*ppObj)->get_ref_perm()) {
            TESSEL_RAISE(TESSEL_ERR_NO_PERMISSION,
                         "rw != (*ppObj)->get_ref_perm() && owner != (*ppObj)->get_ref_perm() [%s]",
                         (*ppObj)->get_ref_perm().c_str());
            return false;
        }
    }
    return true;
}

// The record's own parameters: the call's, for this record's id and version.
// A version map names the version of each id; without one, the version just
// read is the base, except for a change of text or binaries, which must
// name its base itself.
void RecordParam(const Json::Value &jParm, TESSEL_OBJECT *pObj) {
    Json::Value &jOwn = pObj->m_param;
    for (const std::string &strName : jParm.getMemberNames()) {
        if (!jOwn.isMember(strName)) {
            jOwn[strName] = jParm[strName];
        }
    }
    jOwn["id"] = pObj->get_ref_id();
    if (tessel::MemberOf(jOwn, "version").isObject()) {
        const Json::Value jVersions = jOwn["version"];
        jOwn.removeMember("version");
        if (jVersions.isMember(pObj->get_ref_id())) {
            jOwn["version"] = jVersions[pObj->get_ref_id()];
        }
    }
    if (!jOwn.isMember("version") && !jOwn.isMember("text") && !jOwn.isMember("binary_files")) {
        jOwn["version"] = pObj->get_ref_version();
    }
}

bool doMultiThreadSet(TESSEL_OBJECT_LIST *pList, std::vector<bool> &vecSetOk) {
    std::unique_ptr<TESSEL_BACKEND_OP> pBackendFs(RegisterBackend::New("fs"));
    TESSEL_CHECK(NULL == pBackendFs, TESSEL_ERR_NO_BACKEND, "NULL == (pBackendFs = RegisterBackend::New(\"fs\"))",
                 false);
    TESSEL_AS_ROOT();
    tessel::RunDealt(pList->m_head, kTesselModule, [](const std::vector<TESSEL_OBJECT *> &records) {
        std::unique_ptr<TESSEL_BACKEND_OP> pWorkerFs(RegisterBackend::New("fs"));
        for (TESSEL_OBJECT *pObj : records) {
            std::string strNewVer;
            if (pWorkerFs && pWorkerFs->Set(pObj->m_param, strNewVer)) {
                // The version to read back; none when only plain files changed.
                pObj->set_version(strNewVer);
                pObj->set_err(false);
                continue;
            }
            if (pWorkerFs) {
                TESSEL_APPEND("!pBackendFs->Set(pObj->m_param, strNewVer)");
            } else {
                TESSEL_RAISE(TESSEL_ERR_NO_BACKEND, "NULL == (pBackendFs = RegisterBackend::New(\"fs\"))");
            }
            TESSEL_LOG(LOG_ERR, "Failed to set [%s]", pObj->get_ref_id().c_str());
            pObj->set_err(true);
        }
    });
    for (TESSEL_OBJECT *pObj = pList->m_head; pObj; pObj = pObj->next) {
        vecSetOk.push_back(pObj->get_ref_err().isBool() && !pObj->get_ref_err().asBool());
    }
    return true;
}

}  // namespace

bool TESSEL_OBJECT_LIST::Set(const Json::Value &jParm, Json::Value &jsResult) {
    TESSEL_CHECK(!tessel::HasMember(jParm, "ns") || !jParm["ns"].isString() || !jParm.isMember("requester") ||
                     !jParm["requester"].isIntegral(),
                 TESSEL_ERR_USER_INPUT,
                 "!jParm.isMember(\"ns\") || !jParm[\"ns\"].isString() || !jParm.isMember(\"requester\") || "
                 "!jParm[\"requester\"].isIntegral()",
                 false);
    // Wider than a uid would wrap onto another user's id.
    TESSEL_CHECK(!jParm["requester"].isUInt(), TESSEL_ERR_USER_INPUT, "!jParm[\"requester\"].isUInt()", false);
    if (empty()) {
        TESSEL_CHECK_APPEND(!PrepareList(jParm, &m_head), "!PrepareList(jParm, &m_head)", false);
    }
    TESSEL_CHECK(jParm.isMember("version") && !jParm["version"].isString() && !jParm["version"].isObject(),
                 TESSEL_ERR_USER_INPUT, "version format is invalid.", false);
    TESSEL_CHECK_APPEND(!PreCheck(jParm, this, jsResult), "!PreCheck(jParm, this)", false);
    Json::Value jsIds(Json::arrayValue);
    for (TESSEL_OBJECT *pObj = m_head; pObj; pObj = pObj->next) {
        RecordParam(jParm, pObj);
        TESSEL_CHECK_APPEND(!PrepareSetParm(pObj->m_param, pObj->get_ref_acl(), pObj),
                            "!PrepareSetParm(pObj->m_param, pObj->get_ref_acl(), pObj)", false);
        jsIds.append(pObj->get_ref_id());
    }

    const std::string strNs = jParm["ns"].asString();
    Json::Value jLockParm(Json::objectValue);
    jLockParm["ns"] = strNs;
    jLockParm["id"] = jsIds;
    int level = TESSEL_LOCK_ALL;
    TESSEL_CHECK_APPEND(!tessel::SetLockLevel(jLockParm, level), "!SetLockLevel(jParm, level)", false);
    TESSEL_LOCKER locker;
    if (TESSEL_LOCK_ALL == level) {
        TESSEL_CHECK_APPEND(!locker.ReadLock(TESSEL_LOCK_ALL, strNs, jsIds),
                            "!locker.ReadLock(TESSEL_LOCK_ALL, jParm[\"ns\"].asString(), jParm[\"id\"])", false);
    } else {
        TESSEL_CHECK_APPEND(!locker.ReadLock(TESSEL_LOCK_BACKUP_OBJECT_VOLUME, strNs, jsIds),
                            "!locker.ReadLock(TESSEL_LOCK_BACKUP_OBJECT_VOLUME, jParm[\"ns\"].asString(), jParm[\"id\"])",
                            false);
    }
    const TESSEL_NS_HOOK pfnPost = tessel::RunPreHook(strNs, SZ_ACTION_SET, true, jParm, m_head);
    std::vector<bool> vecSetOk;
    TESSEL_CHECK_APPEND(!doMultiThreadSet(this, vecSetOk), "!doMultiThreadSet(this)", false);

    Json::Value jGetParm;
    Json::Value jsGetResult(Json::objectValue);
    TESSEL_CHECK_APPEND(!tessel::ReadBackParm(jParm, jGetParm),
                        "!TesselSettingsIndexGetFromCache(jGetParm[\"ns\"].asString(), jGetParm[\"field_filter\"])",
                        false);
    TESSEL_CHECK_APPEND(!Get(jGetParm, jsGetResult), "!Get(jGetParm, jsGetResult)", false);
    size_t i = 0;
    for (TESSEL_OBJECT *pObj = m_head; pObj; pObj = pObj->next, ++i) {
        const bool blOk = vecSetOk[i] && jsGetResult[pObj->get_ref_id()].asBool();
        pObj->set_perm(tessel::PermAfterChange(jParm, *pObj));
        pObj->set_err(!blOk);
        jsResult[pObj->get_ref_id()] = blOk;
    }
    TESSEL_CHECK_APPEND(!TesselObjectBatchIndex(m_head), "!TesselObjectBatchIndex(m_head)", false);
    if (pfnPost) {
        pfnPost(jParm, m_head);
    }
    return true;
}
