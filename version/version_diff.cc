// Comparing two versions of an object: what changed in its text fields and
// binary files between "old_version" and "new_version" (the latest when
// absent), for a requester who may read the object.
#include <memory>
#include <string>

#include "common/tessel_report.h"
#include "object/object_ops.h"
#include "tessel_backend.h"
#include "tessel_conf.h"
#include "tessel_id.h"
#include "tesselobject.h"
#include "tesselobjectversion.h"

static constexpr const char kTesselModule[] = "version/version_diff";

#include "version/version_hash.h"

bool TESSEL_OBJECT_VERSION::Diff(const Json::Value &jParm, Json::Value &jDiff) {
    std::unique_ptr<TESSEL_BACKEND_OP> pBackendFs(RegisterBackend::New("fs"));
    TESSEL_CHECK(NULL == pBackendFs, TESSEL_ERR_NO_BACKEND, "NULL == pBackendFs", false);

    TESSEL_CHECK(!jParm.isMember("ns") || !jParm["ns"].isString() || !jParm.isMember("id") ||
                     !jParm["id"].isString() || !jParm.isMember("old_version") ||
                     !jParm["old_version"].isString() || !jParm.isMember("requester") ||
                     !jParm["requester"].isIntegral(),
                 TESSEL_ERR_USER_INPUT,
                 "!jParm.isMember(\"ns\") || !jParm[\"ns\"].isString() || !jParm.isMember(\"id\") || "
                 "!jParm[\"id\"].isString() || !jParm.isMember(\"old_version\") || "
                 "!jParm[\"old_version\"].isString() || !jParm.isMember(\"requester\") || "
                 "!jParm[\"requester\"].isIntegral()",
                 false);
    TESSEL_CHECK(jParm.isMember("new_version") && !jParm["new_version"].isString(), TESSEL_ERR_USER_INPUT,
                 "jParm.isMember(\"new_version\") && !jParm[\"new_version\"].isString()", false);
    TESSEL_CHECK(!jDiff.isObject(), TESSEL_ERR_BAD_PARAMETERS, "!jDiff.isObject()", false);

    TESSEL_CHECK_APPEND(FALSE == TesselAccessCheck(jParm["ns"].asCString()),
                        "FALSE == TesselAccessCheck(jParm[\"ns\"].asCString())", false);
    TESSEL_CHECK_APPEND(FALSE == TesselObjectIDIsValid(jParm["id"].asCString()),
                        "FALSE == TesselObjectIDIsValid(jParm[\"id\"].asCString())", false);

    // The read right, checked on the newer side of the comparison: a
    // version that does not exist fails here, before anything is compared.
    TESSEL_OBJECT tmpOldObj;
    Json::Value jGetParm = tessel::ReadRequest(jParm, jParm["id"]);
    if (jParm.isMember("new_version")) {
        jGetParm["version"] = jParm["new_version"];
    }
    TESSEL_CHECK_APPEND(!tmpOldObj.Get(jGetParm), "!tmpOldObj.Get(jGetParm)", false);

    TESSEL_CHECK_APPEND(!pBackendFs->VersionDiff(jParm, jDiff), "!pBackendFs->VersionDiff(jParm, jDiff)", false);
    return true;
}

namespace {

// One side of a comparison ("text" or "binary": name -> "created",
// "deleted" or "modified") into a platform string hash.
bool DiffToHash(const Json::Value &jSide, QLIBSZHASH *pHash) {
    if (!jSide.isObject()) {
        return true;  // nothing changed on this side
    }
    for (Json::ValueConstIterator it = jSide.begin(); it != jSide.end(); ++it) {
        const std::string strName = it.name();
        TESSEL_CHECK(!it->isString(), TESSEL_ERR_UNEXPECTED, "!it->isString()", false);
        TESSEL_CHECK(0 != QLIBCSzHashSetValue(pHash, strName.c_str(), it->asCString()), TESSEL_ERR_OUT_OF_MEMORY,
                     "0 != QLIBCSzHashSetValue(pHash, strName.c_str(), it->asCString())", false);
    }
    return true;
}

}  // namespace

int TesselObjectVersionDiff(QLIBSZHASH *pParmHash, QLIBSZHASH **ppTextDiffHash, QLIBSZHASH **ppBinaryDiffHash) {
    TESSEL_CHECK(NULL == pParmHash, TESSEL_ERR_BAD_PARAMETERS, "NULL == pParmHash", -1);
    TESSEL_CHECK(NULL == ppTextDiffHash || NULL == *ppTextDiffHash, TESSEL_ERR_BAD_PARAMETERS,
                 "NULL == ppTextDiffHash || NULL == *ppTextDiffHash", -1);
    TESSEL_CHECK(NULL == ppBinaryDiffHash || NULL == *ppBinaryDiffHash, TESSEL_ERR_BAD_PARAMETERS,
                 "NULL == ppBinaryDiffHash || NULL == *ppBinaryDiffHash", -1);
    Json::Value jParm(Json::objectValue);
    if (!HashRequest(pParmHash, jParm)) {
        return -1;
    }
    const char *pParm = HashRequired(pParmHash, "old_version");
    if (NULL == pParm) {
        return -1;
    }
    jParm["old_version"] = pParm;
    HashOptionalText(pParmHash, "new_version", jParm);

    TESSEL_OBJECT_VERSION ver;
    Json::Value jDiff(Json::objectValue);
    TESSEL_CHECK_APPEND(!ver.Diff(jParm, jDiff), "!ver.Diff(jParm, jDiff)", -1);
    TESSEL_CHECK_APPEND(!DiffToHash(jDiff["text"], *ppTextDiffHash), "!DiffToHash(jDiff[\"text\"], *ppTextDiffHash)",
                        -1);
    TESSEL_CHECK_APPEND(!DiffToHash(jDiff["binary"], *ppBinaryDiffHash),
                        "!DiffToHash(jDiff[\"binary\"], *ppBinaryDiffHash)", -1);
    return 0;
}
