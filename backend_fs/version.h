/*
 * What the version side of the file-system store shares between its sources:
 * the keys of an object's "git_info.json" and how requests carry user ids.
 */
#ifndef TESSEL_BACKEND_FS_VERSION_H
#define TESSEL_BACKEND_FS_VERSION_H

#include <json/value.h>

/* Versions committed, and those of them whose commit_msg had "listable": true. */
#define TESSEL_GIT_INFO_COMMIT_CNT "commit_cnt"
#define TESSEL_GIT_INFO_LISTABLE_CNT "listable_commit_cnt"

namespace tessel {

/* A user id as requests carry it (4294967295 may also come as -1); 0 when not a number. */
inline unsigned int FsRequestUid(const Json::Value &jVal) {
    if (!jVal.isIntegral()) {
        return 0;
    }
    return (unsigned int)(jVal.isUInt64() ? jVal.asUInt64() : (Json::UInt64)jVal.asInt64());
}

}  // namespace tessel

#endif /* TESSEL_BACKEND_FS_VERSION_H */
