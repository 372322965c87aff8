// The JSON form of a record: what an operation returns to its caller
// (toJson, steered by the caller's field selection) and the way back
// (fromJson).
#include <stdint.h>

#include <string>

#include "common/tessel_json.h"
#include "common/tessel_report.h"
#include "object/object_item.h"
#include "tessel_user.h"
#include "tesselobject.h"

static constexpr const char kTesselModule[] = "object/object_json";

namespace {

const Json::Value &NoSelection() {
    static const Json::Value jEmpty(Json::objectValue);
    return jEmpty;
}

// Whether a selection value converts to true. jsoncpp's asBool() throws on
// text, arrays and objects; a caller's selection must not be able to abort
// the call, so those count as true when they are not empty.
bool IsTrue(const Json::Value &jVal) {
    switch (jVal.type()) {
    case Json::nullValue:
        return false;
    case Json::intValue:
    case Json::uintValue:
    case Json::realValue:
    case Json::booleanValue:
        return jVal.asBool();
    case Json::stringValue:
        return !jVal.asString().empty();
    case Json::arrayValue:
    case Json::objectValue:
        return !jVal.empty();
    }
    return false;
}

// Fields that are written unless the selection turns them off.
bool Selected(const Json::Value &jSel, const char *szKey) {
    return !jSel.isMember(szKey) || IsTrue(jSel[szKey]);
}

// Fields that are written only when the selection asks for them.
bool AskedFor(const Json::Value &jSel, const char *szKey) {
    return jSel.isMember(szKey) && IsTrue(jSel[szKey]);
}

// A JSON field: all of it for the boolean true; for an object of member
// names, those members marked with the boolean true that the field has.
void WriteField(const Json::Value &jSel, const Json::Value &jField, const char *szKey, Json::Value &jRet) {
    if (jSel.isBool()) {
        if (jSel.asBool()) {
            jRet[szKey] = jField;
        }
        return;
    }
    if (!jSel.isObject()) {
        return;
    }
    Json::Value jPart(Json::objectValue);
    for (const std::string &strName : jSel.getMemberNames()) {
        const Json::Value &jWanted = jSel[strName];
        if (jWanted.isBool() && jWanted.asBool() && jField.isObject() && jField.isMember(strName)) {
            jPart[strName] = jField[strName];
        }
    }
    jRet[szKey].swap(jPart);
}

// The conversions below accept what a number can sensibly be read from and
// refuse the rest: jsoncpp's own asUInt64()/asInt64() throw on text and on
// negative or out-of-range values, and a float outside the target range
// would be undefined behaviour to convert.
constexpr double kTwoPow63 = 9223372036854775808.0;
constexpr double kTwoPow64 = 18446744073709551616.0;

bool ToUInt64(const Json::Value &jVal, uint64_t &out) {
    switch (jVal.type()) {
    case Json::nullValue:
    case Json::booleanValue:
        out = jVal.asBool() ? 1 : 0;
        return true;
    case Json::intValue:
        out = static_cast<uint64_t>(jVal.asInt64());  // -1 is all bits set
        return true;
    case Json::uintValue:
        out = jVal.asUInt64();
        return true;
    case Json::realValue: {
        double d = jVal.asDouble();
        if (d >= 0 && d < kTwoPow64) {
            out = static_cast<uint64_t>(d);
            return true;
        }
        if (d < 0 && d >= -kTwoPow63) {
            out = static_cast<uint64_t>(static_cast<int64_t>(d));
            return true;
        }
        return false;  // also NaN
    }
    default:
        return false;
    }
}

bool ToInt64(const Json::Value &jVal, int64_t &out) {
    switch (jVal.type()) {
    case Json::nullValue:
    case Json::booleanValue:
        out = jVal.asBool() ? 1 : 0;
        return true;
    case Json::intValue:
        out = jVal.asInt64();
        return true;
    case Json::uintValue:
        out = static_cast<int64_t>(jVal.asUInt64());
        return true;
    case Json::realValue: {
        double d = jVal.asDouble();
        if (d >= -kTwoPow63 && d < kTwoPow63) {
            out = static_cast<int64_t>(d);
            return true;
        }
        return false;
    }
    default:
        return false;
    }
}

const char *const kTextKeys[] = {"ns", "id", "category", "version", "parent_id"};
const char *const kTimeKeys[] = {"ctime", "mtime"};

// Refuses, before anything is assigned, a value that cannot become its
// field, so that a bad document leaves the record as it was.
bool CheckTypes(const Json::Value &jVal) {
    for (const char *szKey : kTextKeys) {
        if (jVal.isMember(szKey) && !jVal[szKey].isConvertibleTo(Json::stringValue)) {
            std::string strCond = std::string("jVal[\"") + szKey + "\"].isConvertibleTo(Json::stringValue)";
            tessel::ReportBadArgument(kTesselModule, __LINE__, strCond.c_str(), jVal[szKey].type());
            return false;
        }
    }
    uint64_t u64 = 0;
    if (jVal.isMember("owner") && !ToUInt64(jVal["owner"], u64)) {
        tessel::ReportBadArgument(kTesselModule, __LINE__, "ToUInt64(jVal[\"owner\"], u64)", jVal["owner"].type());
        return false;
    }
    int64_t i64 = 0;
    for (const char *szKey : kTimeKeys) {
        if (jVal.isMember(szKey) && !ToInt64(jVal[szKey], i64)) {
            std::string strCond = std::string("ToInt64(jVal[\"") + szKey + "\"], i64)";
            tessel::ReportBadArgument(kTesselModule, __LINE__, strCond.c_str(), jVal[szKey].type());
            return false;
        }
    }
    return true;
}

}  // namespace

bool TESSEL_OBJECT::toJson(const Json::Value &jField, Json::Value &jRet, bool blShowAcl) const {
    TESSEL_CHECK(!jRet.isObject(), TESSEL_ERR_BAD_PARAMETERS, "!jRet.isObject()", false);
    // No selection at all (null) is the empty selection.
    const Json::Value &jSel = jField.isObject() ? jField : NoSelection();

    if (Selected(jSel, "ns")) {
        jRet["ns"] = get_ref_ns();
    }
    if (Selected(jSel, "id")) {
        jRet["id"] = get_ref_id();
    }
    if (Selected(jSel, "category")) {
        jRet["category"] = get_ref_category();
    }
    if (Selected(jSel, "version")) {
        jRet["version"] = get_ref_version();
    }
    const bool blPermWritten = Selected(jSel, "perm");
    if (blPermWritten) {
        jRet["perm"] = get_ref_perm();
    }
    if (Selected(jSel, "parent_id")) {
        jRet["parent_id"] = get_ref_parent_id();
    }
    if (Selected(jSel, "owner")) {
        const unsigned int uid = static_cast<unsigned int>(get_owner());
        std::string strName;
        // A deleted user or no user at all shows without a name.
        if (!TesselGetUserName(uid, strName, true)) {
            strName.clear();
        }
        Json::Value jOwner(Json::objectValue);
        jOwner["uid"] = Json::UInt(uid);
        jOwner["display_name"] = strName;
        jRet["owner"].swap(jOwner);
    }
    if (Selected(jSel, "ctime")) {
        jRet["ctime"] = Json::Int(get_ctime());
    }
    if (Selected(jSel, "mtime")) {
        jRet["mtime"] = Json::Int(get_mtime());
    }

    if (AskedFor(jSel, "commit_msg")) {
        jRet["commit_msg"] = get_ref_commit_msg();
    }
    WriteField(jSel["metatext"], get_ref_metatext(), "metatext", jRet);
    WriteField(jSel["text"], get_ref_text(), "text", jRet);
    WriteField(jSel["person"], get_ref_person(), "person", jRet);
    WriteField(jSel["metabinary_info"], get_ref_metabinary_info(), "metabinary_info", jRet);
    WriteField(jSel["binary_info"], get_ref_binary_info(), "binary_info", jRet);

    if (AskedFor(jSel, "acl")) {
        const std::string &strPerm = get_ref_perm();
        const bool blMayWrite = blPermWritten && ("owner" == strPerm || "rw" == strPerm);
        if (blMayWrite || blShowAcl) {
            jRet["acl"] = get_ref_acl();
        }
    }
    return true;
}

bool TESSEL_OBJECT::fromJson(const Json::Value &jVal) {
    if (!jVal.isObject()) {
        tessel::ReportBadArgument(kTesselModule, __LINE__, "jVal.isObject()", jVal.type());
        return false;
    }
    if (!CheckTypes(jVal)) {
        return false;
    }
    if (jVal.isMember("ns")) {
        set_ns(jVal["ns"].asString());
    }
    if (jVal.isMember("id")) {
        set_id(jVal["id"].asString());
    }
    if (jVal.isMember("category")) {
        set_category(jVal["category"].asString());
    }
    if (jVal.isMember("version")) {
        set_version(jVal["version"].asString());
    }
    if (jVal.isMember("parent_id")) {
        set_parent_id(jVal["parent_id"].asString());
    }
    if (jVal.isMember("commit_msg")) {
        set_commit_msg(jVal["commit_msg"]);
    }
    if (jVal.isMember("metatext")) {
        set_metatext(jVal["metatext"]);
    }
    if (jVal.isMember("text")) {
        set_text(jVal["text"]);
    }
    if (jVal.isMember("acl")) {
        set_acl(jVal["acl"]);
    }
    uint64_t owner = 0;
    if (jVal.isMember("owner") && ToUInt64(jVal["owner"], owner)) {
        set_owner(static_cast<uint32_t>(owner));
    }
    int64_t t = 0;
    if (jVal.isMember("ctime") && ToInt64(jVal["ctime"], t)) {
        set_ctime(static_cast<int32_t>(t));
    }
    if (jVal.isMember("mtime") && ToInt64(jVal["mtime"], t)) {
        set_mtime(static_cast<int32_t>(t));
    }
    // Deliberately a JSON string holding the value's text, not the value:
    // records filled from JSON carry their binary descriptors in that form.
    if (jVal.isMember("metabinary_info")) {
        set_metabinary_info(Json::Value(tessel::toString(jVal["metabinary_info"])));
    }
    if (jVal.isMember("binary_info")) {
        set_binary_info(Json::Value(tessel::toString(jVal["binary_info"])));
    }
    return true;
}

Json::Value TesselObjectFieldAll() {
    Json::Value jField(Json::objectValue);
    jField["commit_msg"] = true;
    jField["acl"] = true;
    jField["metatext"] = true;
    jField["metabinary_info"] = true;
    jField["text"] = true;
    jField["binary_info"] = true;
    // Not a boolean: the file-system backend reads it to attach the person
    // summary; toJson writes no person for it.
    jField["person"] = "summary";
    return jField;
}
