// The version side of the file-system store: an object's text fields and
// binary files live in a Git repository of its own (the "version" entry of
// its path information); every save that changes them is a commit, and older
// versions are read back by checking them out into the request's work area.
#include <ftw.h>
#include <dirent.h>
#include <string.h>
#include <sys/stat.h>
#include <time.h>
#include <unistd.h>

#include <cstdint>
#include <filesystem>
#include <memory>
#include <system_error>
#include <string>
#include <vector>

#include <json/reader.h>
#include <quor/qlib.h>

#include "backend_fs/tesselBackend_fs.h"
#include "backend_fs/utils.h"
#include "backend_fs/version.h"
#include "common/tessel_json.h"
#include "common/tessel_priv.h"
#include "common/tessel_report.h"
#include "tessel_binary.h"
#include "tessel_file.h"
#include "tessel_git.h"
#include "tessel_id.h"
#include "tessel_ns.h"
#include "tessel_user.h"
#include "tesselobject.h"
#include "tesselobjectversion.h"

static constexpr const char kTesselModule[] = "backend_fs/git";

namespace {

constexpr int GIT_OK = 0;
// Room for the paths of one change before the table grows.
constexpr int kPathTableSize = 1024;
constexpr const char SZ_DELETE[] = "delete";

// Owns a path table for the length of one save.
struct PathTable {
    QLIBSZHASH *p = NULL;
    PathTable() = default;
    PathTable(const PathTable &) = delete;
    PathTable &operator=(const PathTable &) = delete;
    ~PathTable() {
        if (NULL != p) {
            QLIBCSzHashFree(p);
        }
    }
};

// Removes a checked-out version or a save's staging files on every path out.
// Removed in this process, not by running a remover program: a save or a
// read of an older version would otherwise spend more time starting that
// program than Git spends on the commit. remove_all never follows a link
// out of the work area.
class WorkAreaRemover {
public:
    WorkAreaRemover() = default;
    WorkAreaRemover(const WorkAreaRemover &) = delete;
    WorkAreaRemover &operator=(const WorkAreaRemover &) = delete;
    void Arm(const std::string &strDir) { m_strDir = strDir; }
    ~WorkAreaRemover() {
        if (m_strDir.empty()) {
            return;
        }
        TESSEL_AS_ROOT();
        std::error_code ec;
        if (static_cast<std::uintmax_t>(-1) == std::filesystem::remove_all(m_strDir, ec) || ec) {
            TESSEL_LOG_FAILED("!remove_all(m_strDir), dir=%s (%s)", m_strDir.c_str(), ec.message().c_str());
        }
    }

private:
    std::string m_strDir;
};

// A JSON text as written by the store, and nothing else: "12 apples" is a raw
// text, not the number 12.
bool ParseWhole(const std::string &strText, Json::Value &jOut) {
    static const Json::CharReaderBuilder builder = [] {
        Json::CharReaderBuilder b;
        b["failIfExtra"] = true;
        return b;
    }();
    std::unique_ptr<Json::CharReader> reader(builder.newCharReader());
    return reader->parse(strText.data(), strText.data() + strText.size(), &jOut, NULL);
}

// "raw_text": true makes every text field raw, {"name": true} that one.
bool IsRawField(const Json::Value &jRaw, const std::string &strName) {
    if (jRaw.isBool()) {
        return jRaw.asBool();
    }
    return jRaw.isObject() && jRaw[strName].isBool() && jRaw[strName].asBool();
}

// A text-field selection entry that asks for the field.
bool Selects(const Json::Value &jSelect) {
    if (jSelect.isBool()) {
        return jSelect.asBool();
    }
    if (jSelect.isObject()) {
        for (const Json::Value &jMember : jSelect) {
            if (Selects(jMember)) {
                return true;
            }
        }
    }
    return false;
}

// The index filter's "key" and "prefix" lists keep a field out of a read.
bool FilteredOut(const Json::Value &jFilter, const std::string &strName) {
    if (!jFilter.isObject()) {
        return false;
    }
    const Json::Value &jKeys = jFilter["key"];
    if (jKeys.isArray()) {
        for (const Json::Value &jKey : jKeys) {
            if (jKey.isString() && jKey.asString() == strName) {
                return true;
            }
        }
    }
    const Json::Value &jPrefixes = jFilter["prefix"];
    if (jPrefixes.isArray()) {
        for (const Json::Value &jPrefix : jPrefixes) {
            if (jPrefix.isString() && 0 == strName.compare(0, jPrefix.asString().size(), jPrefix.asString())) {
                return true;
            }
        }
    }
    return false;
}

// True only for a message that is an object with "listable": true.
bool IsListable(const Json::Value &jCommitMsg) {
    return jCommitMsg.isObject() && jCommitMsg["listable"].isBool() && jCommitMsg["listable"].asBool();
}

// The caller's commit_msg as the store recorded it, or null.
const Json::Value &StoredCommitMsg(const Json::Value &jCommitInfo) {
    static const Json::Value jNull;
    const Json::Value &jMsg = jCommitInfo["msg"];
    return jMsg.isObject() && jMsg.isMember("commit_msg") ? jMsg["commit_msg"] : jNull;
}

}  // namespace

// ---- saving -----------------------------------------------------------------

bool TESSEL_BACKEND_FS::TesselObjectVersionDataToDisk(QLIBSZHASH *&pAddHash, QLIBSZHASH *&pDelHash,
                                                      const Json::Value &jParm, const std::string &strDir) {
    TESSEL_CHECK(NULL == pAddHash || NULL == pDelHash, TESSEL_ERR_BAD_PARAMETERS,
                 "NULL == pAddHash || NULL == pDelHash", false);
    const Json::Value jRaw = jParm.isMember("raw_text") ? jParm["raw_text"] : Json::Value(Json::objectValue);
    const unsigned int owner = tessel::FsRequestUid(jParm["owner"]);
    const Json::Int64 mtime = jParm["mtime"].isIntegral() ? jParm["mtime"].asInt64() : (Json::Int64)time(NULL);
    TESSEL_AS_ROOT();

    if (jParm.isMember("binary_files")) {
        const Json::Value &jArray = jParm["binary_files"];
        TESSEL_CHECK(!jArray.isArray(), TESSEL_ERR_BAD_PARAMETERS, "!jParm[\"binary_files\"].isArray()", false);
        const std::string strBinDir = strDir + "/" TESSEL_GIT_BIN;
        const std::string strInfoDir = strDir + "/" TESSEL_GIT_BIN_INFO;
        for (Json::ArrayIndex i = 0; i < jArray.size(); ++i) {
            TESSEL_CHECK(!jArray[i].isObject() || !jArray[i]["name"].isString(), TESSEL_ERR_BAD_PARAMETERS,
                         "!jArray[i].isMember(\"name\")", false);
            const std::string strName = jArray[i]["name"].asString();
            const std::string strFormat = jArray[i]["format"].isString() ? jArray[i]["format"].asString() : "";
            std::string strNameEncode;
            TESSEL_CHECK_APPEND(!TesselEncode(strName, strNameEncode),
                                "!TesselEncode(jArray[i][\"name\"].asString(), strNameEncode)", false);
            TESSEL_CHECK(!TesselRootFSMkdirP(strBinDir.c_str(), owner), TESSEL_ERR_MKDIR,
                         "!TesselRootFSMkdirP(strBinDir.c_str(), owner)", false);
            TESSEL_CHECK(!TesselRootFSMkdirP(strInfoDir.c_str(), owner), TESSEL_ERR_MKDIR,
                         "!TesselRootFSMkdirP(strInfoDir.c_str(), owner)", false);
            const std::string strBinKey = TESSEL_GIT_BIN "/" + strNameEncode;
            const std::string strInfoKey = TESSEL_GIT_BIN_INFO "/" + strNameEncode;
            if (strFormat == "object") {
                // A stored binary of another object: its latest file and
                // description go into this version as they are.
                Json::Value jPathInfoTmp;
                TESSEL_CHECK_APPEND(!mf_GetBinaryObjectPath(jArray[i], jPathInfoTmp),
                                    "!mf_GetBinaryObjectPath(jArray[i], jPathInfoTmp)", false);
                const std::string strSrcFile = jPathInfoTmp[TESSEL_BIN_PATH].asString() + "/" + strNameEncode;
                const std::string strSrcInfo = jPathInfoTmp[TESSEL_BIN_INFO_PATH].asString() + "/" + strNameEncode;
                TESSEL_CHECK(!QLIBCFileExist(strSrcFile.c_str()), TESSEL_ERR_NOT_EXISTS,
                             "!QLIBCFileExist(strSrcFile.c_str())", false);
                TESSEL_CHECK(!QLIBCFileExist(strSrcInfo.c_str()), TESSEL_ERR_NOT_EXISTS,
                             "!QLIBCFileExist(strSrcInfo.c_str())", false);
                Json::Value jSrcInfo;
                TESSEL_CHECK(
                    !tessel::fromFile(jSrcInfo, strSrcInfo) || !jSrcInfo.isObject() || !jSrcInfo.isMember("md5"),
                    TESSEL_ERR_READ_FILE,
                    "!jSrcInfo.fromFile(strSrcInfo) || !jSrcInfo.isObject() || !jSrcInfo.isMember(\"md5\")", false);
                TESSEL_CHECK(0 != QLIBCSzHashSetValue(pAddHash, strBinKey.c_str(), strSrcFile.c_str()) ||
                                 0 != QLIBCSzHashSetValue(pAddHash, strInfoKey.c_str(), strSrcInfo.c_str()),
                             TESSEL_ERR_OUT_OF_MEMORY, "0 != QLIBCSzHashSetValue(pAddHash, ...)", false);
                continue;
            }
            if (strFormat == SZ_DELETE) {
                TESSEL_CHECK(0 != QLIBCSzHashSetValue(pDelHash, strBinKey.c_str(), SZ_DELETE) ||
                                 0 != QLIBCSzHashSetValue(pDelHash, strInfoKey.c_str(), SZ_DELETE),
                             TESSEL_ERR_OUT_OF_MEMORY, "0 != QLIBCSzHashSetValue(pDelHash, ...)", false);
                continue;
            }
            TESSEL_CHECK(!jArray[i]["path"].isString(), TESSEL_ERR_BAD_PARAMETERS, "!jArray[i].isMember(\"path\")",
                         false);
            const std::string strFile = jArray[i]["path"].asString();
            std::string strMd5;
            TESSEL_CHECK_APPEND(!TesselObjectEvalFileMd5(strFile.c_str(), strMd5),
                                "!TesselObjectEvalFileMd5(strFile.c_str(), strMd5)", false);
            // What a download needs without reading the file: its digest (the
            // entity tag), the name the client gave and the time of the save.
            Json::Value jInfo(Json::objectValue);
            jInfo["format"] = strFormat;
            jInfo["md5"] = strMd5;
            jInfo["name"] = strName;
            jInfo["auto_mtime"] = mtime;
            const std::string strInfoFile = strInfoDir + "/" + strNameEncode;
            TESSEL_CHECK_APPEND(!TesselJsonToFile(jInfo, strInfoFile), "!TesselJsonToFile(jInfo, strInfoFile)", false);
            TESSEL_CHECK(0 != QLIBCSzHashSetValue(pAddHash, strBinKey.c_str(), strFile.c_str()) ||
                             0 != QLIBCSzHashSetValue(pAddHash, strInfoKey.c_str(), strInfoFile.c_str()),
                         TESSEL_ERR_OUT_OF_MEMORY, "0 != QLIBCSzHashSetValue(pAddHash, ...)", false);
        }
    }

    if (jParm.isMember("text")) {
        const Json::Value &jText = jParm["text"];
        TESSEL_CHECK(!jText.isObject(), TESSEL_ERR_BAD_PARAMETERS, "!jParm[\"text\"].isObject()", false);
        const std::string strTextDir = strDir + "/" TESSEL_GIT_TEXT;
        for (Json::Value::const_iterator it = jText.begin(); it != jText.end(); ++it) {
            const std::string strName = it.name();
            std::string strNameEncode;
            TESSEL_CHECK_APPEND(!TesselEncode(strName, strNameEncode), "!TesselEncode(strName, strNameEncode)", false);
            const std::string strKey = TESSEL_GIT_TEXT "/" + strNameEncode;
            if (it->isNull()) {
                TESSEL_CHECK(0 != QLIBCSzHashSetValue(pDelHash, strKey.c_str(), SZ_DELETE), TESSEL_ERR_OUT_OF_MEMORY,
                             "0 != QLIBCSzHashSetValue(pDelHash, strKey.c_str(), \"delete\")", false);
                continue;
            }
            TESSEL_CHECK(!TesselRootFSMkdirP(strTextDir.c_str(), owner), TESSEL_ERR_MKDIR,
                         "!TesselRootFSMkdirP(strTextDir.c_str(), owner)", false);
            const std::string strFile = strTextDir + "/" + strNameEncode;
            if (IsRawField(jRaw, strName) && it->isString()) {
                TESSEL_CHECK_APPEND(!TesselRawToFile(it->asString(), strFile),
                                    "!TesselRawToFile(it->asString(), strFile)", false);
            } else {
                TESSEL_CHECK_APPEND(!TesselJsonToFile(*it, strFile), "!TesselJsonToFile(*it, strFile)", false);
            }
            TESSEL_CHECK(0 != QLIBCSzHashSetValue(pAddHash, strKey.c_str(), strFile.c_str()), TESSEL_ERR_OUT_OF_MEMORY,
                         "0 != QLIBCSzHashSetValue(pAddHash, strKey.c_str(), strFile.c_str())", false);
        }
    }
    return true;
}

bool TESSEL_BACKEND_FS::mf_CountCommit(const Json::Value &jCommitMsg) {
    Json::Value jOld;
    TESSEL_CHECK_APPEND(!mf_GetJsonFile(TESSEL_GIT_INFO, jOld), "!mf_GetJsonFile(TESSEL_GIT_INFO, jOld)", false);
    Json::Value jGitInfo = jOld;
    const Json::Int64 commitCnt =
        jOld[TESSEL_GIT_INFO_COMMIT_CNT].isIntegral() ? jOld[TESSEL_GIT_INFO_COMMIT_CNT].asInt64() : 0;
    const Json::Int64 listableCnt =
        jOld[TESSEL_GIT_INFO_LISTABLE_CNT].isIntegral() ? jOld[TESSEL_GIT_INFO_LISTABLE_CNT].asInt64() : 0;
    jGitInfo[TESSEL_GIT_INFO_COMMIT_CNT] = commitCnt + 1;
    jGitInfo[TESSEL_GIT_INFO_LISTABLE_CNT] = listableCnt + (IsListable(jCommitMsg) ? 1 : 0);
    const std::string strFilePath = m_jPathInfo[TESSEL_GIT_INFO].asString();
    TESSEL_AS_ROOT();
    TESSEL_CHECK_APPEND(!TesselJsonToFile(jGitInfo, strFilePath), "!TesselJsonToFile(jGitInfo, strFilePath)", false);
    return true;
}

bool TESSEL_BACKEND_FS::mf_SaveGit(std::string &strNewVer) {
    const Json::Value &jParm = m_jParm;  // read only: a new member would count as a field to save
    PathTable add;
    PathTable del;
    TESSEL_CHECK(NULL == (add.p = QLIBCSzHashAlloc(kPathTableSize)), TESSEL_ERR_OUT_OF_MEMORY,
                 "NULL == (pAddHash = QLIBCSzHashAlloc(BUFSIZ))", false);
    TESSEL_CHECK(NULL == (del.p = QLIBCSzHashAlloc(kPathTableSize)), TESSEL_ERR_OUT_OF_MEMORY,
                 "NULL == (pDelHash = QLIBCSzHashAlloc(BUFSIZ))", false);

    // An owner may record a version on another user's behalf.
    const Json::Value jNull;
    const Json::Value &jCommitMsg = jParm.isMember("commit_msg") ? jParm["commit_msg"] : jNull;
    unsigned int author = tessel::FsRequestUid(jParm["requester"]);
    if (jParm.isMember("owner") && tessel::FsRequestUid(jParm["owner"]) == author && jCommitMsg.isObject() &&
        jCommitMsg["author_uid"].isIntegral()) {
        author = tessel::FsRequestUid(jCommitMsg["author_uid"]);
    }
    std::string strAuthor;
    std::string strMail;
    TESSEL_CHECK_APPEND(!TesselGetUserNameAndMail(author, strAuthor, strMail, false),
                        "!TesselGetUserNameAndMail(author, strAuthor, strMail, false)", false);
    Json::Value jMsg(Json::objectValue);
    jMsg["author_uid"] = author;
    jMsg["commit_msg"] = jCommitMsg;
    const std::string strMsg = tessel::toString(jMsg);
    const long long mtime = jParm["mtime"].isIntegral() ? jParm["mtime"].asInt64() : (long long)time(NULL);
    const std::string strRepo = m_jPathInfo[TESSEL_VERSION].asString();

    TESSEL_AS_ROOT();
    // An object made without versioned fields has no repository yet: its
    // first versioned change starts one, exactly as a creation would.
    const bool blHasRepo = QLIBCFileExist((strRepo + "/.git").c_str());
    if (jParm.isMember("version") && blHasRepo) {
        TESSEL_CHECK(!jParm["version"].isString(), TESSEL_ERR_BAD_PARAMETERS, "!m_jParm[\"version\"].isString()",
                     false);
        const std::string strBase = jParm["version"].asString();
        if (!jParm.isMember("text") && !jParm.isMember("binary_files")) {
            strNewVer = strBase;
            return true;
        }
        const std::string strTmpDir = m_jPathInfo[TESSEL_TMP_PATH].asString();
        WorkAreaRemover remover;
        remover.Arm(strTmpDir);
        TESSEL_CHECK_APPEND(!TesselObjectVersionDataToDisk(add.p, del.p, jParm, strTmpDir),
                            "!TesselObjectVersionDataToDisk(pAddHash, pDelHash, m_jParm, strTmpDir)", false);
        TESSEL_CHECK_APPEND(GIT_OK != GitCommit(strRepo.c_str(), strBase.c_str(), mtime, add.p, del.p, NULL,
                                                strAuthor.c_str(), strMail.c_str(), strMsg.c_str(), strNewVer),
                            "GIT_OK != GitCommit(m_jPathInfo[TESSEL_VERSION].asCString(), "
                            "m_jParm[\"version\"].asCString(), mtime, pAddHash, pDelHash, NULL, "
                            "strAuthor.c_str(), strMail.c_str(), strMsg.c_str(), strNewVer)",
                            false);
        if (strNewVer != strBase) {
            TESSEL_CHECK_APPEND(!mf_CountCommit(jCommitMsg), "!mf_CountCommit(jCommitMsg)", false);
        }
        return true;
    }

    if (jParm.isMember("version") && !jParm.isMember("text") && !jParm.isMember("binary_files")) {
        strNewVer = jParm["version"].isString() ? jParm["version"].asString() : "";
        return true;
    }
    TESSEL_CHECK_APPEND(!TesselObjectVersionDataToDisk(add.p, del.p, jParm, strRepo),
                        "!TesselObjectVersionDataToDisk(pAddHash, pDelHash, m_jParm, "
                        "m_jPathInfo[TESSEL_VERSION].asString())",
                        false);
    TESSEL_CHECK_APPEND(GIT_OK != GitCreateRepository(strRepo.c_str(), mtime, add.p, del.p, strAuthor.c_str(),
                                                      strMail.c_str(), strMsg.c_str(), strNewVer),
                        "GIT_OK != GitCreateRepository(m_jPathInfo[TESSEL_VERSION].asCString(), mtime, pAddHash, "
                        "pDelHash, strAuthor.c_str(), strMail.c_str(), strMsg.c_str(), strNewVer)",
                        false);
    Json::Value jGitInfo(Json::objectValue);
    jGitInfo[TESSEL_GIT_INFO_COMMIT_CNT] = 1;
    jGitInfo[TESSEL_GIT_INFO_LISTABLE_CNT] = IsListable(jCommitMsg) ? 1 : 0;
    const std::string strFilePath = m_jPathInfo[TESSEL_GIT_INFO].asString();
    TESSEL_CHECK_APPEND(!TesselJsonToFile(jGitInfo, strFilePath), "!TesselJsonToFile(jGitInfo, strFilePath)", false);
    return true;
}

// ---- reading ----------------------------------------------------------------

bool TESSEL_BACKEND_FS::mf_LoadGitVersion(std::string &strDir, bool *pblIsLatest, Json::Value &jCommitInfo) {
    const Json::Value &jParm = m_jParm;
    const std::string strRepo = m_jPathInfo[TESSEL_VERSION].asString();
    TESSEL_AS_ROOT();
    TESSEL_CHECK_APPEND(GIT_OK != GitGetCommitInfo(strRepo.c_str(), NULL, jCommitInfo),
                        "GIT_OK != GitGetCommitInfo(m_jPathInfo[TESSEL_VERSION].asCString(), NULL, jCommitInfo)",
                        false);
    if (jParm.isMember("version")) {
        TESSEL_CHECK(!jParm["version"].isString(), TESSEL_ERR_BAD_PARAMETERS, "!m_jParm[\"version\"].isString()",
                     false);
    }
    // The repository's work tree always holds the latest version.
    if (!jParm.isMember("version") || jParm["version"].asString() == jCommitInfo["version"].asString()) {
        strDir = strRepo;
        *pblIsLatest = true;
        return true;
    }
    const std::string strTmpDir = m_jPathInfo[TESSEL_TMP_PATH].asString();
    TESSEL_CHECK(!TesselRootFSMkdirP(strTmpDir.c_str(), UID_ERR), TESSEL_ERR_MKDIR,
                 "!TesselRootFSMkdirP(strTmpDir.c_str(), UID_ERR)", false);
    if (GIT_OK != GitLoadCommit(strRepo.c_str(), jParm["version"].asCString(), strTmpDir.c_str(), jCommitInfo)) {
        WorkAreaRemover remover;
        remover.Arm(strTmpDir);
        TESSEL_APPEND(
            "GIT_OK != GitLoadCommit(m_jPathInfo[TESSEL_VERSION].asCString(), "
            "m_jParm[\"version\"].asCString(), strTmpDir.c_str(), jCommitInfo)");
        return false;
    }
    strDir = strTmpDir;
    *pblIsLatest = false;
    return true;
}

bool TESSEL_BACKEND_FS::mf_GetGit(TESSEL_OBJECT *pObject) {
    {
        TESSEL_AS_ROOT();
        // No repository: the object has no versions, so there is nothing to read.
        if (!QLIBCFileExist((m_jPathInfo[TESSEL_VERSION].asString() + "/.git").c_str())) {
            return true;
        }
    }
    std::string strDir;
    bool blIsLatest = true;
    Json::Value jCommitInfo;
    TESSEL_CHECK_APPEND(!mf_LoadGitVersion(strDir, &blIsLatest, jCommitInfo), "!mf_LoadGitVersion(strDir, &blIsLatest)",
                        false);
    WorkAreaRemover remover;
    if (!blIsLatest) {
        remover.Arm(strDir);
    }
    TESSEL_CHECK_APPEND(!mf_VersionDataFromDisk(strDir, pObject), "!mf_VersionDataFromDisk(strDir, pObject)", false);
    pObject->set_version(jCommitInfo["version"].asString());
    pObject->set_commit_msg(StoredCommitMsg(jCommitInfo));
    pObject->set_mtime(jCommitInfo["mtime"].isIntegral() ? (long)jCommitInfo["mtime"].asInt64() : 0);
    return true;
}

bool TESSEL_BACKEND_FS::mf_VersionDataFromDisk(const std::string &strDir, TESSEL_OBJECT *pObject) {
    if (NULL == pObject) {
        return true;
    }
    const Json::Value &jParm = m_jParm;
    static const Json::Value jNull;
    const Json::Value &jField = jParm["field"];
    const Json::Value &jSelect = jField.isObject() ? jField["text"] : jNull;
    const Json::Value &jRaw = jParm["raw_text"];
    const Json::Value &jFilter = jParm["field_filter"].isObject() ? jParm["field_filter"]["text"] : jNull;
    const bool blAll = jSelect.isBool() && jSelect.asBool();
    const std::string strTextDir = strDir + "/" TESSEL_GIT_TEXT;
    Json::Value jText(Json::objectValue);
    // One stored field into jText; a field whose file is missing is absent.
    auto readField = [&](const std::string &strName, const std::string &strFile) -> bool {
        if (!QLIBCFileExist(strFile.c_str())) {
            return true;
        }
        Json::Value jRawText;
        TESSEL_CHECK_APPEND(!TesselRawFromFile(jRawText, strFile), "!TesselRawFromFile(jRawText, strFile)", false);
        // A raw field was written as its bare string, which is not a JSON text.
        Json::Value jValue;
        if (IsRawField(jRaw, strName) || !ParseWhole(jRawText.asString(), jValue)) {
            jValue = jRawText;
        }
        jText[strName].swap(jValue);
        return true;
    };
    TESSEL_AS_ROOT();
    if (blAll) {
        // Every field of the version: the names in its text folder (a folder
        // that is not there holds none).
        std::unique_ptr<DIR, int (*)(DIR *)> dir(opendir(strTextDir.c_str()), closedir);
        std::vector<std::string> encodedNames;
        for (struct dirent *pEntry = dir ? readdir(dir.get()) : NULL; NULL != pEntry; pEntry = readdir(dir.get())) {
            // An encoded name has no '.': anything else is not a field's file.
            if (NULL == strchr(pEntry->d_name, '.')) {
                encodedNames.push_back(pEntry->d_name);
            }
        }
        for (std::string &strNameEncode : encodedNames) {
            std::string strName;
            TESSEL_CHECK_APPEND(!TesselDecode(strNameEncode, strName), "!TesselDecode(strNameEncode, strName)", false);
            if (!FilteredOut(jFilter, strName) && !readField(strName, strTextDir + "/" + strNameEncode)) {
                return false;
            }
        }
    } else if (jSelect.isObject()) {
        for (Json::Value::const_iterator it = jSelect.begin(); it != jSelect.end(); ++it) {
            const std::string strName = it.name();
            if (!Selects(*it)) {
                continue;
            }
            std::string strNameEncode;
            TESSEL_CHECK_APPEND(!TesselEncode(strName, strNameEncode), "!TesselEncode(strName, strNameEncode)", false);
            if (!readField(strName, strTextDir + "/" + strNameEncode)) {
                return false;
            }
        }
    }
    // Without a text selection the record's text stays as it is.
    if (blAll || jSelect.isObject()) {
        pObject->swap_text(jText);
    }
    Json::Value jInfo;
    TESSEL_CHECK_APPEND(!mf_GetBinaryInfoByDir(strDir + "/" TESSEL_GIT_BIN_INFO, jInfo, "binary_info"),
                        "!mf_GetBinaryInfoByDir(strDir + \"/binary_info\", jInfo, \"binary_info\")", false);
    pObject->swap_binary_info(jInfo["binary_info"]);
    return true;
}

bool TESSEL_BACKEND_FS::mf_DownloadVersionBinary() {
    std::string strDir;
    bool blIsLatest = true;
    Json::Value jCommitInfo;
    TESSEL_CHECK_APPEND(!mf_LoadGitVersion(strDir, &blIsLatest, jCommitInfo), "!mf_LoadGitVersion(strDir, &blIsLatest)",
                        false);
    WorkAreaRemover remover;
    if (!blIsLatest) {
        remover.Arm(strDir);
    }
    Json::Value jPathInfo(Json::objectValue);
    TESSEL_CHECK_APPEND(!mf_GetPathInfoByGitBase(strDir, jPathInfo), "!mf_GetPathInfoByGitBase(strDir, jPathInfo)",
                        false);
    TESSEL_CHECK_APPEND(
        !mf_DownloadBinaryByDir(jPathInfo[TESSEL_GIT_BIN].asString(), jPathInfo[TESSEL_GIT_BIN_INFO].asString()),
        "!mf_DownloadBinaryByDir(strBinaryDir, strBinaryInfoDir)", false);
    return true;
}

// ---- versions ---------------------------------------------------------------

bool TESSEL_BACKEND_FS::mf_DiffVersionGit(Json::Value &jDiff) {
    const Json::Value &jParm = m_jParm;
    TESSEL_CHECK(!jParm["old_version"].isString(), TESSEL_ERR_BAD_PARAMETERS, "!m_jParm[\"old_version\"].isString()",
                 false);
    TESSEL_CHECK(jParm.isMember("new_version") && !jParm["new_version"].isString(), TESSEL_ERR_BAD_PARAMETERS,
                 "m_jParm.isMember(\"new_version\") && !m_jParm[\"new_version\"].isString()", false);
    PathTable out;
    TESSEL_CHECK(NULL == (out.p = QLIBCSzHashAlloc(kPathTableSize)), TESSEL_ERR_OUT_OF_MEMORY,
                 "NULL == (pDiffHash = QLIBCSzHashAlloc(BUFSIZ))", false);
    const std::string strRepo = m_jPathInfo[TESSEL_VERSION].asString();
    {
        TESSEL_AS_ROOT();
        TESSEL_CHECK_APPEND(
            GIT_OK != GitDiff(strRepo.c_str(), jParm["old_version"].asCString(),
                              jParm.isMember("new_version") ? jParm["new_version"].asCString() : NULL, out.p),
            "GIT_OK != GitDiff(m_jPathInfo[TESSEL_VERSION].asCString(), m_jParm[\"old_version\"].asCString(), "
            "szNewVersion, pDiffHash)",
            false);
    }
    QLIBSZLIST *pKeys = QLIBCSzListAlloc(kPathTableSize);
    TESSEL_CHECK(NULL == pKeys, TESSEL_ERR_OUT_OF_MEMORY, "NULL == (pKeys = QLIBCSzListAlloc(BUFSIZ))", false);
    std::unique_ptr<QLIBSZLIST, void (*)(QLIBSZLIST *)> keys(pKeys, QLIBCSzListFree);
    QLIBSZLIST *pList = keys.release();
    const int count = QLIBCSzHashEnumKey(out.p, &pList);
    keys.reset(pList);
    TESSEL_CHECK(0 > count, TESSEL_ERR_OUT_OF_MEMORY, "0 > QLIBCSzHashEnumKey(pDiffHash, &pKeys)", false);
    for (int i = 0; i < QLIBCSzListCount(keys.get()); ++i) {
        const std::string strPath = QLIBCSzListGet(keys.get(), i);
        const size_t pos = strPath.find('/');
        if (std::string::npos == pos) {
            continue;
        }
        const std::string strPrefix = strPath.substr(0, pos);
        std::string strNameEncode = strPath.substr(pos + 1);
        // Descriptions change with their files; only the files themselves count.
        if ((strPrefix != TESSEL_GIT_TEXT && strPrefix != TESSEL_GIT_BIN) ||
            std::string::npos != strNameEncode.find('/')) {
            continue;
        }
        std::string strName;
        TESSEL_CHECK_APPEND(!TesselDecode(strNameEncode, strName), "!TesselDecode(strNameEncode, strName)", false);
        jDiff[strPrefix][strName] = QLIBCSzHashGetValue(out.p, strPath.c_str());
    }
    return true;
}

bool TESSEL_BACKEND_FS::mf_RenameGitField(std::string &strNewVer) {
    const Json::Value &jParm = m_jParm;
    TESSEL_CHECK(!jParm["version"].isString(), TESSEL_ERR_BAD_PARAMETERS, "!m_jParm[\"version\"].isString()", false);
    TESSEL_CHECK(!jParm["old_field"].isString(), TESSEL_ERR_BAD_PARAMETERS, "!m_jParm[\"old_field\"].isString()",
                 false);
    TESSEL_CHECK(!jParm["new_field"].isString(), TESSEL_ERR_BAD_PARAMETERS, "!m_jParm[\"new_field\"].isString()",
                 false);
    std::string strOldEncode;
    std::string strNewEncode;
    TESSEL_CHECK_APPEND(!TesselEncode(jParm["old_field"].asString(), strOldEncode),
                        "!TesselEncode(m_jParm[\"old_field\"].asString(), strOldEncode)", false);
    TESSEL_CHECK_APPEND(!TesselEncode(jParm["new_field"].asString(), strNewEncode),
                        "!TesselEncode(m_jParm[\"new_field\"].asString(), strNewEncode)", false);
    PathTable add;
    PathTable del;
    PathTable rename;
    TESSEL_CHECK(NULL == (add.p = QLIBCSzHashAlloc(kPathTableSize)) ||
                     NULL == (del.p = QLIBCSzHashAlloc(kPathTableSize)) ||
                     NULL == (rename.p = QLIBCSzHashAlloc(kPathTableSize)),
                 TESSEL_ERR_OUT_OF_MEMORY, "NULL == (pRenameHash = QLIBCSzHashAlloc(BUFSIZ))", false);
    const std::string strSegment = jParm["segment"].isString() ? jParm["segment"].asString() : "";
    std::vector<const char *> folders;
    if (strSegment == TESSEL_GIT_TEXT) {
        folders = {TESSEL_GIT_TEXT};
    } else if (strSegment == TESSEL_GIT_BIN) {
        folders = {TESSEL_GIT_BIN, TESSEL_GIT_BIN_INFO};
    } else {
        TESSEL_RAISE(TESSEL_ERR_BAD_PARAMETERS, "segment error, segment=%s",
                     tessel::toString(jParm["segment"]).c_str());
        return false;
    }
    for (const char *szFolder : folders) {
        const std::string strFrom = std::string(szFolder) + "/" + strOldEncode;
        const std::string strTo = std::string(szFolder) + "/" + strNewEncode;
        TESSEL_CHECK(0 != QLIBCSzHashSetValue(rename.p, strFrom.c_str(), strTo.c_str()), TESSEL_ERR_RENAME_TABLE,
                     "0 != QLIBCSzHashSetValue(pRenameHash, strFrom.c_str(), strTo.c_str())", false);
    }
    const Json::Value jNull;
    const Json::Value &jCommitMsg = jParm.isMember("commit_msg") ? jParm["commit_msg"] : jNull;
    const unsigned int author = tessel::FsRequestUid(jParm["requester"]);
    std::string strAuthor;
    std::string strMail;
    TESSEL_CHECK_APPEND(!TesselGetUserNameAndMail(author, strAuthor, strMail, true),
                        "!TesselGetUserNameAndMail(author, strAuthor, strMail, true)", false);
    Json::Value jMsg(Json::objectValue);
    jMsg["author_uid"] = author;
    jMsg["commit_msg"] = jCommitMsg;
    const long long mtime = jParm["mtime"].isIntegral() ? jParm["mtime"].asInt64() : (long long)time(NULL);
    const std::string strBase = jParm["version"].asString();
    TESSEL_AS_ROOT();
    TESSEL_CHECK_APPEND(
        GIT_OK != GitCommit(m_jPathInfo[TESSEL_VERSION].asCString(), strBase.c_str(), mtime, add.p, del.p, rename.p,
                            strAuthor.c_str(), strMail.c_str(), tessel::toString(jMsg).c_str(), strNewVer),
        "GIT_OK != GitCommit(m_jPathInfo[TESSEL_VERSION].asCString(), "
        "m_jParm[\"version\"].asCString(), mtime, pAddHash, pDelHash, pRenameHash, "
        "strAuthor.c_str(), strMail.c_str(), strMsg.c_str(), strNewVer)",
        false);
    if (strNewVer != strBase) {
        TESSEL_CHECK_APPEND(!mf_CountCommit(jCommitMsg), "!mf_CountCommit(jCommitMsg)", false);
    }
    return true;
}

// ---- the backend's version operations ---------------------------------------

bool TESSEL_BACKEND_FS::VersionDiff(const Json::Value &jParm, Json::Value &jDiff) {
    TESSEL_CHECK_APPEND(!mf_init(jParm), "!mf_init(jParm)", false);
    TESSEL_CHECK_APPEND(!mf_DiffVersionGit(jDiff), "!mf_DiffVersionGit(jDiff)", false);
    return true;
}

bool TESSEL_BACKEND_FS::FieldRename(const Json::Value &jParm, std::string &strNewVer) {
    TESSEL_CHECK_APPEND(!mf_init(jParm), "!mf_init(jParm)", false);
    TESSEL_CHECK_APPEND(!mf_RenameGitField(strNewVer), "!mf_RenameGitField(strNewVer)", false);
    return true;
}

namespace {

// nftw gives its callback no argument of the caller's.
thread_local uid_t t_newOwner = (uid_t)-1;

int ChownEntry(const char *szPath, const struct stat *, int, struct FTW *) {
    if (0 != lchown(szPath, t_newOwner, (gid_t)-1)) {
        TESSEL_LOG_FAILED("0 != lchown(szPath, newOwner, -1), path=%s", szPath);
        return -1;
    }
    return 0;
}

}  // namespace

/*
 * Hands the object's files to another user: every file and directory of the
 * object becomes the new owner's, groups stay. The object's versions are not
 * touched, so the version answered is the latest one (empty for an object
 * without versions).
 */
bool TESSEL_BACKEND_FS::SetOwner(const Json::Value &jParm, std::string &strNewVer) {
    TESSEL_CHECK(!jParm["new_owner"].isIntegral(), TESSEL_ERR_BAD_PARAMETERS, "!jParm[\"new_owner\"].isIntegral()",
                 false);
    const unsigned int newOwner = tessel::FsRequestUid(jParm["new_owner"]);
    TESSEL_CHECK(!TesselCheckUID(newOwner), TESSEL_ERR_USER_NOT_EXISTS, "!TesselCheckUID(newOwner)", false);
    TESSEL_CHECK_APPEND(!mf_init(jParm), "!mf_init(jParm)", false);
    const std::string strIdPath = m_jPathInfo[TESSEL_ID_PATH].asString();
    const std::string strRepo = m_jPathInfo[TESSEL_VERSION].asString();
    TESSEL_AS_ROOT();
    TESSEL_CHECK(!QLIBCFileCheckDir(strIdPath.c_str()), TESSEL_ERR_NOT_EXISTS, "!QLIBCFileCheckDir(strIdPath.c_str())",
                 false);
    t_newOwner = newOwner;
    TESSEL_CHECK(0 != nftw(strIdPath.c_str(), ChownEntry, 16, FTW_PHYS), TESSEL_ERR_OPERATION_FAILED,
                 "0 != nftw(strIdPath.c_str(), ChownEntry, 16, FTW_PHYS)", false);
    strNewVer.clear();
    if (QLIBCFileExist((strRepo + "/.git").c_str())) {
        Json::Value jCommitInfo;
        TESSEL_CHECK_APPEND(GIT_OK != GitGetCommitInfo(strRepo.c_str(), NULL, jCommitInfo),
                            "GIT_OK != GitGetCommitInfo(m_jPathInfo[TESSEL_VERSION].asCString(), NULL, jCommitInfo)",
                            false);
        strNewVer = jCommitInfo["version"].asString();
    }
    return true;
}
