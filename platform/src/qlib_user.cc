// Display names, group membership and enumeration of local accounts.
#include <stdio.h>
#include <string.h>

#include <string>
#include <vector>

#include "nss_entry.h"
#include "quor/quor.h"

using quor_nss::Lookup;
using quor_nss::PasswdEntry;

namespace {

// The database of local accounts, read directly: going through the name
// service would also enumerate the accounts of remote directories.
constexpr const char kLocalPasswdFile[] = "/etc/passwd";

bool LookupUser(const char *szUser, PasswdEntry *pEntry) {
    Lookup found = quor_nss::PasswdByName(szUser, pEntry);
    if (Lookup::kFound != found) {
        QLIBCErrSetEx((Lookup::kNotFound == found) ? QLIBC_ERR_NOT_FOUND : QLIBC_ERR_UNKNOWN, __FILE__, __LINE__);
        return false;
    }
    return true;
}

bool NameMatches(const std::string &name, const char *szQuery) {
    return NULL == szQuery || NULL != strcasestr(name.c_str(), szQuery);
}

}  // namespace

extern "C" {

int QLIBUserRealNameGet(const char *szUser, char *szBuf, size_t cbBuf) {
    if (NULL == szUser || '\0' == szUser[0] || NULL == szBuf || 0 == cbBuf) {
        QLIBCErrSetEx(QLIBC_ERR_BAD_PARAMETERS, __FILE__, __LINE__);
        return -1;
    }
    szBuf[0] = '\0';
    PasswdEntry entry;
    if (!LookupUser(szUser, &entry)) {
        return -1;
    }
    std::string name = quor_nss::GecosRealName(entry.gecos);
    if (name.empty()) {
        name = entry.name;
    }
    // A cut name would be a different name: refuse rather than truncate.
    if (name.size() >= cbBuf) {
        QLIBCErrSetEx(QLIBC_ERR_BAD_PARAMETERS, __FILE__, __LINE__);
        return -1;
    }
    memcpy(szBuf, name.c_str(), name.size() + 1);
    return 0;
}

int QLIBGroupInfoListGet(const char *szUser, QLIBSZLIST **ppList) {
    if (NULL == szUser || '\0' == szUser[0] || NULL == ppList || NULL == *ppList) {
        QLIBCErrSetEx(QLIBC_ERR_BAD_PARAMETERS, __FILE__, __LINE__);
        return -1;
    }
    PasswdEntry entry;
    if (!LookupUser(szUser, &entry)) {
        return -1;
    }
    std::vector<gid_t> gids;
    if (!quor_nss::GroupList(entry.name.c_str(), entry.gid, &gids)) {
        QLIBCErrSetEx(QLIBC_ERR_UNKNOWN, __FILE__, __LINE__);
        return -1;
    }
    for (gid_t gid : gids) {
        char szGid[32];
        snprintf(szGid, sizeof(szGid), "%u", static_cast<unsigned>(gid));
        if (QLIBCSzListPush(ppList, szGid) < 0) {
            return -1;
        }
    }
    return static_cast<int>(gids.size());
}

int QLIBUserInfoEnum(int authType, const char *szQuery, int offset, int limit, QLIBUSERENUMCALLBACK callback,
                     void *pData) {
    if (AUTH_LOCAL != authType || offset < 0 || limit < -1 || NULL == callback) {
        QLIBCErrSetEx(QLIBC_ERR_BAD_PARAMETERS, __FILE__, __LINE__);
        return -1;
    }
    FILE *fp = fopen(kLocalPasswdFile, "re");
    if (NULL == fp) {
        QLIBCErrSetEx(QLIBC_ERR_FILE_OPEN, __FILE__, __LINE__);
        return -1;
    }
    int skipped = 0;
    int handed = 0;
    PasswdEntry entry;
    Lookup next = Lookup::kFound;
    while (limit < 0 || handed < limit) {
        next = quor_nss::NextPasswdEntry(fp, &entry);
        if (Lookup::kFound != next) {
            break;
        }
        if (!NameMatches(entry.name, szQuery)) {
            continue;
        }
        if (skipped < offset) {
            ++skipped;
            continue;
        }
        std::string realName = quor_nss::GecosRealName(entry.gecos);
        std::string mail = quor_nss::GecosMail(entry.gecos);
        QUORUSER user;
        user.szName = &entry.name[0];
        user.uid = entry.uid;
        user.gid = entry.gid;
        user.szRealName = &realName[0];
        user.szMail = &mail[0];
        user.szHomeDir = &entry.dir[0];
        user.szShell = &entry.shell[0];
        ++handed;
        if (callback(&user, pData) < 0) {
            break;
        }
    }
    bool failed = (Lookup::kError == next);
    fclose(fp);
    if (failed) {
        QLIBCErrSetEx(QLIBC_ERR_FILE_READ, __FILE__, __LINE__);
        return -1;
    }
    return handed;
}

}  // extern "C"
