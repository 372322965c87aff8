// User and group records of the name service, and account expiry from the
// shadow database.
#include <stdlib.h>
#include <string.h>
#include <time.h>

#include <string>

#include "nss_entry.h"
#include "quor/quor.h"

using quor_nss::Lookup;

namespace {

void RecordLookupFailure(Lookup result, const char *szFile, int line) {
    QLIBCErrSetEx((Lookup::kNotFound == result) ? QLIBC_ERR_NOT_FOUND : QLIBC_ERR_UNKNOWN, szFile, line);
}

// The record and its strings are separate allocations so that QUORUserFree
// stays the plain free() sequence a C caller would expect.
QUORUSER *NewUser(const quor_nss::PasswdEntry &entry) {
    QUORUSER *pUser = static_cast<QUORUSER *>(calloc(1, sizeof(QUORUSER)));
    if (NULL == pUser) {
        return NULL;
    }
    pUser->uid = entry.uid;
    pUser->gid = entry.gid;
    pUser->szName = strdup(entry.name.c_str());
    pUser->szRealName = strdup(quor_nss::GecosRealName(entry.gecos).c_str());
    pUser->szMail = strdup(quor_nss::GecosMail(entry.gecos).c_str());
    pUser->szHomeDir = strdup(entry.dir.c_str());
    pUser->szShell = strdup(entry.shell.c_str());
    if (NULL == pUser->szName || NULL == pUser->szRealName || NULL == pUser->szMail || NULL == pUser->szHomeDir ||
        NULL == pUser->szShell) {
        QUORUserFree(pUser);
        return NULL;
    }
    return pUser;
}

int HandOutUser(Lookup result, const quor_nss::PasswdEntry &entry, QUORUSER **ppUser) {
    if (Lookup::kFound != result) {
        RecordLookupFailure(result, __FILE__, __LINE__);
        return -1;
    }
    *ppUser = NewUser(entry);
    if (NULL == *ppUser) {
        QLIBCErrSetEx(QLIBC_ERR_OUT_OF_MEMORY, __FILE__, __LINE__);
        return -1;
    }
    return 0;
}

long TodayInEpochDays() { return static_cast<long>(time(NULL) / 86400); }

}  // namespace

extern "C" {

int QUORUserGetByUID(uid_t uid, QUORUSER **ppUser) {
    if (NULL == ppUser) {
        QLIBCErrSetEx(QLIBC_ERR_BAD_PARAMETERS, __FILE__, __LINE__);
        return -1;
    }
    *ppUser = NULL;
    quor_nss::PasswdEntry entry;
    return HandOutUser(quor_nss::PasswdByUid(uid, &entry), entry, ppUser);
}

int QUORUserGet(const char *szName, QUORUSER **ppUser) {
    if (NULL != ppUser) {
        *ppUser = NULL;
    }
    if (NULL == szName || '\0' == szName[0] || NULL == ppUser) {
        QLIBCErrSetEx(QLIBC_ERR_BAD_PARAMETERS, __FILE__, __LINE__);
        return -1;
    }
    quor_nss::PasswdEntry entry;
    return HandOutUser(quor_nss::PasswdByName(szName, &entry), entry, ppUser);
}

void QUORUserFree(QUORUSER *pUser) {
    if (NULL == pUser) {
        return;
    }
    free(pUser->szName);
    free(pUser->szRealName);
    free(pUser->szMail);
    free(pUser->szHomeDir);
    free(pUser->szShell);
    free(pUser);
}

int QUORUserCheckExpired(const char *szName) {
    if (NULL == szName || '\0' == szName[0]) {
        QLIBCErrSetEx(QLIBC_ERR_BAD_PARAMETERS, __FILE__, __LINE__);
        return -1;
    }
    long expireDay = -1;
    Lookup result = quor_nss::ShadowExpireByName(szName, &expireDay);
    if (Lookup::kFound != result) {
        RecordLookupFailure(result, __FILE__, __LINE__);
        return -1;
    }
    // As login and PAM read it: the account is closed from its expiry day on.
    // An empty field reads as -1; 0 is not a date account tools write.
    return (expireDay > 0 && TodayInEpochDays() >= expireDay) ? 1 : 0;
}

int QUORGroupGetByGID(gid_t gid, QUORGROUP **ppGroup) {
    if (NULL == ppGroup) {
        QLIBCErrSetEx(QLIBC_ERR_BAD_PARAMETERS, __FILE__, __LINE__);
        return -1;
    }
    *ppGroup = NULL;
    quor_nss::GroupEntry entry;
    Lookup result = quor_nss::GroupByGid(gid, &entry);
    if (Lookup::kFound != result) {
        RecordLookupFailure(result, __FILE__, __LINE__);
        return -1;
    }
    QUORGROUP *pGroup = static_cast<QUORGROUP *>(calloc(1, sizeof(QUORGROUP)));
    if (NULL == pGroup || NULL == (pGroup->szName = strdup(entry.name.c_str()))) {
        free(pGroup);
        QLIBCErrSetEx(QLIBC_ERR_OUT_OF_MEMORY, __FILE__, __LINE__);
        return -1;
    }
    pGroup->gid = entry.gid;
    *ppGroup = pGroup;
    return 0;
}

void QUORGroupFree(QUORGROUP *pGroup) {
    if (NULL == pGroup) {
        return;
    }
    free(pGroup->szName);
    free(pGroup);
}

}  // extern "C"
