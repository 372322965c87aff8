// Group names from the platform's group database, cached per gid for the life
// of the process, in a map of their own beside the users'.
#include <stdio.h>

#include <map>
#include <mutex>
#include <string>

#include <json/value.h>
#include <quor/quor.h>

#include "tessel_id.h"
#include "tessel_user.h"

static constexpr const char kTesselModule[] = "common/tessel_common";

namespace {

// Held across the whole getter, so concurrent first calls for one gid look
// the group up once.
std::mutex gGroupMapMutex;
std::map<unsigned int, Json::Value> gGroupInfo;

Json::Value LookUpGroup(unsigned int gid) {
    Json::Value jsGroup(Json::objectValue);
    QUORGROUP *pGroup = NULL;
    if (0 != QUORGroupGetByGID(static_cast<gid_t>(gid), &pGroup) || NULL == pGroup) {
        char szName[64];
        snprintf(szName, sizeof(szName), "Deleted group #%u", gid);
        jsGroup["name"] = szName;
        jsGroup["exist"] = false;
        return jsGroup;
    }
    jsGroup["name"] = pGroup->szName;
    jsGroup["exist"] = true;
    QUORGroupFree(pGroup);
    return jsGroup;
}

}  // namespace

BOOL TesselGetGroupName(unsigned int gid, std::string &strName, bool blMustExist) {
    std::lock_guard<std::mutex> lock(gGroupMapMutex);
    if (UID_ERR == gid) {
        if (blMustExist) {
            return FALSE;
        }
        strName = "Anonymous";
        return TRUE;
    }
    auto it = gGroupInfo.find(gid);
    if (gGroupInfo.end() == it) {
        it = gGroupInfo.emplace(gid, LookUpGroup(gid)).first;
    }
    if (blMustExist && !it->second["exist"].asBool()) {
        return FALSE;
    }
    strName = it->second["name"].asString();
    return TRUE;
}
