// Person records of an object, one JSON file per person (see meta.h), and the
// object's meta-binaries: unversioned files beside their descriptions.
#include "backend_fs/meta.h"

#include <ctype.h>
#include <errno.h>
#include <dirent.h>
#include <stdio.h>
#include <unistd.h>

#include <time.h>

#include <memory>
#include <set>
#include <string>
#include <vector>

#include "backend_fs/tesselBackend_fs.h"
#include "backend_fs/utils.h"
#include "common/tessel_json.h"
#include "common/tessel_pathname.h"
#include "common/tessel_priv.h"
#include "common/tessel_report.h"
#include "tessel_file.h"
#include "tessel_id.h"
#include "tessel_ns.h"
#include "tessel_user.h"
#include "tesselobject.h"

static constexpr const char kTesselModule[] = "backend_fs/meta";

namespace {

constexpr const char SZ_PERSON_SUMMARY[] = "summary";
constexpr const char SZ_PERSON_SUMMARY_FILE[] = "summary.json";
constexpr const char SZ_PERSON_CLEAR[] = "@clear";
constexpr const char SZ_PERSON_DIR[] = "/person";

bool IsPersonKey(const std::string &strKey) {
    return !strKey.empty() && isdigit(static_cast<unsigned char>(strKey[0]));
}

// The file that holds the record named strKey ("summary" or a person key).
bool RecordFile(const std::string &strDir, const std::string &strKey, std::string &strPath) {
    if (SZ_PERSON_SUMMARY == strKey) {
        strPath = strDir + "/" + SZ_PERSON_SUMMARY_FILE;
        return true;
    }
    std::string strFileNameEncode;
    TESSEL_CHECK_APPEND(!TesselEncode(strKey, strFileNameEncode), "!TesselEncode(jsIt.memberName(), strFileNameEncode)",
                        false);
    strPath = strDir + "/" + strFileNameEncode;
    return true;
}

// Records are replaced by rename, so a plain read sees a whole one; a
// missing record is an ordinary case and leaves no frame behind.
bool ReadRecord(const std::string &strPath, Json::Value &jRecord) { return tessel::fromFile(jRecord, strPath); }

// Reads the record strKey into jOut; an unreadable file is logged and left out.
bool ReadOne(const std::string &strDir, const std::string &strKey, Json::Value &jOut) {
    std::string strPath;
    if (!RecordFile(strDir, strKey, strPath)) {
        return false;
    }
    Json::Value jRecord;
    if (!ReadRecord(strPath, jRecord)) {
        TESSEL_LOG(LOG_ERR, "failed to read [%s] from [%s]", strKey.c_str(), strPath.c_str());
        return true;
    }
    jOut = jRecord;
    return true;
}

// The keys of every person file in the directory, decoded from file names.
std::vector<std::string> StoredKeys(const std::string &strDir) {
    std::vector<std::string> keys;
    std::unique_ptr<DIR, int (*)(DIR *)> dir(opendir(strDir.c_str()), closedir);
    if (!dir) {
        return keys;
    }
    while (struct dirent *pEntry = readdir(dir.get())) {
        std::string strName = pEntry->d_name;
        std::string strKey;
        if ('.' == strName[0] || SZ_PERSON_SUMMARY_FILE == strName || !TesselDecode(strName, strKey)) {
            continue;
        }
        if (IsPersonKey(strKey)) {
            keys.push_back(strKey);
        }
    }
    return keys;
}

bool SelectedKey(const Json::Value &jKey, std::string &strKey) {
    if (jKey.isString()) {
        strKey = jKey.asString();
        return true;
    }
    if (jKey.isUInt()) {
        strKey = std::to_string(jKey.asUInt());
        return true;
    }
    return false;
}

bool SaveOne(const std::string &strDir, const std::string &strKey, const Json::Value &jNew, bool blClear) {
    std::string strPath;
    if (!RecordFile(strDir, strKey, strPath)) {
        return false;
    }
    if (jNew.isNull()) {
        // A person dropped from the object: its record goes with it.
        if (0 != unlink(strPath.c_str()) && ENOENT != errno) {
            TESSEL_LOG(LOG_ERR, "failed to write [%s] from [%s]", strKey.c_str(), strPath.c_str());
            return false;
        }
        return true;
    }
    Json::Value jRecord(Json::objectValue);
    if (!blClear) {
        Json::Value jStored;
        if (ReadRecord(strPath, jStored) && jStored.isObject()) {
            jRecord = jStored;
        }
    }
    if (!mergeJsonObject(jRecord, jNew)) {
        TESSEL_LOG(LOG_ERR, "failed to mergeJsonObject[%s][%s]", strKey.c_str(), tessel::toString(jNew).c_str());
        return false;
    }
    if (!TesselJsonToFile(jRecord, strPath)) {
        TESSEL_LOG(LOG_ERR, "failed to write [%s] from [%s]", strKey.c_str(), strPath.c_str());
        return false;
    }
    return true;
}

}  // namespace

namespace tessel {

bool ReadPersons(const std::string &strPersonDir, const Json::Value &jSelect, Json::Value &jPerson) {
    if (jSelect.isString() && SZ_PERSON_SUMMARY == jSelect.asString()) {
        return ReadOne(strPersonDir, SZ_PERSON_SUMMARY, jPerson);
    }
    std::vector<std::string> keys;
    std::string strKey;
    if (jSelect.isBool() && jSelect.asBool()) {
        keys = StoredKeys(strPersonDir);
        keys.push_back(SZ_PERSON_SUMMARY);
    } else if (SelectedKey(jSelect, strKey)) {
        keys.push_back(strKey);
    } else if (jSelect.isArray()) {
        for (const Json::Value &jKey : jSelect) {
            if (SelectedKey(jKey, strKey)) {
                keys.push_back(strKey);
            }
        }
    } else if (jSelect.isObject()) {
        for (Json::Value::const_iterator it = jSelect.begin(); it != jSelect.end(); ++it) {
            if (it->isBool() && it->asBool()) {
                keys.push_back(it.name());
            }
        }
    }
    for (const std::string &strName : keys) {
        Json::Value jRecord;
        if (!ReadOne(strPersonDir, strName, jRecord)) {
            return false;
        }
        if (!jRecord.isNull()) {
            jPerson[strName] = jRecord;
        }
    }
    return true;
}

bool SavePersons(const std::string &strPersonDir, const Json::Value &jPerson) {
    if (!jPerson.isObject()) {
        return true;
    }
    bool blClear = jPerson.isMember(SZ_PERSON_CLEAR) && jPerson[SZ_PERSON_CLEAR].isBool() &&
                   jPerson[SZ_PERSON_CLEAR].asBool();
    bool ok = true;
    for (Json::Value::const_iterator it = jPerson.begin(); it != jPerson.end(); ++it) {
        std::string strKey = it.name();
        if (IsPersonKey(strKey) || SZ_PERSON_SUMMARY == strKey) {
            ok = SaveOne(strPersonDir, strKey, *it, blClear) && ok;
        }
    }
    if (blClear) {
        for (const std::string &strKey : StoredKeys(strPersonDir)) {
            if (!jPerson.isMember(strKey)) {
                ok = SaveOne(strPersonDir, strKey, Json::Value(), true) && ok;
            }
        }
    }
    return ok;
}

}  // namespace tessel

BOOL TesselUpdatePerson(TESSEL_OBJECT *pObj, unsigned int uid) {
    TESSEL_CHECK(!pObj, TESSEL_ERR_BAD_PARAMETERS, "!pObj", FALSE);
    std::string strNs = pObj->get_ns();
    std::string strId = pObj->get_id();
    std::string strNSPath;
    TESSEL_CHECK_APPEND(!TesselGetNSPath(strNs, strNSPath), "!TesselGetNSPath(strNs, strNSPath)", FALSE);
    TESSEL_CHECK(!tessel::TesselIsPathComponent(strId), TESSEL_ERR_USER_INPUT, "!TesselIsPathComponent(strId)",
                 FALSE);
    std::string strKey = std::to_string(uid);
    std::string strPath;
    if (!RecordFile(strNSPath + "/" + strId + SZ_PERSON_DIR, strKey, strPath)) {
        return FALSE;
    }
    Json::Value jsUser;
    {
        TESSEL_AS_ROOT();
        TESSEL_CHECK_APPEND(!ReadRecord(strPath, jsUser), "!jsUser.fromFile(strPath)", FALSE);
    }
    Json::Value jPerson = pObj->get_person();
    if (!jPerson.isObject()) {
        jPerson = Json::Value(Json::objectValue);
    }
    jPerson[strKey] = jsUser;
    pObj->swap_person(jPerson);
    return TRUE;
}

// ---- meta-binaries ------------------------------------------------------------

namespace {

constexpr const char SZK_METABINARY_FILES[] = "metabinary_files";
constexpr const char SZK_METABINARY_INFO[] = "metabinary_info";
constexpr const char SZ_FORMAT_DELETE[] = "delete";
constexpr const char SZ_FORMAT_OBJECT[] = "object";
constexpr const char SZ_FORMAT_RAW[] = "raw";
constexpr const char SZ_FORMAT_BASE64[] = "base64";

// The stored description's time, or -1 when there is none.
long long StoredMtime(const std::string &strInfo) {
    Json::Value jInfo;
    if (!tessel::fromFile(jInfo, strInfo) || !jInfo.isObject() || !jInfo["auto_mtime"].isIntegral()) {
        return -1;
    }
    return jInfo["auto_mtime"].asInt64();
}

// Decodes the base64 file strSrc into strDest.
bool DecodeBase64File(const std::string &strSrc, const std::string &strDest) {
    std::string strText;
    TESSEL_CHECK_APPEND(!tessel::FsReadWholeFile(strSrc, strText), "!FsReadWholeFile(strFileTmp, strText)", false);
    size_t nDecoded = strText.size() / 4 * 3 + 3;
    std::string strData(nDecoded, '\0');
    TESSEL_CHECK(!QLIBCBase64Decode(strText.c_str(), strText.size(), &strData[0], &nDecoded), TESSEL_ERR_USER_INPUT,
                 "!QLIBCBase64Decode(strText.c_str(), strText.size(), &strData[0], &nDecoded)", false);
    strData.resize(nDecoded);
    TESSEL_CHECK_APPEND(!TesselRawToFile(strData, strDest), "!TesselRawToFile(strData, strDecoded)", false);
    return true;
}

}  // namespace

bool TESSEL_BACKEND_FS::mf_GetMetaBinaryInfo(TESSEL_OBJECT *pObject, bool blForce) {
    const std::string strDir = m_jPathInfo[TESSEL_META_BIN_INFO].asString();
    Json::Value jOut(Json::objectValue);
    if (blForce) {
        // Every description, whatever the request selected.
        TESSEL_CHECK_APPEND(!tessel::FsReadBinaryInfos(strDir, Json::Value(), jOut[SZK_METABINARY_INFO]),
                            "!FsReadBinaryInfos(strDir, Json::Value(), jOut[\"metabinary_info\"])", false);
    } else {
        TESSEL_CHECK_APPEND(!mf_GetBinaryInfoByDir(strDir, jOut, SZK_METABINARY_INFO),
                            "!mf_GetBinaryInfoByDir(strDir, jOut, \"metabinary_info\")", false);
    }
    pObject->swap_metabinary_info(jOut[SZK_METABINARY_INFO]);
    return true;
}

/*
 * Each item of "metabinary_files" stores, replaces or removes one file. Like
 * the meta-text entries, a file never loses to an older request: an item is
 * passed over when the stored description's "auto_mtime" is newer than the
 * request's "mtime" (a request without one counts as made now). Base64
 * uploads are decoded into the request's own work area, which is removed
 * again; the uploaded files themselves belong to the caller and stay.
 */
bool TESSEL_BACKEND_FS::mf_SaveMetaBinary() {
    const Json::Value &jParm = m_jParm;
    const Json::Value &jArray = jParm[SZK_METABINARY_FILES];
    TESSEL_CHECK(!jArray.isArray(), TESSEL_ERR_BAD_PARAMETERS, "!m_jParm[\"metabinary_files\"].isArray()", false);
    TESSEL_CHECK(jParm.isMember("mtime") && !jParm["mtime"].isIntegral(), TESSEL_ERR_BAD_PARAMETERS,
                 "m_jParm.isMember(\"mtime\") && !m_jParm[\"mtime\"].isIntegral()", false);
    const int64_t mtime = jParm["mtime"].isIntegral() ? jParm["mtime"].asInt64() : (int64_t)time(NULL);
    const std::string strBinDir = m_jPathInfo[TESSEL_META_BIN].asString();
    const std::string strInfoDir = m_jPathInfo[TESSEL_META_BIN_INFO].asString();
    for (Json::ArrayIndex i = 0; i < jArray.size(); ++i) {
        TESSEL_CHECK(!jArray[i].isObject(), TESSEL_ERR_BAD_PARAMETERS, "!jArray[i].isObject()", false);
        TESSEL_CHECK(!jArray[i].isMember("name"), TESSEL_ERR_BAD_PARAMETERS, "!jArray[i].isMember(\"name\")", false);
        TESSEL_CHECK(!jArray[i].isMember("format"), TESSEL_ERR_BAD_PARAMETERS, "!jArray[i].isMember(\"format\")",
                     false);
        TESSEL_CHECK(!jArray[i]["name"].isString(), TESSEL_ERR_BAD_PARAMETERS, "!jArray[i][\"name\"].isString()",
                     false);
        const std::string strFileName = jArray[i]["name"].asString();
        const std::string strFormat = jArray[i]["format"].isString() ? jArray[i]["format"].asString() : "";
        if (SZ_FORMAT_DELETE != strFormat && SZ_FORMAT_OBJECT != strFormat && SZ_FORMAT_RAW != strFormat &&
            SZ_FORMAT_BASE64 != strFormat) {
            TESSEL_LOG(LOG_ERR, "bad binary file format, json=%s\n", tessel::toString(jArray[i]).c_str());
            continue;
        }
        std::string strFileNameEncode;
        TESSEL_CHECK_APPEND(!TesselEncode(strFileName, strFileNameEncode),
                            "!TesselEncode(jArray[i][\"name\"].asString(), strFileNameEncode)", false);
        const std::string strFileNew = strBinDir + "/" + strFileNameEncode;
        const std::string strInfoNew = strInfoDir + "/" + strFileNameEncode;
        TESSEL_AS_ROOT();
        if (StoredMtime(strInfoNew) > mtime) {
            continue;
        }

        if (SZ_FORMAT_DELETE == strFormat) {
            TESSEL_CHECK(0 != unlink(strFileNew.c_str()) && ENOENT != errno, TESSEL_ERR_OPERATION_FAILED,
                         "0 != unlink(strFileNew.c_str()) && ENOENT != errno", false);
            TESSEL_CHECK(0 != unlink(strInfoNew.c_str()) && ENOENT != errno, TESSEL_ERR_OPERATION_FAILED,
                         "0 != unlink(strInfoNew.c_str()) && ENOENT != errno", false);
        } else if (SZ_FORMAT_OBJECT == strFormat) {
            Json::Value jPathInfoTmp;
            TESSEL_CHECK_APPEND(!mf_GetBinaryObjectPath(jArray[i], jPathInfoTmp),
                                "!mf_GetBinaryObjectPath(jArray[i], jPathInfoTmp)", false);
            const std::string strFileSrc = jPathInfoTmp[TESSEL_META_BIN].asString() + "/" + strFileNameEncode;
            const std::string strInfoSrc = jPathInfoTmp[TESSEL_META_BIN_INFO].asString() + "/" + strFileNameEncode;
            TESSEL_CHECK(!QLIBCFileExist(strFileSrc.c_str()), TESSEL_ERR_UNEXPECTED,
                         "!QLIBCFileExist(strFileSrc.c_str())", false);
            TESSEL_CHECK_APPEND(!mf_CopyFile(strFileSrc, strFileNew), "!mf_CopyFile(strFileSrc, strFileNew)", false);
            // The source's description comes along (a download name, say);
            // digest, name and time are then made this object's own.
            if (QLIBCFileExist(strInfoSrc.c_str())) {
                TESSEL_CHECK_APPEND(!mf_CopyFile(strInfoSrc, strInfoNew), "!mf_CopyFile(strInfoSrc, strInfoNew)",
                                    false);
            }
            TESSEL_CHECK_APPEND(!mf_MakeBinaryInfo(strFileNew, strFileName, mtime, true),
                                "!mf_MakeBinaryInfo(strFileNew, strFileName, m_jParm[\"mtime\"].asInt64(), true)",
                                false);
        } else {
            TESSEL_CHECK(!jArray[i].isMember("path"), TESSEL_ERR_BAD_PARAMETERS, "!jArray[i].isMember(\"path\")",
                         false);
            TESSEL_CHECK(!jArray[i]["path"].isString(), TESSEL_ERR_BAD_PARAMETERS,
                         "!jArray[i][\"path\"].isString()", false);
            std::string strFileTmp = jArray[i]["path"].asString();
            const std::string strWorkDir = m_jPathInfo[TESSEL_TMP_PATH].asString();
            const bool blDecode = SZ_FORMAT_BASE64 == strFormat;
            if (blDecode) {
                TESSEL_CHECK(!TesselRootFSMkdirP(strWorkDir.c_str(), 0), TESSEL_ERR_MKDIR,
                             "!TesselRootFSMkdirP(m_jPathInfo[TESSEL_TMP_PATH].asCString(), 0)", false);
                const std::string strDecoded = strWorkDir + "/" + strFileNameEncode;
                const bool blOk = DecodeBase64File(strFileTmp, strDecoded);
                strFileTmp = strDecoded;
                if (!blOk) {
                    unlink(strDecoded.c_str());
                    rmdir(strWorkDir.c_str());
                    TESSEL_APPEND("!DecodeBase64File(jArray[i][\"path\"].asString(), strDecoded)");
                    return false;
                }
            }
            const bool blCopied = mf_CopyFile(strFileTmp, strFileNew);
            if (blDecode) {
                unlink(strFileTmp.c_str());
                rmdir(strWorkDir.c_str());
            }
            TESSEL_CHECK_APPEND(!blCopied, "!mf_CopyFile(strFileTmp, strFileNew)", false);
            TESSEL_CHECK_APPEND(!mf_MakeBinaryInfo(strFileNew, strFileName, mtime, false),
                                "!mf_MakeBinaryInfo(strFileNew, strFileName, m_jParm[\"mtime\"].asInt64(), false)",
                                false);
        }
    }
    return true;
}

bool TESSEL_BACKEND_FS::mf_DownloadMetaBinary() {
    const std::string strBinaryDir = m_jPathInfo[TESSEL_META_BIN].asString();
    const std::string strBinaryInfoDir = m_jPathInfo[TESSEL_META_BIN_INFO].asString();
    TESSEL_CHECK_APPEND(!mf_DownloadBinaryByDir(strBinaryDir, strBinaryInfoDir),
                        "!mf_DownloadBinaryByDir(strBinaryDir, strBinaryInfoDir)", false);
    return true;
}
