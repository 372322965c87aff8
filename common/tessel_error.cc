// The code table, the per-thread error stack and the reporting helpers that
// every module goes through.
#include <errno.h>
#include <stdarg.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <syslog.h>

#include <string>

#include "common/tessel_report.h"
#include "tessel_error.h"

static constexpr const char kTesselModule[] = "common/tessel_error";

extern "C" {

const TESSEL_ERROR_STRING rgErrorString[TESSEL_ERROR_STRING_COUNT] = {
    {1000, "Operation failed.", "common", "error_system"},
    {1001, "Lock failed.", NULL, NULL},
    {1002, "Open File failed.", NULL, NULL},
    {1003, "Read file/data failed.", NULL, NULL},
    {1005, "Write DB data failed.", NULL, NULL},
    {1004, "Create DB data failed.", NULL, NULL},
    {1006, "Delete DB data failed.", NULL, NULL},
    {1007, "User input error.", NULL, NULL},
    {1008, "Object not exists.", NULL, NULL},
    {1009, "Operation is unavailable in demo mode.", NULL, NULL},
    {1010, "No such backend.", NULL, NULL},
    {1011, "User home is disabled.", NULL, NULL},
    {1012, "Namespace is disabled.", NULL, NULL},
    {1013, "No function table in namespace module.", NULL, NULL},
    {1014, "Allocate memory failed.", NULL, NULL},
    {1015, "Bad use by passing parameters.", NULL, NULL},
    {1016, "Should not have the error, please check it.", NULL, NULL},
    {1017, "Plugin is not initialized.", NULL, NULL},
    {1018, "Plugin initialized failed.", NULL, NULL},
    {1019, "Execute plugin failed.", NULL, NULL},
    {1020, "Sharing is not enabled for the object.", NULL, NULL},
    {1021, "Failed to get user group list.", NULL, NULL},
    {1022, "User not exists.", NULL, NULL},
    {1023, "No permission for the object.", NULL, NULL},
    {1024, "PostgresSQL service is disabled.", NULL, NULL},
    {1025, "Create DB failed.", NULL, NULL},
    {1026, "Configuration file is corrupted.", NULL, NULL},
    {1027, "tessel is disabled.", NULL, NULL},
    {1028, "No application privilege for the namespace.", NULL, NULL},
    {1029, "Update configuration file failed.", NULL, NULL},
    {1030, "Object owner is disabled or expired.", NULL, NULL},
    {1031, "Object ID already exists.", NULL, NULL},
};

}  // extern "C"

namespace {

// Created empty on the thread's first use, destroyed when the thread exits.
// The application holds a writable reference to it; whatever it stored there,
// the error calls keep working on an array.
Json::Value &ThreadStack() {
    thread_local Json::Value jErrMsg(Json::arrayValue);
    if (!jErrMsg.isArray()) {
        jErrMsg = Json::Value(Json::arrayValue);
    }
    return jErrMsg;
}

constexpr size_t kMaxBlindSize = 1u << 20;

// vsnprintf into a heap buffer that grows until the text fits. Any allocation
// failure yields an empty text rather than a visible error.
std::string FormatMessage(const char *szFormat, va_list ap) {
    if (NULL == szFormat) {
        return std::string();
    }
    size_t size = 1024;
    char *szBuf = static_cast<char *>(malloc(size));
    if (NULL == szBuf) {
        return std::string();
    }
    for (;;) {
        va_list aq;
        va_copy(aq, ap);
        int n = vsnprintf(szBuf, size, szFormat, aq);
        va_end(aq);
        if (0 <= n && static_cast<size_t>(n) < size) {
            break;
        }
        // A negative result without a size (an encoding error) would repeat
        // at every size: give up once doubling has reached 1 MiB.
        if (0 > n && size >= kMaxBlindSize) {
            free(szBuf);
            return std::string();
        }
        size = (0 <= n) ? static_cast<size_t>(n) + 1 : size * 2;
        char *szGrown = static_cast<char *>(realloc(szBuf, size));
        if (NULL == szGrown) {
            free(szBuf);
            return std::string();
        }
        szBuf = szGrown;
    }
    std::string strMsg(szBuf);
    free(szBuf);
    return strMsg;
}

Json::Value MakeFrame(const char *szFile, int line, const char *szFormat, va_list ap) {
    Json::Value jFrame(Json::objectValue);
    jFrame["file"] = (NULL == szFile) ? "" : szFile;
    jFrame["line"] = line;
    jFrame["msg"] = FormatMessage(szFormat, ap);
    return jFrame;
}

// Frames may have been edited by the application: a member of the wrong type
// prints as a missing one instead of throwing from inside a report.
const char *FrameText(const Json::Value &jFrame, const char *szKey) {
    return (jFrame.isObject() && jFrame[szKey].isString()) ? jFrame[szKey].asCString() : "----";
}

int FrameLine(const Json::Value &jFrame) {
    return (jFrame.isObject() && jFrame["line"].isInt()) ? jFrame["line"].asInt() : 0;
}

// Frame 0's code, or false when it has none.
bool RootCode(const Json::Value &jStack, int &code) {
    const Json::Value &jRoot = jStack[0u];
    if (!jRoot.isObject() || !jRoot.isMember("code")) {
        return false;
    }
    code = jRoot["code"].isInt() ? jRoot["code"].asInt() : -1;
    return true;
}

}  // namespace

extern "C" {

void TesselErrSetEx(int code, const char *szFile, int line, const char *szFormat, ...) {
    va_list ap;
    va_start(ap, szFormat);
    Json::Value jFrame = MakeFrame(szFile, line, szFormat, ap);
    va_end(ap);
    jFrame["code"] = code;
    Json::Value &jStack = ThreadStack();
    jStack = Json::Value(Json::arrayValue);
    jStack.append(jFrame);
}

void TesselErrAppendEx(const char *szFile, int line, const char *szFormat, ...) {
    va_list ap;
    va_start(ap, szFormat);
    Json::Value jFrame = MakeFrame(szFile, line, szFormat, ap);
    va_end(ap);
    ThreadStack().append(jFrame);
}

int TesselErrCodeGet(void) {
    const Json::Value &jStack = ThreadStack();
    if (jStack.empty()) {
        return 0;
    }
    int code = -1;
    return RootCode(jStack, code) ? code : -1;
}

void TesselErrSyslog(void) {
    const Json::Value &jStack = ThreadStack();
    if (jStack.empty()) {
        return;
    }
    syslog(LOG_ERR, "%s:%d tessel call stack:", kTesselModule, __LINE__);
    for (Json::ArrayIndex i = jStack.size(); i-- > 0;) {
        const Json::Value &jFrame = jStack[i];
        syslog(LOG_ERR, "%s:%d   %s (%s:%d)", kTesselModule, __LINE__, FrameText(jFrame, "msg"),
               FrameText(jFrame, "file"), FrameLine(jFrame));
    }
    int code = 0;
    if (RootCode(jStack, code)) {
        for (const TESSEL_ERROR_STRING &entry : rgErrorString) {
            if (entry.code == code) {
                syslog(LOG_ERR, "%s:%d   ErrNo=[%d] (%s)", kTesselModule, __LINE__, code, entry.message);
            }
        }
    }
}

void TesselErrPrint(FILE *stream) {
    const Json::Value &jStack = ThreadStack();
    if (jStack.empty()) {
        return;
    }
    FILE *out = (NULL == stream) ? stderr : stream;
    fprintf(out, "tessel call stack:\n");
    for (Json::ArrayIndex i = jStack.size(); i-- > 0;) {
        const Json::Value &jFrame = jStack[i];
        fprintf(out, "  %s (%s:%d)\n", FrameText(jFrame, "msg"), FrameText(jFrame, "file"), FrameLine(jFrame));
    }
    int code = 0;
    if (RootCode(jStack, code)) {
        for (const TESSEL_ERROR_STRING &entry : rgErrorString) {
            if (entry.code == code) {
                fprintf(out, "  ErrNo=[%d] (%s)\n", code, entry.message);
            }
        }
    }
}

}  // extern "C"

Json::Value &TesselErrMsgGet() { return ThreadStack(); }

const char *TesselErrGetString(int code, const char **pszSection) {
    const TESSEL_ERROR_STRING *pFound = NULL;
    for (const TESSEL_ERROR_STRING &entry : rgErrorString) {
        if (entry.code == code) {
            pFound = &entry;  // a later matching entry wins
        }
    }
    if (NULL == pFound) {
        return "";
    }
    if (NULL != pszSection) {
        *pszSection = (NULL == pFound->section) ? "" : pFound->section;
    }
    return pFound->key;
}

namespace tessel {

namespace {

std::string VFormat(const char *szFormat, va_list ap) { return FormatMessage(szFormat, ap); }

}  // namespace

void ReportSet(const char *szModule, int line, int code, const char *szFormat, ...) {
    int savedErrno = errno;
    va_list ap;
    va_start(ap, szFormat);
    std::string strMsg = VFormat(szFormat, ap);
    va_end(ap);
    errno = savedErrno;
    syslog(LOG_ERR, "%s:%d Failed [%s], err=%m\n", szModule, line, strMsg.c_str());
    TesselErrSetEx(code, szModule, line, "%s", strMsg.c_str());
    errno = savedErrno;
}

void ReportAppend(const char *szModule, int line, const char *szFormat, ...) {
    int savedErrno = errno;
    va_list ap;
    va_start(ap, szFormat);
    std::string strMsg = VFormat(szFormat, ap);
    va_end(ap);
    errno = savedErrno;
    syslog(LOG_ERR, "%s:%d Failed [%s], err=%m\n", szModule, line, strMsg.c_str());
    TesselErrAppendEx(szModule, line, "%s", strMsg.c_str());
    errno = savedErrno;
}

void ReportLog(const char *szModule, int line, const char *szFormat, ...) {
    int savedErrno = errno;
    va_list ap;
    va_start(ap, szFormat);
    std::string strMsg = VFormat(szFormat, ap);
    va_end(ap);
    errno = savedErrno;
    syslog(LOG_ERR, "%s:%d Failed [%s], err=%m\n", szModule, line, strMsg.c_str());
    errno = savedErrno;
}

void LogLine(int priority, const char *szModule, int line, const char *szFormat, ...) {
    int savedErrno = errno;
    va_list ap;
    va_start(ap, szFormat);
    std::string strMsg = VFormat(szFormat, ap);
    va_end(ap);
    errno = savedErrno;
    syslog(priority, "%s:%d %s", szModule, line, strMsg.c_str());
    errno = savedErrno;
}

}  // namespace tessel
