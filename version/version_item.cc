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

typedef tessel::ItemAccess<TESSEL_OBJECT_VERSION, kGetterModule, kSetterModule> Item;

}  // namespace

extern "C" {

int TesselObjectVersionItemGetNameSpace(char *szBuf, int cbBuf, const TESSEL_OBJECT_VERSION *pObject) {
    return Item::GetText(szBuf, cbBuf, pObject, &TESSEL_OBJECT_VERSION::get_ref_ns);
}
int TesselObjectVersionItemGetID(char *szBuf, int cbBuf, const TESSEL_OBJECT_VERSION *pObject) {
    return Item::GetText(szBuf, cbBuf, pObject, &TESSEL_OBJECT_VERSION::get_ref_id);
}
int TesselObjectVersionItemGetVersion(char *szBuf, int cbBuf, const TESSEL_OBJECT_VERSION *pObject) {
    return Item::GetText(szBuf, cbBuf, pObject, &TESSEL_OBJECT_VERSION::get_ref_version);
}
int TesselObjectVersionItemGetCommitMsg(char *szBuf, int cbBuf, const TESSEL_OBJECT_VERSION *pObject) {
    return Item::GetJson(szBuf, cbBuf, pObject, &TESSEL_OBJECT_VERSION::get_ref_commit_msg);
}
int TesselObjectVersionItemGetLastVersion(char *szBuf, int cbBuf, const TESSEL_OBJECT_VERSION *pObject) {
    return Item::GetJson(szBuf, cbBuf, pObject, &TESSEL_OBJECT_VERSION::get_ref_last_version);
}
int TesselObjectVersionItemGetAuthor(unsigned long *pVal, const TESSEL_OBJECT_VERSION *pObject) {
    return Item::GetInteger(pVal, pObject, &TESSEL_OBJECT_VERSION::get_author);
}
int TesselObjectVersionItemGetModifyTime(long *pVal, const TESSEL_OBJECT_VERSION *pObject) {
    return Item::GetInteger(pVal, pObject, &TESSEL_OBJECT_VERSION::get_mtime);
}
int TesselObjectVersionItemGetExtraInfo(char *szBuf, int cbBuf, const TESSEL_OBJECT_VERSION *pObject) {
    return Item::GetJson(szBuf, cbBuf, pObject, &TESSEL_OBJECT_VERSION::get_ref_extra_info);
}

int TesselObjectVersionItemSetNameSpace(TESSEL_OBJECT_VERSION *pObject, const char *szVal) {
    return Item::SetText(pObject, szVal, &TESSEL_OBJECT_VERSION::set_ns);
}
int TesselObjectVersionItemSetID(TESSEL_OBJECT_VERSION *pObject, const char *szVal) {
    return Item::SetText(pObject, szVal, &TESSEL_OBJECT_VERSION::set_id);
}
int TesselObjectVersionItemSetVersion(TESSEL_OBJECT_VERSION *pObject, const char *szVal) {
    return Item::SetText(pObject, szVal, &TESSEL_OBJECT_VERSION::set_version);
}
int TesselObjectVersionItemSetCommitMsg(TESSEL_OBJECT_VERSION *pObject, const char *szVal) {
    return Item::SetJson(pObject, szVal, &TESSEL_OBJECT_VERSION::swap_commit_msg);
}
int TesselObjectVersionItemSetLastVersion(TESSEL_OBJECT_VERSION *pObject, const char *szVal) {
    return Item::SetJson(pObject, szVal, &TESSEL_OBJECT_VERSION::swap_last_version);
}
int TesselObjectVersionItemSetAuthor(TESSEL_OBJECT_VERSION *pObject, unsigned long val) {
    return Item::SetInteger(pObject, val, &TESSEL_OBJECT_VERSION::set_author);
}
int TesselObjectVersionItemSetModifyTime(TESSEL_OBJECT_VERSION *pObject, long val) {
    return Item::SetInteger(pObject, val, &TESSEL_OBJECT_VERSION::set_mtime);
}
int TesselObjectVersionItemSetExtraInfo(TESSEL_OBJECT_VERSION *pObject, const char *szVal) {
    return Item::SetJson(pObject, szVal, &TESSEL_OBJECT_VERSION::swap_extra_info);
}

}  // extern "C"
