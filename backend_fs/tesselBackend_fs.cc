// The file-system store's entry points and its registration as "fs".
#include "backend_fs/tesselBackend_fs.h"

#include <string.h>
#include <time.h>

#include <git2/common.h>
#include <git2/global.h>
#include <quor/qlib.h>

#include "backend_fs/meta.h"
#include "backend_fs/utils.h"
#include "common/tessel_json.h"
#include "common/tessel_pathname.h"
#include "common/tessel_priv.h"
#include "common/tessel_report.h"
#include "tessel_file.h"
#include "tessel_id.h"
#include "tessel_ns.h"
#include "tesselobject.h"

static constexpr const char kTesselModule[] = "backend_fs/tesselBackend_fs";

namespace {

constexpr const char SZ_RM[] = "/bin/rm";
constexpr const char SZ_RM_RECURSIVE[] = "-rf";
constexpr const char SZK_AUTO_MTIME[] = "auto_mtime";
constexpr const char SZK_METATEXT[] = "metatext";

// A stored value of another type (an older or hand-edited file) reads as empty.
std::string TextOf(const Json::Value &jVal) { return jVal.isString() ? jVal.asString() : std::string(); }

}  // namespace

TESSEL_BACKEND_OP *CreateFsBackend() { return new TESSEL_BACKEND_FS(); }

namespace {
const RegisterBackend g_registerFs("fs", CreateFsBackend);
}  // namespace

TESSEL_BACKEND_FS::TESSEL_BACKEND_FS() {
    // Every store brings libgit2 up and takes it down again, so the version
    // store may assume it is up while a store exists. One reference more is
    // taken for the whole process and never given back: each operation makes
    // a store of its own, and bringing libgit2 up from nothing (its TLS set-up
    // reads and decodes the system's certificates) cost more than the whole
    // read the store was made for. With that reference held, the pair below
    // only counts.
    static const bool s_blGitUp = [] {
        git_libgit2_init();
        // Each repository belongs to its object's owner while the store works
        // on it as root; libgit2 would refuse such a repository as someone
        // else's.
        git_libgit2_opts(GIT_OPT_SET_OWNER_VALIDATION, 0);
        return true;
    }();
    (void)s_blGitUp;
    git_libgit2_init();
    // The table is compiled in; a parse failure is a build defect, reported
    // here and seen as an empty table (no field read or saved) afterwards.
    if (!tessel::FsParseFieldTable(m_jFieldTable, m_fieldOrder)) {
        m_jFieldTable = Json::Value(Json::objectValue);
        m_fieldOrder.clear();
    }
}

TESSEL_BACKEND_FS::~TESSEL_BACKEND_FS() { git_libgit2_shutdown(); }

// ---- questions for the index store ------------------------------------------

int TESSEL_BACKEND_FS::List(const Json::Value &, TESSEL_OBJECT **, unsigned int &) { return 0; }

bool TESSEL_BACKEND_FS::ListChildren(const Json::Value &, Json::Value &) { return false; }

bool TESSEL_BACKEND_FS::HasChildren(const Json::Value &) { return false; }

// ---- the store's own operations ---------------------------------------------

bool TESSEL_BACKEND_FS::Get(const Json::Value &jParm, TESSEL_OBJECT *pObject) {
    TESSEL_CHECK_APPEND(!mf_init(jParm, false, pObject), "!mf_init(jParm, false, pObject)", false);
    {
        // Without this, a selection that skips "basic.json" would read a
        // missing object as an empty one.
        TESSEL_AS_ROOT();
        TESSEL_CHECK(!QLIBCFileCheckDir(m_jPathInfo[TESSEL_ID_PATH].asCString()), TESSEL_ERR_NOT_EXISTS,
                     "!QLIBCFileCheckDir(m_jPathInfo[TESSEL_ID_PATH].asCString())", false);
    }
    if (mf_NeedToGet(TESSEL_BASIC)) {
        TESSEL_CHECK_APPEND(!mf_GetBasic(pObject), "!mf_GetBasic(pObject)", false);
    }
    if (mf_NeedToGet(TESSEL_META_TEXT)) {
        TESSEL_CHECK_APPEND(!mf_GetMetaText(pObject), "!mf_GetMetaText(pObject)", false);
    }
    if (mf_NeedToGet(TESSEL_META_BIN_INFO)) {
        TESSEL_CHECK_APPEND(!mf_GetMetaBinaryInfo(pObject, false), "!mf_GetMetaBinaryInfo(pObject, false)", false);
    }
    if (mf_NeedToGet(TESSEL_VERSION)) {
        TESSEL_CHECK_APPEND(!mf_GetGit(pObject), "!mf_GetGit(pObject)", false);
    }
    if (mf_NeedToGet(TESSEL_PERSON_PATH)) {
        TESSEL_CHECK_APPEND(!mf_GetPerson(pObject), "!mf_GetPerson(pObject)", false);
    }
    return true;
}

bool TESSEL_BACKEND_FS::Create(const Json::Value &jParm, std::string &strNewID, std::string &strNewVer) {
    TESSEL_CHECK(jParm.isMember("version"), TESSEL_ERR_BAD_PARAMETERS, "jParm.isMember(\"version\")", false);
    TESSEL_CHECK_APPEND(!mf_init(jParm, true), "!mf_init(jParm, true)", false);
    // Known as soon as it is chosen: a later failure leaves the directory
    // behind, and the caller must be able to name it.
    strNewID = m_jParm["id"].asString();
    TESSEL_CHECK_APPEND(!mf_CreatePath(), "!mf_CreatePath()", false);
    TESSEL_CHECK_APPEND(!mf_SaveConfig(strNewVer), "!mf_SaveConfig(strNewVer)", false);
    return true;
}

bool TESSEL_BACKEND_FS::Set(const Json::Value &jParm, std::string &strNewVer) {
    TESSEL_CHECK(!jParm.isMember("version"), TESSEL_ERR_BAD_PARAMETERS, "!jParm.isMember(\"version\")", false);
    TESSEL_CHECK_APPEND(!mf_init(jParm), "!mf_init(jParm)", false);
    TESSEL_CHECK_APPEND(!mf_SaveConfig(strNewVer), "!mf_SaveConfig(strNewVer)", false);
    return true;
}

bool TESSEL_BACKEND_FS::Delete(const Json::Value &jParm) {
    TESSEL_CHECK(!jParm.isMember("ns"), TESSEL_ERR_BAD_PARAMETERS, "!jParm.isMember(\"ns\")", false);
    TESSEL_CHECK(!jParm.isMember("id"), TESSEL_ERR_BAD_PARAMETERS, "!jParm.isMember(\"id\")", false);
    // mf_init refuses names that are not path components before forming any
    // path, so the directory removed below is always one object's own.
    TESSEL_CHECK_APPEND(!mf_init(jParm), "!mf_init(jParm)", false);
    TESSEL_CHECK(!m_jPathInfo.isMember(TESSEL_ID_PATH), TESSEL_ERR_BAD_PARAMETERS,
                 "!m_jPathInfo.isMember(TESSEL_ID_PATH)", false);
    const std::string strIdPath = m_jPathInfo[TESSEL_ID_PATH].asString();
    TESSEL_AS_ROOT();
    if (QLIBCFileCheckDir(strIdPath.c_str())) {
        TESSEL_CHECK(0 != QLIBCExec(SZ_RM, SZ_RM_RECURSIVE, strIdPath.c_str(), NULL), TESSEL_ERR_OPERATION_FAILED,
                     "0 != QLIBCExec(\"/bin/rm\", \"-rf\", strIdPath.c_str(), NULL)", false);
    }
    return true;
}

// ---- request and paths ------------------------------------------------------

bool TESSEL_BACKEND_FS::mf_init(const Json::Value &jParm, bool bCreate, TESSEL_OBJECT *pObject) {
    m_jParm = jParm;
    m_jPathInfo = Json::Value(Json::objectValue);
    TESSEL_CHECK(!m_jParm.isMember("ns"), TESSEL_ERR_BAD_PARAMETERS, "!m_jParm.isMember(\"ns\")", false);
    TESSEL_CHECK(!m_jParm["ns"].isString(), TESSEL_ERR_BAD_PARAMETERS, "!m_jParm[\"ns\"].isString()", false);
    if (bCreate) {
        // A new object belongs to the owner named in the request; its id is
        // made for that owner.
        TESSEL_CHECK(!m_jParm.isMember("owner"), TESSEL_ERR_BAD_PARAMETERS, "!m_jParm.isMember(\"owner\")", false);
        TESSEL_CHECK(!m_jParm["owner"].isIntegral(), TESSEL_ERR_BAD_PARAMETERS, "!m_jParm[\"owner\"].isIntegral()",
                     false);
        if (!m_jParm.isMember("id")) {
            const std::string strId =
                TesselObjectGenerateID((unsigned int)m_jParm["owner"].asUInt64(), m_jParm["ns"].asString());
            TESSEL_CHECK(TesselIDIsExist(m_jParm["ns"].asString(), strId), TESSEL_ERR_ID_EXISTS,
                         "TesselIDIsExist(m_jParm[\"ns\"].asString(), strId)", false);
            m_jParm["id"] = strId;
        }
    }
    TESSEL_CHECK(!m_jParm.isMember("id"), TESSEL_ERR_BAD_PARAMETERS, "!m_jParm.isMember(\"id\")", false);
    TESSEL_CHECK(!m_jParm["id"].isString(), TESSEL_ERR_BAD_PARAMETERS, "!m_jParm[\"id\"].isString()", false);
    if (!bCreate) {
        // The owner of an existing object is part of its id; a request's own
        // "owner" cannot move it elsewhere.
        unsigned int owner = UID_ERR;
        TESSEL_CHECK_APPEND(UID_ERR == (owner = TesselObjectGetOwnerByID(m_jParm["id"].asString())),
                            "UID_ERR == (owner = TesselObjectGetOwnerByID(m_jParm[\"id\"].asString()))", false);
        m_jParm["owner"] = owner;
    }
    TESSEL_CHECK_APPEND(!mf_GetPathInfo(m_jParm, m_jPathInfo, pObject), "!mf_GetPathInfo(pObject)", false);
    if (NULL != pObject) {
        // The "id_path" fields: given by the request and the object's place.
        pObject->set_ns(m_jParm["ns"].asString());
        pObject->set_id(m_jParm["id"].asString());
        pObject->set_owner(m_jParm["owner"].asUInt64());
    }
    return true;
}

bool TESSEL_BACKEND_FS::mf_GetPathInfo(const Json::Value &jParm, Json::Value &jPathInfo, TESSEL_OBJECT *pObject) {
    TESSEL_CHECK(!jParm.isMember("owner"), TESSEL_ERR_BAD_PARAMETERS, "!jParm.isMember(\"owner\")", false);
    TESSEL_CHECK(!jParm.isMember("ns"), TESSEL_ERR_BAD_PARAMETERS, "!jParm.isMember(\"ns\")", false);
    TESSEL_CHECK(!jParm.isMember("id"), TESSEL_ERR_BAD_PARAMETERS, "!jParm.isMember(\"id\")", false);
    if (jParm.isMember("requester") && 0 != jParm["requester"].asInt64()) {
        TESSEL_CHECK(!TesselCheckUID((uid_t)jParm["owner"].asInt64()), TESSEL_ERR_USER_NOT_EXISTS,
                     "!TesselCheckUID((uid_t)jParm[\"owner\"].asInt64())", false);
    }
    TESSEL_CHECK(!tessel::TesselIsPathComponent(jParm["ns"].asString()), TESSEL_ERR_USER_INPUT,
                 "!TesselIsPathComponent(jParm[\"ns\"].asString())", false);
    TESSEL_CHECK(!tessel::TesselIsPathComponent(jParm["id"].asString()), TESSEL_ERR_USER_INPUT,
                 "!TesselIsPathComponent(jParm[\"id\"].asString())", false);
    std::string strNSPath;
    std::string strTempDir;
    TESSEL_CHECK_APPEND(!TesselGetNSPath(jParm["ns"].asString(), strNSPath),
                        "!TesselGetNSPath(jParm[\"ns\"].asString(), strNSPath)", false);
    TESSEL_CHECK_APPEND(!TesselGetNSTmpDir(jParm["ns"].asString(), strTempDir),
                        "!TesselGetNSTmpDir(jParm[\"ns\"].asString(), strTempDir)", false);
    const std::string strBaseDir = strNSPath + "/" + jParm["id"].asString();
    TESSEL_CHECK_APPEND(!mf_GetPathInfoByBase(strBaseDir, jPathInfo), "!mf_GetPathInfoByBase(strBaseDir, jPathInfo)",
                        false);
    // One work area per object and thread: "<scratch dir>/<id>.<pid><tid>".
    jPathInfo[TESSEL_TMP_PATH] = strTempDir + "/" + jParm["id"].asString() + "." + tessel::FsScratchName();
    if (NULL != pObject) {
        pObject->set_path_info(jPathInfo);
    }
    return true;
}

bool TESSEL_BACKEND_FS::mf_GetPathInfoByBase(const std::string &strBase, Json::Value &jPathInfo) {
    tessel::FsPathInfoByBase(strBase, jPathInfo);
    return true;
}

bool TESSEL_BACKEND_FS::mf_GetPathInfoByGitBase(const std::string &strBase, Json::Value &jPathInfo) {
    tessel::FsPathInfoByGitBase(strBase, jPathInfo);
    return true;
}

bool TESSEL_BACKEND_FS::mf_CreatePath() {
    TESSEL_CHECK(!m_jPathInfo.isMember(TESSEL_TEXT_PATH), TESSEL_ERR_BAD_PARAMETERS,
                 "!m_jPathInfo.isMember(TESSEL_TEXT_PATH)", false);
    TESSEL_CHECK(!m_jPathInfo.isMember(TESSEL_BIN_PATH), TESSEL_ERR_BAD_PARAMETERS,
                 "!m_jPathInfo.isMember(TESSEL_BIN_PATH)", false);
    TESSEL_CHECK(!m_jPathInfo.isMember(TESSEL_BIN_INFO_PATH), TESSEL_ERR_BAD_PARAMETERS,
                 "!m_jPathInfo.isMember(TESSEL_BIN_INFO_PATH)", false);
    TESSEL_CHECK(!m_jPathInfo.isMember(TESSEL_META_BIN), TESSEL_ERR_BAD_PARAMETERS,
                 "!m_jPathInfo.isMember(TESSEL_META_BIN)", false);
    TESSEL_CHECK(!m_jPathInfo.isMember(TESSEL_META_BIN_INFO), TESSEL_ERR_BAD_PARAMETERS,
                 "!m_jPathInfo.isMember(TESSEL_META_BIN_INFO)", false);
    TESSEL_CHECK(!m_jPathInfo.isMember(TESSEL_PERSON_PATH), TESSEL_ERR_BAD_PARAMETERS,
                 "!m_jPathInfo.isMember(TESSEL_PERSON_PATH)", false);
    const unsigned int owner = (unsigned int)m_jParm["owner"].asUInt64();
    TESSEL_CHECK(!TesselRootFSMkdirP(m_jPathInfo[TESSEL_TEXT_PATH].asCString(), owner), TESSEL_ERR_MKDIR,
                 "!TesselRootFSMkdirP(m_jPathInfo[TESSEL_TEXT_PATH].asCString(), owner)", false);
    TESSEL_CHECK(!TesselRootFSMkdirP(m_jPathInfo[TESSEL_BIN_PATH].asCString(), owner), TESSEL_ERR_MKDIR,
                 "!TesselRootFSMkdirP(m_jPathInfo[TESSEL_BIN_PATH].asCString(), owner)", false);
    TESSEL_CHECK(!TesselRootFSMkdirP(m_jPathInfo[TESSEL_BIN_INFO_PATH].asCString(), owner), TESSEL_ERR_MKDIR,
                 "!TesselRootFSMkdirP(m_jPathInfo[TESSEL_BIN_INFO_PATH].asCString(), owner)", false);
    TESSEL_CHECK(!TesselRootFSMkdirP(m_jPathInfo[TESSEL_META_BIN].asCString(), owner), TESSEL_ERR_MKDIR,
                 "!TesselRootFSMkdirP(m_jPathInfo[TESSEL_META_BIN].asCString(), owner)", false);
    TESSEL_CHECK(!TesselRootFSMkdirP(m_jPathInfo[TESSEL_META_BIN_INFO].asCString(), owner), TESSEL_ERR_MKDIR,
                 "!TesselRootFSMkdirP(m_jPathInfo[TESSEL_META_BIN_INFO].asCString(), owner)", false);
    TESSEL_CHECK(!TesselRootFSMkdirP(m_jPathInfo[TESSEL_PERSON_PATH].asCString(), owner), TESSEL_ERR_MKDIR,
                 "!TesselRootFSMkdirP(m_jPathInfo[TESSEL_PERSON_PATH].asCString(), owner)", false);
    return true;
}

// ---- which files a request touches -------------------------------------------

bool TESSEL_BACKEND_FS::mf_NeedToGet(const char *szType) {
    const Json::Value jField = m_jParm.isMember("field") ? m_jParm["field"] : Json::Value();
    for (const std::string &strName : m_fieldOrder) {
        const Json::Value &jEntry = m_jFieldTable[strName];
        if (jEntry[0].asString() != szType) {
            continue;
        }
        bool blGet = false;
        if (jField.isObject() && jField.isMember(strName)) {
            const Json::Value &jSelect = jField[strName];
            if (jSelect.isBool()) {
                blGet = jSelect.asBool();
            } else if (jSelect.isString()) {
                blGet = true;
            } else if (jSelect.isObject()) {
                blGet = mf_NeedToGetCheckOne(jSelect);
            } else {
                TESSEL_LOG(LOG_ERR, "bad jField[%s] type, jField[%s]=%s\n", strName.c_str(), strName.c_str(),
                           tessel::toString(jSelect).c_str());
                continue;
            }
        } else {
            blGet = jEntry[1].asBool();
        }
        if (blGet) {
            return true;
        }
    }
    return false;
}

bool TESSEL_BACKEND_FS::mf_NeedToGetCheckOne(const Json::Value &jValue) {
    if (jValue.isBool()) {
        return jValue.asBool();
    }
    if (jValue.isObject()) {
        for (const Json::Value &jMember : jValue) {
            if (mf_NeedToGetCheckOne(jMember)) {
                return true;
            }
        }
    }
    return false;
}

bool TESSEL_BACKEND_FS::mf_NeedToSave(const char *szType) {
    for (const std::string &strName : m_jParm.getMemberNames()) {
        if (m_jFieldTable.isMember(strName) && m_jFieldTable[strName][0].asString() == szType) {
            return true;
        }
    }
    return false;
}

// ---- "basic.json" and "metatext.json" ------------------------------------------

bool TESSEL_BACKEND_FS::mf_GetConfigFieldFromJson(const char *szType, Json::Value &jOut) {
    TESSEL_CHECK(0 != strcmp(szType, TESSEL_BASIC) && 0 != strcmp(szType, TESSEL_META_TEXT), TESSEL_ERR_BAD_PARAMETERS,
                 "0 != strcmp(szType, TESSEL_BASIC) && 0 != strcmp(szType, TESSEL_META_TEXT)", false);
    jOut = Json::Value(Json::objectValue);
    for (const std::string &strName : m_fieldOrder) {
        if (m_jFieldTable[strName][0].asString() == szType && m_jParm.isMember(strName)) {
            jOut[strName] = m_jParm[strName];
        }
    }
    return true;
}

bool TESSEL_BACKEND_FS::mf_GetJsonFile(const char *szType, Json::Value &jOut) {
    const std::string strPath = m_jPathInfo[szType].asString();
    TESSEL_AS_ROOT();
    // A file not written yet holds nothing.
    if (!QLIBCFileExist(strPath.c_str())) {
        jOut = Json::Value(Json::objectValue);
        return true;
    }
    TESSEL_CHECK(!tessel::fromFile(jOut, strPath) || !jOut.isObject(), TESSEL_ERR_READ_FILE,
                 "!jOut.fromFile(m_jPathInfo[szType].asString()) || !jOut.isObject()", false);
    return true;
}

bool TESSEL_BACKEND_FS::mf_SetJsonFile(const char *szType) {
    TESSEL_CHECK(!szType || 0 == szType[0], TESSEL_ERR_BAD_PARAMETERS, "!szType || 0 == szType[0]", false);
    TESSEL_CHECK(0 != strcmp(szType, TESSEL_BASIC) && 0 != strcmp(szType, TESSEL_META_TEXT), TESSEL_ERR_BAD_PARAMETERS,
                 "0 != strcmp(szType, TESSEL_BASIC) && 0 != strcmp(szType, TESSEL_META_TEXT)", false);
    TESSEL_CHECK(!m_jPathInfo.isMember(szType), TESSEL_ERR_BAD_PARAMETERS, "!m_jPathInfo.isMember(szType)", false);
    Json::Value jOld;
    Json::Value jObj;
    TESSEL_CHECK_APPEND(!mf_GetJsonFile(szType, jOld), "!mf_GetJsonFile(szType, jOld)", false);
    TESSEL_CHECK_APPEND(!mf_GetConfigFieldFromJson(szType, jObj), "!mf_GetConfigFieldFromJson(szType, jObj)", false);
    TESSEL_CHECK_APPEND(!mf_MergeAndCheckMtime(szType, jOld, jObj), "!mf_MergeAndCheckMtime(szType, jOld, jObj)",
                        false);
    TESSEL_AS_ROOT();
    TESSEL_CHECK_APPEND(!TesselJsonToFile(jOld, m_jPathInfo[szType].asString()),
                        "!TesselJsonToFile(jOld, m_jPathInfo[szType].asString())", false);
    return true;
}

/*
 * Merges the request's values jNew into the stored file jOld, one member of
 * the section at a time: the fields themselves for "basic.json", the named
 * entries of "metatext" for "metatext.json". Beside the section the file
 * keeps "auto_mtime": for each member, the modification time of the request
 * that last wrote it.
 *
 * The rule: a member is written, and its "auto_mtime" becomes the request's
 * time, unless the stored "auto_mtime" of that member is newer than the
 * request's time; then the stored value stays. A request never loses a newer
 * value to an older one, whichever of them reaches the file first; of two
 * requests with the same time the later write wins. A null value removes
 * the member but leaves its time behind, so that an older request cannot
 * bring back what a newer one removed. Members the request does not name
 * are left as they are. The request's time is its "mtime"; a request
 * without one counts as made now.
 */
bool TESSEL_BACKEND_FS::mf_MergeAndCheckMtime(const char *szType, Json::Value &jOld, const Json::Value &jNew) {
    const bool blBasic = 0 == strcmp(szType, TESSEL_BASIC);
    if (!blBasic && 0 != strcmp(szType, TESSEL_META_TEXT)) {
        TESSEL_RAISE(TESSEL_ERR_BAD_PARAMETERS, "incorrect type, szType=%s", szType);
        return false;
    }
    const Json::Value &jParm = m_jParm;  // read only: a new member would count as a field to save
    const long long reqMtime = jParm["mtime"].isIntegral() ? jParm["mtime"].asInt64() : (long long)time(NULL);
    if (!blBasic) {
        TESSEL_CHECK(!jNew[SZK_METATEXT].isObject(), TESSEL_ERR_BAD_PARAMETERS, "!jObj[\"metatext\"].isObject()",
                     false);
        if (!jOld[SZK_METATEXT].isObject()) {
            jOld[SZK_METATEXT] = Json::Value(Json::objectValue);
        }
    }
    if (!jOld[SZK_AUTO_MTIME].isObject()) {
        jOld[SZK_AUTO_MTIME] = Json::Value(Json::objectValue);
    }
    Json::Value &jAuto = jOld[SZK_AUTO_MTIME];
    Json::Value &jSection = blBasic ? jOld : jOld[SZK_METATEXT];
    const Json::Value &jNewSection = blBasic ? jNew : jNew[SZK_METATEXT];
    for (Json::Value::const_iterator it = jNewSection.begin(); it != jNewSection.end(); ++it) {
        const std::string strName = it.name();
        if (jAuto[strName].isIntegral() && jAuto[strName].asInt64() > reqMtime) {
            continue;
        }
        if (it->isNull()) {
            jSection.removeMember(strName);
        } else {
            jSection[strName] = *it;
        }
        jAuto[strName] = (Json::Int64)reqMtime;
    }
    return true;
}

bool TESSEL_BACKEND_FS::mf_GetBasic(TESSEL_OBJECT *pObject) {
    Json::Value jBasic;
    TESSEL_CHECK_APPEND(!mf_GetJsonFile(TESSEL_BASIC, jBasic), "!mf_GetJsonFile(TESSEL_BASIC, jBasic)", false);
    pObject->set_category(TextOf(jBasic["category"]));
    pObject->set_parent_id(TextOf(jBasic["parent_id"]));
    pObject->set_ctime(jBasic["ctime"].isIntegral() ? (long)jBasic["ctime"].asInt64() : 0);
    pObject->set_acl(jBasic["acl"]);
    return true;
}

bool TESSEL_BACKEND_FS::mf_SaveBasic() {
    TESSEL_CHECK_APPEND(!mf_SetJsonFile(TESSEL_BASIC), "!mf_SetJsonFile(TESSEL_BASIC)", false);
    return true;
}

bool TESSEL_BACKEND_FS::mf_GetMetaText(TESSEL_OBJECT *pObject) {
    Json::Value jMetaText;
    TESSEL_CHECK_APPEND(!mf_GetJsonFile(TESSEL_META_TEXT, jMetaText), "!mf_GetJsonFile(TESSEL_META_TEXT, jMetaText)",
                        false);
    pObject->set_metatext(jMetaText[SZK_METATEXT].isObject() ? jMetaText[SZK_METATEXT]
                                                             : Json::Value(Json::objectValue));
    return true;
}

bool TESSEL_BACKEND_FS::mf_SaveMetaText() {
    TESSEL_CHECK_APPEND(!mf_SetJsonFile(TESSEL_META_TEXT), "!mf_SetJsonFile(TESSEL_META_TEXT)", false);
    return true;
}

bool TESSEL_BACKEND_FS::mf_SaveConfig(std::string &strNewVer) {
    if (mf_NeedToSave(TESSEL_BASIC)) {
        TESSEL_CHECK_APPEND(!mf_SaveBasic(), "!mf_SaveBasic()", false);
    }
    if (mf_NeedToSave(TESSEL_META_TEXT)) {
        TESSEL_CHECK_APPEND(!mf_SaveMetaText(), "!mf_SaveMetaText()", false);
    }
    if (mf_NeedToSave(TESSEL_META_BIN)) {
        TESSEL_CHECK_APPEND(!mf_SaveMetaBinary(), "!mf_SaveMetaBinary()", false);
    }
    if (mf_NeedToSave(TESSEL_VERSION)) {
        TESSEL_CHECK_APPEND(!mf_SaveGit(strNewVer), "!mf_SaveGit(strNewVer)", false);
    }
    if (mf_NeedToSave(TESSEL_PERSON_PATH)) {
        TESSEL_CHECK_APPEND(!mf_SavePerson(), "!mf_SavePerson()", false);
    }
    return true;
}

// ---- person records ---------------------------------------------------------

bool TESSEL_BACKEND_FS::mf_GetPerson(TESSEL_OBJECT *pObject) {
    const Json::Value &jParm = m_jParm;
    Json::Value jPerson(Json::objectValue);
    {
        TESSEL_AS_ROOT();
        TESSEL_CHECK_APPEND(
            !tessel::ReadPersons(m_jPathInfo[TESSEL_PERSON_PATH].asString(), jParm["field"]["person"], jPerson),
            "!ReadPersons(m_jPathInfo[TESSEL_PERSON_PATH].asString(), jParm[\"field\"][\"person\"], "
            "jPerson)",
            false);
    }
    pObject->set_person(jPerson);
    return true;
}

bool TESSEL_BACKEND_FS::mf_SavePerson() {
    TESSEL_AS_ROOT();
    TESSEL_CHECK(!tessel::SavePersons(m_jPathInfo[TESSEL_PERSON_PATH].asString(), m_jParm["person"]),
                 TESSEL_ERR_OPERATION_FAILED,
                 "!SavePersons(m_jPathInfo[TESSEL_PERSON_PATH].asString(), m_jParm[\"person\"])", false);
    return true;
}
