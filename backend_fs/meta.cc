// Person records of an object, one JSON file per person; see meta.h.
#include "backend_fs/meta.h"

#include <ctype.h>
#include <errno.h>
#include <dirent.h>
#include <stdio.h>
#include <unistd.h>

#include <memory>
#include <set>
#include <string>
#include <vector>

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
