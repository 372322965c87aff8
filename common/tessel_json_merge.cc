// Shallow merge of one JSON object into another, where a null member of the
// source removes that member: how a partial update deletes keys.
#include <json/value.h>

#include "common/tessel_report.h"
#include "tessel_user.h"

static constexpr const char kTesselModule[] = "common/tessel_common";

BOOL mergeJsonObject(Json::Value &jsDest, const Json::Value &jsSrc) {
    if (!jsDest.isObject() || !jsSrc.isObject()) {
        TESSEL_LOG_FAILED("!jsDest.isObject() || !jsSrc.isObject()");
        return FALSE;
    }
    for (Json::Value::const_iterator it = jsSrc.begin(); it != jsSrc.end(); ++it) {
        if (it->isNull()) {
            jsDest.removeMember(it.name());
        } else {
            jsDest[it.name()] = *it;
        }
    }
    return TRUE;
}
