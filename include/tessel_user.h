/*
 * Users, groups and the person records of objects. User and group answers are
 * cached for the life of the process: a user renamed, deleted or expired
 * while a process runs keeps the information that process saw first.
 */
#ifndef TESSEL_USER_H
#define TESSEL_USER_H

#include <string>

#include <json/value.h>
#include <quor/qlib.h>

#include "tessel_export.h"
#include "tesselobject.h"

/*
 * {"name", "mail", "exist", "expire", "gid"} of a user. UID_ERR is the
 * anonymous user ("Anonymous"), answered only when blMustExist is false; an
 * unknown uid is "Deleted user #<uid>" and fails only with blMustExist.
 */
TESSEL_EXPORT BOOL TesselGetUserInfo(unsigned int uid, Json::Value &jsInfo, bool blMustExist);
TESSEL_EXPORT BOOL TesselGetUserName(unsigned int uid, std::string &strName, bool blMustExist);
TESSEL_EXPORT BOOL TesselGetUserNameAndMail(unsigned int uid, std::string &strName, std::string &strMail,
                                            bool blMustExist);
TESSEL_EXPORT BOOL TesselGetGID(unsigned int uid, int &gid, bool blMustExist);
/* The user's group ids, an array of integers. */
TESSEL_EXPORT BOOL TesselGetAllGID(unsigned int uid, Json::Value &jsGid, bool blMustExist);
TESSEL_EXPORT BOOL TesselGetGroupName(unsigned int gid, std::string &strName, bool blMustExist);
/* Loads the person record of uid from the object's person files into pObj's person. */
TESSEL_EXPORT BOOL TesselUpdatePerson(TESSEL_OBJECT *pObj, unsigned int uid);
/* Shallow merge of src into dest; a null member of src removes it from dest. */
TESSEL_EXPORT BOOL mergeJsonObject(Json::Value &jsDest, const Json::Value &jsSrc);

#endif /* TESSEL_USER_H */
