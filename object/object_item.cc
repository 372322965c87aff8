// The plain-function accessors of TESSEL_OBJECT for applications. Their bad
// arguments are reported under the names of the public headers that declare
// them, which is where an application developer looks.
#include "object/object_item.h"

#include <stdio.h>
#include <syslog.h>

#include <string>

#include <quor/qlib.h>

#include "common/tessel_json.h"
#include "tesselobject.h"
#include "tesselobjectgetter.h"
#include "tesselobjectsetter.h"

namespace tessel {

int ReportBadArgument(const char *szModule, int line, const char *szCondition, int value) {
    syslog(LOG_ERR, "%s:%d Invaild Argument (%s)=[%d]\n", szModule, line, szCondition, value);
    QLIBCErrSetEx(QLIBC_ERR_BAD_PARAMETERS, szModule, line);
    return -1;
}

}  // namespace tessel

namespace {

constexpr const char kGetterModule[] = "include/tesselobjectgetter";
constexpr const char kSetterModule[] = "include/tesselobjectsetter";

typedef tessel::ItemAccess<TESSEL_OBJECT, kGetterModule, kSetterModule> Item;

}  // namespace

extern "C" {

int TesselObjectItemGetNameSpace(char *szBuf, int cbBuf, const TESSEL_OBJECT *pObject) {
    return Item::GetText(szBuf, cbBuf, pObject, &TESSEL_OBJECT::get_ref_ns);
}
int TesselObjectItemGetID(char *szBuf, int cbBuf, const TESSEL_OBJECT *pObject) {
    return Item::GetText(szBuf, cbBuf, pObject, &TESSEL_OBJECT::get_ref_id);
}
int TesselObjectItemGetCategory(char *szBuf, int cbBuf, const TESSEL_OBJECT *pObject) {
    return Item::GetText(szBuf, cbBuf, pObject, &TESSEL_OBJECT::get_ref_category);
}
int TesselObjectItemGetVersion(char *szBuf, int cbBuf, const TESSEL_OBJECT *pObject) {
    return Item::GetText(szBuf, cbBuf, pObject, &TESSEL_OBJECT::get_ref_version);
}
int TesselObjectItemGetPerm(char *szBuf, int cbBuf, const TESSEL_OBJECT *pObject) {
    return Item::GetText(szBuf, cbBuf, pObject, &TESSEL_OBJECT::get_ref_perm);
}
int TesselObjectItemGetCommitMsg(char *szBuf, int cbBuf, const TESSEL_OBJECT *pObject) {
    return Item::GetJson(szBuf, cbBuf, pObject, &TESSEL_OBJECT::get_ref_commit_msg);
}
int TesselObjectItemGetParentID(char *szBuf, int cbBuf, const TESSEL_OBJECT *pObject) {
    return Item::GetText(szBuf, cbBuf, pObject, &TESSEL_OBJECT::get_ref_parent_id);
}
int TesselObjectItemGetOwner(unsigned long *pVal, const TESSEL_OBJECT *pObject) {
    return Item::GetInteger(pVal, pObject, &TESSEL_OBJECT::get_owner);
}
int TesselObjectItemGetMetaText(char *szBuf, int cbBuf, const TESSEL_OBJECT *pObject) {
    return Item::GetJson(szBuf, cbBuf, pObject, &TESSEL_OBJECT::get_ref_metatext);
}
int TesselObjectItemGetText(char *szBuf, int cbBuf, const TESSEL_OBJECT *pObject) {
    return Item::GetJson(szBuf, cbBuf, pObject, &TESSEL_OBJECT::get_ref_text);
}
int TesselObjectItemGetMetaBinary_info(char *szBuf, int cbBuf, const TESSEL_OBJECT *pObject) {
    return Item::GetJson(szBuf, cbBuf, pObject, &TESSEL_OBJECT::get_ref_metabinary_info);
}
int TesselObjectItemGetBinary_info(char *szBuf, int cbBuf, const TESSEL_OBJECT *pObject) {
    return Item::GetJson(szBuf, cbBuf, pObject, &TESSEL_OBJECT::get_ref_binary_info);
}
int TesselObjectItemGetPath_info(char *szBuf, int cbBuf, const TESSEL_OBJECT *pObject) {
    return Item::GetJson(szBuf, cbBuf, pObject, &TESSEL_OBJECT::get_ref_path_info);
}
int TesselObjectItemGetACL(char *szBuf, int cbBuf, const TESSEL_OBJECT *pObject) {
    return Item::GetJson(szBuf, cbBuf, pObject, &TESSEL_OBJECT::get_ref_acl);
}
int TesselObjectItemGetCreateTime(long *pVal, const TESSEL_OBJECT *pObject) {
    return Item::GetInteger(pVal, pObject, &TESSEL_OBJECT::get_ctime);
}
int TesselObjectItemGetModifyTime(long *pVal, const TESSEL_OBJECT *pObject) {
    return Item::GetInteger(pVal, pObject, &TESSEL_OBJECT::get_mtime);
}
int TesselObjectItemGetExtraInfo(char *szBuf, int cbBuf, const TESSEL_OBJECT *pObject) {
    return Item::GetJson(szBuf, cbBuf, pObject, &TESSEL_OBJECT::get_ref_extra_info);
}
int TesselObjectItemGetPerson(char *szBuf, int cbBuf, const TESSEL_OBJECT *pObject) {
    return Item::GetJson(szBuf, cbBuf, pObject, &TESSEL_OBJECT::get_ref_person);
}
int TesselObjectItemGetErr(char *szBuf, int cbBuf, const TESSEL_OBJECT *pObject) {
    return Item::GetJson(szBuf, cbBuf, pObject, &TESSEL_OBJECT::get_ref_err);
}

int TesselObjectItemSetNameSpace(TESSEL_OBJECT *pObject, const char *szVal) {
    return Item::SetText(pObject, szVal, &TESSEL_OBJECT::set_ns);
}
int TesselObjectItemSetID(TESSEL_OBJECT *pObject, const char *szVal) {
    return Item::SetText(pObject, szVal, &TESSEL_OBJECT::set_id);
}
int TesselObjectItemSetCategory(TESSEL_OBJECT *pObject, const char *szVal) {
    return Item::SetText(pObject, szVal, &TESSEL_OBJECT::set_category);
}
int TesselObjectItemSetVersion(TESSEL_OBJECT *pObject, const char *szVal) {
    return Item::SetText(pObject, szVal, &TESSEL_OBJECT::set_version);
}
int TesselObjectItemSetPerm(TESSEL_OBJECT *pObject, const char *szVal) {
    return Item::SetText(pObject, szVal, &TESSEL_OBJECT::set_perm);
}
int TesselObjectItemSetCommitMsg(TESSEL_OBJECT *pObject, const char *szVal) {
    return Item::SetJson(pObject, szVal, &TESSEL_OBJECT::swap_commit_msg);
}
int TesselObjectItemSetParentID(TESSEL_OBJECT *pObject, const char *szVal) {
    return Item::SetText(pObject, szVal, &TESSEL_OBJECT::set_parent_id);
}
int TesselObjectItemSetOwner(TESSEL_OBJECT *pObject, unsigned long val) {
    return Item::SetInteger(pObject, val, &TESSEL_OBJECT::set_owner);
}
int TesselObjectItemSetMetaText(TESSEL_OBJECT *pObject, const char *szVal) {
    return Item::SetJson(pObject, szVal, &TESSEL_OBJECT::swap_metatext);
}
int TesselObjectItemSetText(TESSEL_OBJECT *pObject, const char *szVal) {
    return Item::SetJson(pObject, szVal, &TESSEL_OBJECT::swap_text);
}
int TesselObjectItemSetMetaBinaryInfo(TESSEL_OBJECT *pObject, const char *szVal) {
    return Item::SetJson(pObject, szVal, &TESSEL_OBJECT::swap_metabinary_info);
}
int TesselObjectItemSetBinaryInfo(TESSEL_OBJECT *pObject, const char *szVal) {
    return Item::SetJson(pObject, szVal, &TESSEL_OBJECT::swap_binary_info);
}
int TesselObjectItemSetPathInfo(TESSEL_OBJECT *pObject, const char *szVal) {
    return Item::SetJson(pObject, szVal, &TESSEL_OBJECT::swap_path_info);
}
int TesselObjectItemSetACL(TESSEL_OBJECT *pObject, const char *szVal) {
    return Item::SetJson(pObject, szVal, &TESSEL_OBJECT::swap_acl);
}
int TesselObjectItemSetCreateTime(TESSEL_OBJECT *pObject, long val) {
    return Item::SetInteger(pObject, val, &TESSEL_OBJECT::set_ctime);
}
int TesselObjectItemSetModifyTime(TESSEL_OBJECT *pObject, long val) {
    return Item::SetInteger(pObject, val, &TESSEL_OBJECT::set_mtime);
}
int TesselObjectItemSetExtraInfo(TESSEL_OBJECT *pObject, const char *szVal) {
    return Item::SetJson(pObject, szVal, &TESSEL_OBJECT::swap_extra_info);
}
int TesselObjectItemSetPerson(TESSEL_OBJECT *pObject, const char *szVal) {
    return Item::SetJson(pObject, szVal, &TESSEL_OBJECT::swap_person);
}
int TesselObjectItemSetErr(TESSEL_OBJECT *pObject, const char *szVal) {
    return Item::SetJson(pObject, szVal, &TESSEL_OBJECT::swap_err);
}

}  // extern "C"
