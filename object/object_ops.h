/*
 * Pieces the changing operations on objects (create, set) share: safe reads
 * of request members, the request of a read, the namespace's hooks, the
 * dealing of a chain's records to worker threads, and the marking of an acl
 * taken over from a parent.
 */
#ifndef TESSEL_OBJECT_OBJECT_OPS_H
#define TESSEL_OBJECT_OBJECT_OPS_H

#include <functional>
#include <string>
#include <vector>

#include <json/value.h>

#include "tessel_hook.h"
#include "tesselobject.h"

namespace tessel {

/* jParm has member szKey; false for anything but an object (a request of
 * another type has no members, and must never reach jsoncpp's asserts). */
bool HasMember(const Json::Value &jParm, const char *szKey);
/* The member's value, or null when there is none. */
const Json::Value &MemberOf(const Json::Value &jParm, const char *szKey);
/* An integral member as a uid: negative and oversized values wrap the way a
 * cast to uid_t does, without jsoncpp's range exceptions. */
unsigned int UidOf(const Json::Value &jVal);

/*
 * Runs work over the records of the chain from pHead: a single record on the
 * calling thread; more are dealt by list position modulo 30 to at most 30
 * workers, one thread each (a worker whose thread cannot be made runs on the
 * calling thread at once), joined in the order they were made. A failed join
 * is logged under szModule. work must be safe to run on several threads at
 * once over disjoint records.
 */
void RunDealt(TESSEL_OBJECT *pHead, const char *szModule,
              const std::function<void(const std::vector<TESSEL_OBJECT *> &)> &work);

/* A parent's acl as a child takes it over: "inherit": true on "public",
 * "zem_app" and every "zem_user" and "zem_group" entry present. */
Json::Value InheritedAcl(const Json::Value &jParentAcl);

/* The request of a read of the object jId in jParm's namespace, made on
 * behalf of jParm's requester; callers add the fields and version they need. */
Json::Value ReadRequest(const Json::Value &jParm, const Json::Value &jId);

/* Looks up the namespace's hooks for szAction (the list operations' table
 * when blBatch), runs the "pre" one on jParm and pObj, and returns the
 * "post" one (NULL: none). */
TESSEL_NS_HOOK RunPreHook(const std::string &strNs, const char *szAction, bool blBatch, const Json::Value &jParm,
                          const TESSEL_OBJECT *pObj);

/* The word the requester holds on the record's object now, "NA" when it can
 * no longer be calculated (the error stack is left as it was), with "owner"
 * reported as jParm's "delegate_perm" when that is given. */
std::string PermAfterChange(const Json::Value &jParm, const TESSEL_OBJECT &obj);

}  // namespace tessel

#endif /* TESSEL_OBJECT_OBJECT_OPS_H */
