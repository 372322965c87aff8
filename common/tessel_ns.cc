// Where each namespace's data lives, and the scratch space beside it.
//
// Two placement schemes, chosen once per process: a fixed one (everything on
// the volume of the homes share) for platforms that cannot move a namespace,
// and a linked one in which a root-only directory holds one symbolic link per
// namespace pointing at its directory on whichever volume it was placed.
#include <errno.h>
#include <stdlib.h>
#include <sys/stat.h>
#include <unistd.h>

#include <atomic>
#include <map>
#include <memory>
#include <mutex>
#include <string>

#include <json/value.h>
#include <quor/quor.h>

#include "common/tessel_pathname.h"
#include "common/tessel_priv.h"
#include "common/tessel_report.h"
#include "tessel_conf.h"
#include "tessel_file.h"
#include "tessel_id.h"
#include "tessel_ns.h"
#include "tesselobject.h"

static constexpr const char kTesselModule[] = "common/tessel_common";

namespace {

// The directory of namespace links (linked scheme); it is also the
// repository directory callers are given in that scheme.
constexpr char SZD_TESSEL_NS[] = "/usr/quor/etc/tessel/ns/";
// The store's folder on a volume: "<volume>/@Tessel/<ns>".
constexpr char SZD_TESSEL_FOLDER[] = "/@Tessel";
constexpr char SZF_PLATFORM_VERSION[] = "/etc.defaults/VERSION";
constexpr char SZK_BUILD_NUMBER[] = "buildnumber";
constexpr char SZK_SECTION_HOMES[] = "homes";
// "/var/packages/<package>/target" links to where the package is installed.
constexpr char SZD_PACKAGES[] = "/var/packages/";
constexpr char SZF_PACKAGE_TARGET[] = "/target";
constexpr char SZF_TMP_FILE_TEMPLATE[] = "/tmp_file.XXXXXX";
constexpr char SZD_TEXT[] = "/version/text/";
constexpr char SZD_METABINARY[] = "/metabinary/";

// Platforms up to this build cannot move a namespace between volumes.
constexpr long kLastBuildWithoutVolumeMove = 14887;
constexpr gid_t GID_USERS = 100;
constexpr gid_t GID_ROOT = 0;

// The volume-move verdict: -1 until computed, then 0 or 1.
std::mutex tChekcZEM;
int gVolumeMove = -1;

// Namespace name -> namespace path, for the life of the process.
struct NSPathCache {
    std::mutex mutex;
    std::map<std::string, std::string> paths;
};
NSPathCache tNSPath;

struct ShareDeleter {
    void operator()(QUORSHARE *pShare) const { QUORShareFree(pShare); }
};

std::string LinkPath(const std::string &strNS) { return SZD_TESSEL_NS + strNS; }

// The volume of the homes share, or "" (nothing reported: the caller reports
// the empty result).
std::string HomesVolume() {
    QUORSHARE *pRaw = NULL;
    int ret = QUORShareGet(SZK_SECTION_HOMES, &pRaw);
    std::unique_ptr<QUORSHARE, ShareDeleter> pShare(pRaw);
    char szVol[4096];
    if (0 > ret || 0 > QUORShareBinPathGet(pShare->szPath, szVol, sizeof(szVol))) {
        return std::string();
    }
    return szVol;
}

// The volume a package is installed on, from the target link of the
// package, or "".
std::string PackageVolume(const std::string &strPkg) {
    std::string strTarget = SZD_PACKAGES + strPkg + SZF_PACKAGE_TARGET;
    char szTarget[4096];
    ssize_t len = readlink(strTarget.c_str(), szTarget, sizeof(szTarget) - 1);
    if (0 > len) {
        return std::string();
    }
    szTarget[len] = '\0';
    char szVol[4096];
    if (0 > QUORShareBinPathGet(szTarget, szVol, sizeof(szVol))) {
        return std::string();
    }
    return szVol;
}

// Linked scheme: whether the namespace's link resolves to a directory, and
// its target when it does. False only when such a link cannot be read.
bool ReadNSLink(const std::string &strNS, bool &blLinked, std::string &strTarget) {
    std::string strNSPath = LinkPath(strNS);
    char szPath[4096];
    ssize_t len = -1;
    {
        TESSEL_AS_ROOT();
        blLinked = FALSE != QLIBCFileCheckDir(strNSPath.c_str());
        if (!blLinked) {
            return true;
        }
        TESSEL_CHECK_APPEND(0 > (len = readlink(strNSPath.c_str(), szPath, sizeof(szPath) - 1)),
                            "0 > (len = readlink(strNSPath.c_str(), szPath, sizeof(szPath) - 1))", false);
    }
    szPath[len] = '\0';
    strTarget = szPath;
    return true;
}

// Points the namespace's link at strNSPath, creating the link directory
// (root only, 0755) when it is missing. The new link is made beside the old
// one and renamed over it, so another process sees either the old target or
// the new one, never no link; a dangling link is replaced the same way. A
// real directory in the link's place is not replaced.
bool LinkNSPath(const std::string &strNS, const std::string &strNSPath) {
    static std::atomic<unsigned> nextTmp{0};
    std::string strLink = LinkPath(strNS);
    std::string strTmpLink = std::string(SZD_TESSEL_NS) + ".link." + std::to_string(getpid()) + "." +
                             std::to_string(nextTmp++);
    TESSEL_AS_ROOT();
    TESSEL_CHECK(0 > QUORFSMkdirP(SZD_TESSEL_NS, NULL, TRUE, UID_ROOT, GID_ROOT, 0755), TESSEL_ERR_MKDIR,
                 "0 > QUORFSMkdirP(SZD_TESSEL_NS, NULL, TRUE, UID_ROOT, GID_ROOT, 0755)", false);
    TESSEL_CHECK(0 != symlink(strNSPath.c_str(), strTmpLink.c_str()), TESSEL_ERR_OPERATION_FAILED,
                 "0 != symlink(strNSPath.c_str(), strTmpLink.c_str())", false);
    if (0 != rename(strTmpLink.c_str(), strLink.c_str())) {
        int err = errno;
        unlink(strTmpLink.c_str());
        errno = err;
        TESSEL_RAISE(TESSEL_ERR_OPERATION_FAILED, "0 != rename(strTmpLink.c_str(), strLink.c_str())");
        return false;
    }
    return true;
}

// Text and meta-binary files share one layout: "<ns path>/<id><kind><encoded name>".
BOOL GetObjectFilePath(const std::string &strNs, const std::string &strId, const std::string &strName,
                       const char *szKind, std::string &strPath) {
    std::string strNSPath;
    std::string strEncodedFilename;
    TESSEL_CHECK_APPEND(!TesselGetNSPath(strNs, strNSPath), "!TesselGetNSPath(strNs, strNSPath)", FALSE);
    TESSEL_CHECK_APPEND(!TesselEncode((const unsigned char *)strName.c_str(), (size_t)strName.length(),
                                      strEncodedFilename),
                        "!TesselEncode((const unsigned char *)strName.c_str(), (size_t)strName.length(), "
                        "strEncodedFilename)",
                        FALSE);
    TESSEL_CHECK(!tessel::TesselIsPathComponent(strId), TESSEL_ERR_USER_INPUT, "!TesselIsPathComponent(strId)",
                 FALSE);
    strPath = strNSPath + "/" + strId + szKind + strEncodedFilename;
    return QLIBCFileExist(strPath.c_str());
}

}  // namespace

BOOL TesselSupportVolumeMove(void) {
    std::lock_guard<std::mutex> lock(tChekcZEM);
    if (-1 == gVolumeMove) {
        gVolumeMove = 0;
        if (!QUORIsRemovableModel()) {
            char szBuild[64];
            if (0 > QLIBCFileGetKeyValue(SZF_PLATFORM_VERSION, SZK_BUILD_NUMBER, szBuild, sizeof(szBuild))) {
                // Not fatal: without a build number the platform counts as
                // one that cannot move namespaces.
                TESSEL_LOG_FAILED("0 > QLIBCFileGetKeyValue(SZF_PLATFORM_VERSION, SZK_BUILD_NUMBER, szBuild, "
                                  "sizeof(szBuild))");
            } else if (kLastBuildWithoutVolumeMove < strtol(szBuild, NULL, 10)) {
                gVolumeMove = 1;
            }
        }
    }
    return gVolumeMove;
}

BOOL TesselGetRepoDir(std::string &strRepo) {
    if (TesselSupportVolumeMove()) {
        strRepo = SZD_TESSEL_NS;
        return TRUE;
    }
    QUORSHARE *pRaw = NULL;
    int ret = QUORShareGet(SZK_SECTION_HOMES, &pRaw);
    std::unique_ptr<QUORSHARE, ShareDeleter> pShare(pRaw);
    TESSEL_CHECK(0 > ret, TESSEL_ERR_OPERATION_FAILED, "0 > QUORShareGet(SZK_SECTION_HOMES, &pShare)", FALSE);
    char szVol[256];
    TESSEL_CHECK(0 > QUORShareBinPathGet(pShare->szPath, szVol, sizeof(szVol)), TESSEL_ERR_OPERATION_FAILED,
                 "0 > QUORShareBinPathGet(pShare->szPath, szVol, sizeof(szVol))", FALSE);
    strRepo = std::string(szVol) + SZD_TESSEL_FOLDER;
    return TRUE;
}

BOOL TesselGetNSPath(const std::string &strNS, std::string &strNSPath) {
    // Held across the look-up and the computation, so that concurrent first
    // calls resolve a namespace once.
    std::lock_guard<std::mutex> lock(tNSPath.mutex);
    auto it = tNSPath.paths.find(strNS);
    if (tNSPath.paths.end() != it) {
        strNSPath = it->second;
        return TRUE;
    }
    TESSEL_CHECK_APPEND(strNS.empty(), "strNS.empty()", FALSE);
    TESSEL_CHECK(!tessel::TesselIsPathComponent(strNS), TESSEL_ERR_USER_INPUT, "!TesselIsPathComponent(strNS)",
                 FALSE);
    if (!TesselSupportVolumeMove()) {
        std::string strRepo;
        TESSEL_CHECK(!TesselGetRepoDir(strRepo), TESSEL_ERR_OPERATION_FAILED, "!TesselGetRepoDir(strRepo)", FALSE);
        strNSPath = strRepo + "/" + strNS;
        tNSPath.paths[strNS] = strNSPath;
        return TRUE;
    }
    std::string strLink = LinkPath(strNS);
    char szPath[4096];
    ssize_t len = -1;
    {
        TESSEL_AS_ROOT();
        TESSEL_CHECK_APPEND(FALSE == QLIBCFileCheckDir(strLink.c_str()),
                            "FALSE == QLIBCFileCheckDir(strNSPath.c_str())", FALSE);
        TESSEL_CHECK_APPEND(-1 == (len = readlink(strLink.c_str(), szPath, sizeof(szPath) - 1)),
                            "-1 == (len = readlink(strNSPath.c_str(), szPath, sizeof(szPath) - 1))", FALSE);
    }
    szPath[len] = '\0';
    strNSPath = szPath;
    tNSPath.paths[strNS] = strNSPath;
    return TRUE;
}

BOOL TesselFindNSPath(const std::string &strNS, const std::string &strPkgId, std::string &strNSPath) {
    TESSEL_CHECK_APPEND(strNS.empty(), "strNS.empty()", FALSE);
    TESSEL_CHECK(!tessel::TesselIsPathComponent(strNS), TESSEL_ERR_USER_INPUT, "!TesselIsPathComponent(strNS)",
                 FALSE);
    if (!TesselSupportVolumeMove()) {
        return TesselGetNSPath(strNS, strNSPath);
    }
    bool blLinked = false;
    if (!ReadNSLink(strNS, blLinked, strNSPath)) {
        return FALSE;
    }
    if (blLinked) {
        return TRUE;
    }
    std::string strVol;
    Json::Value jConf;
    if (TesselSettingsGet(strNS.c_str(), jConf)) {
        std::string strPkg = strPkgId;
        const Json::Value &jPkgIds = jConf["pkg_id"];
        if (strPkg.empty() && jPkgIds.isObject() && jPkgIds.isMember(strNS) && jPkgIds[strNS].isString()) {
            strPkg = jPkgIds[strNS].asString();
        }
        if (!strPkg.empty()) {
            // The package id is joined into a path under /var/packages too.
            TESSEL_CHECK(!tessel::TesselIsPathComponent(strPkg), TESSEL_ERR_USER_INPUT,
                         "!TesselIsPathComponent(strPkg)", FALSE);
            strVol = PackageVolume(strPkg);
        }
    } else {
        strVol = HomesVolume();
    }
    strNSPath = strVol.empty() ? std::string() : strVol + SZD_TESSEL_FOLDER + "/" + strNS;
    TESSEL_CHECK_APPEND(strNSPath.empty(), "strNSPath.empty()", FALSE);
    return TRUE;
}

BOOL TesselSetNSPath(const std::string &strNS, const std::string &strPkgId, std::string &strNSPath) {
    TESSEL_CHECK_APPEND(strNS.empty(), "strNS.empty()", FALSE);
    TESSEL_CHECK(!tessel::TesselIsPathComponent(strNS), TESSEL_ERR_USER_INPUT, "!TesselIsPathComponent(strNS)",
                 FALSE);
    if (TesselSupportVolumeMove()) {
        bool blLinked = false;
        if (!ReadNSLink(strNS, blLinked, strNSPath)) {
            return FALSE;
        }
        if (blLinked) {
            return TRUE;
        }
    }
    std::string strTmpDir;
    TESSEL_CHECK_APPEND(!TesselFindNSPath(strNS, strPkgId, strNSPath), "!TesselFindNSPath(strNS, strPkgId, strNSPath)",
                        FALSE);
    TESSEL_CHECK_APPEND(!LinkNSPath(strNS, strNSPath), "!LinkNSPath(strNS, strNSPath)", FALSE);
    TESSEL_CHECK(!TesselRootFSMkdirP(strNSPath.c_str(), UID_ERR), TESSEL_ERR_MKDIR,
                 "!TesselRootFSMkdirP(strNSPath.c_str(), UID_ERR)", FALSE);
    TESSEL_CHECK_APPEND(!TesselGetNSTmpDir(strNS, strTmpDir), "!TesselGetNSTmpDir(strNS, strTmpDir)", FALSE);
    return TRUE;
}

BOOL TesselResetNSPath(const std::string &strNS, const std::string &strNSPath) {
    TESSEL_CHECK_APPEND(strNS.empty(), "strNS.empty()", FALSE);
    TESSEL_CHECK(!tessel::TesselIsPathComponent(strNS), TESSEL_ERR_USER_INPUT, "!TesselIsPathComponent(strNS)",
                 FALSE);
    // The namespace was moved: this process must not go on using the old
    // place, so its cached path goes too (other processes keep theirs).
    // Holding the cache meanwhile keeps a concurrent look-up from caching
    // the old link.
    std::lock_guard<std::mutex> lock(tNSPath.mutex);
    tNSPath.paths.erase(strNS);
    {
        TESSEL_AS_ROOT();
        unlink(LinkPath(strNS).c_str());
    }
    TESSEL_CHECK_APPEND(!LinkNSPath(strNS, strNSPath), "!LinkNSPath(strNS, strNSPath)", FALSE);
    return TRUE;
}

BOOL TesselGetNSStatus(const std::string &strNS) {
    Json::Value jConf;
    std::string strNSPath;
    TESSEL_CHECK_APPEND(strNS.empty(), "strNS.empty()", FALSE);
    TESSEL_CHECK_APPEND(FALSE == TesselSettingsGet(strNS.c_str(), jConf),
                        "FALSE == TesselSettingsGet(strNS.c_str(), jConf)", FALSE);
    TESSEL_CHECK_APPEND(!TesselGetNSPath(strNS, strNSPath), "!TesselGetNSPath(strNS, strNSPath)", FALSE);
    return TRUE;
}

BOOL TesselGetNSVolumePath(const std::string &strNS, std::string &strVolPath) {
    std::string strNSPath;
    QUORVOLINFO volInfo;
    TESSEL_CHECK_APPEND(!TesselGetNSPath(strNS, strNSPath), "!TesselGetNSPath(strNS, strNSPath)", FALSE);
    TESSEL_CHECK(0 > VolumePathParseEx(strNSPath.c_str(), &volInfo), TESSEL_ERR_OPERATION_FAILED,
                 "0 > VolumePathParseEx(strNSPath.c_str(), &volInfo)", FALSE);
    strVolPath = volInfo.szVolPath;
    return TRUE;
}

// The namespace name is joined into the scratch paths below only after
// TesselGetNSPath accepted it as a path component.
BOOL TesselGetNSTmpDir(const std::string &strNS, std::string &strTmpDir) {
    std::string strPath;
    char szShareTmpPath[4096];
    TESSEL_CHECK_APPEND(!TesselGetNSPath(strNS, strPath), "!TesselGetNSPath(strNS, strPath)", FALSE);
    TESSEL_CHECK_APPEND(0 > QUORShareTmpPathGet(strPath.c_str(), szShareTmpPath, sizeof(szShareTmpPath)),
                        "0 > QUORShareTmpPathGet(strPath.c_str(), szShareTmpPath, sizeof(szShareTmpPath))", FALSE);
    strTmpDir = std::string(szShareTmpPath) + SZD_TESSEL_FOLDER + "/" + strNS;
    if (!QLIBCFileCheckDir(strTmpDir.c_str())) {
        TESSEL_CHECK_APPEND(!TesselRootFSMkdirP(strTmpDir.c_str(), 0, 0755),
                            "!TesselRootFSMkdirP(strPath.c_str(), 0, 0755)", FALSE);
    }
    return TRUE;
}

BOOL TesselGetNSTmpFile(const std::string &strNS, std::string &strTmpFile) {
    std::string strPath;
    TESSEL_CHECK_APPEND(!TesselGetNSTmpDir(strNS, strPath), "!TesselGetNSTmpDir(strNS, strPath)", FALSE);
    std::string strTemplate = strPath + SZF_TMP_FILE_TEMPLATE;
    int fd = mkstemp(&strTemplate[0]);
    TESSEL_CHECK_APPEND(0 > fd, "0 > fd", FALSE);
    close(fd);
    strTmpFile = strTemplate;
    return TRUE;
}

BOOL TesselGetTextPath(const std::string &strNs, const std::string &strId, const std::string &strName,
                       std::string &strPath) {
    return GetObjectFilePath(strNs, strId, strName, SZD_TEXT, strPath);
}

BOOL TesselGetMetaBinaryPath(const std::string &strNs, const std::string &strId, const std::string &strName,
                             std::string &strPath) {
    return GetObjectFilePath(strNs, strId, strName, SZD_METABINARY, strPath);
}

BOOL TesselRootFSMkdirP(const char *szPath, unsigned int uid, mode_t mode) {
    TESSEL_AS_ROOT();
    TESSEL_CHECK(0 > QUORFSMkdirP(szPath, NULL, TRUE, uid, GID_USERS, mode), TESSEL_ERR_MKDIR,
                 "0 > QUORFSMkdirP(szPath, NULL, TRUE, uid, GID_USERS, mode)", FALSE);
    return TRUE;
}

// The objects lose their parent (it is gone): each returns to its owner's top
// level through the list set, as root, keeping its acl. A single id is taken
// as a list of one.
BOOL TesselResetParentID(const std::string &strNs, const Json::Value &jIds) {
    Json::Value jSetParm(Json::objectValue);
    jSetParm["ns"] = strNs;
    if (jIds.isArray()) {
        jSetParm["id"] = jIds;
    } else {
        jSetParm["id"].append(jIds);
    }
    jSetParm["reset_parent_id"] = true;
    jSetParm["requester"] = 0;
    TESSEL_OBJECT_LIST list;
    Json::Value jsResult(Json::objectValue);
    TESSEL_CHECK_APPEND(!list.Set(jSetParm, jsResult), "!list.Set(jSetParm, jsResult)", FALSE);
    // A record that could not be reset fails the call; the others stay reset.
    for (const std::string &strId : jsResult.getMemberNames()) {
        TESSEL_CHECK(!jsResult[strId].asBool(), TESSEL_ERR_OPERATION_FAILED, "!jsResult[strId].asBool()", FALSE);
    }
    return TRUE;
}
