// Changing one object: parameter completion (moves, parent resets, the acl
// taken from a new parent), the single set and its two thin forms.
#include <stdio.h>
#include <stdlib.h>
#include <time.h>

#include <memory>
#include <string>

#include "common/tessel_json.h"
#include "common/tessel_priv.h"
#include "common/tessel_report.h"
#include "object/object_ops.h"
#include "object/object_upload.h"
#include "object/object_set.h"
#include "tessel_backend.h"
#include "tessel_conf.h"
#include "tessel_hook.h"
#include "tessel_id.h"
#include "tessel_index.h"
#include "tessel_lock.h"
#include "tessel_ns.h"
#include "tesselobject.h"

static constexpr const char kTesselModule[] = "object/list_object_set";

namespace {

constexpr char SZ_PERM_RW[] = "rw";
constexpr char SZ_PERM_OWNER[] = "owner";
constexpr char SZ_ACTION_SET[] = "set";
constexpr char SZ_BASIC_JSON[] = "basic.json";
constexpr char SZK_AUTO_MTIME[] = "auto_mtime";

enum { TESSEL_OBJECT_ACTION_SET = 2 };

bool IsInherited(const Json::Value &jEntry) {
    return jEntry.isObject() && jEntry["inherit"].isBool() && jEntry["inherit"].asBool();
}

/*
 * The acl of an object that moves with "acl_inherit": the new parent's
 * entries, marked inherited, with the object's own entries (those not
 * marked) on top, because what was set on the object itself stays its own
 * wherever it goes. What the old parent had passed down is dropped; a move to
 * the top level therefore keeps just the object's own entries. "enabled"
 * follows the new parent when it has one.
 */
Json::Value AclFromNewParent(const Json::Value &jOwnAcl, const Json::Value &jParentAcl) {
    Json::Value jAcl = tessel::InheritedAcl(jParentAcl);
    if (!jOwnAcl.isObject()) {
        return jAcl;
    }
    if (!jAcl.isMember("enabled") && jOwnAcl.isMember("enabled")) {
        jAcl["enabled"] = jOwnAcl["enabled"];
    }
    for (const char *szKey : {"public", "zem_app"}) {
        if (jOwnAcl[szKey].isObject() && !IsInherited(jOwnAcl[szKey])) {
            jAcl[szKey] = jOwnAcl[szKey];
        }
    }
    for (const char *szKey : {"zem_user", "zem_group"}) {
        if (!jOwnAcl[szKey].isObject()) {
            continue;
        }
        for (const std::string &strName : jOwnAcl[szKey].getMemberNames()) {
            if (!IsInherited(jOwnAcl[szKey][strName])) {
                jAcl[szKey][strName] = jOwnAcl[szKey][strName];
            }
        }
    }
    return jAcl;
}

bool get_basic(unsigned int, const std::string &strNs, const std::string &strId, Json::Value &jBasic) {
    std::string strNSPath;
    TESSEL_CHECK_APPEND(!TesselGetNSPath(strNs, strNSPath), "!TesselGetNSPath(jParm[\"ns\"].asString(), strNSPath)",
                        false);
    const std::string strPath = strNSPath + "/" + strId + "/" + SZ_BASIC_JSON;
    bool blRead = false;
    {
        // The object's files belong to root and the owner alone.
        TESSEL_AS_ROOT();
        blRead = tessel::fromFile(jBasic, strPath);
    }
    TESSEL_CHECK(!blRead, TESSEL_ERR_USER_INPUT, "!jBasic.fromFile(strPath)", false);
    return true;
}

/*
 * The store keeps a stored member whose "auto_mtime" is newer than the
 * request's time. A move that lost that way would leave the object where it
 * was while its acl followed the new parent, and say nothing: a move older
 * than the parent on record is refused instead.
 */
bool CheckParentTime(const Json::Value &jParm, unsigned int owner) {
    Json::Value jBasic;
    TESSEL_CHECK_APPEND(!get_basic(owner, jParm["ns"].asString(), jParm["id"].asString(), jBasic),
                        "!get_basic(owner, jParm[\"ns\"].asString(), jParm[\"id\"].asString(), jBasic)", false);
    TESSEL_CHECK(!jBasic.isObject() || !jBasic.isMember(SZK_AUTO_MTIME), TESSEL_ERR_USER_INPUT,
                 "!jBasic.isMember(\"auto_mtime\")", false);
    TESSEL_CHECK(!jBasic[SZK_AUTO_MTIME].isObject() || !jBasic[SZK_AUTO_MTIME].isMember("parent_id"),
                 TESSEL_ERR_USER_INPUT, "!jBasic[\"auto_mtime\"].isMember(\"parent_id\")", false);
    const Json::Value &jStored = jBasic[SZK_AUTO_MTIME]["parent_id"];
    const long long mtime = jParm.isMember("mtime") ? jParm["mtime"].asInt64() : (long long)time(NULL);
    TESSEL_CHECK(jStored.isIntegral() && jStored.asInt64() > mtime, TESSEL_ERR_USER_INPUT,
                 "jBasic[\"auto_mtime\"][\"parent_id\"].asInt64() > mtime", false);
    return true;
}

/*
 * A move to "parent_id", or a reset of the parent ("reset_parent_id") to the
 * owner's top level. Objects move only among their owner's objects. As in a
 * create, a parent that is no object (the owner's default id, or one that is
 * gone) places the object at the top level.
 */
bool PrepareParent(Json::Value &jParm, const Json::Value &oldAcl) {
    const bool blReset = jParm.isMember("reset_parent_id");
    TESSEL_CHECK(blReset && jParm.isMember("parent_id"), TESSEL_ERR_USER_INPUT,
                 "jParm.isMember(\"parent_id\") && jParm.isMember(\"reset_parent_id\")", false);
    TESSEL_CHECK(!blReset && !tessel::MemberOf(jParm, "parent_id").isString(), TESSEL_ERR_USER_INPUT,
                 "!jParm[\"parent_id\"].isString()", false);
    TESSEL_CHECK(jParm.isMember("acl_inherit") && !jParm["acl_inherit"].isBool(), TESSEL_ERR_USER_INPUT,
                 "!jParm[\"acl_inherit\"].isBool()", false);
    unsigned int owner = UID_ERR;
    TESSEL_CHECK_APPEND(UID_ERR == (owner = TesselObjectGetOwnerByID(jParm["id"].asString())),
                        "UID_ERR == (owner = TesselObjectGetOwnerByID(jParm[\"id\"].asString()))", false);
    Json::Value jParentAcl(Json::objectValue);
    if (blReset) {
        jParm["parent_id"] = TesselObjectDefaultID(owner);
    } else {
        TESSEL_CHECK(!TesselCheckUID(owner), TESSEL_ERR_USER_INPUT, "!TesselCheckUID(owner)", false);
        TESSEL_CHECK(owner != TesselObjectGetOwnerByID(jParm["parent_id"].asString()), TESSEL_ERR_USER_INPUT,
                     "owner != TesselObjectGetOwnerByID(jParm[\"parent_id\"].asString())", false);
        // An object cannot hold itself.
        TESSEL_CHECK(jParm["parent_id"] == jParm["id"], TESSEL_ERR_USER_INPUT,
                     "jParm[\"parent_id\"].asString() == jParm[\"id\"].asString()", false);
        if (TesselIDIsExist(jParm["ns"].asString(), jParm["parent_id"].asString())) {
            TESSEL_OBJECT obj;
            Json::Value jGetParm = tessel::ReadRequest(jParm, jParm["parent_id"]);
            jGetParm["field"]["acl"] = true;
            TESSEL_CHECK_APPEND(!obj.Get(jGetParm), "!obj.Get(jGetParm)", false);
            TESSEL_CHECK(SZ_PERM_RW != obj.get_ref_perm() && SZ_PERM_OWNER != obj.get_ref_perm(),
                         TESSEL_ERR_NO_PERMISSION, "\"rw\" != obj.get_ref_perm() && \"owner\" != obj.get_ref_perm()",
                         false);
            jParentAcl = obj.get_ref_acl();
        } else {
            jParm["parent_id"] = TesselObjectDefaultID(owner);
        }
    }
    const Json::Value &jInherit = tessel::MemberOf(jParm, "acl_inherit");
    if (jInherit.isBool() && jInherit.asBool()) {
        jParm["acl"] = AclFromNewParent(oldAcl, jParentAcl);
    }
    return CheckParentTime(jParm, owner);
}

}  // namespace

bool PrepareSetParm(Json::Value &jParm, const Json::Value &oldAcl, TESSEL_OBJECT *) {
    TESSEL_CHECK(!jParm.isMember("ctime") && !jParm.isMember("parent_id") && !jParm.isMember("reset_parent_id") &&
                     !jParm.isMember("person") && !jParm.isMember("metatext") && !jParm.isMember("text") &&
                     !jParm.isMember("metabinary_files") && !jParm.isMember("binary_files"),
                 TESSEL_ERR_USER_INPUT,
                 "!jParm.isMember(\"ctime\") && !jParm.isMember(\"parent_id\") && "
                 "!jParm.isMember(\"reset_parent_id\") && !jParm.isMember(\"person\") && "
                 "!jParm.isMember(\"metatext\") && !jParm.isMember(\"text\") && "
                 "!jParm.isMember(\"metabinary_files\") && !jParm.isMember(\"binary_files\")",
                 false);
    TESSEL_CHECK(jParm.isMember("mtime") && !jParm["mtime"].isIntegral(), TESSEL_ERR_USER_INPUT,
                 "!jParm[\"mtime\"].isIntegral()", false);
    // Not among the documented checks; a creation time that is no number
    // would be stored as one and read back as 0.
    TESSEL_CHECK(jParm.isMember("ctime") && !jParm["ctime"].isIntegral(), TESSEL_ERR_USER_INPUT,
                 "!jParm[\"ctime\"].isIntegral()", false);
    TESSEL_CHECK((jParm.isMember("text") || jParm.isMember("binary_files")) &&
                     (!jParm.isMember("version") || !jParm["version"].isString()),
                 TESSEL_ERR_USER_INPUT,
                 "(jParm.isMember(\"text\") || jParm.isMember(\"binary_files\")) && (!jParm.isMember(\"version\") || "
                 "!jParm[\"version\"].isString())",
                 false);
    TESSEL_CHECK(jParm.isMember("metatext") && !jParm["metatext"].isObject(), TESSEL_ERR_USER_INPUT,
                 "jParm.isMember(\"metatext\") && !jParm[\"metatext\"].isObject()", false);
    TESSEL_CHECK(jParm.isMember("text") && !jParm["text"].isObject(), TESSEL_ERR_USER_INPUT,
                 "jParm.isMember(\"text\") && !jParm[\"text\"].isObject()", false);
    TESSEL_CHECK(jParm.isMember("person") && !jParm["person"].isObject(), TESSEL_ERR_USER_INPUT,
                 "jParm.isMember(\"person\") && !jParm[\"person\"].isObject()", false);
    TESSEL_CHECK(jParm.isMember("metabinary_files") && !jParm["metabinary_files"].isArray(), TESSEL_ERR_USER_INPUT,
                 "!jParm[\"metabinary_files\"].isArray()", false);
    TESSEL_CHECK(jParm.isMember("binary_files") && !jParm["binary_files"].isArray(), TESSEL_ERR_USER_INPUT,
                 "!jParm[\"binary_files\"].isArray()", false);
    TESSEL_CHECK(jParm.isMember("commit_msg") && !jParm["commit_msg"].isObject(), TESSEL_ERR_USER_INPUT,
                 "!jParm[\"commit_msg\"].isObject()", false);
    if ((jParm.isMember("parent_id") || jParm.isMember("reset_parent_id")) && !PrepareParent(jParm, oldAcl)) {
        return false;
    }
    TESSEL_CHECK_APPEND(!tessel::CheckUploadSources(jParm), "!CheckUploadSources(jParm)", false);
    return true;
}

namespace tessel {

bool SetLockLevel(const Json::Value &jParm, int &level) {
    std::unique_ptr<TESSEL_BACKEND_OP> pBackendPgsql(RegisterBackend::New("pgsql"));
    TESSEL_CHECK(NULL == pBackendPgsql, TESSEL_ERR_NO_BACKEND,
                 "NULL == (pBackendPgsql = RegisterBackend::New(\"pgsql\"))", false);
    level = pBackendPgsql->HasChildren(jParm) ? TESSEL_LOCK_ALL : TESSEL_LOCK_BACKUP_OBJECT_VOLUME;
    return true;
}

bool ReadBackParm(const Json::Value &jParm, Json::Value &jGetParm) {
    jGetParm = Json::Value(Json::objectValue);
    jGetParm["ns"] = jParm["ns"];
    jGetParm["requester"] = 0;
    jGetParm["field"] = TesselObjectFieldAll();
    TESSEL_CHECK_APPEND(!TesselSettingsIndexGetFromCache(jGetParm["ns"].asString(), jGetParm["field_filter"]),
                        "!TesselSettingsIndexGetFromCache(jGetParm[\"ns\"].asString(), jGetParm[\"field_filter\"])",
                        false);
    return true;
}

}  // namespace tessel

namespace {

bool SetOne(TESSEL_OBJECT &self, TESSEL_BACKEND_OP &backendFs, Json::Value &jParm) {
    TESSEL_CHECK(!tessel::HasMember(jParm, "ns") || !jParm["ns"].isString() || !jParm.isMember("id") ||
                     !jParm["id"].isString() || !jParm.isMember("requester") || !jParm["requester"].isIntegral(),
                 TESSEL_ERR_USER_INPUT,
                 "!jParm.isMember(\"ns\") || !jParm[\"ns\"].isString() || !jParm.isMember(\"id\") || "
                 "!jParm[\"id\"].isString() || !jParm.isMember(\"requester\") || !jParm[\"requester\"].isIntegral()",
                 false);
    // Wider than a uid would wrap onto another user's id.
    TESSEL_CHECK(!jParm["requester"].isUInt(), TESSEL_ERR_USER_INPUT, "!jParm[\"requester\"].isUInt()", false);
    const unsigned int requester = tessel::UidOf(jParm["requester"]);
    if (0 != requester) {
        TESSEL_CHECK_APPEND(FALSE == TesselAccessCheck(jParm["ns"].asCString()),
                            "FALSE == TesselAccessCheck(jParm[\"ns\"].asCString())", false);
    }
    TESSEL_CHECK_APPEND(FALSE == TesselObjectIDIsValid(jParm["id"].asCString()),
                        "FALSE == TesselObjectIDIsValid(jParm[\"id\"].asCString())", false);

    TESSEL_OBJECT tmpOldObj;
    Json::Value jGetParm = tessel::ReadRequest(jParm, jParm["id"]);
    if (jParm.isMember("version")) {
        jGetParm["version"] = jParm["version"];
    }
    jGetParm["field"] = TesselObjectFieldAll();
    TESSEL_CHECK_APPEND(!TesselSettingsIndexGetFromCache(jGetParm["ns"].asString(), jGetParm["field_filter"]),
                        "!TesselSettingsIndexGetFromCache(jGetParm[\"ns\"].asString(), jGetParm[\"field_filter\"])",
                        false);
    TESSEL_CHECK_APPEND(!tmpOldObj.Get(jGetParm), "!tmpOldObj.Get(jGetParm)", false);
    if (0 != requester && tmpOldObj.get_owner() != requester) {
        if (SZ_PERM_RW != tmpOldObj.get_ref_perm() && SZ_PERM_OWNER != tmpOldObj.get_ref_perm()) {
            TESSEL_RAISE(TESSEL_ERR_NO_PERMISSION,
                         "rw != tmpOldObj.get_ref_perm() && owner != tmpOldObj.get_ref_perm() [%s]",
                         tmpOldObj.get_ref_perm().c_str());
            return false;
        }
    }
    // A change of text or binaries must name the version it is based on
    // (PrepareSetParm refuses it otherwise); any other change is based on
    // the version just read.
    if (!jParm.isMember("version") && !jParm.isMember("text") && !jParm.isMember("binary_files")) {
        jParm["version"] = tmpOldObj.get_ref_version();
    }
    TESSEL_CHECK_APPEND(!PrepareSetParm(jParm, tmpOldObj.get_ref_acl(), &tmpOldObj),
                        "!PrepareSetParm(jParm, tmpOldObj.get_ref_acl(), &tmpOldObj)", false);

    int level = TESSEL_LOCK_ALL;
    TESSEL_CHECK_APPEND(!tessel::SetLockLevel(jParm, level), "!SetLockLevel(jParm, level)", false);
    TESSEL_LOCKER locker;
    if (TESSEL_LOCK_ALL == level) {
        TESSEL_CHECK_APPEND(!locker.ReadLock(TESSEL_LOCK_ALL, jParm["ns"].asString(), jParm["id"]),
                            "!locker.ReadLock(TESSEL_LOCK_ALL, jParm[\"ns\"].asString(), jParm[\"id\"])", false);
    } else {
        TESSEL_CHECK_APPEND(
            !locker.ReadLock(TESSEL_LOCK_BACKUP_OBJECT_VOLUME, jParm["ns"].asString(), jParm["id"]),
            "!locker.ReadLock(TESSEL_LOCK_BACKUP_OBJECT_VOLUME, jParm[\"ns\"].asString(), jParm[\"id\"])", false);
    }
    const TESSEL_NS_HOOK pfnPost = tessel::RunPreHook(jParm["ns"].asString(), SZ_ACTION_SET, false, jParm, &tmpOldObj);

    std::string strNewVer;
    bool blSet = false;
    {
        TESSEL_AS_ROOT();
        blSet = backendFs.Set(jParm, strNewVer);
    }
    TESSEL_CHECK_APPEND(!blSet, "!pBackendFs->Set(jParm, strNewVer)", false);

    TESSEL_CHECK_APPEND(!tessel::ReadBackParm(jParm, jGetParm),
                        "!TesselSettingsIndexGetFromCache(jGetParm[\"ns\"].asString(), jGetParm[\"field_filter\"])",
                        false);
    jGetParm["id"] = jParm["id"];
    // A change of plain files alone makes no new version: the object is then
    // read as it now stands.
    if (!strNewVer.empty()) {
        jGetParm["version"] = strNewVer;
    }
    TESSEL_CHECK_APPEND(!self.Get(jGetParm), "!Get(jGetParm)", false);
    self.set_perm(tessel::PermAfterChange(jParm, self));
    TESSEL_CHECK_APPEND(!TesselObjectIndex(&self), "!TesselObjectIndex(this)", false);
    if (pfnPost) {
        pfnPost(jParm, &self);
    }
    return true;
}

// The unsigned decimal number that fills all of szText.
bool ParseNumber(const char *szText, Json::Value &jOut) {
    char *endPtr = NULL;
    const unsigned long long value = strtoull(szText, &endPtr, 10);
    TESSEL_CHECK(endPtr && *endPtr, TESSEL_ERR_USER_INPUT, "endPtr && *endPtr", false);
    jOut = (Json::UInt64)value;
    return true;
}

// The hash form: "ns", "id" and "requester" are required, as in the hash
// form of the get; the other members of a set come as text (times as
// decimal numbers, the structured members as JSON text).
bool ParmFromHash(const QLIBSZHASH *pParmHash, Json::Value &jParm) {
    const char *pParm = NULL;
    TESSEL_CHECK(NULL == (pParm = QLIBCSzHashGetValue(pParmHash, "ns")), TESSEL_ERR_USER_INPUT,
                 "NULL == (pParm = QLIBCSzHashGetValue(pParmHash, \"ns\"))", false);
    jParm["ns"] = pParm;
    TESSEL_CHECK(NULL == (pParm = QLIBCSzHashGetValue(pParmHash, "id")), TESSEL_ERR_USER_INPUT,
                 "NULL == (pParm = QLIBCSzHashGetValue(pParmHash, \"id\"))", false);
    jParm["id"] = pParm;
    TESSEL_CHECK(NULL == (pParm = QLIBCSzHashGetValue(pParmHash, "requester")), TESSEL_ERR_USER_INPUT,
                 "NULL == (pParm = QLIBCSzHashGetValue(pParmHash, \"requester\"))", false);
    if (!ParseNumber(pParm, jParm["requester"])) {
        return false;
    }
    for (const char *szKey : {"version", "parent_id", "delegate_perm"}) {
        if (NULL != (pParm = QLIBCSzHashGetValue(pParmHash, szKey))) {
            jParm[szKey] = pParm;
        }
    }
    for (const char *szKey : {"ctime", "mtime"}) {
        if (NULL != (pParm = QLIBCSzHashGetValue(pParmHash, szKey)) && !ParseNumber(pParm, jParm[szKey])) {
            return false;
        }
    }
    for (const char *szKey : {"metatext", "text", "person", "commit_msg", "metabinary_files", "binary_files",
                              "reset_parent_id", "acl_inherit"}) {
        if (NULL != (pParm = QLIBCSzHashGetValue(pParmHash, szKey))) {
            if (!tessel::fromString(jParm[szKey], pParm)) {
                TESSEL_RAISE(TESSEL_ERR_USER_INPUT, "!fromString(jParm[szKey], pParm) [%s]", szKey);
                return false;
            }
        }
    }
    return true;
}

}  // namespace

bool TESSEL_OBJECT::Set(const Json::Value &jsParm) {
    std::unique_ptr<TESSEL_BACKEND_OP> pBackendFs(RegisterBackend::New("fs"));
    TESSEL_CHECK(NULL == pBackendFs, TESSEL_ERR_NO_BACKEND, "NULL == pBackendFs", false);
    Json::Value jParm = jsParm;
    const bool blOk = SetOne(*this, *pBackendFs, jParm);
    if (!TesselObjectLog(TESSEL_OBJECT_ACTION_SET, blOk ? 0 : -1, NULL, this)) {
        TESSEL_LOG(LOG_ERR, "Failed to record set action of TESSEL_OBJECT in db. ns=[%s] id=[%s] ver=[%s]",
                   tessel::MemberOf(jParm, "ns").isString() ? jParm["ns"].asCString() : "",
                   tessel::MemberOf(jParm, "id").isString() ? jParm["id"].asCString() : "", get_ref_version().c_str());
    }
    return blOk;
}

bool TESSEL_OBJECT::Set(const Json::Value &jsParm, std::string &strNewVer) {
    TESSEL_OBJECT tmpNewObj;
    TESSEL_CHECK_APPEND(!tmpNewObj.Set(jsParm), "!tmpNewObj.Set(jsParm)", false);
    strNewVer = tmpNewObj.get_version();
    return true;
}

int TesselObjectSet(QLIBSZHASH *pParmHash, char *szVer, size_t verLen) {
    TESSEL_CHECK(NULL == pParmHash, TESSEL_ERR_BAD_PARAMETERS, "NULL == pParmHash", -1);
    Json::Value jParm(Json::objectValue);
    if (!ParmFromHash(pParmHash, jParm)) {
        return -1;
    }
    std::string strNewVer;
    TESSEL_OBJECT obj;
    TESSEL_CHECK_APPEND(!obj.Set(jParm, strNewVer), "!TESSEL_OBJECT::Set(jParm, strNewVer)", -1);
    if (szVer && verLen > 0) {
        snprintf(szVer, verLen, "%s", strNewVer.c_str());
    }
    return 0;
}
