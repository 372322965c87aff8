// Shares, volumes and the switches of the platform configuration file.
//
// Only a missing file or key means "use the default of a fresh machine". A
// configuration that exists but cannot be read, or names a share with a
// relative path, is an error: silently falling back to /volume1 would put data
// on a volume the administrator did not choose.
#include <errno.h>
#include <limits.h>
#include <stdlib.h>
#include <string.h>
#include <strings.h>

#include <new>
#include <string>

#include "keyvalue_file.h"
#include "quor/quor.h"

namespace {

using quor_internal::KeyValueLookup;

constexpr char kVolumePrefix[] = "/volume";
constexpr char kVolumeTmpDir[] = "/@tmp";
constexpr char kHomesShare[] = "homes";
constexpr char kHomesDefaultPath[] = "/volume1/homes";

KeyValueLookup ConfGet(const std::string &key, std::string *pValue) {
    return quor_internal::KeyValueRead(QUOR_PLATFORM_CONF, key, pValue);
}

// A "yes"/"no" switch; anything else leaves the default in force.
BOOL ConfSwitch(const char *szKey, BOOL blDefault) {
    std::string value;
    switch (ConfGet(szKey, &value)) {
    case KeyValueLookup::kMissing:
        return blDefault;
    case KeyValueLookup::kError:
        QLIBCErrSetEx(QLIBC_ERR_FILE_READ, __FILE__, __LINE__);
        return FALSE;
    case KeyValueLookup::kFound:
        break;
    }
    if (0 == strcasecmp(value.c_str(), "yes")) {
        return TRUE;
    }
    if (0 == strcasecmp(value.c_str(), "no")) {
        return FALSE;
    }
    return blDefault;
}

bool HasDotDotComponent(const char *szPath) {
    for (const char *p = szPath; NULL != (p = strstr(p, "..")); p += 2) {
        bool startsComponent = (p == szPath) || ('/' == p[-1]);
        bool endsComponent = ('\0' == p[2]) || ('/' == p[2]);
        if (startsComponent && endsComponent) {
            return true;
        }
    }
    return false;
}

// Splits "/volumeN[/rest]"; -1 (error state set) when the path is on no volume.
// N is a positive decimal number written without leading zeros, so that every
// volume has exactly one name.
int ParseVolume(const char *szPath, QUORVOLINFO *pInfo) {
    if (NULL == szPath || HasDotDotComponent(szPath)) {
        // A ".." could lead anywhere: "/volume1/../etc" is not on volume 1.
        QLIBCErrSetEx(QLIBC_ERR_BAD_PARAMETERS, __FILE__, __LINE__);
        return -1;
    }
    const size_t cchPrefix = sizeof(kVolumePrefix) - 1;
    if (0 != strncmp(szPath, kVolumePrefix, cchPrefix)) {
        QLIBCErrSetEx(QLIBC_ERR_NOT_FOUND, __FILE__, __LINE__);
        return -1;
    }
    const char *p = szPath + cchPrefix;
    long long number = 0;
    size_t digits = 0;
    for (; *p >= '0' && *p <= '9'; ++p, ++digits) {
        number = number * 10 + (*p - '0');
        if (number > INT_MAX) {
            QLIBCErrSetEx(QLIBC_ERR_NOT_FOUND, __FILE__, __LINE__);
            return -1;
        }
    }
    if (0 == digits || '0' == szPath[cchPrefix] || ('\0' != *p && '/' != *p)) {
        QLIBCErrSetEx(QLIBC_ERR_NOT_FOUND, __FILE__, __LINE__);
        return -1;
    }
    size_t cchVol = static_cast<size_t>(p - szPath);
    size_t cchRel = strlen(p);
    if (cchVol >= sizeof(pInfo->szVolPath) || cchRel >= sizeof(pInfo->szRelPath)) {
        QLIBCErrSetEx(QLIBC_ERR_BAD_PARAMETERS, __FILE__, __LINE__);
        return -1;
    }
    memcpy(pInfo->szVolPath, szPath, cchVol);
    pInfo->szVolPath[cchVol] = '\0';
    memcpy(pInfo->szRelPath, p, cchRel + 1);
    pInfo->volNumber = static_cast<int>(number);
    return 0;
}

int CopyOut(const std::string &text, char *szBuf, size_t cbBuf) {
    if (text.size() >= cbBuf) {
        szBuf[0] = '\0';
        QLIBCErrSetEx(QLIBC_ERR_BAD_PARAMETERS, __FILE__, __LINE__);
        return -1;
    }
    memcpy(szBuf, text.c_str(), text.size() + 1);
    return 0;
}

char *DupOrNull(const std::string &text) { return strdup(text.c_str()); }

}  // namespace

extern "C" {

int VolumePathParseEx(const char *szPath, QUORVOLINFO *pVolInfo) {
    if (NULL == szPath || NULL == pVolInfo) {
        QLIBCErrSetEx(QLIBC_ERR_BAD_PARAMETERS, __FILE__, __LINE__);
        return -1;
    }
    return ParseVolume(szPath, pVolInfo);
}

int QUORShareBinPathGet(const char *szPath, char *szVolume, size_t cbVolume) {
    if (NULL == szPath || NULL == szVolume || 0 == cbVolume) {
        QLIBCErrSetEx(QLIBC_ERR_BAD_PARAMETERS, __FILE__, __LINE__);
        return -1;
    }
    szVolume[0] = '\0';
    QUORVOLINFO info;
    if (0 != ParseVolume(szPath, &info)) {
        return -1;
    }
    try {
        return CopyOut(info.szVolPath, szVolume, cbVolume);
    } catch (const std::bad_alloc &) {
        QLIBCErrSetEx(QLIBC_ERR_OUT_OF_MEMORY, __FILE__, __LINE__);
        return -1;
    }
}

int QUORShareTmpPathGet(const char *szPath, char *szTmpPath, size_t cbTmpPath) {
    if (NULL == szPath || NULL == szTmpPath || 0 == cbTmpPath) {
        QLIBCErrSetEx(QLIBC_ERR_BAD_PARAMETERS, __FILE__, __LINE__);
        return -1;
    }
    szTmpPath[0] = '\0';
    QUORVOLINFO info;
    if (0 != ParseVolume(szPath, &info)) {
        return -1;
    }
    try {
        return CopyOut(std::string(info.szVolPath) + kVolumeTmpDir, szTmpPath, cbTmpPath);
    } catch (const std::bad_alloc &) {
        QLIBCErrSetEx(QLIBC_ERR_OUT_OF_MEMORY, __FILE__, __LINE__);
        return -1;
    }
}

int QUORShareGet(const char *szName, QUORSHARE **ppShare) {
    if (NULL != ppShare) {
        *ppShare = NULL;
    }
    if (NULL == szName || NULL == ppShare) {
        QLIBCErrSetEx(QLIBC_ERR_BAD_PARAMETERS, __FILE__, __LINE__);
        return -1;
    }
    try {
        std::string key = std::string("share_") + szName + "_path";
        if ('\0' == szName[0] || !quor_internal::KeyValueKeyIsValid(key)) {
            QLIBCErrSetEx(QLIBC_ERR_BAD_PARAMETERS, __FILE__, __LINE__);
            return -1;
        }
        std::string path;
        switch (ConfGet(key, &path)) {
        case KeyValueLookup::kFound:
            if ('/' != path[0]) {  // also catches an empty value
                QLIBCErrSetEx(QLIBC_ERR_NOT_FOUND, __FILE__, __LINE__);
                return -1;
            }
            break;
        case KeyValueLookup::kMissing:
            if (0 != strcmp(szName, kHomesShare)) {
                QLIBCErrSetEx(QLIBC_ERR_NOT_FOUND, __FILE__, __LINE__);
                return -1;
            }
            path = kHomesDefaultPath;
            break;
        case KeyValueLookup::kError:
            QLIBCErrSetEx(QLIBC_ERR_FILE_READ, __FILE__, __LINE__);
            return -1;
        }
        QUORSHARE *pShare = static_cast<QUORSHARE *>(calloc(1, sizeof(QUORSHARE)));
        if (NULL != pShare) {
            pShare->szName = DupOrNull(szName);
            pShare->szPath = DupOrNull(path);
        }
        if (NULL == pShare || NULL == pShare->szName || NULL == pShare->szPath) {
            QUORShareFree(pShare);
            QLIBCErrSetEx(QLIBC_ERR_OUT_OF_MEMORY, __FILE__, __LINE__);
            return -1;
        }
        *ppShare = pShare;
        return 0;
    } catch (const std::bad_alloc &) {
        QLIBCErrSetEx(QLIBC_ERR_OUT_OF_MEMORY, __FILE__, __LINE__);
        return -1;
    }
}

void QUORShareFree(QUORSHARE *pShare) {
    if (NULL == pShare) {
        return;
    }
    free(pShare->szName);
    free(pShare->szPath);
    free(pShare);
}

BOOL QUORIsRemovableModel(void) {
    try {
        return ConfSwitch("removable_model", FALSE);
    } catch (const std::bad_alloc &) {
        QLIBCErrSetEx(QLIBC_ERR_OUT_OF_MEMORY, __FILE__, __LINE__);
        return FALSE;
    }
}

BOOL QUORServiceUserHomeIsEnabled(int authType, void *pReserved) {
    (void)pReserved;
    const char *szKey = NULL;
    switch (authType) {
    case AUTH_LOCAL:
        szKey = "userhome_local";
        break;
    case AUTH_DOMAIN:
        szKey = "userhome_domain";
        break;
    case AUTH_LDAP:
        szKey = "userhome_ldap";
        break;
    default:
        QLIBCErrSetEx(QLIBC_ERR_BAD_PARAMETERS, __FILE__, __LINE__);
        return FALSE;
    }
    try {
        return ConfSwitch(szKey, TRUE);
    } catch (const std::bad_alloc &) {
        QLIBCErrSetEx(QLIBC_ERR_OUT_OF_MEMORY, __FILE__, __LINE__);
        return FALSE;
    }
}

}  // extern "C"
