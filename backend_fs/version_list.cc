// Version records of the file-system store: one commit described, or the
// history of an object's repository as a chain of records.
#include <string.h>

#include <string>

#include <quor/qlib.h>

#include "backend_fs/tesselBackend_fs.h"
#include "backend_fs/utils.h"
#include "backend_fs/version.h"
#include "common/tessel_priv.h"
#include "common/tessel_report.h"
#include "tessel_git.h"
#include "tesselobjectversion.h"

static constexpr const char kTesselModule[] = "backend_fs/git";

namespace {

constexpr int GIT_OK = 0;

void FillVersion(const Json::Value &jParm, const Json::Value &jCommitInfo, TESSEL_OBJECT_VERSION *pVersion) {
    pVersion->set_ns(jParm["ns"].asString());
    pVersion->set_id(jParm["id"].asString());
    pVersion->set_version(jCommitInfo["version"].asString());
    const Json::Value &jMsg = jCommitInfo["msg"];
    if (jMsg.isObject() && jMsg.isMember("commit_msg")) {
        pVersion->set_commit_msg(jMsg["commit_msg"]);
    }
    pVersion->set_last_version(jCommitInfo["parent"]);
    if (jMsg.isObject() && jMsg["author_uid"].isIntegral()) {
        pVersion->set_author(tessel::FsRequestUid(jMsg["author_uid"]));
    }
    pVersion->set_mtime(jCommitInfo["mtime"].isIntegral() ? (long)jCommitInfo["mtime"].asInt64() : 0);
}

}  // namespace

bool TESSEL_BACKEND_FS::mf_GetVersionGit(TESSEL_OBJECT_VERSION *pVersion) {
    const Json::Value &jParm = m_jParm;
    const char *szVersion = NULL;
    if (jParm.isMember("ver")) {
        TESSEL_CHECK(!jParm["ver"].isString(), TESSEL_ERR_BAD_PARAMETERS, "!m_jParm[\"ver\"].isString()", false);
        szVersion = jParm["ver"].asCString();
    } else if (jParm.isMember("version")) {
        TESSEL_CHECK(!jParm["version"].isString(), TESSEL_ERR_BAD_PARAMETERS, "!m_jParm[\"version\"].isString()",
                     false);
        szVersion = jParm["version"].asCString();
    }
    Json::Value jCommitInfo;
    {
        TESSEL_AS_ROOT();
        TESSEL_CHECK_APPEND(
            GIT_OK != GitGetCommitInfo(m_jPathInfo[TESSEL_VERSION].asCString(), szVersion, jCommitInfo),
            "GIT_OK != GitGetCommitInfo(m_jPathInfo[TESSEL_VERSION].asCString(), szVersion, jCommitInfo)", false);
    }
    FillVersion(jParm, jCommitInfo, pVersion);
    return true;
}

int TESSEL_BACKEND_FS::mf_ListVersionGit(TESSEL_OBJECT_VERSION **addrPHead) {
    const Json::Value &jParm = m_jParm;
    TESSEL_CHECK(NULL == addrPHead, TESSEL_ERR_BAD_PARAMETERS, "NULL == addrPHead", -1);
    TESSEL_CHECK(jParm.isMember("limit") && !jParm["limit"].isIntegral(), TESSEL_ERR_BAD_PARAMETERS,
                 "m_jParm.isMember(\"limit\") && !m_jParm[\"limit\"].isIntegral()", -1);
    TESSEL_CHECK(jParm.isMember("offset") && !jParm["offset"].isIntegral(), TESSEL_ERR_BAD_PARAMETERS,
                 "m_jParm.isMember(\"offset\") && !m_jParm[\"offset\"].isIntegral()", -1);
    bool reverse = false;
    if (jParm["sort_direction"].isString()) {
        const std::string strDirection = jParm["sort_direction"].asString();
        // Upper-casing may lengthen UTF-8 text; anything that long is not "ASC" anyway.
        char szUpper[16] = {0};
        reverse = strDirection.size() < 4 && 0 == QLIBCUTF8StrToUpper(strDirection.c_str(), szUpper, sizeof(szUpper)) &&
                  0 == strcmp(szUpper, "ASC");
    }
    Json::Value jList;
    int count = -1;
    {
        TESSEL_AS_ROOT();
        TESSEL_CHECK_APPEND(
            -1 == (count = GitListCommitHistory(m_jPathInfo[TESSEL_VERSION].asCString(), jParm["limit"].asInt(),
                                                jParm["offset"].asUInt(), reverse, jParm["filter"], jList)),
            "-1 == (count = GitListCommitHistory(m_jPathInfo[TESSEL_VERSION].asCString(), "
            "m_jParm[\"limit\"].asInt(), m_jParm[\"offset\"].asUInt(), reverse, m_jParm[\"filter\"], "
            "jList))",
            -1);
    }
    TESSEL_OBJECT_VERSION *pHead = NULL;
    TESSEL_OBJECT_VERSION **ppTail = &pHead;
    for (const Json::Value &jCommitInfo : jList) {
        TESSEL_OBJECT_VERSION *pVersion = TesselObjectVersionAlloc();
        if (NULL == pVersion) {
            TesselObjectVersionFreeList(pHead);
            TESSEL_RAISE(TESSEL_ERR_OUT_OF_MEMORY, "NULL == pVersion");
            return -1;
        }
        FillVersion(jParm, jCommitInfo, pVersion);
        *ppTail = pVersion;
        ppTail = &pVersion->next;
    }
    *addrPHead = pHead;
    return count;
}

bool TESSEL_BACKEND_FS::VersionGet(const Json::Value &jParm, TESSEL_OBJECT_VERSION *pVersion) {
    TESSEL_CHECK(NULL == pVersion, TESSEL_ERR_BAD_PARAMETERS, "NULL == pVersion", false);
    TESSEL_CHECK_APPEND(!mf_init(jParm), "!mf_init(jParm)", false);
    TESSEL_CHECK_APPEND(!mf_GetVersionGit(pVersion), "!mf_GetVersionGit(pVersion)", false);
    return true;
}

int TESSEL_BACKEND_FS::VersionList(const Json::Value &jParm, TESSEL_OBJECT_VERSION **addrPHead, unsigned int &total,
                                   unsigned int &listable_total) {
    TESSEL_CHECK_APPEND(!mf_init(jParm), "!mf_init(jParm)", -1);
    int count = -1;
    TESSEL_CHECK_APPEND(0 > (count = mf_ListVersionGit(addrPHead)), "0 > (count = mf_ListVersionGit(addrPHead))", -1);
    Json::Value jGitInfo;
    if (!mf_GetJsonFile(TESSEL_GIT_INFO, jGitInfo)) {
        TesselObjectVersionFreeList(*addrPHead);
        *addrPHead = NULL;
        TESSEL_APPEND("!mf_GetJsonFile(TESSEL_GIT_INFO, jGitInfo)");
        return -1;
    }
    total = jGitInfo[TESSEL_GIT_INFO_COMMIT_CNT].isIntegral()
                ? (unsigned int)jGitInfo[TESSEL_GIT_INFO_COMMIT_CNT].asInt()
                : 0;
    listable_total = jGitInfo[TESSEL_GIT_INFO_LISTABLE_CNT].isIntegral()
                         ? (unsigned int)jGitInfo[TESSEL_GIT_INFO_LISTABLE_CNT].asInt()
                         : 0;
    return count;
}
