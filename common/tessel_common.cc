// Name encoding, whole-file writes and reads serialised by flock, and the
// one-level difference of two JSON objects.
#include <ctype.h>
#include <errno.h>
#include <fcntl.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include <fstream>
#include <memory>
#include <string>
#include <vector>

#include <quor/qlib.h>

#include "common/tessel_json.h"
#include "common/tessel_report.h"
#include "tessel_file.h"

static constexpr const char kTesselModule[] = "common/tessel_common";

namespace {

// Writers and readers give a busy file about 2.5 s: six tries, half a second
// apart. Long enough to outlast another process's write, short enough that a
// stuck holder turns into an error instead of a hung request.
constexpr int kLockTries = 6;
constexpr useconds_t kLockPauseUs = 500000;

struct FreeDeleter {
    void operator()(void *p) const { free(p); }
};

// Room for the base64 text and its terminator; without blBase64Only, room for
// every base64 character to become a five-character escape.
size_t CountEncodeSize(size_t nIn, bool blBase64Only) {
    if (blBase64Only) {
        return ((nIn + 2) / 3 * 4) | 1;
    }
    return (nIn + 2) / 3 * 20 + 5;
}

// Only upper-case letters and digits survive a case-insensitive file system
// unchanged; everything else of the base64 alphabet becomes "{code}".
bool KeepsItsCase(unsigned char c) { return ('A' <= c && c <= 'Z') || ('0' <= c && c <= '9'); }

// Undoes the "{code}" escapes of szIn (nIn bytes, zero-terminated) into
// strResult. The loop works on the whole length, so an embedded zero byte
// reaches the base64 decoder and is refused there instead of cutting the
// input short.
bool Unescape(const char *szIn, size_t nIn, std::string &strResult) {
    const char *szCur = szIn;
    const char *szLimit = szIn + nIn;
    while (szCur < szLimit) {
        const char *szStart = static_cast<const char *>(memchr(szCur, '{', szLimit - szCur));
        if (NULL == szStart) {
            strResult.append(szCur, szLimit - szCur);
            break;
        }
        strResult.append(szCur, szStart - szCur);
        const char *szEnd = static_cast<const char *>(memchr(szStart, '}', szLimit - szStart));
        TESSEL_CHECK_APPEND(NULL == szEnd, "NULL == szEnd", false);
        // Only a plain decimal byte value is an escape; anything else would
        // let two different names decode to the same bytes.
        char *szStop = NULL;
        long ch = strtol(szStart + 1, &szStop, 10);
        TESSEL_CHECK(!isdigit(static_cast<unsigned char>(szStart[1])) || szStop != szEnd || 255 < ch,
                     TESSEL_ERR_BAD_PARAMETERS,
                     "!isdigit((unsigned char)szStart[1]) || szStop != szEnd || 255 < ch", false);
        strResult.push_back(static_cast<char>(ch));
        szCur = szEnd + 1;
    }
    return true;
}

// flock with the patience above, for a descriptor the caller opened.
bool FlockPatiently(int fd, int op) {
    for (int i = 0; i < kLockTries; ++i) {
        if (0 < i) {
            usleep(kLockPauseUs);
        }
        if (0 == flock(fd, op | LOCK_NB)) {
            return true;
        }
        if (EWOULDBLOCK != errno && EINTR != errno) {
            return false;
        }
    }
    return false;
}

// A write that fails on a file that did not exist must not leave behind the
// empty file the lock created, or the next reader would take it for content.
void RemoveLockPlaceholder(int fdLock, const std::string &strPath) {
    struct stat stLock;
    struct stat stNow;
    if (0 == fstat(fdLock, &stLock) && 0 == lstat(strPath.c_str(), &stNow) && stLock.st_dev == stNow.st_dev &&
        stLock.st_ino == stNow.st_ino && 0 == stNow.st_size) {
        unlink(strPath.c_str());
    }
}

// The temporary file's part of an atomic write: create it beside the target,
// fill it, give it the target's owner and mode, and rename it over the
// target. On failure the temporary file may still exist (pszTempFile names it
// once mkstemp has run).
bool WriteAndReplace(const std::string &strData, const std::string &strPath, const struct stat *pOld,
                     char *pszTempFile, bool &blTempExists) {
    int fdTemp = mkstemp(pszTempFile);
    TESSEL_CHECK_APPEND(0 > fdTemp, "0 > fdTemp", false);
    blTempExists = true;
    close(fdTemp);

    std::ofstream ofs(pszTempFile, std::ios::out | std::ios::trunc | std::ios::binary);
    TESSEL_CHECK_APPEND(!ofs.good(), "!ofs.good()", false);
    ofs.write(strData.data(), static_cast<std::streamsize>(strData.size()));
    ofs.flush();
    TESSEL_CHECK_APPEND(!ofs.good(), "!ofs.good()", false);
    ofs.close();
    TESSEL_CHECK_APPEND(!ofs.good(), "!ofs.good()", false);

    if (NULL != pOld) {
        if (0 != chown(pszTempFile, pOld->st_uid, pOld->st_gid)) {
            TESSEL_LOG(LOG_ERR, "chown [%s] failed", pszTempFile);
        }
        if (0 != chmod(pszTempFile, pOld->st_mode & 07777)) {
            TESSEL_LOG(LOG_ERR, "chmod [%s] failed", pszTempFile);
        }
    }
    TESSEL_CHECK_APPEND(0 > rename(pszTempFile, strPath.c_str()), "0 > rename(pszTempFile, strPath.c_str())",
                        false);
    blTempExists = false;
    return true;
}

}  // namespace

bool TesselEncode(const unsigned char *szIn, size_t nIn, std::string &strOut, bool blBase64Only) {
    TESSEL_CHECK(NULL == szIn || 0 == nIn, TESSEL_ERR_BAD_PARAMETERS, "NULL == szIn || 0 == nIn", false);
    std::unique_ptr<char, FreeDeleter> szBuf(
        static_cast<char *>(calloc(CountEncodeSize(nIn, blBase64Only), sizeof(char))));
    TESSEL_CHECK(!szBuf, TESSEL_ERR_OUT_OF_MEMORY,
                 "NULL == (szBuf = (char *)calloc(CountEncodeSize(nIn, blBase64Only), sizeof(char)))", false);
    TESSEL_CHECK(!QLIBCBase64SzEncodeFull(szIn, nIn, szBuf.get(), CountEncodeSize(nIn, blBase64Only), FALSE),
                 TESSEL_ERR_OPERATION_FAILED,
                 "!QLIBCBase64SzEncodeFull((unsigned char *)szIn, nIn, szBuf, CountEncodeSize(nIn, blBase64Only), "
                 "FALSE)",
                 false);
    if (blBase64Only) {
        strOut = szBuf.get();
        return true;
    }
    std::string strEscaped;
    strEscaped.reserve(CountEncodeSize(nIn, blBase64Only));
    for (const char *p = szBuf.get(); '\0' != *p; ++p) {
        unsigned char c = static_cast<unsigned char>(*p);
        if (KeepsItsCase(c)) {
            strEscaped.push_back(static_cast<char>(c));
        } else {
            char szEscape[8];
            snprintf(szEscape, sizeof(szEscape), "{%d}", c);
            strEscaped.append(szEscape);
        }
    }
    strOut.swap(strEscaped);
    return true;
}

bool TesselEncode(const std::string &strIn, std::string &strOut, bool blBase64Only) {
    return TesselEncode(reinterpret_cast<const unsigned char *>(strIn.data()), strIn.size(), strOut, blBase64Only);
}

bool TesselDecode(const std::string &strIn, unsigned char *szOut, size_t nOut, bool blBase64Only) {
    TESSEL_CHECK(0 == strIn.length(), TESSEL_ERR_BAD_PARAMETERS, "0 == strIn.length()", false);
    std::string strResult;
    if (blBase64Only) {
        strResult = strIn;
    } else {
        std::unique_ptr<char, FreeDeleter> szIn(static_cast<char *>(calloc(strIn.length() + 1, sizeof(char))));
        TESSEL_CHECK(!szIn, TESSEL_ERR_OUT_OF_MEMORY,
                     "NULL == (szIn = (char *)calloc(strIn.length() + 1, sizeof(char)))", false);
        memcpy(szIn.get(), strIn.data(), strIn.length());
        if (!Unescape(szIn.get(), strIn.length(), strResult)) {
            return false;
        }
    }
    size_t nDecoded = nOut;
    TESSEL_CHECK(!QLIBCBase64Decode(strResult.c_str(), strResult.length(), reinterpret_cast<char *>(szOut),
                                    &nDecoded),
                 TESSEL_ERR_OPERATION_FAILED,
                 "!QLIBCBase64Decode((const char *)strResult.c_str(), strResult.length(), (char *)szOut, &nOut)",
                 false);
    return true;
}

bool TesselDecode(std::string &strIn, std::string &strOut, bool blBase64Only) {
    // Decoded data is always shorter than its text, so the buffer keeps a
    // terminating zero.
    std::vector<unsigned char> szOut(strIn.length() + 1, 0);
    TESSEL_CHECK_APPEND(!TesselDecode(strIn, szOut.data(), szOut.size(), blBase64Only),
                        "!TesselDecode(strIn, (unsigned char *)szOut, sizeof(szOut), blBase64Only)", false);
    strOut.assign(reinterpret_cast<const char *>(szOut.data()));
    return true;
}

bool TesselRawToFile(const std::string &strData, const std::string &strPath) {
    TESSEL_CHECK_APPEND(strPath.empty(), "strPath.empty()", false);
    struct stat stOld;
    const bool blExisted = (0 == stat(strPath.c_str(), &stOld));

    // The lock is taken on the target itself, so that every writer and reader
    // of this file in any process meets on it.
    int fdLock = open(strPath.c_str(), O_WRONLY | O_CREAT | O_NONBLOCK | O_CLOEXEC, 0600);
    TESSEL_CHECK_APPEND(0 > fdLock, "0 > fdLock", false);
    if (!FlockPatiently(fdLock, LOCK_EX)) {
        // Busy for too long, or flock itself failed: logged, but left for the
        // caller to report.
        TESSEL_LOG_FAILED("!FlockPatiently(fdLock, LOCK_EX)");
        close(fdLock);
        return false;
    }

    std::string strTemp = strPath + ".XXXXXX";
    bool blTempExists = false;
    bool blOk = WriteAndReplace(strData, strPath, blExisted ? &stOld : NULL, &strTemp[0], blTempExists);
    if (blTempExists) {
        unlink(strTemp.c_str());
    }
    if (!blOk && !blExisted) {
        RemoveLockPlaceholder(fdLock, strPath);
    }
    flock(fdLock, LOCK_UN);
    close(fdLock);
    return blOk;
}

bool TesselJsonToFile(const Json::Value &jVal, const std::string &strPath) {
    return TesselRawToFile(tessel::toString(jVal), strPath);
}

bool TesselRawFromFile(Json::Value &jOut, const std::string &strPath) {
    TESSEL_CHECK_APPEND(strPath.empty(), "strPath.empty()", false);
    // Non-blocking, so that a FIFO planted at the path cannot hang the open.
    int fdLock = open(strPath.c_str(), O_RDONLY | O_NONBLOCK | O_CLOEXEC);
    TESSEL_CHECK_APPEND(0 > fdLock, "0 > fdLock", false);
    struct stat st;
    if (0 != fstat(fdLock, &st) || !S_ISREG(st.st_mode)) {
        TESSEL_APPEND("0 != fstat(fdLock, &st) || !S_ISREG(st.st_mode)");
        close(fdLock);
        return false;
    }
    if (!FlockPatiently(fdLock, LOCK_SH)) {
        TESSEL_LOG_FAILED("!FlockPatiently(fdLock, LOCK_SH)");
        close(fdLock);
        return false;
    }

    bool blOk = false;
    std::string strText;
    std::ifstream ifs(strPath, std::ios::in | std::ios::binary);
    ifs.seekg(0, std::ios::end);
    std::streamoff size = ifs.tellg();
    ifs.seekg(0, std::ios::beg);
    if (ifs.good() && 0 < size) {
        strText.resize(static_cast<size_t>(size));
        ifs.read(&strText[0], static_cast<std::streamsize>(size));
    }
    if (!ifs.good()) {
        TESSEL_APPEND("!ifs.good()");
    } else {
        jOut = Json::Value(strText);
        blOk = true;
    }
    flock(fdLock, LOCK_UN);
    close(fdLock);
    return blOk;
}

bool TesselJsonDiff(const Json::Value &jData1, const Json::Value &jData2, Json::Value &jOut) {
    TESSEL_CHECK(!jData1.isObject(), TESSEL_ERR_BAD_PARAMETERS, "!jData1.isObject()", false);
    TESSEL_CHECK(!jData2.isObject(), TESSEL_ERR_BAD_PARAMETERS, "!jData2.isObject()", false);
    Json::Value jDiff(Json::arrayValue);
    for (const std::string &k : jData1.getMemberNames()) {
        Json::Value jEntry(Json::objectValue);
        jEntry["key"] = k;
        if (!jData2.isMember(k)) {
            jEntry["type"] = "del";
            jEntry["value"] = jData1[k];
        } else if (jData1[k] != jData2[k]) {
            jEntry["type"] = "sub";
            jEntry["old_value"] = jData1[k];
            jEntry["new_value"] = jData2[k];
        } else {
            continue;
        }
        jDiff.append(jEntry);
    }
    for (const std::string &k : jData2.getMemberNames()) {
        if (!jData1.isMember(k)) {
            Json::Value jEntry(Json::objectValue);
            jEntry["key"] = k;
            jEntry["type"] = "ins";
            jEntry["value"] = jData2[k];
            jDiff.append(jEntry);
        }
    }
    if (!jDiff.empty()) {
        jOut = jDiff;
    }
    return true;
}
