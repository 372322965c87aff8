/*
 * Completion of create parameters, shared by the single and the list create.
 */
#ifndef TESSEL_OBJECT_OBJECT_CREATE_H
#define TESSEL_OBJECT_OBJECT_CREATE_H

#include <json/value.h>

/*
 * Completes jParm in place: owner (default the requester), parent and acl
 * (taken over from an existing parent, whose owner the new object then
 * belongs to), a given id checked for its owner and absence, the owner's
 * validity, and the defaults and types of the remaining fields. jParm must
 * already hold "ns" (string) and "requester" (integral).
 */
bool PrepareCreateParm(Json::Value &jParm);

#endif /* TESSEL_OBJECT_OBJECT_CREATE_H */
