/*
 * The keys of the hash-parameter forms of the version operations, read into
 * the request that the JSON forms take. Included by each hash-parameter form
 * after its kTesselModule, so that a refused key is reported under that
 * operation's own module.
 */
#ifndef TESSEL_VERSION_VERSION_HASH_H
#define TESSEL_VERSION_VERSION_HASH_H

#include <errno.h>
#include <stdlib.h>

#include <json/value.h>
#include <quor/qlib.h>

#include "common/tessel_report.h"
#include "tessel_id.h"

namespace {

// The value of a key the operation cannot do without; NULL (1007) when missing.
[[maybe_unused]] const char *HashRequired(const QLIBSZHASH *pParmHash, const char *szKey) {
    const char *pParm = NULL;
    if (NULL == (pParm = QLIBCSzHashGetValue(pParmHash, szKey))) {
        TESSEL_RAISE(TESSEL_ERR_USER_INPUT, "NULL == (pParm = QLIBCSzHashGetValue(pParmHash, \"%s\"))", szKey);
    }
    return pParm;
}

// "ns", "id" and "requester", the decimal user id of the caller.
[[maybe_unused]] bool HashRequest(const QLIBSZHASH *pParmHash, Json::Value &jParm) {
    for (const char *szKey : {"ns", "id", "requester"}) {
        const char *pParm = HashRequired(pParmHash, szKey);
        if (NULL == pParm) {
            return false;
        }
        jParm[szKey] = pParm;
    }
    const char *pParm = jParm["requester"].asCString();
    char *endPtr = NULL;
    errno = 0;
    const unsigned long ulRequester = strtoul(pParm, &endPtr, 10);
    TESSEL_CHECK(endPtr && *endPtr, TESSEL_ERR_USER_INPUT, "endPtr && *endPtr", false);
    // No digits at all would read as 0, which is root; and a number past the
    // user ids would wrap round to one (2^32 is root again).
    TESSEL_CHECK(endPtr == pParm, TESSEL_ERR_USER_INPUT, "endPtr == pParm", false);
    TESSEL_CHECK(UID_ERR < ulRequester, TESSEL_ERR_USER_INPUT, "UID_ERR < ulRequester", false);
    jParm["requester"] = Json::UInt64(ulRequester);
    return true;
}

// A text key that may be left out.
[[maybe_unused]] void HashOptionalText(const QLIBSZHASH *pParmHash, const char *szKey, Json::Value &jParm) {
    const char *pParm = QLIBCSzHashGetValue(pParmHash, szKey);
    if (NULL != pParm) {
        jParm[szKey] = pParm;
    }
}

// A decimal integer key that may be left out; its range is the operation's
// own check.
[[maybe_unused]] bool HashOptionalInteger(const QLIBSZHASH *pParmHash, const char *szKey, Json::Value &jParm) {
    const char *pParm = QLIBCSzHashGetValue(pParmHash, szKey);
    if (NULL == pParm) {
        return true;
    }
    char *endPtr = NULL;
    errno = 0;
    const long long llVal = strtoll(pParm, &endPtr, 10);
    TESSEL_CHECK(endPtr && *endPtr, TESSEL_ERR_USER_INPUT, "endPtr && *endPtr", false);
    TESSEL_CHECK(endPtr == pParm || ERANGE == errno, TESSEL_ERR_USER_INPUT, "endPtr == pParm || ERANGE == errno",
                 false);
    jParm[szKey] = Json::Int64(llVal);
    return true;
}

}  // namespace

#endif /* TESSEL_VERSION_VERSION_HASH_H */
