// Creating many objects in one call: one record per new object, completed
// like a single create, written by up to 30 workers, read back and indexed
// together.
#include <memory>
#include <string>
#include <vector>

#include "common/tessel_priv.h"
#include "common/tessel_report.h"
#include "object/object_create.h"
#include "object/object_ops.h"
#include "tessel_backend.h"
#include "tessel_conf.h"
#include "tessel_hook.h"
#include "tessel_index.h"
#include "tessel_lock.h"
#include "tesselobject.h"

static constexpr const char kTesselModule[] = "object/list_object_create";

namespace {

constexpr char SZ_ACTION_CREATE[] = "create";

bool PreCheck(const Json::Value &jParm) {
    TESSEL_CHECK(!tessel::HasMember(jParm, "ns") || !jParm["ns"].isString() || !jParm.isMember("requester") ||
                     !jParm["requester"].isIntegral(),
                 TESSEL_ERR_USER_INPUT,
                 "!jParm.isMember(\"ns\") || !jParm[\"ns\"].isString() || !jParm.isMember(\"requester\") || "
                 "!jParm[\"requester\"].isIntegral()",
                 false);
    // Wider than a uid would wrap onto another user's id.
    TESSEL_CHECK(!jParm["requester"].isUInt(), TESSEL_ERR_USER_INPUT, "!jParm[\"requester\"].isUInt()", false);
    if (0 != tessel::UidOf(jParm["requester"])) {
        TESSEL_CHECK_APPEND(FALSE == TesselAccessCheck(jParm["ns"].asCString()),
                            "FALSE == TesselAccessCheck(jParm[\"ns\"].asCString())", false);
    } else {
        TESSEL_CHECK(!jParm.isMember("owner"), TESSEL_ERR_USER_INPUT, "!jParm.isMember(\"owner\")", false);
    }
    return true;
}

bool AppendRecord(TESSEL_OBJECT **&ppTail, const Json::Value *pId) {
    TESSEL_OBJECT **ppObj = ppTail;
    TESSEL_CHECK_APPEND(NULL == (*ppObj = TesselObjectAlloc()), "NULL == (*ppObj = TesselObjectAlloc())", false);
    if (pId) {
        (*ppObj)->m_param["id"] = *pId;
        (*ppObj)->set_id(pId->isString() ? pId->asString() : std::string());
    }
    ppTail = &(*ppObj)->next;
    return true;
}

// A record per object to make: one without a given id, one with "id", or one
// per element of the array "id", in its order. Each given id goes into the
// record's own parameters, where the completion checks it.
bool PrepareList(const Json::Value &jParm, TESSEL_OBJECT **ppHead) {
    TESSEL_OBJECT **ppTail = ppHead;
    if (!jParm.isMember("id")) {
        return AppendRecord(ppTail, NULL);
    }
    if (jParm["id"].isString()) {
        return AppendRecord(ppTail, &jParm["id"]);
    }
    TESSEL_CHECK(!jParm["id"].isArray(), TESSEL_ERR_USER_INPUT, "!jParm[\"id\"].isArray()", false);
    for (const Json::Value &jId : jParm["id"]) {
        if (!AppendRecord(ppTail, &jId)) {
            return false;
        }
    }
    return true;
}

// The record's own values win over the call's.
void MergeParam(Json::Value &jOwn, const Json::Value &jParm) {
    if (jOwn.empty()) {
        jOwn = jParm;
        return;
    }
    for (const std::string &strName : jParm.getMemberNames()) {
        if (!jOwn.isMember(strName)) {
            jOwn[strName] = jParm[strName];
        }
    }
}

bool doMultiThreadCreate(TESSEL_OBJECT_LIST *pList) {
    // Made here only to learn that the store exists; each worker makes its own.
    std::unique_ptr<TESSEL_BACKEND_OP> pBackendFs(RegisterBackend::New("fs"));
    TESSEL_CHECK(NULL == pBackendFs, TESSEL_ERR_NO_BACKEND, "NULL == (pBackendFs = RegisterBackend::New(\"fs\"))",
                 false);
    TESSEL_AS_ROOT();
    tessel::RunDealt(pList->m_head, kTesselModule, [](const std::vector<TESSEL_OBJECT *> &records) {
        std::unique_ptr<TESSEL_BACKEND_OP> pWorkerFs(RegisterBackend::New("fs"));
        for (TESSEL_OBJECT *pObj : records) {
            std::string strNewID;
            std::string strNewVer;
            if (pWorkerFs && pWorkerFs->Create(pObj->m_param, strNewID, strNewVer)) {
                pObj->set_id(strNewID);
                pObj->set_version(strNewVer);
                pObj->set_err(false);
            } else {
                if (pWorkerFs) {
                    TESSEL_APPEND("!pBackendFs->Create(pObj->m_param, strNewID, strNewVer)");
                } else {
                    TESSEL_RAISE(TESSEL_ERR_NO_BACKEND, "NULL == (pBackendFs = RegisterBackend::New(\"fs\"))");
                }
                pObj->set_err(true);
            }
        }
    });
    return true;
}

}  // namespace

bool TESSEL_OBJECT_LIST::Create(const Json::Value &jParm, Json::Value &jsResult) {
    TESSEL_CHECK_APPEND(!PreCheck(jParm), "!PreCheck(jParm)", false);
    if (empty()) {
        TESSEL_CHECK_APPEND(!PrepareList(jParm, &m_head), "!PrepareList(jParm, &m_head)", false);
    }
    for (TESSEL_OBJECT *pObj = m_head; pObj; pObj = pObj->next) {
        MergeParam(pObj->m_param, jParm);
        // The call's array of ids is not a parameter of any one record.
        if (pObj->m_param.isMember("id") && !pObj->m_param["id"].isString() && jParm.isMember("id") &&
            pObj->m_param["id"] == jParm["id"]) {
            pObj->m_param.removeMember("id");
        }
        TESSEL_CHECK_APPEND(!PrepareCreateParm(pObj->m_param), "!PrepareCreateParm(pObj->m_param)", false);
    }

    const std::string strNs = jParm["ns"].asString();
    TESSEL_LOCKER locker;
    TESSEL_CHECK_APPEND(!locker.ReadLock(TESSEL_LOCK_ALL, strNs, Json::nullValue),
                        "!locker.ReadLock(TESSEL_LOCK_ALL, jParm[\"ns\"].asString(), Json::nullValue)", false);
    const TESSEL_NS_HOOK pfnPost = tessel::RunPreHook(strNs, SZ_ACTION_CREATE, true, jParm, m_head);
    TESSEL_CHECK_APPEND(!doMultiThreadCreate(this), "!doMultiThreadCreate(this)", false);

    // The created records, in list order, and where each was copied from.
    Json::Value jsId(Json::arrayValue);
    Json::Value jsVersion(Json::objectValue);
    for (TESSEL_OBJECT *pObj = m_head; pObj; pObj = pObj->next) {
        if (pObj->get_ref_err().isBool() && !pObj->get_ref_err().asBool()) {
            jsId.append(pObj->get_ref_id());
            jsVersion[pObj->get_ref_id()] = pObj->get_ref_version();
            const Json::Value &jSource = tessel::MemberOf(pObj->m_param, "copy_from_object");
            if (jSource.isString()) {
                jsResult[jSource.asString()] = pObj->get_ref_id();
            }
        }
    }
    TESSEL_CHECK(jsId.empty(), TESSEL_ERR_OPERATION_FAILED, "jsId.empty()", false);

    TESSEL_OBJECT_LIST list;
    Json::Value jGetParm(Json::objectValue);
    Json::Value jsGetResult(Json::objectValue);
    jGetParm["ns"] = strNs;
    jGetParm["id"] = jsId;
    jGetParm["version"] = jsVersion;
    jGetParm["requester"] = jParm["requester"];
    jGetParm["field"] = TesselObjectFieldAll();
    TESSEL_CHECK_APPEND(!TesselSettingsIndexGetFromCache(strNs, jGetParm["field_filter"]),
                        "!TesselSettingsIndexGetFromCache(jGetParm[\"ns\"].asString(), jGetParm[\"field_filter\"])",
                        false);
    TESSEL_CHECK_APPEND(!list.Get(jGetParm, jsGetResult), "!list.Get(jGetParm, jsGetResult)", false);
    size_t nRead = 0;
    for (const Json::Value &jId : jsId) {
        nRead += jsGetResult[jId.asString()].asBool() ? 1 : 0;
    }
    // Every record must have been made and read back: a call that made only
    // some of its objects is reported as failed (the records keep their err).
    TESSEL_CHECK(size() != nRead, TESSEL_ERR_OPERATION_FAILED, "size() != list.size()", false);
    TESSEL_CHECK_APPEND(!TesselObjectBatchIndex(list.m_head), "!TesselObjectBatchIndex(list.m_head)", false);

    // The call's records become the objects as read back, each with the
    // parameters it was made with.
    TESSEL_OBJECT *pMade = m_head;
    for (TESSEL_OBJECT *pRead = list.m_head; pRead && pMade; pRead = pRead->next, pMade = pMade->next) {
        pRead->m_param.swap(pMade->m_param);
        pRead->set_err(false);
    }
    std::swap(m_head, list.m_head);
    if (pfnPost) {
        pfnPost(jParm, m_head);
    }
    return true;
}
