// User information from the platform's user database, cached per uid for the
// life of the process: a user renamed, deleted or expired while a process
// runs keeps the answers that process saw first.
#include <stdio.h>
#include <stdlib.h>
#include <string.h>

#include <map>
#include <mutex>
#include <string>

#include <json/value.h>
#include <quor/quor.h>

#include "common/tessel_priv.h"
#include "common/tessel_report.h"
#include "tessel_id.h"
#include "tessel_user.h"

static constexpr const char kTesselModule[] = "common/tessel_common";

namespace {

constexpr const char kAnonymous[] = "Anonymous";
constexpr const char kLocalMailDomain[] = "@localhost";
constexpr size_t kRealNameSize = 8192;

// Held across a whole getter, so concurrent first calls for one uid build
// its entry once. Recursive because TesselGetAllGID asks TesselGetUserName
// for the name while it holds the map.
std::recursive_mutex tUserMap;
// The platform's user look-ups are not known to be safe to run in parallel.
std::mutex tUser;
std::map<unsigned int, Json::Value> gUserInfo;

// A domain user ("DOMAIN\name") is shown by the display name people know.
std::string DisplayName(const char *szLogin) {
    if (NULL != strchr(szLogin, '\\')) {
        char szReal[kRealNameSize];
        if (0 == QLIBUserRealNameGet(szLogin, szReal, sizeof(szReal))) {
            return szReal;
        }
    }
    return szLogin;
}

Json::Value LookUpUser(unsigned int uid) {
    Json::Value jsUser(Json::objectValue);
    std::lock_guard<std::mutex> lock(tUser);
    QUORUSER *pUser = NULL;
    if (0 != QUORUserGetByUID(static_cast<uid_t>(uid), &pUser) || NULL == pUser) {
        char szName[64];
        snprintf(szName, sizeof(szName), "Deleted user #%u", uid);
        jsUser["name"] = szName;
        jsUser["mail"] = std::string(szName) + kLocalMailDomain;
        jsUser["gid"] = -1;
        jsUser["expire"] = true;
        jsUser["exist"] = false;
        return jsUser;
    }
    const std::string strName = DisplayName(pUser->szName);
    int expired = 0;
    {
        // The shadow database is root's. Asked by the login name: a display
        // name names no account.
        TESSEL_AS_ROOT();
        expired = QUORUserCheckExpired(pUser->szName);
    }
    jsUser["name"] = strName;
    jsUser["mail"] = '\0' == pUser->szMail[0] ? strName + kLocalMailDomain : std::string(pUser->szMail);
    jsUser["gid"] = static_cast<Json::Int64>(pUser->gid);
    jsUser["expire"] = (1 == expired);
    jsUser["exist"] = true;
    QUORUserFree(pUser);
    return jsUser;
}

// uid's entry, built on first demand; tUserMap must be held.
Json::Value &CachedUser(unsigned int uid) {
    auto it = gUserInfo.find(uid);
    if (gUserInfo.end() == it) {
        it = gUserInfo.emplace(uid, LookUpUser(uid)).first;
    }
    return it->second;
}

// The group ids of the user TesselGetUserName names, primary group first;
// empty for a user who does not exist. False when the platform could not
// tell, so that the next call asks again.
bool LookUpGroupIds(unsigned int uid, Json::Value &jsGids) {
    jsGids = Json::Value(Json::arrayValue);
    std::string strName;
    if (!TesselGetUserName(uid, strName, true)) {
        return true;
    }
    std::lock_guard<std::mutex> lock(tUser);
    QLIBSZLIST *pList = QLIBCSzListAlloc(8);
    if (NULL == pList) {
        TESSEL_LOG_FAILED("NULL == (pList = QLIBCSzListAlloc(8))");
        return false;
    }
    const bool ok = 0 <= QLIBGroupInfoListGet(strName.c_str(), &pList);
    if (!ok) {
        TESSEL_LOG_FAILED("0 > QLIBGroupInfoListGet(strName.c_str(), &pList)");
    }
    for (int i = 0; ok && i < QLIBCSzListCount(pList); ++i) {
        jsGids.append(static_cast<Json::Int64>(strtoll(QLIBCSzListGet(pList, i), NULL, 10)));
    }
    QLIBCSzListFree(pList);
    return ok;
}

// The entry a getter answers from, tUserMap held: the anonymous user for
// UID_ERR (never looked up), else uid's cached entry; NULL when the user must
// exist and does not.
const Json::Value *FindUser(unsigned int uid, bool blMustExist) {
    static const Json::Value jsAnonymous = [] {
        Json::Value jsUser(Json::objectValue);
        jsUser["name"] = kAnonymous;
        jsUser["mail"] = "";
        jsUser["exist"] = false;
        jsUser["expire"] = true;
        return jsUser;
    }();
    const Json::Value &jsUser = (UID_ERR == uid) ? jsAnonymous : CachedUser(uid);
    return (blMustExist && !jsUser["exist"].asBool()) ? NULL : &jsUser;
}

}  // namespace

BOOL TesselGetUserInfo(unsigned int uid, Json::Value &jsInfo, bool blMustExist) {
    std::lock_guard<std::recursive_mutex> lock(tUserMap);
    const Json::Value *pUser = FindUser(uid, blMustExist);
    if (NULL == pUser) {
        return FALSE;
    }
    jsInfo = *pUser;
    return TRUE;
}

BOOL TesselGetUserName(unsigned int uid, std::string &strName, bool blMustExist) {
    std::lock_guard<std::recursive_mutex> lock(tUserMap);
    const Json::Value *pUser = FindUser(uid, blMustExist);
    if (NULL == pUser) {
        return FALSE;
    }
    strName = (*pUser)["name"].asString();
    return TRUE;
}

BOOL TesselGetUserNameAndMail(unsigned int uid, std::string &strName, std::string &strMail, bool blMustExist) {
    std::lock_guard<std::recursive_mutex> lock(tUserMap);
    const Json::Value *pUser = FindUser(uid, blMustExist);
    if (NULL == pUser) {
        return FALSE;
    }
    strName = (*pUser)["name"].asString();
    // Mail goes into commit signatures, which need an address even for nobody.
    strMail = (UID_ERR == uid) ? strName + kLocalMailDomain : (*pUser)["mail"].asString();
    return TRUE;
}

BOOL TesselGetGID(unsigned int uid, int &gid, bool blMustExist) {
    std::lock_guard<std::recursive_mutex> lock(tUserMap);
    const Json::Value *pUser = FindUser(uid, blMustExist);
    if (NULL == pUser) {
        return FALSE;
    }
    gid = pUser->get("gid", -1).asInt();
    return TRUE;
}

BOOL TesselGetAllGID(unsigned int uid, Json::Value &jsGid, bool blMustExist) {
    std::lock_guard<std::recursive_mutex> lock(tUserMap);
    if (NULL == FindUser(uid, blMustExist)) {
        return FALSE;
    }
    if (UID_ERR == uid) {
        jsGid = Json::Value(Json::arrayValue);
        return TRUE;
    }
    Json::Value &jsUser = CachedUser(uid);
    if (!jsUser.isMember("gids")) {
        Json::Value jsGids;
        if (!LookUpGroupIds(uid, jsGids)) {
            // Not cached: a passing failure of the platform must not stick.
            jsGid = jsGids;
            return TRUE;
        }
        jsUser["gids"] = jsGids;
    }
    jsGid = jsUser["gids"];
    return TRUE;
}

bool TesselCheckUID(unsigned int uid) {
    Json::Value jsInfo;
    return TesselGetUserInfo(uid, jsInfo, false) && jsInfo["exist"].asBool();
}
