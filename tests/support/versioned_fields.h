/*
 * The members of an object read back that a new version changes, side by
 * side in one value, so that a test compares them in one go. Header-only,
 * for programs linking the exported library or the objects alike.
 */
#ifndef TESSEL_TESTS_SUPPORT_VERSIONED_FIELDS_H
#define TESSEL_TESTS_SUPPORT_VERSIONED_FIELDS_H

#include <json/value.h>

#include "tesselobject.h"

namespace tessel_test {

/* {"text", "version", "commit_msg", "mtime"} of obj. */
inline Json::Value VersionedFields(const TESSEL_OBJECT &obj) {
    Json::Value jRet(Json::objectValue);
    jRet["text"] = obj.get_text();
    jRet["version"] = obj.get_version();
    jRet["commit_msg"] = obj.get_commit_msg();
    jRet["mtime"] = (Json::Int64)obj.get_mtime();
    return jRet;
}

}  // namespace tessel_test

#endif /* TESSEL_TESTS_SUPPORT_VERSIONED_FIELDS_H */
