// User names from the platform's user database.
//
// Every answer is looked up afresh for now: the process-wide user and group
// caches, and the rest of the user and group getters, come with the users
// module proper.
#include <stdio.h>
#include <string.h>

#include <mutex>
#include <string>

#include <quor/quor.h>

#include "tessel_id.h"
#include "tessel_user.h"

namespace {

// The platform's user look-ups are not known to be safe to run in parallel.
std::mutex tUser;

constexpr size_t kRealNameSize = 8192;

struct UserName {
    std::string name;
    bool exist = false;
};

// The login name, or for a domain user ("DOMAIN\name") the display name,
// which is what people recognise; "Deleted user #<uid>" for an unknown uid.
UserName LookUpUserName(unsigned int uid) {
    UserName user;
    std::lock_guard<std::mutex> lock(tUser);
    QUORUSER *pUser = NULL;
    if (0 != QUORUserGetByUID(static_cast<uid_t>(uid), &pUser) || NULL == pUser) {
        char szName[64];
        snprintf(szName, sizeof(szName), "Deleted user #%u", uid);
        user.name = szName;
        return user;
    }
    user.name = pUser->szName;
    user.exist = true;
    if (NULL != strchr(pUser->szName, '\\')) {
        char szReal[kRealNameSize];
        if (0 == QLIBUserRealNameGet(pUser->szName, szReal, sizeof(szReal))) {
            user.name = szReal;
        }
    }
    QUORUserFree(pUser);
    return user;
}

}  // namespace

BOOL TesselGetUserName(unsigned int uid, std::string &strName, bool blMustExist) {
    if (UID_ERR == uid) {
        if (blMustExist) {
            return FALSE;
        }
        strName = "Anonymous";
        return TRUE;
    }
    UserName user = LookUpUserName(uid);
    if (blMustExist && !user.exist) {
        return FALSE;
    }
    strName = user.name;
    return TRUE;
}
