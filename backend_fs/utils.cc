// The file-system store's field table and path layout, and its stored files:
// descriptions, copies and downloads; see utils.h.
#include "backend_fs/utils.h"

#include <errno.h>
#include <fcntl.h>
#include <glob.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <time.h>
#include <unistd.h>

#include <algorithm>
#include <utility>
#include <memory>
#include <set>

#include <quor/qlib.h>
#include <quor/quor.h>
#include <quor/quor_web.h>

#include "backend_fs/tesselBackend_fs.h"
#include "common/tessel_json.h"
#include "common/tessel_priv.h"
#include "common/tessel_report.h"
#include "tessel_binary.h"
#include "tessel_file.h"
#include "tessel_id.h"

static constexpr const char kTesselModule[] = "backend_fs/utils";

namespace {

// Every member is written "<name>":[ so that its place in the text can be
// found again after parsing.
constexpr const char kFieldTable[] =
    "{"
    "\"ns\":[\"id_path\",true,false,false],"
    "\"owner\":[\"id_path\",true,false,false],"
    "\"id\":[\"id_path\",true,false,false],"
    "\"category\":[\"basic.json\",true,false,false],"
    "\"parent_id\":[\"basic.json\",true,true,false],"
    "\"ctime\":[\"basic.json\",true,false,false],"
    "\"acl\":[\"basic.json\",true,true,false],"
    "\"ver\":[\"version\",true,false,false],"
    "\"mtime\":[\"version\",true,false,false],"
    "\"commit_msg\":[\"version\",false,false,false],"
    "\"text\":[\"version\",false,false,true],"
    "\"binary_info\":[\"version\",false,false,true],"
    "\"binary\":[\"version\",false,false,true],"
    "\"commit_cnt\":[\"git_info.json\",false,false,false],"
    "\"listable_commit_cmt\":[\"git_info.json\",false,false,false],"
    "\"person\":[\"person\",false,false,true],"
    "\"metatext\":[\"metatext.json\",false,true,true],"
    "\"metabinary_info\":[\"metabinary_info\",false,false,true],"
    "\"metabinary_files\":[\"metabinary\",false,true,true]"
    "}";

// The two variables of the web server's gateway interface that a download
// reads: the client's cached entity tag and its user agent.
constexpr const char SZ_ENV_IF_NONE_MATCH[] = "HTTP_IF_NONE_MATCH";
constexpr const char SZ_ENV_USER_AGENT[] = "HTTP_USER_AGENT";
// Clients that do not understand a raw UTF-8 file name in the attachment header.
constexpr const char *const SZ_URLENCODE_AGENTS[] = {"MSIE", "Trident/7"};
// Whatever is stored under a name may change with any save; the entity tag
// makes asking again cheap (a 304), so a response expires at once.
constexpr time_t kExpiresAfter = 0;

constexpr const char SZK_MD5[] = "md5";
constexpr const char SZK_NAME[] = "name";
constexpr const char SZK_FILENAME[] = "filename";
constexpr const char SZK_AUTO_MTIME[] = "auto_mtime";
constexpr const char SZ_SEGMENT_BINARY[] = "binary";
constexpr const char SZ_SEGMENT_METABINARY[] = "metabinary";
constexpr const char SZ_FORMAT_BASE64[] = "base64";
constexpr const char SZ_FORMAT_RAW[] = "raw";
constexpr const char SZ_MODE_DOWNLOAD[] = "download";

// Data directory -> description directory.
constexpr const char *const SZ_INFO_DIRS[][2] = {{"binary", "binary_info"}, {"metabinary", "metabinary_info"}};

bool HasLineBreak(const std::string &strText) { return std::string::npos != strText.find_first_of("\r\n"); }

// A directory name taken literally by glob.
std::string GlobEscape(const std::string &strDir) {
    std::string strOut;
    for (char c : strDir) {
        if (NULL != strchr("*?[]\\", c)) {
            strOut.push_back('\\');
        }
        strOut.push_back(c);
    }
    return strOut;
}

// The names a selection asks for; false when it asks for every file.
bool SelectedNames(const Json::Value &jSelect, std::set<std::string> &names) {
    if (jSelect.isObject()) {
        for (Json::Value::const_iterator it = jSelect.begin(); it != jSelect.end(); ++it) {
            if (it->isBool() && it->asBool()) {
                names.insert(it.name());
            }
        }
        return true;
    }
    if (jSelect.isArray()) {
        for (const Json::Value &jName : jSelect) {
            if (jName.isString()) {
                names.insert(jName.asString());
            }
        }
        return true;
    }
    return false;
}

// Inside a quoted-string a quote or backslash is written escaped.
std::string QuotedText(const std::string &strText) {
    std::string strOut;
    for (char c : strText) {
        if ('"' == c || '\\' == c) {
            strOut.push_back('\\');
        }
        strOut.push_back(c);
    }
    return strOut;
}

std::string AttachmentName(const std::string &strFileName) {
    const char *szAgent = getenv(SZ_ENV_USER_AGENT);
    if (NULL != szAgent) {
        for (const char *szOld : SZ_URLENCODE_AGENTS) {
            if (NULL != strstr(szAgent, szOld)) {
                return QUOR_WebAPIUtil_URLEncode(strFileName);
            }
        }
    }
    return QuotedText(strFileName);
}

std::string ExpiresText() {
    const time_t expires = time(NULL) + kExpiresAfter;
    struct tm tmExpires;
    char szDate[64] = "";
    gmtime_r(&expires, &tmExpires);
    strftime(szDate, sizeof(szDate), "%a, %d %b %Y %T GMT", &tmExpires);
    return szDate;
}

}  // namespace

namespace tessel {

const char *FsFieldTableText() { return kFieldTable; }

bool FsParseFieldTable(Json::Value &jTable, std::vector<std::string> &order) {
    // The text is compiled in, so it is parsed once for the process; every
    // store made for an operation takes a copy, which costs a fraction of
    // parsing it again.
    struct Parsed {
        bool blOk = false;
        Json::Value jTable;
        std::vector<std::string> order;
    };
    static const Parsed s_parsed = [] {
        Parsed parsed;
        const std::string strText = kFieldTable;
        if (!fromString(parsed.jTable, strText) || !parsed.jTable.isObject()) {
            return parsed;
        }
        // The names in the order the text gives them.
        std::vector<std::pair<size_t, std::string>> places;
        for (const std::string &strName : parsed.jTable.getMemberNames()) {
            places.emplace_back(strText.find("\"" + strName + "\":["), strName);
        }
        std::sort(places.begin(), places.end());
        for (auto &place : places) {
            parsed.order.push_back(std::move(place.second));
        }
        parsed.blOk = true;
        return parsed;
    }();
    TESSEL_CHECK(!s_parsed.blOk, TESSEL_ERR_UNEXPECTED, "!jTable.fromString(kFieldTable)", false);
    jTable = s_parsed.jTable;
    order = s_parsed.order;
    return true;
}

void FsPathInfoByBase(const std::string &strBase, Json::Value &jPathInfo) {
    jPathInfo[TESSEL_ID_PATH] = strBase;
    for (const char *szEntry :
         {TESSEL_BASIC, TESSEL_META_TEXT, TESSEL_META_BIN, TESSEL_META_BIN_INFO, TESSEL_VERSION, TESSEL_TEXT_PATH,
          TESSEL_BIN_PATH, TESSEL_BIN_INFO_PATH, TESSEL_GIT_INFO, TESSEL_PERSON_PATH}) {
        jPathInfo[szEntry] = strBase + "/" + szEntry;
    }
}

void FsPathInfoByGitBase(const std::string &strBase, Json::Value &jPathInfo) {
    for (const char *szEntry : {TESSEL_GIT_TEXT, TESSEL_GIT_BIN, TESSEL_GIT_BIN_INFO}) {
        jPathInfo[szEntry] = strBase + "/" + szEntry;
    }
}

std::string FsScratchName() {
    char szName[64];
    snprintf(szName, sizeof(szName), "%d%ld", static_cast<int>(getpid()), static_cast<long>(syscall(SYS_gettid)));
    return szName;
}

}  // namespace tessel

namespace tessel {

bool FsReadBinaryInfos(const std::string &strDir, const Json::Value &jSelect, Json::Value &jOut) {
    jOut = Json::Value(Json::objectValue);
    std::set<std::string> wanted;
    const bool blSome = SelectedNames(jSelect, wanted);
    if (blSome && wanted.empty()) {
        return true;
    }
    TESSEL_AS_ROOT();
    glob_t globbuf;
    memset(&globbuf, 0, sizeof(globbuf));
    const std::string strPattern = GlobEscape(strDir) + "/*";
    const int rv = glob(strPattern.c_str(), 0, NULL, &globbuf);
    std::unique_ptr<glob_t, void (*)(glob_t *)> freeGlob(&globbuf, globfree);
    // No file, or no directory yet: nothing described.
    if (GLOB_NOMATCH == rv) {
        return true;
    }
    if (0 != rv) {
        TESSEL_LOG(LOG_ERR, "glob fail, path=%s, rv=%d\n", strPattern.c_str(), rv);
        TESSEL_RAISE(TESSEL_ERR_READ_FILE, "glob fail, path=%s, rv=%d", strPattern.c_str(), rv);
        return false;
    }
    for (size_t i = 0; i < globbuf.gl_pathc; ++i) {
        const std::string strPath = globbuf.gl_pathv[i];
        std::string strNameEncode = strPath.substr(strPath.rfind('/') + 1);
        // An encoded name has no '.': this is a writer's temporary file.
        if (std::string::npos != strNameEncode.find('.')) {
            continue;
        }
        std::string strName;
        TESSEL_CHECK_APPEND(!TesselDecode(strNameEncode, strName), "!TesselDecode(strNameEncode, strName)", false);
        if (blSome && 0 == wanted.count(strName)) {
            continue;
        }
        Json::Value jInfo;
        if (!fromFile(jInfo, strPath) || !jInfo.isObject()) {
            TESSEL_LOG(LOG_ERR, "failed to read the description [%s] of [%s]", strPath.c_str(), strName.c_str());
            continue;
        }
        jOut[strName] = jInfo;
    }
    return true;
}

bool FsReadWholeFile(const std::string &strFile, std::string &strData) {
    std::unique_ptr<FILE, int (*)(FILE *)> file(fopen(strFile.c_str(), "rb"), fclose);
    TESSEL_CHECK(!file, TESSEL_ERR_OPEN_FILE, "NULL == fopen(strFile.c_str(), \"rb\")", false);
    strData.clear();
    char buf[65536];
    size_t n = 0;
    while (0 < (n = fread(buf, 1, sizeof(buf), file.get()))) {
        strData.append(buf, n);
    }
    TESSEL_CHECK(ferror(file.get()), TESSEL_ERR_READ_FILE, "ferror(file)", false);
    return true;
}

bool OpenBinaryAndPrint(bool blBase64, const std::string &strFile, const std::string &strFileName,
                        const std::string &strEtag, bool blAttachment, const Json::Value &jHeaders) {
    TESSEL_CHECK(!QLIBCFileExist(strFile.c_str()), TESSEL_ERR_UNEXPECTED, "!QLIBCFileExist(strFile.c_str())", false);
    // Everything that goes into a header line is checked before the first
    // byte is printed: afterwards a failure can no longer reach the client.
    TESSEL_CHECK(!jHeaders.isNull() && !jHeaders.isObject(), TESSEL_ERR_BAD_PARAMETERS,
                 "!jHeaders.isNull() && !jHeaders.isObject()", false);
    for (Json::Value::const_iterator it = jHeaders.begin(); it != jHeaders.end(); ++it) {
        if (!it->isString() || it.name().empty() || HasLineBreak(it.name()) || HasLineBreak(it->asString())) {
            TESSEL_RAISE(TESSEL_ERR_BAD_PARAMETERS, "bad header [%s]", it.name().c_str());
            return false;
        }
    }
    TESSEL_CHECK(HasLineBreak(strFileName) || HasLineBreak(strEtag), TESSEL_ERR_BAD_PARAMETERS,
                 "HasLineBreak(strFileName) || HasLineBreak(strEtag)", false);
    HTTPFileOutputer file_outputer;
    std::string strAttachment;
    if (blAttachment) {
        strAttachment = "Content-Disposition:attachment; filename=\"" + AttachmentName(strFileName) + "\"\r\n";
    }
    std::string strExtra;
    for (Json::Value::const_iterator it = jHeaders.begin(); it != jHeaders.end(); ++it) {
        strExtra += it.name() + ": " + it->asString() + "\r\n";
    }

    if (!blBase64) {
        fputs(strAttachment.c_str(), stdout);
        fputs(strExtra.c_str(), stdout);
        TESSEL_CHECK(0 > file_outputer.Output(strFile.c_str(), file_outputer.GetMimeType(strFileName.c_str()).c_str()),
                     TESSEL_ERR_OPERATION_FAILED,
                     "0 > file_outputer.Output(strFile.c_str(), "
                     "file_outputer.GetMimeType(strFileName.c_str()).c_str())",
                     false);
        return true;
    }

    std::string strBlock;
    TESSEL_CHECK_APPEND(!FsReadWholeFile(strFile, strBlock), "!FsReadWholeFile(strFile, strBlock)", false);
    const size_t size = strBlock.size();
    TESSEL_CHECK(size == 0, TESSEL_ERR_READ_FILE, "size == 0", false);
    // Room for the terminating zero, which Content-Length counts as well.
    const size_t sizeBase64 = (size + 2) / 3 * 4 + 1;
    std::unique_ptr<char[]> bBlock2(new (std::nothrow) char[sizeBase64]);
    TESSEL_CHECK(!bBlock2, TESSEL_ERR_OUT_OF_MEMORY, "NULL == bBlock2", false);
    TESSEL_CHECK(!QLIBCBase64SzEncodeFull((const unsigned char *)strBlock.data(), size, bBlock2.get(), sizeBase64,
                                          FALSE),
                 TESSEL_ERR_OPERATION_FAILED,
                 "!QLIBCBase64SzEncodeFull((unsigned char *)bBlock, size, bBlock2, sizeBase64, FALSE)", false);
    printf("Content-Type:%s\r\n", file_outputer.GetMimeType(strFileName.c_str()).c_str());
    fputs(strAttachment.c_str(), stdout);
    printf("Content-Length: %zu\r\n", sizeBase64);
    printf("ETag:%s\r\n", strEtag.c_str());
    printf("Expires:%s\r\n", ExpiresText().c_str());
    fputs(strExtra.c_str(), stdout);
    fputs("\r\n", stdout);
    fputs(bBlock2.get(), stdout);
    TESSEL_CHECK(0 != fflush(stdout) || ferror(stdout), TESSEL_ERR_OPERATION_FAILED,
                 "0 != fflush(stdout) || ferror(stdout)", false);
    return true;
}

}  // namespace tessel

// ---- stored files of the file-system store -------------------------------------

bool TESSEL_BACKEND_FS::mf_GetBinaryInfoPath(const std::string &strFile, std::string &strInfo) {
    const size_t pos = strFile.rfind('/');
    const std::string strDir = (std::string::npos == pos) ? std::string() : strFile.substr(0, pos);
    const size_t posDir = strDir.rfind('/');
    const std::string strLast = (std::string::npos == posDir) ? strDir : strDir.substr(posDir + 1);
    for (const auto &dirs : SZ_INFO_DIRS) {
        if (strLast == dirs[0]) {
            strInfo = strDir.substr(0, strDir.size() - strLast.size()) + dirs[1] + strFile.substr(pos);
            return true;
        }
    }
    TESSEL_LOG(LOG_ERR, "cannot find the binary info path, binary file=%s", strFile.c_str());
    TESSEL_RAISE(TESSEL_ERR_BAD_PARAMETERS, "cannot find the binary info path, binary file=%s", strFile.c_str());
    return false;
}

bool TESSEL_BACKEND_FS::mf_MakeBinaryInfo(const std::string &strFile, const std::string &strFileName, int64_t mtime,
                                          bool blMerge) {
    const size_t pos = strFile.find('/');
    TESSEL_CHECK(pos == std::string::npos, TESSEL_ERR_BAD_PARAMETERS, "pos == string::npos", false);
    std::string strInfo;
    TESSEL_CHECK_APPEND(!mf_GetBinaryInfoPath(strFile, strInfo), "!mf_GetBinaryInfoPath(strFile, strInfo)", false);
    TESSEL_AS_ROOT();
    TESSEL_CHECK(!QLIBCFileExist(strFile.c_str()), TESSEL_ERR_UNEXPECTED, "!QLIBCFileExist(strFile.c_str())", false);
    std::string strMd5;
    TESSEL_CHECK_APPEND(!TesselObjectEvalFileMd5(strFile.c_str(), strMd5),
                        "!TesselObjectEvalFileMd5(strFile.c_str(), strMd5)", false);
    TESSEL_CHECK(strMd5 == "", TESSEL_ERR_UNEXPECTED, "strMd5 == \"\"", false);
    Json::Value jInfo(Json::objectValue);
    // An unreadable earlier description is replaced, not merged.
    if (blMerge && QLIBCFileExist(strInfo.c_str()) && (!tessel::fromFile(jInfo, strInfo) || !jInfo.isObject())) {
        jInfo = Json::Value(Json::objectValue);
    }
    jInfo[SZK_MD5] = strMd5;
    jInfo[SZK_NAME] = strFileName;
    jInfo[SZK_AUTO_MTIME] = (Json::Int64)mtime;
    TESSEL_CHECK_APPEND(!TesselJsonToFile(jInfo, strInfo), "!TesselJsonToFile(jInfo, strInfo)", false);
    return true;
}

bool TESSEL_BACKEND_FS::mf_GetBinaryInfoByDir(const std::string &strDir, Json::Value &jOut, const char *szMember) {
    const Json::Value &jParm = m_jParm;
    const Json::Value &jField = jParm["field"];
    const Json::Value jSelect = jField.isObject() ? jField[szMember] : Json::Value();
    Json::Value jInfos;
    TESSEL_CHECK_APPEND(!tessel::FsReadBinaryInfos(strDir, jSelect, jInfos),
                        "!FsReadBinaryInfos(strDir, jSelect, jInfos)", false);
    jOut[szMember] = jInfos;
    return true;
}

bool TESSEL_BACKEND_FS::mf_CopyFile(const std::string &strSrc, const std::string &strDest) {
    QUORFILECOPYARG copyArg = {TRUE, FALSE, FALSE};
    TESSEL_AS_ROOT();
    TESSEL_CHECK(0 > QUORFileCopy(strSrc.c_str(), strDest.c_str(), &copyArg), TESSEL_ERR_COPY_FILE,
                 "0 > QUORFileCopy(strSrc.c_str(), strDest.c_str(), &copyArg)", false);
    TESSEL_CHECK(0 > chmod(strDest.c_str(), 0640), TESSEL_ERR_COPY_FILE, "0 > chmod(strDest.c_str(), 0640)", false);
    return true;
}

bool TESSEL_BACKEND_FS::mf_GetBinaryObjectPath(const Json::Value &jItem, Json::Value &jPathInfo) {
    TESSEL_CHECK(!jItem.isObject(), TESSEL_ERR_BAD_PARAMETERS, "!jItem.isObject()", false);
    TESSEL_CHECK(!jItem.isMember("id"), TESSEL_ERR_BAD_PARAMETERS, "!jItem.isMember(\"id\")", false);
    TESSEL_CHECK(!jItem.isMember("name"), TESSEL_ERR_BAD_PARAMETERS, "!jItem.isMember(\"name\")", false);
    TESSEL_CHECK(!jItem["id"].isString(), TESSEL_ERR_BAD_PARAMETERS, "!jItem[\"id\"].isString()", false);
    unsigned int owner = UID_ERR;
    TESSEL_CHECK_APPEND(UID_ERR == (owner = TesselObjectGetOwnerByID(jItem["id"].asString())),
                        "UID_ERR == (owner = TesselObjectGetOwnerByID(jItem[\"id\"].asString()))", false);
    // The other object lives in this request's namespace: a request never
    // reaches into a namespace it was not admitted to.
    const Json::Value &jParm = m_jParm;
    Json::Value jOther(Json::objectValue);
    jOther["ns"] = jParm["ns"];
    jOther["id"] = jItem["id"];
    jOther["owner"] = owner;
    if (jParm.isMember("requester")) {
        jOther["requester"] = jParm["requester"];
    }
    jPathInfo = Json::Value(Json::objectValue);
    TESSEL_CHECK_APPEND(!mf_GetPathInfo(jOther, jPathInfo, NULL), "!mf_GetPathInfo(jOther, jPathInfo, NULL)", false);
    return true;
}

bool TESSEL_BACKEND_FS::mf_DownloadBinaryByDir(const std::string &strBinaryDir, const std::string &strBinaryInfoDir) {
    const Json::Value &jParm = m_jParm;
    TESSEL_CHECK(!jParm.isMember("field"), TESSEL_ERR_BAD_PARAMETERS, "!m_jParm.isMember(\"field\")", false);
    TESSEL_CHECK(!jParm.isMember("format"), TESSEL_ERR_BAD_PARAMETERS, "!m_jParm.isMember(\"format\")", false);
    TESSEL_CHECK(!jParm["field"].isString(), TESSEL_ERR_BAD_PARAMETERS, "!m_jParm[\"field\"].isString()", false);
    std::string strFileNameEncode;
    TESSEL_CHECK_APPEND(!TesselEncode(jParm["field"].asString(), strFileNameEncode),
                        "!TesselEncode(m_jParm[\"field\"].asString(), strFileNameEncode)", false);
    const std::string strBinaryFilePath = strBinaryDir + "/" + strFileNameEncode;
    const std::string strBinaryInfoFilePath = strBinaryInfoDir + "/" + strFileNameEncode;
    TESSEL_AS_ROOT();
    TESSEL_CHECK(!QLIBCFileExist(strBinaryFilePath.c_str()), TESSEL_ERR_UNEXPECTED,
                 "!QLIBCFileExist(strBinaryFilePath.c_str())", false);
    TESSEL_CHECK(!QLIBCFileExist(strBinaryInfoFilePath.c_str()), TESSEL_ERR_UNEXPECTED,
                 "!QLIBCFileExist(strBinaryInfoFilePath.c_str())", false);
    Json::Value jInfo;
    TESSEL_CHECK(!tessel::fromFile(jInfo, strBinaryInfoFilePath) || !jInfo.isObject(), TESSEL_ERR_READ_FILE,
                 "!jInfo.fromFile(strBinaryInfoFilePath) || !jInfo.isObject()", false);
    TESSEL_CHECK(!jInfo[SZK_MD5].isString(), TESSEL_ERR_UNEXPECTED, "!jInfo[\"md5\"].isString()", false);
    const std::string strEtag = jInfo[SZK_MD5].asString();
    // An attachment only when the client asked to save the file; it is
    // named by the description ("filename" before "name"), else as asked.
    const bool blAttachment = jParm["mode"].isString() && SZ_MODE_DOWNLOAD == jParm["mode"].asString();
    std::string strFileName = jParm["field"].asString();
    for (const char *szKey : {SZK_FILENAME, SZK_NAME}) {
        if (jInfo[szKey].isString() && !jInfo[szKey].asString().empty()) {
            strFileName = jInfo[szKey].asString();
            break;
        }
    }

    const char *szIfNoneMatch = getenv(SZ_ENV_IF_NONE_MATCH);
    if (NULL != szIfNoneMatch && strEtag == szIfNoneMatch) {
        fputs("Status: 304 Not Modified\r\n\r\n", stdout);
        TESSEL_CHECK(0 != fflush(stdout), TESSEL_ERR_OPERATION_FAILED, "0 != fflush(stdout)", false);
        return true;
    }
    const std::string strFormat = jParm["format"].isString() ? jParm["format"].asString() : std::string();
    if (SZ_FORMAT_BASE64 != strFormat && SZ_FORMAT_RAW != strFormat) {
        const std::string strParm = tessel::toString(jParm);
        TESSEL_LOG(LOG_ERR, "wrong foramt, jParm=%s\n", strParm.c_str());
        TESSEL_RAISE(TESSEL_ERR_BAD_PARAMETERS, "wrong foramt, jParm=%s", strParm.c_str());
        return false;
    }
    TESSEL_CHECK_APPEND(!tessel::OpenBinaryAndPrint(SZ_FORMAT_BASE64 == strFormat, strBinaryFilePath, strFileName,
                                                    strEtag, blAttachment, jParm["headers"]),
                        "!OpenBinaryAndPrint(blBase64, strBinaryFilePath, strFileName, strEtag, blAttachment, "
                        "m_jParm[\"headers\"])",
                        false);
    return true;
}

bool TESSEL_BACKEND_FS::Download(const Json::Value &jParm) {
    TESSEL_CHECK(!jParm.isMember("segment"), TESSEL_ERR_BAD_PARAMETERS, "!jParm.isMember(\"segment\")", false);
    TESSEL_CHECK_APPEND(!mf_init(jParm), "!mf_init(jParm)", false);
    const std::string strSegment = jParm["segment"].isString() ? jParm["segment"].asString() : std::string();
    if (SZ_SEGMENT_BINARY == strSegment) {
        TESSEL_CHECK_APPEND(!mf_DownloadVersionBinary(), "!mf_DownloadVersionBinary()", false);
        return true;
    }
    if (SZ_SEGMENT_METABINARY == strSegment) {
        TESSEL_CHECK_APPEND(!mf_DownloadMetaBinary(), "!mf_DownloadMetaBinary()", false);
        return true;
    }
    const std::string strParm = tessel::toString(jParm);
    TESSEL_LOG(LOG_ERR, "segment error, jParm=%s\n", strParm.c_str());
    TESSEL_RAISE(TESSEL_ERR_BAD_PARAMETERS, "segment error, jParm=%s", strParm.c_str());
    return false;
}
