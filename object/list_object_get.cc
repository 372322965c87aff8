// Reading many objects at once: the ids become records, the records are
// dealt to at most 30 worker threads, and each record gets its word.
#include <pthread.h>
#include <sys/types.h>

#include <map>
#include <memory>
#include <string>
#include <vector>

#include "common/tessel_priv.h"
#include "common/tessel_report.h"
#include "object/object_get.h"
#include "object/list_object_get.h"
#include "object/object_perm.h"
#include "tessel_backend.h"
#include "tessel_conf.h"
#include "tessel_id.h"
#include "tesselobject.h"

static constexpr const char kTesselModule[] = "object/list_object_get";

namespace {

// The store's read of one record of the list.
void ReadRecord(TESSEL_BACKEND_OP *pBackendFs, const Json::Value &jParm, TESSEL_OBJECT *pObj) {
    Json::Value jGet = jParm;
    jGet["id"] = pObj->get_ref_id();
    tessel::ForceAclField(jGet);
    if (jParm.isMember("version")) {
        const Json::Value &jVersion = jParm["version"];
        // A per-id map without this id goes to the store as it is.
        if (jVersion.isObject() && jVersion.isMember(pObj->get_ref_id())) {
            jGet["version"] = jVersion[pObj->get_ref_id()];
        }
    } else if (!pObj->get_ref_version().empty()) {
        jGet["version"] = pObj->get_ref_version();
    }
    pObj->set_err(Json::Value(!pBackendFs->Get(jGet, pObj)));
}

void ReadRecords(TESSEL_BACKEND_OP *pBackendFs, const Thread_Info &info) {
    for (TESSEL_OBJECT *pObj : info.vObjs) {
        ReadRecord(pBackendFs, *info.pParm, pObj);
    }
}

// A worker: its own store, its own records.
void *WorkerMain(void *pArg) {
    const Thread_Info &info = *static_cast<const Thread_Info *>(pArg);
    TESSEL_BACKEND_OP *pBackendFs = NULL;
    if (NULL == (pBackendFs = RegisterBackend::New("fs"))) {
        TESSEL_RAISE(TESSEL_ERR_NO_BACKEND, "NULL == (pBackendFs = RegisterBackend::New(\"fs\"))");
        for (TESSEL_OBJECT *pObj : info.vObjs) {
            pObj->set_err(Json::Value(true));
        }
        return NULL;
    }
    ReadRecords(pBackendFs, info);
    delete pBackendFs;
    return NULL;
}

bool PrepareList(const Json::Value &jParm, TESSEL_OBJECT **ppHead) {
    TESSEL_CHECK(!jParm.isMember("id"), TESSEL_ERR_USER_INPUT, "!jParm.isMember(\"id\")", false);
    Json::Value jIds = jParm["id"];
    if (jIds.isString()) {
        Json::Value jOne(Json::arrayValue);
        jOne.append(jIds);
        jIds.swap(jOne);
    }
    TESSEL_CHECK(!jIds.isArray(), TESSEL_ERR_USER_INPUT, "!jParm[\"id\"].isArray()", false);
    // Built aside and attached whole: a failure leaves the list empty.
    TESSEL_OBJECT *pHead = NULL;
    TESSEL_OBJECT **ppObj = &pHead;
    for (const Json::Value &jId : jIds) {
        if (!jId.isString()) {
            TesselObjectFreeList(pHead);
        }
        TESSEL_CHECK(!jId.isString(), TESSEL_ERR_USER_INPUT, "!(*jsIt).isString()", false);
        if (NULL == (*ppObj = TesselObjectAlloc())) {
            TesselObjectFreeList(pHead);
        }
        TESSEL_CHECK_APPEND(NULL == *ppObj, "NULL == (*ppObj = TesselObjectAlloc())", false);
        (*ppObj)->set_id(jId.asString());
        ppObj = &(*ppObj)->next;
    }
    *ppHead = pHead;
    return true;
}

bool PreCheck(const Json::Value &jParm, const TESSEL_OBJECT_LIST *pList) {
    TESSEL_CHECK(!jParm.isMember("ns") || !jParm["ns"].isString() || (pList->empty() && !jParm.isMember("id")) ||
                     !jParm.isMember("requester") || !jParm["requester"].isIntegral(),
                 TESSEL_ERR_USER_INPUT,
                 "!jParm.isMember(\"ns\") || !jParm[\"ns\"].isString() || (pList->empty() && "
                 "!jParm.isMember(\"id\")) || !jParm.isMember(\"requester\") || !jParm[\"requester\"].isIntegral()",
                 false);
    // Wider values would wrap around to another user, 4294967296 to root.
    TESSEL_CHECK(!jParm["requester"].isUInt(), TESSEL_ERR_USER_INPUT, "!jParm[\"requester\"].isUInt()", false);
    TESSEL_CHECK(jParm.isMember("version") && !jParm["version"].isString() && !jParm["version"].isObject(),
                 TESSEL_ERR_USER_INPUT,
                 "jParm.isMember(\"version\") && !jParm[\"version\"].isString() && !jParm[\"version\"].isObject()",
                 false);
    TESSEL_CHECK(jParm.isMember("field") && !jParm["field"].isObject(), TESSEL_ERR_USER_INPUT,
                 "jParm.isMember(\"field\") && !jParm[\"field\"].isObject()", false);
    const uid_t requester = tessel::RequesterOf(jParm["requester"]);
    if (UID_ROOT == requester) {
        return true;
    }
    TESSEL_CHECK_APPEND(FALSE == TesselAccessCheck(jParm["ns"].asCString()),
                        "FALSE == TesselAccessCheck(jParm[\"ns\"].asCString())", false);
    for (const TESSEL_OBJECT *pObj = pList->head(); NULL != pObj; pObj = pObj->next) {
        unsigned int owner = UID_ERR;
        TESSEL_CHECK_APPEND(UID_ERR == (owner = TesselObjectGetOwnerByID(pObj->get_ref_id())),
                            "UID_ERR == (owner = TesselObjectGetOwnerByID(pObj->get_ref_id()))", false);
        TESSEL_CHECK_APPEND(FALSE == TesselObjectOwnerIsValid(owner), "FALSE == TesselObjectOwnerIsValid(owner)",
                            false);
        if (requester != owner) {
            TESSEL_CHECK(FALSE == TesselSharingCheck(jParm["ns"].asCString(), owner), TESSEL_ERR_NO_PERMISSION,
                         "FALSE == TesselSharingCheck(jParm[\"ns\"].asCString(), owner)", false);
        }
    }
    return true;
}

bool doMultiThreadGet(const Json::Value &jParm, TESSEL_OBJECT_LIST *pList) {
    // Before the workers start and until they are joined: they read as root.
    TESSEL_AS_ROOT();
    std::unique_ptr<TESSEL_BACKEND_OP> pBackendFs;
    pBackendFs.reset(RegisterBackend::New("fs"));
    TESSEL_CHECK(NULL == pBackendFs, TESSEL_ERR_NO_BACKEND, "NULL == (pBackendFs = RegisterBackend::New(\"fs\"))",
                 false);
    TESSEL_OBJECT *pHead = pList->head();
    if (NULL == pHead) {
        return true;
    }
    if (NULL == pHead->next) {
        ReadRecord(pBackendFs.get(), jParm, pHead);
        return true;
    }
    std::map<unsigned int, Thread_Info> mapThreads;
    tessel::DealToWorkers(jParm, pHead, mapThreads);
    std::vector<std::pair<unsigned int, pthread_t>> vCreated;
    for (std::map<unsigned int, Thread_Info>::iterator it = mapThreads.begin(); it != mapThreads.end(); ++it) {
        pthread_t tid;
        if (0 == pthread_create(&tid, NULL, WorkerMain, &it->second)) {
            vCreated.emplace_back(it->first, tid);
        } else {
            // No thread: this worker's share is read here, now.
            ReadRecords(pBackendFs.get(), it->second);
        }
    }
    for (const std::pair<unsigned int, pthread_t> &worker : vCreated) {
        if (0 != pthread_join(worker.second, NULL)) {
            TESSEL_LOG(LOG_ERR, "Fail to join thread %u %m", worker.first);
        }
    }
    return true;
}

}  // namespace

namespace tessel {

void DealToWorkers(const Json::Value &jParm, TESSEL_OBJECT *pHead, std::map<unsigned int, Thread_Info> &mapThreads) {
    unsigned int i = 0;
    for (TESSEL_OBJECT *pObj = pHead; NULL != pObj; pObj = pObj->next, ++i) {
        Thread_Info &info = mapThreads[i % kMaxGetWorkers];
        info.pParm = &jParm;
        info.vObjs.push_back(pObj);
    }
}

}  // namespace tessel

bool TESSEL_OBJECT_LIST::Get(const Json::Value &jParmIn, Json::Value &jsResult) {
    const Json::Value jParm = jParmIn;
    const bool blAskedAcl = tessel::AskedForAcl(jParm);
    if (empty()) {
        TESSEL_CHECK_APPEND(!PrepareList(jParm, &m_head), "!PrepareList(jParm, &m_head)", false);
    }
    TESSEL_CHECK_APPEND(!PreCheck(jParm, this), "!PreCheck(jParm, this)", false);
    TESSEL_CHECK_APPEND(!doMultiThreadGet(jParm, this), "!doMultiThreadGet(jParm, this)", false);

    jsResult = Json::Value(Json::objectValue);
    for (const TESSEL_OBJECT *pObj = m_head; NULL != pObj; pObj = pObj->next) {
        jsResult[pObj->get_ref_id()] = !pObj->get_ref_err().asBool();
    }

    const uid_t requester = tessel::RequesterOf(jParm["requester"]);
    for (TESSEL_OBJECT *pObj = m_head; NULL != pObj; pObj = pObj->next) {
        std::string strPerm;
        if (!TesselObjectPermCalculate(requester, (unsigned int)pObj->get_owner(), pObj->get_ref_acl(), strPerm)) {
            // This record and the ones not yet judged keep nothing of their
            // objects but the names.
            for (TESSEL_OBJECT *pWithheld = pObj; NULL != pWithheld; pWithheld = pWithheld->next) {
                tessel::WithholdRecord(pWithheld);
            }
            TESSEL_APPEND(
                "!TesselObjectPermCalculate((uid_t)jParm[\"requester\"].asInt64(), pObj->get_owner(), "
                "pObj->get_ref_acl(), strPerm)");
            return false;
        }
        tessel::HideAndDelegate(jParm, blAskedAcl, strPerm, pObj);
        pObj->set_perm(strPerm);
    }
    return true;
}

bool TESSEL_OBJECT_LIST::GetObject(const Json::Value &jParm) {
    TESSEL_OBJECT *pObj = NULL;
    TESSEL_CHECK_APPEND(NULL == (pObj = TesselObjectAlloc()), "NULL == (pObj = TesselObjectAlloc())", false);
    if (!pObj->Get(jParm)) {
        delete pObj;
        TESSEL_APPEND("!pObj->Get(jParm)");
        return false;
    }
    clear();
    m_head = pObj;
    return true;
}
