// The settings file and what is built on it: the store and namespace
// switches, per-user sharing switches, index filters, the owner-validity and
// index-filter caches, and the application privilege of a namespace.
//
// The file is root's (it may be mode 0600), so it is read and written only in
// a privilege-raising section; callers running as a user reach it that way.
#include <stdio.h>
#include <sys/file.h>
#include <unistd.h>

#include <map>
#include <mutex>
#include <string>

#include <quor/qlib.h>
#include <quor/quor.h>

#include "common/tessel_json.h"
#include "common/tessel_ns_hook.h"
#include "common/tessel_pathname.h"
#include "common/tessel_priv.h"
#include "common/tessel_report.h"
#include "tessel_conf.h"
#include "tessel_file.h"
#include "tessel_id.h"
#include "tessel_index.h"
#include "tessel_user.h"

static constexpr const char kTesselModule[] = "common/tessel_conf";

namespace {

constexpr const char SZF_TESSEL_CONF_PATH[] = "/usr/quor/etc/tessel.conf";
constexpr const char SZF_TESSEL_CONF_LOCK[] = "/tmp/.tessel_conf.lock";
constexpr long long kConfLockTimeoutUs = 5000000;
// Keys made from a namespace name or a uid; a longer name is cut here.
constexpr size_t kKeySize = 4096;

// Authentication types of a user, as the user-home switches know them.
constexpr int kAuthNone = 0;

// ---- the file --------------------------------------------------------------

BOOL ConfFileExists() {
    TESSEL_AS_ROOT();
    return QLIBCFileExist(SZF_TESSEL_CONF_PATH);
}

bool ReadConfFile(Json::Value &jConf) {
    TESSEL_AS_ROOT();
    TESSEL_CHECK(!tessel::fromFile(jConf, SZF_TESSEL_CONF_PATH), TESSEL_ERR_CONF_CORRUPTED,
                 "!jConf.fromFile(SZF_TESSEL_CONF_PATH)", false);
    return true;
}

// Readers take no lock, so they must only ever see a whole file: the text is
// written to a temporary file beside it and renamed over it, which also keeps
// the file's owner and mode (a new file is root's, 0600).
bool SaveConfFile(const Json::Value &jConf) {
    TESSEL_AS_ROOT();
    TESSEL_CHECK(!TesselJsonToFile(jConf, SZF_TESSEL_CONF_PATH), TESSEL_ERR_UPDATE_CONF,
                 "!jConf.toFile(SZF_TESSEL_CONF_PATH)", false);
    return true;
}

// The file as a getter needs it: a missing file means the store is disabled.
bool ReadExistingConf(Json::Value &jConf) {
    TESSEL_CHECK(FALSE == ConfFileExists(), TESSEL_ERR_DISABLED, "FALSE == QLIBCFileExist(SZF_TESSEL_CONF_PATH)",
                 false);
    TESSEL_CHECK(!ReadConfFile(jConf), TESSEL_ERR_CONF_CORRUPTED, "!ReadConfFile(jConf)", false);
    return true;
}

// The file as a writer starts from it: whatever could be read, else null. A
// failed read stays on the error stack; the writer goes on regardless.
Json::Value ReadConfForUpdate() {
    Json::Value jConf;
    if (ConfFileExists()) {
        ReadConfFile(jConf);
    }
    return jConf;
}

// jParent[szKey] as an object, for a writer. A value in the way that is not
// an object is replaced, the way a corrupted file is: the writer's own member
// must land, and the rest of the file is kept.
Json::Value &MemberObject(Json::Value &jParent, const char *szKey) {
    if (!jParent.isObject()) {
        jParent = Json::Value(Json::objectValue);
    }
    Json::Value &jChild = jParent[szKey];
    if (!jChild.isObject()) {
        jChild = Json::Value(Json::objectValue);
    }
    return jChild;
}

void FormatUidKey(char (&szUid)[kKeySize], unsigned int uid) { snprintf(szUid, sizeof(szUid), "%u", uid); }

// ---- the caches --------------------------------------------------------------

// Each held across look-up and computation, so concurrent first calls for
// one key compute once. Never freed: threads may still use them while the
// process exits.
struct FilterCache {
    std::mutex mutex;
    std::map<std::string, Json::Value> tFilterMap;
};

struct ValidCache {
    std::mutex mutex;
    std::map<unsigned int, bool> tValidMap;
};

FilterCache &Filters() {
    static FilterCache *pCache = new FilterCache;
    return *pCache;
}

ValidCache &Validities() {
    static ValidCache *pCache = new ValidCache;
    return *pCache;
}

// Which user-home switch governs the user: from the name's form.
int AuthTypeOf(const Json::Value &jsName) {
    if (!jsName.isString() || jsName.asString().empty()) {
        return kAuthNone;
    }
    const std::string strName = jsName.asString();
    if (std::string::npos != strName.find('\\')) {
        return AUTH_DOMAIN;
    }
    if (std::string::npos != strName.find('@')) {
        return AUTH_LDAP;
    }
    return AUTH_LOCAL;
}

bool EvaluateOwner(unsigned int owner) {
    TESSEL_CHECK(UID_ROOT == owner || UID_ERR == owner, TESSEL_ERR_USER_INPUT, "UID_ROOT == owner || UID_ERR == owner",
                 false);
    Json::Value jsInfo;
    TESSEL_CHECK(!TesselGetUserInfo(owner, jsInfo, true), TESSEL_ERR_USER_NOT_EXISTS,
                 "!TesselGetUserInfo(owner, jsInfo, true)", false);
    const Json::Value &jsUser = jsInfo;
    const int authType = AuthTypeOf(jsUser["name"]);
    TESSEL_CHECK(FALSE == QUORServiceUserHomeIsEnabled(authType, NULL), TESSEL_ERR_USER_HOME_DISABLED,
                 "FALSE == QUORServiceUserHomeIsEnabled(authType, NULL)", false);
    TESSEL_CHECK(jsUser["expire"].asBool(), TESSEL_ERR_OWNER_INVALID, "jsInfo[\"expire\"].asBool()", false);
    return true;
}

bool ReadModuleDescriptor(const std::string &strPath, Json::Value &jsDesc) {
    TESSEL_AS_ROOT();
    return 0 == access(strPath.c_str(), R_OK) && tessel::fromFile(jsDesc, strPath);
}

}  // namespace

// ---- the writer lock ---------------------------------------------------------

// Taken with the caller's own rights: flock needs only a read-only descriptor,
// which any caller gets, and raising here would make every thread of the
// process root for as long as the wait lasts.
ConfMutex::ConfMutex() : m_strPath(SZF_TESSEL_CONF_LOCK), m_locked(false), m_fd(-1) {
    int fd = -1;
    if (1 == QLIBCFileLockTimeByFile(m_strPath.c_str(), QLIBC_FILE_LOCK_EX, kConfLockTimeoutUs, &fd)) {
        m_locked = true;
        m_fd = fd;
    } else {
        TESSEL_LOG_FAILED("1 != QLIBCFileLockTimeByFile(m_strPath.c_str(), 1, 5000000, &m_fd)");
    }
}

ConfMutex::~ConfMutex() {
    if (m_locked && 0 <= m_fd) {
        flock(m_fd, LOCK_UN);
        close(m_fd);
        m_fd = -1;
        m_locked = false;
    }
}

// ---- access ------------------------------------------------------------------

BOOL TesselSettingsAccessGetEx(const Json::Value &jConf, const char *szNameSpace) {
    TESSEL_CHECK(!jConf.isObject(), TESSEL_ERR_CONF_CORRUPTED, "!jConf.isObject()", FALSE);
    TESSEL_CHECK(!jConf.isMember("Access"), TESSEL_ERR_DISABLED, "!jConf.isMember(\"Access\")", FALSE);
    TESSEL_CHECK(!jConf["Access"].isObject(), TESSEL_ERR_CONF_CORRUPTED, "!jConf[\"Access\"].isObject()", FALSE);
    const Json::Value &jAccess = jConf["Access"];
    if (NULL == szNameSpace) {
        TESSEL_CHECK(!jAccess.isMember("enable"), TESSEL_ERR_DISABLED, "!jConf[\"Access\"].isMember(\"enable\")",
                     FALSE);
        TESSEL_CHECK(!jAccess["enable"].isBool(), TESSEL_ERR_CONF_CORRUPTED, "!jConf[\"Access\"][\"enable\"].isBool()",
                     FALSE);
        TESSEL_CHECK(!jAccess["enable"].asBool(), TESSEL_ERR_DISABLED, "!jConf[\"Access\"][\"enable\"].asBool()",
                     FALSE);
        return TRUE;
    }
    char szNSKey[kKeySize];
    snprintf(szNSKey, sizeof(szNSKey), "enable_ns_%s", szNameSpace);
    TESSEL_CHECK(!jAccess.isMember(szNSKey), TESSEL_ERR_NS_DISABLED, "!jConf[\"Access\"].isMember(szNSKey)", FALSE);
    TESSEL_CHECK(!jAccess[szNSKey].isBool(), TESSEL_ERR_CONF_CORRUPTED, "!jConf[\"Access\"][szNSKey].isBool()", FALSE);
    TESSEL_CHECK(!jAccess[szNSKey].asBool(), TESSEL_ERR_NS_DISABLED, "!jConf[\"Access\"][szNSKey].asBool()", FALSE);
    return TRUE;
}

BOOL TesselSettingsAccessGet(const char *szNameSpace) {
    Json::Value jConf;
    if (!ReadExistingConf(jConf)) {
        return FALSE;
    }
    TESSEL_CHECK_APPEND(FALSE == TesselSettingsAccessGetEx(jConf, szNameSpace),
                        "FALSE == TesselSettingsAccessGetEx(jConf, szNameSpace)", FALSE);
    return TRUE;
}

BOOL TesselAccessCheck(const char *szNameSpace) {
    Json::Value jConf;
    if (!ReadExistingConf(jConf)) {
        return FALSE;
    }
    TESSEL_CHECK_APPEND(FALSE == TesselSettingsAccessGetEx(jConf, NULL),
                        "FALSE == TesselSettingsAccessGetEx(jConf, NULL)", FALSE);
    if (NULL != szNameSpace) {
        TESSEL_CHECK_APPEND(FALSE == TesselSettingsAccessGetEx(jConf, szNameSpace),
                            "FALSE == TesselSettingsAccessGetEx(jConf, szNameSpace)", FALSE);
    }
    return TRUE;
}

BOOL TesselSettingsGet(const char *szNameSpace, Json::Value &jConf) {
    TESSEL_CHECK(NULL == szNameSpace, TESSEL_ERR_OPERATION_FAILED, "NULL == szNameSpace", FALSE);
    jConf = Json::Value();
    if (!ReadExistingConf(jConf)) {
        return FALSE;
    }
    const Json::Value &jRead = jConf;
    TESSEL_CHECK(!jRead.isObject(), TESSEL_ERR_CONF_CORRUPTED, "!jConf.isObject()", FALSE);
    TESSEL_CHECK(!jRead["Access"].isObject(), TESSEL_ERR_CONF_CORRUPTED, "!jConf[\"Access\"].isObject()", FALSE);
    char szNSKey[kKeySize];
    snprintf(szNSKey, sizeof(szNSKey), "enable_ns_%s", szNameSpace);
    TESSEL_CHECK(!jRead["Access"].isMember(szNSKey), TESSEL_ERR_NS_DISABLED, "!jConf[\"Access\"].isMember(szNSKey)",
                 FALSE);
    return TRUE;
}

int TesselSettingsAccessSet(const char *szNameSpace, const char *szPkgId, int enable) {
    // Without the lock within its wait the change is still made: a stuck
    // holder must not keep the store switched off for ever.
    ConfMutex lock;
    TESSEL_CHECK(!TesselAppendPersonTable(), TESSEL_ERR_CREATE_DB, "!TesselAppendPersonTable()", -1);
    Json::Value jConf = ReadConfForUpdate();
    if (NULL != szNameSpace) {
        char szNSKey[kKeySize];
        snprintf(szNSKey, sizeof(szNSKey), "enable_ns_%s", szNameSpace);
        MemberObject(jConf, "Access")[szNSKey] = (1 == enable);
        if (NULL != szPkgId) {
            MemberObject(jConf, "pkg_id")[szNameSpace] = szPkgId;
        }
    } else {
        MemberObject(jConf, "Access")["enable"] = (1 == enable);
    }
    TESSEL_CHECK(!SaveConfFile(jConf), TESSEL_ERR_UPDATE_CONF, "!SaveConfFile(jConf)", -1);
    return 0;
}

// ---- sharing -----------------------------------------------------------------

BOOL TesselSettingsSharingGetEx(const Json::Value &jConf, const char *szNameSpace, unsigned int owner) {
    TESSEL_CHECK(UID_ERR == owner, TESSEL_ERR_BAD_PARAMETERS, "UID_ERR == owner", FALSE);
    TESSEL_CHECK(!jConf.isObject(), TESSEL_ERR_CONF_CORRUPTED, "!jConf.isObject()", FALSE);
    if (!jConf.isMember("Sharing")) {
        return TRUE;
    }
    const Json::Value &jSharing = jConf["Sharing"];
    TESSEL_CHECK(!jSharing.isObject(), TESSEL_ERR_CONF_CORRUPTED, "!jConf[\"Sharing\"].isObject()", FALSE);
    char szUid[kKeySize];
    FormatUidKey(szUid, owner);
    if (!jSharing.isMember(szUid)) {
        return TRUE;
    }
    const Json::Value &jUser = jSharing[szUid];
    TESSEL_CHECK(!jUser.isObject(), TESSEL_ERR_CONF_CORRUPTED, "!jConf[\"Sharing\"][szUid].isObject()", FALSE);
    if (NULL != szNameSpace) {
        char szNSKey[kKeySize];
        snprintf(szNSKey, sizeof(szNSKey), "disable_ns_%s", szNameSpace);
        if (!jUser.isMember(szNSKey)) {
            return TRUE;
        }
        TESSEL_CHECK(!jUser[szNSKey].isBool(), TESSEL_ERR_CONF_CORRUPTED,
                     "!jConf[\"Sharing\"][szUid][szNSKey].isBool()", FALSE);
        TESSEL_CHECK(jUser[szNSKey].asBool(), TESSEL_ERR_SHARING_DISABLED,
                     "jConf[\"Sharing\"][szUid][szNSKey].asBool()", FALSE);
        return TRUE;
    }
    if (!jUser.isMember("disable")) {
        return TRUE;
    }
    TESSEL_CHECK(!jUser["disable"].isBool(), TESSEL_ERR_CONF_CORRUPTED,
                 "!jConf[\"Sharing\"][szUid][\"disable\"].isBool()", FALSE);
    TESSEL_CHECK(jUser["disable"].asBool(), TESSEL_ERR_SHARING_DISABLED,
                 "jConf[\"Sharing\"][szUid][\"disable\"].asBool()", FALSE);
    return TRUE;
}

BOOL TesselSettingsSharingGet(const char *szNameSpace, unsigned int owner) {
    if (FALSE == QLIBCFileExist(SZF_TESSEL_CONF_PATH)) {
        return TRUE;
    }
    Json::Value jConf;
    if (!ReadConfFile(jConf)) {
        // An unreadable file switches nobody's sharing off.
        return TRUE;
    }
    TESSEL_CHECK_APPEND(FALSE == TesselSettingsSharingGetEx(jConf, szNameSpace, owner),
                        "FALSE == TesselSettingsSharingGetEx(jConf, szNameSpace, owner)", FALSE);
    return TRUE;
}

BOOL TesselSharingCheck(const char *szNameSpace, unsigned int owner) {
    if (FALSE == ConfFileExists()) {
        return TRUE;
    }
    Json::Value jConf;
    TESSEL_CHECK(!ReadConfFile(jConf), TESSEL_ERR_CONF_CORRUPTED, "!ReadConfFile(jConf)", FALSE);
    TESSEL_CHECK_APPEND(FALSE == TesselSettingsSharingGetEx(jConf, NULL, owner),
                        "FALSE == TesselSettingsSharingGetEx(jConf, NULL, owner)", FALSE);
    if (NULL != szNameSpace) {
        TESSEL_CHECK_APPEND(FALSE == TesselSettingsSharingGetEx(jConf, szNameSpace, owner),
                            "FALSE == TesselSettingsSharingGetEx(jConf, szNameSpace, owner)", FALSE);
    }
    return TRUE;
}

int TesselSettingsSharingSet(const char *szNameSpace, unsigned int uid, int enable) {
    ConfMutex lock;
    Json::Value jConf = ReadConfForUpdate();
    char szUid[kKeySize];
    FormatUidKey(szUid, uid);
    Json::Value &jUser = MemberObject(MemberObject(jConf, "Sharing"), szUid);
    if (NULL != szNameSpace) {
        char szNSKey[kKeySize];
        snprintf(szNSKey, sizeof(szNSKey), "disable_ns_%s", szNameSpace);
        jUser[szNSKey] = !(1 == enable);
    } else {
        jUser["disable"] = !(1 == enable);
    }
    TESSEL_CHECK(!SaveConfFile(jConf), TESSEL_ERR_UPDATE_CONF, "!SaveConfFile(jConf)", -1);
    return 0;
}

int TesselSettingsNoSharingUserList(const char *szNameSpace, QLIBSZLIST **ppList) {
    TESSEL_CHECK(NULL == szNameSpace, TESSEL_ERR_BAD_PARAMETERS, "NULL == szNameSpace", -1);
    TESSEL_CHECK(NULL == ppList || NULL == *ppList, TESSEL_ERR_BAD_PARAMETERS, "NULL == ppList || NULL == *ppList", -1);
    if (FALSE == ConfFileExists()) {
        return 0;
    }
    Json::Value jConf;
    TESSEL_CHECK(!ReadConfFile(jConf), TESSEL_ERR_CONF_CORRUPTED, "!ReadConfFile(jConf)", -1);
    const Json::Value &jRead = jConf;
    TESSEL_CHECK(!jRead.isObject(), TESSEL_ERR_CONF_CORRUPTED, "!jConf.isObject()", -1);
    if (!jRead.isMember("Sharing")) {
        return 0;
    }
    const Json::Value &jSharing = jRead["Sharing"];
    TESSEL_CHECK(!jSharing.isObject(), TESSEL_ERR_CONF_CORRUPTED, "!jConf[\"Sharing\"].isObject()", -1);
    char szNSKey[kKeySize];
    snprintf(szNSKey, sizeof(szNSKey), "disable_ns_%s", szNameSpace);
    const Json::Value jTrue(true);
    // Member names come sorted (byte order), and each is looked at once.
    for (const std::string &strUid : jSharing.getMemberNames()) {
        const Json::Value &jUser = jSharing[strUid];
        if (!jUser.isObject() || (jTrue != jUser["disable"] && jTrue != jUser[szNSKey])) {
            continue;
        }
        // A user left out would be taken for one who shares.
        TESSEL_CHECK(0 > QLIBCSzListPush(ppList, strUid.c_str()), TESSEL_ERR_OUT_OF_MEMORY,
                     "0 > QLIBCSzListPush(ppList, strUid.c_str())", -1);
    }
    return 0;
}

unsigned int TesselVersionGet(void) { return 2; }

// ---- index filters -----------------------------------------------------------

BOOL TesselSettingsIndexSet(const std::string &strNs, const Json::Value &jsFilter) {
    ConfMutex lock;
    TESSEL_CHECK_APPEND(strNs.empty() || !jsFilter.isObject(), "strNs.empty() || !jsFilter.isObject()", FALSE);
    TESSEL_CHECK_APPEND(!jsFilter.isMember("text") && !jsFilter.isMember("metatext"),
                        "!jsFilter.isMember(\"text\") && !jsFilter.isMember(\"metatext\")", FALSE);
    Json::Value jsConf = ReadConfForUpdate();
    Json::Value jsNsFilter(Json::objectValue);
    for (const char *szField : {"text", "metatext"}) {
        if (jsFilter.isMember(szField)) {
            jsNsFilter[szField] = jsFilter[szField];
        }
    }
    MemberObject(jsConf, "Index")[strNs] = jsNsFilter;
    TESSEL_CHECK_APPEND(!SaveConfFile(jsConf), "!SaveConfFile(jsConf)", FALSE);
    return TRUE;
}

BOOL TesselSettingsIndexGet(const std::string &strNs, Json::Value &jsFilter) {
    TESSEL_CHECK_APPEND(strNs.empty(), "strNs.empty()", FALSE);
    Json::Value jsConf;
    // A missing or unreadable file means no filter.
    ReadConfFile(jsConf);
    const Json::Value &jsRead = jsConf;
    if (jsRead.isObject() && jsRead["Index"].isObject()) {
        jsFilter = jsRead["Index"].get(strNs, Json::Value(Json::objectValue));
    } else {
        jsFilter = Json::Value(Json::objectValue);
    }
    return TRUE;
}

BOOL TesselSettingsIndexGetFromCache(const std::string &strNs, Json::Value &jsFilter) {
    FilterCache &cache = Filters();
    std::lock_guard<std::mutex> lock(cache.mutex);
    auto it = cache.tFilterMap.find(strNs);
    if (cache.tFilterMap.end() != it) {
        jsFilter = it->second;
        return TRUE;
    }
    TESSEL_CHECK_APPEND(!TesselSettingsIndexGet(strNs, jsFilter), "!TesselSettingsIndexGet(strNs, jsFilter)", FALSE);
    cache.tFilterMap.emplace(strNs, jsFilter);
    return TRUE;
}

// ---- owners ------------------------------------------------------------------

BOOL TesselObjectOwnerIsValid(unsigned int uid) {
    ValidCache &cache = Validities();
    std::lock_guard<std::mutex> lock(cache.mutex);
    auto it = cache.tValidMap.find(uid);
    if (cache.tValidMap.end() != it) {
        return it->second ? TRUE : FALSE;
    }
    const bool blValid = EvaluateOwner(uid);
    cache.tValidMap.emplace(uid, blValid);
    return blValid ? TRUE : FALSE;
}

BOOL TesselObjectIDIsValid(const char *szID) {
    TESSEL_CHECK(NULL == szID, TESSEL_ERR_BAD_PARAMETERS, "NULL == szID", FALSE);
    unsigned int owner = UID_ERR;
    TESSEL_CHECK_APPEND(UID_ERR == (owner = TesselObjectGetOwnerByID(szID)),
                        "UID_ERR == (owner = TesselObjectGetOwnerByID(szID))", FALSE);
    TESSEL_CHECK_APPEND(FALSE == TesselObjectOwnerIsValid(owner), "FALSE == TesselObjectOwnerIsValid(owner)", FALSE);
    return TRUE;
}

// ---- application privilege ---------------------------------------------------

std::string TesselAppPrivName(const std::string &strNs) {
    TESSEL_CHECK(!tessel::TesselIsPathComponent(strNs), TESSEL_ERR_USER_INPUT, "!TesselIsPathComponent(strNs)",
                 std::string());
    const std::string strPath = tessel::NsModuleDescriptorPath(strNs);
    Json::Value jsDesc;
    if (!ReadModuleDescriptor(strPath, jsDesc)) {
        return std::string();
    }
    const Json::Value &jsRead = jsDesc;
    if (!jsRead.isObject() || !jsRead["app priv"].isString()) {
        return std::string();
    }
    return jsRead["app priv"].asString();
}
