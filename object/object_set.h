/*
 * Completion of set parameters and the steps the single and the list set
 * share.
 */
#ifndef TESSEL_OBJECT_OBJECT_SET_H
#define TESSEL_OBJECT_OBJECT_SET_H

#include <json/value.h>

#include "tesselobject.h"

/*
 * Checks a change of the object oldObj (read with every field, its acl
 * oldAcl) and completes jParm in place. A move ("parent_id") or a reset of
 * the parent ("reset_parent_id") settles the new parent and, with
 * "acl_inherit", the acl the object takes from it. jParm must already hold
 * "ns", "id" (strings) and "requester" (integral).
 */
bool PrepareSetParm(Json::Value &jParm, const Json::Value &oldAcl, TESSEL_OBJECT *oldObj);

namespace tessel {

/* The lock level of a change: objects with children are locked as a whole
 * namespace's readers, objects without as object, volume and backup readers. */
bool SetLockLevel(const Json::Value &jParm, int &level);

/* The parameters that read an object back after its change: every field,
 * the namespace's index filter, read as root (the requester's own word is
 * calculated afterwards, and may be gone). */
bool ReadBackParm(const Json::Value &jParm, Json::Value &jGetParm);

}  // namespace tessel

#endif /* TESSEL_OBJECT_OBJECT_SET_H */
