// Creating one object: parameter completion, the single create and its two
// thin forms, and the action record.
#include <stdio.h>
#include <time.h>

#include <memory>
#include <string>

#include "common/tessel_pathname.h"
#include "common/tessel_priv.h"
#include "common/tessel_report.h"
#include "object/object_create.h"
#include "object/object_ops.h"
#include "object/object_upload.h"
#include "tessel_backend.h"
#include "tessel_conf.h"
#include "tessel_hook.h"
#include "tessel_id.h"
#include "tessel_index.h"
#include "tessel_lock.h"
#include "tesselobject.h"

static constexpr const char kTesselModule[] = "object/list_object_create";

namespace {

constexpr char SZ_PERM_RW[] = "rw";
constexpr char SZ_PERM_OWNER[] = "owner";
constexpr char SZ_ACTION_CREATE[] = "create";

// Action numbers handed to TesselObjectLog.
enum { TESSEL_OBJECT_ACTION_CREATE = 1 };

// A user's own top level: no parent object, and nothing to inherit.
void PlaceAtTopLevel(Json::Value &jParm, unsigned int owner) {
    jParm["parent_id"] = TesselObjectDefaultID(owner);
    jParm["acl"] = Json::Value(Json::objectValue);
}

// The defaults of the fields a create may leave out, and their types.
bool CompleteFields(Json::Value &jParm) {
    if (!jParm.isMember("commit_msg")) {
        jParm["commit_msg"] = Json::Value(Json::objectValue);
    }
    TESSEL_CHECK(!jParm["commit_msg"].isObject(), TESSEL_ERR_USER_INPUT, "!jParm[\"commit_msg\"].isObject()", false);
    if (!jParm.isMember("ctime")) {
        jParm["ctime"] = (Json::Int64)time(NULL);
    }
    TESSEL_CHECK(!jParm["ctime"].isIntegral(), TESSEL_ERR_USER_INPUT, "!jParm[\"ctime\"].isIntegral()", false);
    if (!jParm.isMember("mtime")) {
        jParm["mtime"] = jParm["ctime"];
    }
    // Not in the list of checks below, but a time that is no number would be
    // stored as one and read back as 0.
    TESSEL_CHECK(!jParm["mtime"].isIntegral(), TESSEL_ERR_USER_INPUT, "!jParm[\"mtime\"].isIntegral()", false);
    if (!jParm.isMember("person")) {
        jParm["person"] = Json::Value(Json::objectValue);
    }
    TESSEL_CHECK(!jParm["person"].isObject(), TESSEL_ERR_USER_INPUT, "!jParm[\"person\"].isObject()", false);
    if (!jParm.isMember("metatext")) {
        jParm["metatext"] = Json::Value(Json::objectValue);
    }
    TESSEL_CHECK(!jParm["metatext"].isObject(), TESSEL_ERR_USER_INPUT, "!jParm[\"metatext\"].isObject()", false);
    if (!jParm.isMember("text")) {
        jParm["text"] = Json::Value(Json::objectValue);
    }
    TESSEL_CHECK(!jParm["text"].isObject(), TESSEL_ERR_USER_INPUT, "!jParm[\"text\"].isObject()", false);
    if (!jParm.isMember("metabinary_files")) {
        jParm["metabinary_files"] = Json::Value(Json::arrayValue);
    }
    TESSEL_CHECK(!jParm["metabinary_files"].isArray(), TESSEL_ERR_USER_INPUT,
                 "!jParm[\"metabinary_files\"].isArray()", false);
    if (!jParm.isMember("binary_files")) {
        jParm["binary_files"] = Json::Value(Json::arrayValue);
    }
    TESSEL_CHECK(!jParm["binary_files"].isArray(), TESSEL_ERR_USER_INPUT, "!jParm[\"binary_files\"].isArray()",
                 false);
    return true;
}

// The acl of an object created under an existing parent of owner's. Children
// take the parent's sharing whether or not the parent is the creator's own:
// what is shared as a folder is shared with its content.
bool AclUnderParent(Json::Value &jParm, const TESSEL_OBJECT &parent, unsigned int owner) {
    if (!jParm.isMember("acl")) {
        jParm["acl"] = tessel::InheritedAcl(parent.get_ref_acl());
        return true;
    }
    TESSEL_CHECK(!jParm["acl"].isObject(), TESSEL_ERR_USER_INPUT, "!jParm[\"acl\"].isObject()", false);
    // An owner holds "owner" anyway; an entry of their own would only mislead.
    Json::Value &jUsers = jParm["acl"]["zem_user"];
    if (jUsers.isObject()) {
        jUsers.removeMember(std::to_string(owner));
        if (jUsers.empty()) {
            jParm["acl"].removeMember("zem_user");
        }
    } else if (jUsers.isNull()) {
        jParm["acl"].removeMember("zem_user");
    }
    return true;
}

}  // namespace

bool PrepareCreateParm(Json::Value &jParm) {
    if (!jParm.isMember("owner")) {
        jParm["owner"] = jParm["requester"];
    }
    // Not among the documented checks, but every later step reads it as a uid.
    TESSEL_CHECK(!jParm["owner"].isUInt(), TESSEL_ERR_USER_INPUT, "!jParm[\"owner\"].isUInt()", false);
    unsigned int owner = tessel::UidOf(jParm["owner"]);
    const std::string strNs = jParm["ns"].asString();
    if (!jParm.isMember("parent_id")) {
        jParm["parent_id"] = TesselObjectDefaultID(owner);
        const Json::Value &jPreset = tessel::MemberOf(jParm, "preset_acl");
        if (jPreset.isBool() && jPreset.asBool()) {
            jParm.removeMember("preset_acl");
            if (!jParm.isMember("acl")) {
                jParm["acl"] = Json::Value(Json::objectValue);
            }
            TESSEL_CHECK(!jParm["acl"].isObject(), TESSEL_ERR_USER_INPUT, "!jParm[\"acl\"].isObject()", false);
        } else {
            jParm["acl"] = Json::Value(Json::objectValue);
        }
    } else {
        TESSEL_CHECK(!jParm["parent_id"].isString(), TESSEL_ERR_USER_INPUT, "!jParm[\"parent_id\"].isString()",
                     false);
        if (!TesselIDIsExist(strNs, jParm["parent_id"].asString())) {
            TESSEL_CHECK(owner != TesselObjectGetOwnerByID(jParm["parent_id"].asString()), TESSEL_ERR_USER_INPUT,
                         "owner != TesselObjectGetOwnerByID(jParm[\"parent_id\"].asString())", false);
            PlaceAtTopLevel(jParm, owner);
        } else {
            TESSEL_OBJECT obj;
            Json::Value jGetParm = tessel::ReadRequest(jParm, jParm["parent_id"]);
            jGetParm["field"]["acl"] = true;
            TESSEL_CHECK_APPEND(!obj.Get(jGetParm), "!obj.Get(jGetParm)", false);
            TESSEL_CHECK(SZ_PERM_RW != obj.get_ref_perm() && SZ_PERM_OWNER != obj.get_ref_perm(),
                         TESSEL_ERR_NO_PERMISSION, "\"rw\" != obj.get_ref_perm() && \"owner\" != obj.get_ref_perm()",
                         false);
            if (obj.get_owner() != owner) {
                owner = static_cast<unsigned int>(obj.get_owner());
                jParm["owner"] = owner;
            }
            if (!AclUnderParent(jParm, obj, owner)) {
                return false;
            }
        }
    }
    if (jParm.isMember("id")) {
        TESSEL_CHECK(!jParm["id"].isString(), TESSEL_ERR_USER_INPUT, "!jParm[\"id\"].isString()", false);
        TESSEL_CHECK(owner != TesselObjectGetOwnerByID(jParm["id"].asString()), TESSEL_ERR_USER_INPUT,
                     "owner != TesselObjectGetOwnerByID(jParm[\"id\"].asString())", false);
        TESSEL_CHECK(TesselIDIsExist(strNs, jParm["id"].asString()), TESSEL_ERR_ID_EXISTS,
                     "TesselIDIsExist(jParm[\"ns\"].asString(), jParm[\"id\"].asString())", false);
        TESSEL_CHECK(!tessel::TesselIsPathComponent(jParm["id"].asString()), TESSEL_ERR_USER_INPUT,
                     "!TesselIsPathComponent(jParm[\"id\"].asString())", false);
    }
    TESSEL_CHECK_APPEND(FALSE == TesselObjectOwnerIsValid(owner),
                        "FALSE == TesselObjectOwnerIsValid((uid_t)jParm[\"owner\"].asInt64())", false);
    if (!CompleteFields(jParm)) {
        return false;
    }
    TESSEL_CHECK_APPEND(!tessel::CheckUploadSources(jParm), "!CheckUploadSources(jParm)", false);
    return true;
}

namespace {

// Steps of the single create after the backend was obtained; the caller
// records the action whatever happens here.
bool CreateOne(TESSEL_OBJECT &self, TESSEL_BACKEND_OP &backendFs, Json::Value &jParm) {
    TESSEL_CHECK(!tessel::HasMember(jParm, "ns") || !jParm["ns"].isString() || !jParm.isMember("category") ||
                     !jParm["category"].isString() || !jParm.isMember("requester") ||
                     !jParm["requester"].isIntegral(),
                 TESSEL_ERR_USER_INPUT,
                 "!jParm.isMember(\"ns\") || !jParm[\"ns\"].isString() || !jParm.isMember(\"category\") || "
                 "!jParm[\"category\"].isString() || !jParm.isMember(\"requester\") || "
                 "!jParm[\"requester\"].isIntegral()",
                 false);
    // Wider than a uid would wrap onto another user's id.
    TESSEL_CHECK(!jParm["requester"].isUInt(), TESSEL_ERR_USER_INPUT, "!jParm[\"requester\"].isUInt()", false);
    const unsigned int requester = tessel::UidOf(jParm["requester"]);
    if (0 != requester) {
        TESSEL_CHECK_APPEND(FALSE == TesselAccessCheck(jParm["ns"].asCString()),
                            "FALSE == TesselAccessCheck(jParm[\"ns\"].asCString())", false);
    } else {
        TESSEL_CHECK(!jParm.isMember("owner"), TESSEL_ERR_USER_INPUT, "!jParm.isMember(\"owner\")", false);
    }
    TESSEL_CHECK_APPEND(!PrepareCreateParm(jParm), "!PrepareCreateParm(jParm)", false);

    TESSEL_LOCKER locker;
    TESSEL_CHECK_APPEND(!locker.ReadLock(TESSEL_LOCK_ALL, jParm["ns"].asString(), Json::nullValue),
                        "!locker.ReadLock(TESSEL_LOCK_ALL, jParm[\"ns\"].asString(), Json::nullValue)", false);
    const TESSEL_NS_HOOK pfnPost = tessel::RunPreHook(jParm["ns"].asString(), SZ_ACTION_CREATE, false, jParm, NULL);

    std::string strNewID;
    std::string strNewVer;
    bool blCreated = false;
    {
        TESSEL_AS_ROOT();
        blCreated = backendFs.Create(jParm, strNewID, strNewVer);
    }
    TESSEL_CHECK_APPEND(!blCreated, "!pBackendFs->Create(jParm, strNewID, strNewVer)", false);

    Json::Value jGetParm = tessel::ReadRequest(jParm, strNewID);
    jGetParm["version"] = strNewVer;
    jGetParm["field"] = TesselObjectFieldAll();
    TESSEL_CHECK_APPEND(!TesselSettingsIndexGetFromCache(jGetParm["ns"].asString(), jGetParm["field_filter"]),
                        "!TesselSettingsIndexGetFromCache(jGetParm[\"ns\"].asString(), jGetParm[\"field_filter\"])",
                        false);
    TESSEL_CHECK_APPEND(!self.Get(jGetParm), "!Get(jGetParm)", false);
    // Indexing by id would read the object again just as it was read back
    // here (same requester, every field, the index filter): the record read
    // is indexed instead, and the frame keeps the name callers know.
    TESSEL_CHECK_APPEND(!TesselObjectIndex(&self),
                        "!TesselObjectIndex(strNewID.c_str(), jParm[\"ns\"].asCString(), "
                        "(uid_t)jParm[\"requester\"].asInt64())",
                        false);
    if (pfnPost) {
        pfnPost(jParm, &self);
    }
    return true;
}

}  // namespace

bool TESSEL_OBJECT::Create(const Json::Value &jsParm) {
    std::unique_ptr<TESSEL_BACKEND_OP> pBackendFs(RegisterBackend::New("fs"));
    TESSEL_CHECK(NULL == pBackendFs, TESSEL_ERR_NO_BACKEND, "NULL == pBackendFs", false);
    Json::Value jParm = jsParm;
    const bool blOk = CreateOne(*this, *pBackendFs, jParm);
    if (!TesselObjectLog(TESSEL_OBJECT_ACTION_CREATE, blOk ? 0 : -1, NULL, this)) {
        TESSEL_LOG(LOG_ERR, "Failed to record create action of TESSEL_OBJECT in db. ns=[%s] category=[%s]",
                   tessel::MemberOf(jParm, "ns").isString() ? jParm["ns"].asCString() : "",
                   tessel::MemberOf(jParm, "category").isString() ? jParm["category"].asCString() : "");
    }
    return blOk;
}

bool TESSEL_OBJECT::Create(const Json::Value &jsParm, std::string &strNewID, std::string &strNewVer) {
    TESSEL_OBJECT tmpNewObj;
    TESSEL_CHECK_APPEND(!tmpNewObj.Create(jsParm), "!tmpNewObj.Create(jsParm)", false);
    strNewID = tmpNewObj.get_id();
    strNewVer = tmpNewObj.get_version();
    return true;
}

// The hash's contents are not read: applications of this form have always
// received the parameter error, and callers rely on the object form instead.
int TesselObjectCreate(QLIBSZHASH *pParmHash, char *szId, size_t idLen, char *szVer, size_t verLen) {
    TESSEL_CHECK(NULL == pParmHash, TESSEL_ERR_BAD_PARAMETERS, "NULL == pParmHash", -1);
    const Json::Value jParm(Json::objectValue);
    std::string strNewID;
    std::string strNewVer;
    TESSEL_OBJECT obj;
    TESSEL_CHECK_APPEND(!obj.Create(jParm, strNewID, strNewVer),
                        "!TESSEL_OBJECT::Create(jParm, strNewID, strNewVer)", -1);
    if (szId && idLen > 0) {
        snprintf(szId, idLen, "%s", strNewID.c_str());
    }
    if (szVer && verLen > 0) {
        snprintf(szVer, verLen, "%s", strNewVer.c_str());
    }
    return 0;
}

// This library keeps no log of actions; the hook modules observe changes.
bool TesselObjectLog(int, int, const TESSEL_OBJECT *, const TESSEL_OBJECT *) { return true; }
