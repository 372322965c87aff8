/*
 * Steps the single and the list get share: reading the requester, the acl
 * the store must always read, and what the caller is shown afterwards.
 */
#ifndef TESSEL_OBJECT_OBJECT_GET_H
#define TESSEL_OBJECT_OBJECT_GET_H

#include <sys/types.h>

#include <string>

#include <json/value.h>

#include "tesselobject.h"

namespace tessel {

constexpr const char kPermOwner[] = "owner";

/* The requester of a request whose "requester" is integral. */
uid_t RequesterOf(const Json::Value &jRequester);
/* True when the request's "field" asks for the acl with the bool true. */
bool AskedForAcl(const Json::Value &jParm);
/* Makes jParm["field"]["acl"] true, "field" an object if it was not one. */
void ForceAclField(Json::Value &jParm);
/* Empties the record's acl unless the caller asked for it; turns "owner"
 * into the request's "delegate_perm" when it has one. */
void HideAndDelegate(const Json::Value &jParm, bool blAskedAcl, std::string &strPerm, TESSEL_OBJECT *pObject);

/* Empties a record the requester may not see; it keeps only which object
 * it stands for (ns, id) and whether it was read (err). */
void WithholdRecord(TESSEL_OBJECT *pObject);

}  // namespace tessel

#endif /* TESSEL_OBJECT_OBJECT_GET_H */
