// The plain-function accessors of TESSEL_OBJECT_VERSION for applications.
// They follow the object record's accessors argument for argument, so an
// application handles both kinds of record the same way; bad arguments are
// reported under the names of the public headers that declare them.
#include <stdio.h>

#include <string>

#include "common/tessel_json.h"
#include "object/object_item.h"
#include "tesselobjectversion.h"
#include "tesselobjectversiongetter.h"
#include "tesselobjectversionsetter.h"

namespace {

constexpr const char kGetterModule[] = "include/tesselobjectversiongetter";
constexpr const char kSetterModule[] = "include/tesselobjectversionsetter";

typedef const std::string &(TESSEL_OBJECT_VERSION::*TextRef)() const;
typedef const Json::Value &(TESSEL_OBJECT_VERSION::*JsonRef)() const;
typedef bool (TESSEL_OBJECT_VERSION::*TextSet)(const std::string &);
typedef bool (TESSEL_OBJECT_VERSION::*JsonSwap)(Json::Value &);

int CheckBuffer(const char *szBuf, int cbBuf, const TESSEL_OBJECT_VERSION *pObject) {
    TESSEL_ITEM_CHECK(kGetterModule, NULL != szBuf, "__null != szBuf", 0);
    TESSEL_ITEM_CHECK(kGetterModule, 0 < cbBuf, "0 < cbBuf", cbBuf);
    TESSEL_ITEM_CHECK(kGetterModule, NULL != pObject, "NULL != pObject", 0);
    return 0;
}

int GetText(char *szBuf, int cbBuf, const TESSEL_OBJECT_VERSION *pObject, TextRef get) {
    if (0 != CheckBuffer(szBuf, cbBuf, pObject)) {
        return -1;
    }
    snprintf(szBuf, static_cast<size_t>(cbBuf), "%s", (pObject->*get)().c_str());
    return 0;
}

int GetJson(char *szBuf, int cbBuf, const TESSEL_OBJECT_VERSION *pObject, JsonRef get) {
    if (0 != CheckBuffer(szBuf, cbBuf, pObject)) {
        return -1;
    }
    snprintf(szBuf, static_cast<size_t>(cbBuf), "%s", tessel::toString((pObject->*get)()).c_str());
    return 0;
}

template <typename T, typename Getter>
int GetInteger(T *pVal, const TESSEL_OBJECT_VERSION *pObject, Getter get) {
    TESSEL_ITEM_CHECK(kGetterModule, NULL != pVal, "__null != pVal", 0);
    TESSEL_ITEM_CHECK(kGetterModule, NULL != pObject, "NULL != pObject", 0);
    *pVal = (pObject->*get)();
    return 0;
}

// A record without its data block cannot hold the value: -1 without a
// report, since no argument was wrong.
int SetText(TESSEL_OBJECT_VERSION *pObject, const char *szVal, TextSet set) {
    TESSEL_ITEM_CHECK(kSetterModule, NULL != szVal, "__null != szVal", 0);
    TESSEL_ITEM_CHECK(kSetterModule, NULL != pObject, "NULL != pObject", 0);
    return (pObject->*set)(szVal) ? 0 : -1;
}

// Text that is not JSON is stored as what the parse left (null), without a
// report: these setters guard only against missing arguments.
int SetJson(TESSEL_OBJECT_VERSION *pObject, const char *szVal, JsonSwap swap) {
    TESSEL_ITEM_CHECK(kSetterModule, NULL != szVal, "__null != szVal", 0);
    TESSEL_ITEM_CHECK(kSetterModule, NULL != pObject, "NULL != pObject", 0);
    Json::Value jVal;
    tessel::fromString(jVal, szVal);
    return (pObject->*swap)(jVal) ? 0 : -1;
}

template <typename T, typename Setter>
int SetInteger(TESSEL_OBJECT_VERSION *pObject, T val, Setter set) {
    TESSEL_ITEM_CHECK(kSetterModule, NULL != pObject, "__null != pObject", 0);
    return (pObject->*set)(val) ? 0 : -1;
}

}  // namespace

extern "C" {

int TesselObjectVersionItemGetNameSpace(char *szBuf, int cbBuf, const TESSEL_OBJECT_VERSION *pObject) {
    return GetText(szBuf, cbBuf, pObject, &TESSEL_OBJECT_VERSION::get_ref_ns);
}
int TesselObjectVersionItemGetID(char *szBuf, int cbBuf, const TESSEL_OBJECT_VERSION *pObject) {
    return GetText(szBuf, cbBuf, pObject, &TESSEL_OBJECT_VERSION::get_ref_id);
}
int TesselObjectVersionItemGetVersion(char *szBuf, int cbBuf, const TESSEL_OBJECT_VERSION *pObject) {
    return GetText(szBuf, cbBuf, pObject, &TESSEL_OBJECT_VERSION::get_ref_version);
}
int TesselObjectVersionItemGetCommitMsg(char *szBuf, int cbBuf, const TESSEL_OBJECT_VERSION *pObject) {
    return GetJson(szBuf, cbBuf, pObject, &TESSEL_OBJECT_VERSION::get_ref_commit_msg);
}
int TesselObjectVersionItemGetLastVersion(char *szBuf, int cbBuf, const TESSEL_OBJECT_VERSION *pObject) {
    return GetJson(szBuf, cbBuf, pObject, &TESSEL_OBJECT_VERSION::get_ref_last_version);
}
int TesselObjectVersionItemGetAuthor(unsigned long *pVal, const TESSEL_OBJECT_VERSION *pObject) {
    return GetInteger(pVal, pObject, &TESSEL_OBJECT_VERSION::get_author);
}
int TesselObjectVersionItemGetModifyTime(long *pVal, const TESSEL_OBJECT_VERSION *pObject) {
    return GetInteger(pVal, pObject, &TESSEL_OBJECT_VERSION::get_mtime);
}
int TesselObjectVersionItemGetExtraInfo(char *szBuf, int cbBuf, const TESSEL_OBJECT_VERSION *pObject) {
    return GetJson(szBuf, cbBuf, pObject, &TESSEL_OBJECT_VERSION::get_ref_extra_info);
}

int TesselObjectVersionItemSetNameSpace(TESSEL_OBJECT_VERSION *pObject, const char *szVal) {
    return SetText(pObject, szVal, &TESSEL_OBJECT_VERSION::set_ns);
}
int TesselObjectVersionItemSetID(TESSEL_OBJECT_VERSION *pObject, const char *szVal) {
    return SetText(pObject, szVal, &TESSEL_OBJECT_VERSION::set_id);
}
int TesselObjectVersionItemSetVersion(TESSEL_OBJECT_VERSION *pObject, const char *szVal) {
    return SetText(pObject, szVal, &TESSEL_OBJECT_VERSION::set_version);
}
int TesselObjectVersionItemSetCommitMsg(TESSEL_OBJECT_VERSION *pObject, const char *szVal) {
    return SetJson(pObject, szVal, &TESSEL_OBJECT_VERSION::swap_commit_msg);
}
int TesselObjectVersionItemSetLastVersion(TESSEL_OBJECT_VERSION *pObject, const char *szVal) {
    return SetJson(pObject, szVal, &TESSEL_OBJECT_VERSION::swap_last_version);
}
int TesselObjectVersionItemSetAuthor(TESSEL_OBJECT_VERSION *pObject, unsigned long val) {
    return SetInteger(pObject, val, &TESSEL_OBJECT_VERSION::set_author);
}
int TesselObjectVersionItemSetModifyTime(TESSEL_OBJECT_VERSION *pObject, long val) {
    return SetInteger(pObject, val, &TESSEL_OBJECT_VERSION::set_mtime);
}
int TesselObjectVersionItemSetExtraInfo(TESSEL_OBJECT_VERSION *pObject, const char *szVal) {
    return SetJson(pObject, szVal, &TESSEL_OBJECT_VERSION::swap_extra_info);
}

}  // extern "C"
