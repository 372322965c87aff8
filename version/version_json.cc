// The JSON form of a version record, as the version operations return it to
// applications: the history entry a user sees, with the author by name.
#include <string>

#include "common/tessel_report.h"
#include "tessel_user.h"
#include "tesselobjectversion.h"

static constexpr const char kTesselModule[] = "version/version_json";

namespace {

// Whether a selection value converts to true. jsoncpp's asBool() throws on
// text, arrays and objects; a caller's selection must not be able to abort
// the call, so those count as true when they are not empty.
bool IsTrue(const Json::Value &jVal) {
    switch (jVal.type()) {
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
    case Json::nullValue:
        break;
    }
    return false;
}

// Written unless the selection turns the key off.
bool Selected(const Json::Value &jSel, const char *szKey) {
    return !jSel.isMember(szKey) || IsTrue(jSel[szKey]);
}

// Written only when the selection asks for the key.
bool AskedFor(const Json::Value &jSel, const char *szKey) {
    return jSel.isMember(szKey) && IsTrue(jSel[szKey]);
}

}  // namespace

bool TESSEL_OBJECT_VERSION::toJson(const Json::Value &jField, Json::Value &jRet) const {
    TESSEL_CHECK(!jRet.isObject(), TESSEL_ERR_BAD_PARAMETERS, "!jRet.isObject()", false);
    // No selection at all (null, or not an object) is the empty selection.
    static const Json::Value jNoSelection(Json::objectValue);
    const Json::Value &jSel = jField.isObject() ? jField : jNoSelection;

    // A history lists versions of one object the caller already named, so
    // the object's own names come only on request.
    if (AskedFor(jSel, "ns")) {
        jRet["ns"] = get_ref_ns();
    }
    if (AskedFor(jSel, "id")) {
        jRet["id"] = get_ref_id();
    }
    if (Selected(jSel, "version")) {
        jRet["version"] = get_ref_version();
    }
    if (Selected(jSel, "author")) {
        // A removed account still names its versions ("Deleted user #<uid>").
        std::string strName;
        TesselGetUserName(static_cast<unsigned int>(get_author()), strName, false);
        jRet["author"] = strName;
    }
    if (Selected(jSel, "mtime")) {
        jRet["mtime"] = Json::Int(get_mtime());
    }
    if (Selected(jSel, "commit_msg")) {
        jRet["commit_msg"] = get_ref_commit_msg();
    }
    if (Selected(jSel, "last_version")) {
        jRet["last_version"] = get_ref_last_version();
    }
    return true;
}
