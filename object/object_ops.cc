// Shared pieces of the changing operations: request members, worker threads,
// inherited acls, the word reported after a change.
#include "object/object_ops.h"

#include <errno.h>
#include <pthread.h>
#include <syslog.h>

#include <map>
#include <utility>

#include "common/tessel_report.h"
#include "object/object_perm.h"
#include "tessel_error.h"

namespace {

constexpr unsigned kMaxWorkers = 30;
constexpr char SZ_PERM_NA[] = "NA";
constexpr char SZ_PERM_OWNER[] = "owner";

const Json::Value &NullValue() {
    static const Json::Value jNull;
    return jNull;
}

struct Worker {
    std::vector<TESSEL_OBJECT *> records;
    const std::function<void(const std::vector<TESSEL_OBJECT *> &)> *work = nullptr;
};

void *RunWorker(void *pArg) {
    Worker *pWorker = static_cast<Worker *>(pArg);
    (*pWorker->work)(pWorker->records);
    return nullptr;
}

void MarkInherit(Json::Value &jEntry) {
    if (jEntry.isObject()) {
        jEntry["inherit"] = true;
    }
}

}  // namespace

namespace tessel {

bool HasMember(const Json::Value &jParm, const char *szKey) { return jParm.isObject() && jParm.isMember(szKey); }

const Json::Value &MemberOf(const Json::Value &jParm, const char *szKey) {
    return HasMember(jParm, szKey) ? jParm[szKey] : NullValue();
}

unsigned int UidOf(const Json::Value &jVal) {
    if (jVal.isUInt64()) {
        return static_cast<unsigned int>(jVal.asUInt64());
    }
    if (jVal.isInt64()) {
        return static_cast<unsigned int>(jVal.asInt64());
    }
    return static_cast<unsigned int>(-1);
}

void RunDealt(TESSEL_OBJECT *pHead, const char *szModule,
              const std::function<void(const std::vector<TESSEL_OBJECT *> &)> &work) {
    std::vector<TESSEL_OBJECT *> records;
    for (TESSEL_OBJECT *pObj = pHead; pObj; pObj = pObj->next) {
        records.push_back(pObj);
    }
    if (records.size() <= 1) {
        if (!records.empty()) {
            work(records);
        }
        return;
    }
    std::map<unsigned, Worker> workers;
    for (size_t i = 0; i < records.size(); ++i) {
        Worker &worker = workers[static_cast<unsigned>(i % kMaxWorkers)];
        worker.records.push_back(records[i]);
        worker.work = &work;
    }
    std::vector<std::pair<unsigned, pthread_t>> threads;
    for (auto &entry : workers) {
        pthread_t tid;
        if (0 == pthread_create(&tid, nullptr, RunWorker, &entry.second)) {
            threads.emplace_back(entry.first, tid);
        } else {
            work(entry.second.records);
        }
    }
    for (const auto &thread : threads) {
        const int rc = pthread_join(thread.second, nullptr);
        if (0 != rc) {
            errno = rc;
            LogLine(LOG_ERR, szModule, __LINE__, "Fail to join thread %u %m", thread.first);
        }
    }
}

Json::Value InheritedAcl(const Json::Value &jParentAcl) {
    Json::Value jAcl = jParentAcl.isObject() ? jParentAcl : Json::Value(Json::objectValue);
    MarkInherit(jAcl["public"]);
    MarkInherit(jAcl["zem_app"]);
    for (const char *szEntries : {"zem_user", "zem_group"}) {
        if (jAcl[szEntries].isObject()) {
            for (Json::Value &jEntry : jAcl[szEntries]) {
                MarkInherit(jEntry);
            }
        }
    }
    // Marking must not invent entries the parent does not have.
    for (const char *szKey : {"public", "zem_app", "zem_user", "zem_group"}) {
        if (jAcl[szKey].isNull()) {
            jAcl.removeMember(szKey);
        }
    }
    return jAcl;
}

Json::Value ReadRequest(const Json::Value &jParm, const Json::Value &jId) {
    Json::Value jGetParm(Json::objectValue);
    jGetParm["ns"] = jParm["ns"];
    jGetParm["id"] = jId;
    jGetParm["requester"] = jParm["requester"];
    return jGetParm;
}

TESSEL_NS_HOOK RunPreHook(const std::string &strNs, const char *szAction, bool blBatch, const Json::Value &jParm,
                          const TESSEL_OBJECT *pObj) {
    TESSEL_NS_HOOK pfnPre = NULL;
    TESSEL_NS_HOOK pfnPost = NULL;
    if (blBatch) {
        TesselNsBatchHookGet(strNs, szAction, &pfnPre, &pfnPost);
    } else {
        TesselNsHookGet(strNs, szAction, &pfnPre, &pfnPost);
    }
    if (pfnPre) {
        pfnPre(jParm, pObj);
    }
    return pfnPost;
}

std::string PermAfterChange(const Json::Value &jParm, const TESSEL_OBJECT &obj) {
    const Json::Value jSavedStack = TesselErrMsgGet();
    std::string strPerm;
    if (!TesselObjectPermCalculate(UidOf(MemberOf(jParm, "requester")), static_cast<unsigned int>(obj.get_owner()),
                                   obj.get_ref_acl(), strPerm)) {
        // The change is made; that it took the requester's own right away is
        // the answer, not a failure.
        TesselErrMsgGet() = jSavedStack;
        return SZ_PERM_NA;
    }
    if (SZ_PERM_OWNER == strPerm && MemberOf(jParm, "delegate_perm").isString()) {
        return jParm["delegate_perm"].asString();
    }
    return strPerm;
}

}  // namespace tessel
